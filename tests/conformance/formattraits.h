#pragma once

#include "datasources/interfaces/metadatamap.h"
#include "gobs/raster/datatype.h"

#include <ostream>
#include <string>
#include <vector>

namespace krv::conformance
{

// An image that a format's test file holds: the recipe of tests/support/recipe.h.
struct Image
{
    unsigned int mnWidth = 300;
    unsigned int mnHeight = 133;
    std::vector<krv::gobs::DataType> moTypes = {krv::gobs::eDT_8U, krv::gobs::eDT_8U, krv::gobs::eDT_8U};
    // Of the file, when the format holds tags; of channels 1, 2 ..., when it holds those of channels.
    krv::datasources::MetadataMap moTags;
    // Reduction factors, when the format holds levels: ceil(size / level) pixels of the channels channel + 1000 *
    // level.
    std::vector<unsigned int> moLevels;
    // How the format lays it out: each format has its own few ways, from 0.
    unsigned int mnVariant = 0;
};

// What the suite has to know of a format: how its files are made, and each thing that it cannot do.
struct FormatTraits
{
    std::string moShortName;
    std::string moLibrary; // base name in lib/qrfformats
    void (*mpMakeFile)(const std::string& fileName, const Image& oImage) = nullptr;
    std::vector<const char*> moVariants = {"plain"}; // the layouts, by name
    std::vector<krv::gobs::NativeDataTypeCode> moTypes = {
        krv::gobs::eDT_8U,   krv::gobs::eDT_8S,   krv::gobs::eDT_16U,  krv::gobs::eDT_16S,  krv::gobs::eDT_32U,
        krv::gobs::eDT_32S,  krv::gobs::eDT_32R,  krv::gobs::eDT_64U,  krv::gobs::eDT_64S,  krv::gobs::eDT_64R,
        krv::gobs::eDT_C16U, krv::gobs::eDT_C16S, krv::gobs::eDT_C32S, krv::gobs::eDT_C32R, krv::gobs::eDT_C64R};
    bool mbMixedTypes = true;
    bool mbMetadata = true;
    bool mbOverviews = true;

    friend void PrintTo(const FormatTraits& oTraits, std::ostream* poStream) { *poStream << oTraits.moShortName; }
};

} // namespace krv::conformance
