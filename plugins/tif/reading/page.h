#pragma once

#include "plugins/support/file/file.h"
#include "plugins/tif/reading/peekreader.h"
#include "plugins/tif/reading/rawdirectory.h"
#include "plugins/tif/reading/sampleform.h"
#include "plugins/tif/reading/striletable.h"
#include "plugins/tif/reading/tiffhandle.h"

#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

namespace krv::plugins::tif
{

// What of the tags of a page decides how its pixels are read.
struct PageForm
{
    std::uint32_t mnWidth = 0;
    std::uint32_t mnHeight = 0;
    std::uint16_t mnChannels = 1;
    SampleForm moSample;
    bool mbBigEndian = false;
    bool mbSeparate = false; // every channel in strips or tiles of its own
    bool mbTiled = false;
    bool mbReversedBits = false; // the lowest bit of a byte comes first
    std::uint16_t mnCompression = 1;
    std::uint16_t mnPredictor = 1;
    std::uint16_t mnPhotometric = 1;
    std::vector<std::uint16_t> moExtraSamples;
    // A tile, or a strip: as wide as the image, its height at most the image's.
    std::uint32_t mnStrileWidth = 0;
    std::uint32_t mnStrileHeight = 0;
    std::uint32_t mnStrilesAcross = 0;
    std::uint32_t mnStrilesDown = 0;

    // Channels that lie together in a strip or tile.
    unsigned int GetPlaneChannels() const { return mbSeparate ? 1u : mnChannels; }
    unsigned int GetPlanes() const { return mbSeparate ? mnChannels : 1u; }
    std::uint64_t GetStriles() const { return std::uint64_t{mnStrilesAcross} * mnStrilesDown * GetPlanes(); }
    StrileShape GetShape() const;
    // Bytes of a stored row of nPixels, and of the same row as handed out.
    std::uint64_t GetStoredRowBytes(std::uint64_t nPixels) const
    {
        return (nPixels * GetPlaneChannels() * moSample.GetBits() + 7) / 8;
    }
    std::uint64_t GetRowBytes(std::uint64_t nPixels) const
    {
        return nPixels * GetPlaneChannels() * moSample.GetValueBytes();
    }
    // The rows that a strip or tile in a row of them holds: strips end with the image, tiles do not.
    std::uint32_t GetStrileRows(std::uint32_t nStrileRow) const;
    // Whether the samples come as they are stored, not by way of libtiff's decoders.
    bool IsOwnCodec() const;
    // The channel (from 0) that holds alpha: extra samples 1 and 2; -1 when there is none.
    int GetAlphaChannel() const;
    bool IsPremultiplied() const;
};

// One directory of the file with everything that reading it takes. libtiff looks at a plain directory only when
// something is asked that it alone knows. Throws FileFormatException naming file and cause for what is damaged and for
// what cannot be read correctly.
class Page
{
public:
    // poReader: of the same file, with what was read of it already; null for a new one.
    Page(std::shared_ptr<const support::File> poFile, const FileHeader& oHeader, std::uint64_t nDirectory,
         std::unique_ptr<PeekReader> poReader = nullptr);
    ~Page();
    Page(const Page&) = delete;
    Page& operator=(const Page&) = delete;

    const support::File& GetFile() const { return *mpoFile; }
    const std::shared_ptr<const support::File>& ShareFile() const { return mpoFile; }
    const std::string& GetFileName() const { return mpoFile->GetName(); }
    const FileHeader& GetHeader() const { return moHeader; }
    const PageForm& GetForm() const { return moForm; }
    const RawDirectory& GetDirectory() const { return moDirectory; }
    PeekReader& GetReader() { return *mpoReader; }
    TIFF* GetTiff() const { return GetHandle().Get(); }
    TiffHandle& GetHandle() const;
    // The tables of tag 347, as long as the page is there; none when there is none.
    std::span<const unsigned char> GetJpegTables() const;
    StrileTable& GetStriles() { return *mpoStriles; }

    // Throws FileFormatException "<file>: <what>; the file is damaged", and the other "<file>: <what>; the file is of a
    // kind that is not read".
    [[noreturn]] void Fail(const std::string& what, const Place& oPlace = Place::Current()) const;
    [[noreturn]] void Refuse(const std::string& what, const Place& oPlace = Place::Current()) const;
    // What went wrong inside libtiff, after the words that say where.
    [[noreturn]] void Fail(const std::string& where, const TiffTrouble& oTrouble,
                           const Place& oPlace = Place::Current()) const;

private:
    template <typename T>
    T GetTag(std::uint16_t nTag, T nDefault) const;
    void CheckTagSizes() const;
    void CheckNumbers() const;
    void CheckExtent(const char* pWhat, std::uint64_t nWidth, std::uint64_t nHeight) const;
    void CheckRow(std::uint64_t nBytes) const;
    void ReadForm();
    void ReadGeometry();
    void CheckCodec();
    void CheckPredictor() const;
    void CheckPhotometric();
    void CheckSizes() const;

    std::shared_ptr<const support::File> mpoFile;
    FileHeader moHeader;
    std::unique_ptr<PeekReader> mpoReader;
    RawDirectory moDirectory;
    bool mbPlain = false;
    mutable std::unique_ptr<TiffHandle> mpoHandle;
    PageForm moForm;
    std::unique_ptr<StrileTable> mpoStriles;
};

} // namespace krv::plugins::tif
