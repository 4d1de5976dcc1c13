#pragma once

#include "operations/source/sourcefile.h"

#include "tools/krv/pngwriter.h"
#include "tools/krv/stretch.h"

#include <string>
#include <vector>

namespace krv::tool
{

using namespace krv::operations;

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
    std::string description; // what is shown and how, for the user
};

// Renders a small picture of a file: from the coarsest level that is large enough, with its default display channels,
// its colour table, and no-data, masked and transparent pixels transparent. Throws UsageError for channels that are not
// there.
QuickLook MakeQuickLook(const SourceFile& oFile, const QuickLookOptions& oOptions);

} // namespace krv::tool
