#pragma once

#include "datasources/interfaces/metadatamap.h"
#include "gobs/raster/datatype.h"
#include "plugins/krvdsk/link/link.h"
#include "plugins/krvdsk/store/bytes.h"
#include "plugins/krvdsk/store/storefile.h"
#include "plugins/krvdsk/store/tiletable.h"
#include "plugins/support/writing/recordtext.h"

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <vector>

namespace krv::plugins::krvdsk
{

// How tiles are coded. The values are those of the file.
enum class Coding : std::uint8_t
{
    eNone = 0,
    eDeflate = 1,
    eZstd = 2,
    eLz4 = 3,
    eLzw = 4
};

// The name by which options and support/codec know a coding.
const char* GetCodingName(Coding eCoding);

// Where the pixels of a plane are. The values are those of the file.
enum class Storage : std::uint8_t
{
    eTiles = 0,     // tiles hold what of them lies in the image
    eWholeTiles = 1 // all tiles are of one size, as those of TIFF are
};

// Channels of one type that are stored together, pixel interleaved, with their levels; or a bitmap.
struct Plane
{
    Storage meStorage = Storage::eTiles;
    krv::gobs::DataType moType; // eDT_BIT for bitmaps
    Coding meCoding = Coding::eNone;
    std::uint8_t mnCodingLevel = 0; // for what is written; 0: the coding's own
    std::uint8_t mnPredictor = 1;   // 1: none, 2: differences along the rows, 3: byte planes of reals with differences
    std::uint8_t mnKeptBits = 0;    // of a value, which is stored with all that its type has; 0: all
    // Of the channels that are stored, which are there: those that were deleted stay in the tiles.
    std::vector<bool> moThere;
    std::map<unsigned int, std::shared_ptr<TileTable>> moTables; // by level, 1 for the image
    // Of a linked channel: of which state of the other file its levels were made, as far as that is known.
    std::map<unsigned int, Link::State> moMadeOf;
    bool mbGone = false; // was deleted

    unsigned int GetStoredChannels() const { return static_cast<unsigned int>(moThere.size()); }
    unsigned int GetChannels() const;
    // With the bits that are kept.
    krv::gobs::DataType GetNativeType() const;
    // Bits of a pixel as stored.
    std::uint64_t GetPixelBits() const { return moType.GetValueBits() * moThere.size(); }
    // As it goes with the type: 2 for integers, 3 for reals, 1 for complex values and bits.
    static std::uint8_t GetUsualPredictor(const krv::gobs::DataType& oType);
    static bool CanPredict(std::uint8_t nPredictor, const krv::gobs::DataType& oType);
};

// A record that is read when it is asked for, and written when it changed.
struct Blob
{
    Entry moEntry;
    std::uint64_t mnGeneration = 0;     // of its room
    std::vector<unsigned char> moBytes; // when it changed
    bool mbChanged = false;

    void Set(std::vector<unsigned char> oBytes);
    std::vector<unsigned char> Get(const StoreFile& oStore, const std::string& what) const;
};

// Something of a file beside its channels: a bitmap, a table, a model. All kinds share one range of numbers; the kind
// is the layer name of reference tags.
struct Segment
{
    static constexpr const char* BITMAP = "BITMAP";
    static constexpr const char* PCT = "PCT";
    static constexpr const char* LUT = "LUT";
    static constexpr const char* MODEL = "MODEL";
    static constexpr const char* EPHEMERIS = "EPHEMERIS";

    std::string moKind;
    std::string moDescription;
    unsigned int mnChannel = 0; // that it belongs to; 0: none
    krv::datasources::MetadataMap moMetadata;
    std::shared_ptr<Plane> mpoPlane; // of bitmaps
    Blob moBytes;                    // of all others

    std::string Describe(unsigned int nNumber) const { return moKind + " " + std::to_string(nNumber); }
};

// Of an image or a level, in pixels.
struct ImageSize
{
    unsigned int mnWidth = 0;
    unsigned int mnHeight = 0;
};

// What a file holds, without pixels and the bytes of segments: its directory, in memory. The record of metadata is read
// apart.
struct Catalogue
{
    static constexpr unsigned int LARGEST_BLOCK_SIDE = 65536;
    // Of a tile, decoded.
    static constexpr std::uint64_t LARGEST_TILE = std::uint64_t{96} << 20;
    static constexpr std::uint64_t LARGEST_DIRECTORY = std::uint64_t{16} << 20;
    static constexpr unsigned int MOST_CHANNELS = 1u << 20;
    static constexpr std::uint64_t MOST_TILES = std::uint64_t{1} << 40;

    ImageSize moSize;
    unsigned int mnBlockWidth = 256;
    unsigned int mnBlockHeight = 256;
    // How planes to come are stored.
    Coding meCoding = Coding::eNone;
    std::uint8_t mnCodingLevel = 0;
    std::uint8_t mnPredictor = 0; // 0: the usual one
    bool mbSeparate = false;      // every channel in a plane of its own
    // Of the channels that a new file begins with; 0: all.
    std::uint8_t mnKeptBits = 0;

    // Channels count through those that lie in another file, and then through the planes.
    std::string moLinkPath; // of that file, from the folder of this one; empty: there is none
    std::vector<Link::Channel> moLinked;
    // Of each of them a plane for levels of its own, without the image.
    std::vector<std::shared_ptr<Plane>> moLinkedPlanes;
    std::vector<std::shared_ptr<Plane>> moPlanes;
    std::map<unsigned int, ImageSize> moLevels; // from 2 on
    std::map<unsigned int, Segment> moSegments;
    std::map<unsigned int, ImageSize> moBitmapLevels;
    unsigned int mnNextSegment = 1;
    bool mbPlaced = false; // has a geocoding
    krv::ogc::cs::GeocodingInfo moGeocoding;
    std::string moCRS; // a definition; empty: none
    Blob moRecord;     // metadata, descriptions and histories

    // Throws FileFormatException for a directory that contradicts itself.
    static Catalogue Read(const StoreFile& oStore, const std::vector<unsigned char>& oBytes);
    std::vector<unsigned char> Write() const;

    unsigned int CountChannels() const;
    // The planes of all channels, in which levels lie: those of linked ones first.
    std::vector<std::shared_ptr<Plane>> GetLevelPlanes() const;
    // Of a level as new ones are made; of the image, 1.
    ImageSize GetUsualSize(unsigned int nLevel) const;
    std::uint64_t CountTiles(const ImageSize& oSize) const;
    // A table of nothing.
    std::shared_ptr<TileTable> MakeTable(const ImageSize& oSize) const;
    // Of a type, as the file stores new ones, with tables for all levels. Throws krv::DataException for tiles that are
    // too large or too many.
    std::shared_ptr<Plane> MakePlane(const krv::gobs::DataType& oType, unsigned int nChannels, const std::string& name,
                                     const Place& oPlace) const;
    std::shared_ptr<Plane> MakeLinkedPlane(const krv::gobs::DataType& oType, const std::string& name,
                                           const Place& oPlace) const;
    std::shared_ptr<Plane> MakeBitmapPlane() const;
    // Why tiles of such a plane cannot be; empty when they can.
    std::string FindObstacle(const Plane& oPlane) const;
    // Gives the tables their names for messages, which count channels.
    void Describe() const;
    static std::string DescribePlane(unsigned int nFirst, unsigned int nChannels);

private:
    void ReadImage(BytesReader oItem);
    enum class Use
    {
        eChannels,
        eLinked,
        eBitmap
    };
    std::shared_ptr<Plane> ReadPlane(BytesReader& oItem, Use eUse) const;
    void ReadSegment(BytesReader oItem);
    void ReadLink(BytesReader oItem);
};

// Metadata, descriptions and histories of channels, as they are stored.
struct TagRecord
{
    krv::datasources::AuxiliaryData moTags;
    std::vector<std::vector<std::string>> moHistories; // of each channel, oldest entry first

    explicit TagRecord(unsigned int nChannels) : moTags(nChannels), moHistories(nChannels) {}
    static TagRecord Read(const StoreFile& oStore, const std::vector<unsigned char>& oBytes, unsigned int nChannels);
    std::vector<unsigned char> Write() const;
};

} // namespace krv::plugins::krvdsk
