#pragma once

#include "datasources/interfaces/isidecardataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "gobs/raster/datatype.h"
#include "operations/api.h"

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

struct CrsFacts
{
    std::string name;
    int epsg = 0; // 0: none
    std::string wkt;
};

struct LevelFacts
{
    unsigned int level = 0;
    unsigned int width = 0;
    unsigned int height = 0;
};

struct BitmapFacts
{
    unsigned int number = 0;
    std::string description;
    bool validity = false; // it is the image's validity mask
};

struct ColourTableFacts
{
    unsigned int number = 0;
    unsigned int channel = 0;
    std::string description;
    std::size_t entries = 0;
};

struct MathModelFacts
{
    unsigned int number = 0;
    std::string kind;               // empty when the model cannot be read
    std::optional<double> accuracy; // metres on the ground, as the provider states it
};

// Everything known of a file. What has no value is not there; empty texts and lists are.
struct FileInfo
{
    std::string file;
    std::optional<std::string> format;
    unsigned int width = 0;
    unsigned int height = 0;
    unsigned int blockWidth = 0;
    unsigned int blockHeight = 0;
    std::vector<ChannelFacts> channels;
    krv::datasources::MetadataMap metadata;
    std::optional<CrsFacts> crs;
    std::optional<std::array<double, 6>> geocoding;
    std::vector<LevelFacts> overviews;
    std::vector<BitmapFacts> bitmaps;
    std::vector<MathModelFacts> mathModels;
    std::vector<std::string> linkedFiles; // those that hold the pixels
    std::vector<ColourTableFacts> colourTables;
    std::array<unsigned int, 4> displayDefaults{}; // red, green, blue, grey; 0: none
    std::optional<std::uint64_t> unusedBytes;
    std::vector<krv::datasources::Sidecar> sidecars; // in the order in which they are looked for
    std::optional<unsigned int> furtherImages;       // nothing where the format has no such files
};

// A part that cannot be read leaves the others to be shown, and a warning says so.
KRV_OPERATIONS_API FileInfo GatherInfo(const SourceFile& oFile);

} // namespace krv::operations
