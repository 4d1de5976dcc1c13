#pragma once

#include "gobs/raster/datatype.h"
#include "operations/copy/detail/copyplan.h"
#include "operations/job/progress.h"

#include <functional>
#include <vector>

namespace krv::datasources
{
class IRasterWriter;
} // namespace krv::datasources

namespace krv::threading
{
class IExecutor;
}

namespace krv::operations::detail
{

// Channels that one reader serves, and where each goes in the pixels that are written.
struct CopySource
{
    const SourceFile* file = nullptr;
    // Makes the reader of the file, or of the file opened again.
    std::function<LevelReader(const SourceFile& oFile)> open;
    std::vector<unsigned int> positions;
};

// Where the pixels go: all of the image (level 1) or of a level.
struct CopyTarget
{
    krv::datasources::IRasterWriter& writer;
    unsigned int level = 1;
};

// Reads a window from all sources and writes it, as the whole image, in pieces that consist of whole blocks of the
// target and are as large as blocks of the sources are, but at most 64 MiB. Values are converted to the writer's type.
// Each position is filled by one source. Pieces are read, converted and encoded on the executor's threads too; this
// thread stores them in their order.
void CopyPixels(const std::vector<CopySource>& oSources, const CopyTarget& oTarget, const PixelWindow& oWindow,
                ProgressCounter& oCounter, krv::threading::IExecutor* poExecutor);

} // namespace krv::operations::detail
