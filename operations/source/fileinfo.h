#pragma once

#include "datasources/interfaces/isidecardataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "gobs/raster/datatype.h"
#include "operations/api.h"
#include "operations/source/imageplace.h"
#include "operations/source/mapwindow.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace krv::operations
{

class SourceFile;

// A table that a tag refers to.
// As the reference tag says it; the table itself was not looked for.
struct TableReference
{
    std::string file;        // as written, relative to the file that refers to it
    std::string layer;       // such as "PCT" or "LUT"
    unsigned int number = 0; // of the segment; 0 for the file as a whole
};

// One channel.
// What statistics programs leave in tags is handed out as it stands: nothing here is computed from pixels.
struct ChannelFacts
{
    unsigned int number = 0; // from 1

    // Of the values that readers hand out. The stored type may be narrower, such as 12 bits in 16.
    krv::gobs::DataType type;
    krv::gobs::DataType storedType;           // as the file has it, before anything is widened
    std::string noDataText;                   // as the file has it, so that NaN and 64-bit integers stay what they are
    bool recorded = false;                    // whether the metadata knows the channel; else nothing follows
    std::string description;                  // empty when nobody gave one
    krv::datasources::MetadataMap metadata;   // all tags of the channel
    std::optional<TableReference> defaultLut; // that the channel is to be shown by
    std::optional<TableReference> defaultPct; // its colours, where a tag names them
};

// The reference system: its name, its EPSG code and WKT2 on one line.
// A system that nothing of is known but its text has the name "unknown".
struct CrsFacts
{
    std::string name;
    int epsg = 0;    // 0: none
    std::string wkt; // WKT2:2019, for programs that compare or store it
};

// A level, as overview accessors number it, and its size in pixels.
// The size comes from the file: levels of other programs may be rounded otherwise.
struct LevelFacts
{
    unsigned int level = 0; // the reduction factor: 2 for half of the size
    unsigned int width = 0;
    unsigned int height = 0;
    bool valid = true; // made of the pixels that the image has; others are passed over
};

// A bitmap by its number, from 1.
// Pixels of bitmaps are not read: whether any bit is set is not told.
struct BitmapFacts
{
    unsigned int number = 0;
    std::string description;
    bool validity = false; // it is the image's validity mask
};

// A colour table by its number, from 1, and the channel that it belongs to.
// The colours themselves are had by IPCTDataset::GetPCT.
struct ColourTableFacts
{
    unsigned int number = 0;
    unsigned int channel = 0; // 0: it belongs to no channel of its own
    std::string description;  // empty for one that says which pixels are valid
    std::size_t entries = 0;  // ranges of values, each with a colour
};

// A sensor model by its number, from 1.
// The numbers of the model are had by LoadMathModel.
struct MathModelFacts
{
    unsigned int number = 0;        // the segment, as LoadMathModel takes it
    std::string kind;               // empty when the model cannot be read
    std::optional<double> accuracy; // metres on the ground, as the provider states it
};

// How the pixels are stored, of formats that tell.
// Those of the image at full size; levels may be stored otherwise.
struct StorageFacts
{
    unsigned int blockWidth = 0; // pixels, of a tile or strip as the file has it
    unsigned int blockHeight = 0;
    bool tiled = true;          // else in strips, which are as wide as the image and end with it
    std::string compression;    // NONE, DEFLATE and so on; empty when it has no name
    bool lossy = false;         // pixels that are decoded and encoded again may change
    unsigned int predictor = 1; // 1: none, 2: differences along the rows, 3: byte planes of reals with differences
    bool separate = false;      // every channel in blocks of its own
    bool bigEndian = false;     // the order of bytes before coding
};

// The size of a pixel on the ground, along a row and along a column.
// Never negative, whatever way rows run. Of a rotated image along its own rows and columns.
struct PixelSize
{
    double x = 0;
    double y = 0;
    std::string unit; // empty when no reference system says it
};

// Everything known of a file. What has no value is not there; empty texts and lists are.
// Made once and independent of the file afterwards: it may be kept, copied and handed to other threads.
struct FileInfo
{
    std::string file;                  // the name as it was given
    std::optional<std::string> format; // the short name; nothing for datasets without a format
    unsigned int width = 0;            // pixels; 0 for a file without an image
    unsigned int height = 0;
    unsigned int tileWidth = 0; // the tile in which a program best reads
    unsigned int tileHeight = 0;
    std::optional<StorageFacts> storage;
    std::string variant;                    // of the format, such as "BigTIFF"; empty when it has none
    std::optional<std::uint64_t> fileBytes; // size on the disk, that of the file alone
    // What keeps the file from being read in few requests over a network; nothing for formats without such a layout.
    std::optional<std::vector<std::string>> cloudReasons;
    // What says where the image lies; nothing when it lies nowhere.
    std::optional<PlacedBy> placedBy;

    // In map units of the file's reference system.
    std::optional<MapBounds> bounds;            // of the outer edges; of files with a transform
    std::optional<GeographicBounds> geographic; // the same in degrees

    // Of a geographic system in degrees.
    std::optional<PixelSize> pixelSize; // of files with a transform

    // In the order of their numbers.
    std::vector<ChannelFacts> channels;
    krv::datasources::MetadataMap metadata; // all tags of the file
    std::optional<CrsFacts> crs;            // nothing when the file names none
    // x = [0] + column * [1] + row * [2] and y = [3] + column * [4] + row * [5], of outer corners of pixels.
    std::optional<std::array<double, 6>> geocoding;
    std::vector<LevelFacts> overviews; // ascending, valid or not
    std::vector<BitmapFacts> bitmaps;  // ascending by number
    std::vector<MathModelFacts> mathModels;

    // Paths that open from the working folder.
    std::vector<std::string> linkedFiles;          // those that hold the pixels
    std::vector<ColourTableFacts> colourTables;    // ascending by number
    std::array<unsigned int, 4> displayDefaults{}; // red, green, blue, grey; 0: none
    // Bytes of the file that nothing in it refers to; nothing for formats that do not tell.
    std::optional<std::uint64_t> unusedBytes;
    std::vector<krv::datasources::Sidecar> sidecars; // in the order in which they are looked for
    std::optional<unsigned int> furtherImages;       // nothing where the format has no such files
};

// A part that cannot be read leaves the others to be shown, and a warning says so.
// No pixel of a channel is read, so that the size of the image does not matter.
// Example: const FileInfo oInfo = GatherInfo(SourceFile("scene.tif"));
KRV_OPERATIONS_API FileInfo GatherInfo(const SourceFile& oFile);

} // namespace krv::operations
