#pragma once

#include "operations/job/progress.h"
#include "operations/picture/displaychoice.h"
#include "operations/picture/pngwriter.h"
#include "operations/picture/stretch.h"

#include <vector>

namespace krv::threading
{
class IExecutor;
}

namespace krv::operations
{

struct QuickLookOptions
{
    unsigned int size = 1024;           // the longest side; smaller files keep their own size
    std::vector<unsigned int> channels; // one, or red, green and blue; empty: the file's defaults
    StretchMode stretch = StretchMode::eAuto;
    bool average = true; // nearest otherwise
};

struct QuickLook
{
    Picture picture;
    DisplayChoice choice;           // what is shown
    std::vector<Stretch> stretches; // of each colour of it; none with a colour table
};

// Renders a small picture of a file: from the coarsest level that is large enough, with its default display channels,
// its colour table, and no-data, masked and transparent pixels transparent. Throws RequestException for channels that
// are not there.
KRV_OPERATIONS_API QuickLook MakeQuickLook(const SourceFile& oFile, const QuickLookOptions& oOptions,
                                           const Progress& oProgress = {},
                                           krv::threading::IExecutor* poExecutor = nullptr);

} // namespace krv::operations
