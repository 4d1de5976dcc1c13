#pragma once

#include "datasources/interfaces/metadatamap.h"
#include "gobs/raster/datatype.h"

#include <string>
#include <vector>

namespace krv::test
{

// Writes the recipe image as a file of the DEMO format, whose channels may have several types.
void WriteDemoFile(const std::string& fileName, unsigned int nWidth, unsigned int nHeight,
                   const std::vector<krv::gobs::DataType>& oTypes,
                   const krv::datasources::MetadataMap& oTags = krv::datasources::MetadataMap());

} // namespace krv::test
