#pragma once

#include "gobs/raster/datatype.h"
#include "operations/copy/detail/copyplan.h"
#include "operations/job/progress.h"

#include <vector>

namespace krv::datasources
{
class IRasterReader;
class IRasterWriter;
} // namespace krv::datasources

namespace krv::operations::detail
{

// Channels that one reader serves, and where each goes in the pixels that are written.
struct CopySource
{
    krv::datasources::IRasterReader* reader = nullptr;
    std::vector<unsigned int> positions;
};

// Reads a window from all sources and writes it, as the whole image, in pieces that consist of whole blocks of the
// target and are as large as blocks of the sources are, but at most 64 MiB. Values are converted to the writer's type.
// Each position is filled by one source.
void CopyPixels(const std::vector<CopySource>& oSources, krv::datasources::IRasterWriter& oWriter,
                const PixelWindow& oWindow, ProgressCounter& oCounter);

} // namespace krv::operations::detail
