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
struct TableReference
{
    std::string file;
    std::string layer;
    unsigned int number = 0;
};

// One channel.
struct ChannelFacts
{
    unsigned int number = 0; // from 1
    krv::gobs::DataType type;
    krv::gobs::DataType storedType;
    std::string noDataText; // as the file has it, so that NaN and 64-bit integers stay what they are
    bool recorded = false;  // whether the metadata knows the channel; else nothing follows
    std::string description;
    krv::datasources::MetadataMap metadata;
    std::optional<TableReference> defaultLut;
    std::optional<TableReference> defaultPct;
};

// The reference system: its name, its EPSG code and WKT2 on one line.
struct CrsFacts
{
    std::string name;
    int epsg = 0; // 0: none
    std::string wkt;
};

// A level, as overview accessors number it, and its size in pixels.
struct LevelFacts
{
    unsigned int level = 0;
    unsigned int width = 0;
    unsigned int height = 0;
    bool valid = true; // made of the pixels that the image has; others are passed over
};

// A bitmap by its number, from 1.
struct BitmapFacts
{
    unsigned int number = 0;
    std::string description;
    bool validity = false; // it is the image's validity mask
};

// A colour table by its number, from 1, and the channel that it belongs to.
struct ColourTableFacts
{
    unsigned int number = 0;
    unsigned int channel = 0;
    std::string description;
    std::size_t entries = 0;
};

// A sensor model by its number, from 1.
struct MathModelFacts
{
    unsigned int number = 0;
    std::string kind;               // empty when the model cannot be read
    std::optional<double> accuracy; // metres on the ground, as the provider states it
};

// How the pixels are stored, of formats that tell.
struct StorageFacts
{
    unsigned int blockWidth = 0;
    unsigned int blockHeight = 0;
    bool tiled = true;       // else in strips, which are as wide as the image and end with it
    std::string compression; // NONE, DEFLATE and so on; empty when it has no name
    bool lossy = false;
    unsigned int predictor = 1; // 1: none, 2: differences along the rows, 3: byte planes of reals with differences
    bool separate = false;      // every channel in blocks of its own
    bool bigEndian = false;
};

// The size of a pixel on the ground, along a row and along a column.
struct PixelSize
{
    double x = 0;
    double y = 0;
    std::string unit; // empty when no reference system says it
};

// Everything known of a file. What has no value is not there; empty texts and lists are.
struct FileInfo
{
    std::string file;
    std::optional<std::string> format;
    unsigned int width = 0;
    unsigned int height = 0;
    unsigned int tileWidth = 0; // the tile in which a program best reads
    unsigned int tileHeight = 0;
    std::optional<StorageFacts> storage;
    std::string variant; // of the format, such as "BigTIFF"; empty when it has none
    std::optional<std::uint64_t> fileBytes;
    // What keeps the file from being read in few requests over a network; nothing for formats without such a layout.
    std::optional<std::vector<std::string>> cloudReasons;
    // What says where the image lies; nothing when it lies nowhere.
    std::optional<PlacedBy> placedBy;
    std::optional<MapBounds> bounds;            // of the outer edges; of files with a transform
    std::optional<GeographicBounds> geographic; // the same in degrees
    std::optional<PixelSize> pixelSize;         // of files with a transform
    std::vector<ChannelFacts> channels;
    krv::datasources::MetadataMap metadata;
    std::optional<CrsFacts> crs;
    // x = [0] + column * [1] + row * [2] and y = [3] + column * [4] + row * [5], of outer corners of pixels.
    std::optional<std::array<double, 6>> geocoding;
    std::vector<LevelFacts> overviews;
    std::vector<BitmapFacts> bitmaps;
    std::vector<MathModelFacts> mathModels;
    std::vector<std::string> linkedFiles; // those that hold the pixels
    std::vector<ColourTableFacts> colourTables;
    std::array<unsigned int, 4> displayDefaults{}; // red, green, blue, grey; 0: none
    // Bytes of the file that nothing in it refers to; nothing for formats that do not tell.
    std::optional<std::uint64_t> unusedBytes;
    std::vector<krv::datasources::Sidecar> sidecars; // in the order in which they are looked for
    std::optional<unsigned int> furtherImages;       // nothing where the format has no such files
};

// A part that cannot be read leaves the others to be shown, and a warning says so.
KRV_OPERATIONS_API FileInfo GatherInfo(const SourceFile& oFile);

} // namespace krv::operations
