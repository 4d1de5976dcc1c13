#pragma once

#include "operations/job/progress.h"
#include "operations/picture/displaychoice.h"
#include "operations/picture/picturewriter.h"
#include "operations/picture/stretch.h"

#include <vector>

namespace krv::threading
{
class IExecutor;
}

namespace krv::operations
{

// The defaults suit a picture for a screen.
// Example: WritePicture(MakeQuickLook(SourceFile("scene.tif"), {}).picture, "scene.png");
struct QuickLookOptions
{
    unsigned int size = 1024; // the longest side; smaller files keep their own size

    // Counted from 1.
    std::vector<unsigned int> channels;       // one, or red, green and blue; empty: the file's defaults
    StretchMode stretch = StretchMode::eAuto; // of values to grey levels, for each colour
    bool average = true;                      // nearest otherwise
    bool power = false;                       // the power of a radar scene in place of its channels
    // Values as 10 times their logarithm, as the power of radar scenes is looked at. Complex channels are shown so, by
    // their power, unless channels or a stretch are asked for.
    bool decibels = false;
    bool legend = false; // what the levels or colours stand for, below the picture; not for three channels
};

// Owns all that it holds; the file may be closed.
struct QuickLook
{
    Picture picture;
    DisplayChoice choice;           // what is shown
    std::vector<Stretch> stretches; // of each colour of it; none with a colour table
    bool power = false;             // the total power is shown
    bool decibels = false;          // stretches are in decibels
};

// Renders a small picture of a file: from the coarsest level that is large enough, with its default display channels,
// its colour table, and no-data, masked and transparent pixels transparent. Throws RequestException for channels that
// are not there.
// Cost: the pixels of the level that is read, with levels of powers of two less than twice as wide and as high as the
// picture.
KRV_OPERATIONS_API QuickLook MakeQuickLook(const SourceFile& oFile, const QuickLookOptions& oOptions,
                                           const Progress& oProgress = {},
                                           krv::threading::IExecutor* poExecutor = nullptr);

} // namespace krv::operations
