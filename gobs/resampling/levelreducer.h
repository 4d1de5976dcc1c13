#pragma once

#include "gobs/api.h"
#include "gobs/raster/datatype.h"
#include "gobs/resampling/resampling.h"

#include <algorithm>
#include <cstdint>
#include <memory>
#include <vector>

namespace krv::gobs
{

class LevelTarget;

// A rectangle of pixels; right and bottom are the first ones outside.
// Example: all of an image is {0, 0, width, height}.
struct PixelBounds
{
    unsigned int mnLeft = 0; // columns
    unsigned int mnTop = 0;  // rows
    unsigned int mnRight = 0;
    unsigned int mnBottom = 0;

    unsigned int GetWidth() const { return mnRight - mnLeft; }
    unsigned int GetHeight() const { return mnBottom - mnTop; }

    // Of empty bounds width and height mean nothing.
    bool IsEmpty() const { return mnLeft >= mnRight || mnTop >= mnBottom; }
    bool Contains(unsigned int nX, unsigned int nY) const
    {
        return nX >= mnLeft && nX < mnRight && nY >= mnTop && nY < mnBottom;
    }
};

// Pixels of the image, interleaved, rows without padding; for each value a
// byte, 1 when it is valid and else 0, or null when all are; with it for each
// row a byte, 1 when something in it is not valid.
// Borrowed: the memory is the caller's and is read while Add runs.
struct SourceWindow
{
    PixelBounds moBounds;
    const unsigned char* mpPixels; // width * height pixels, all channels of each
    const unsigned char* mpValid;  // width * height * channels bytes, or null
    const unsigned char* mpRows = nullptr;

    // Whether all values of some rows, counted from the first of the window, are valid.
    bool AreValid(unsigned int nRow, unsigned int nRows) const
    {
        return mpValid == nullptr || std::find(mpRows + nRow, mpRows + nRow + nRows, 1) == mpRows + nRow + nRows;
    }
};

// What all levels have in common.
struct SourceForm
{
    unsigned int mnWidth; // of the image
    unsigned int mnHeight;
    unsigned int mnChannels; // of a pixel
    DataType moType;
    bool mbValidity; // windows may come with validity

    std::size_t GetPixelBytes() const { return moType.GetValueBits() / 8 * mnChannels; }
    // Samples of a pixel: complex values count twice.
    unsigned int GetSamples() const { return mnChannels * moType.GetParts(); }
};

// A level that is to be made and the part of it.
// Levels begin at factor 2; the bounds are in pixels of the level.
struct LevelTask
{
    unsigned int mnFactor; // the reduction: 2 for half of the size
    PixelBounds moBounds;
    LevelTarget* mpoTarget; // borrowed
};

// How a value of a level is made of those that go into it.
struct ReductionRule
{
    Resampling meMethod = Resampling::eAverage;
    bool mbHalfValid = false; // box methods: valid only when at least half of the box is, instead of a single value
    bool mbPower = false; // complex averages: the magnitude is the root of the mean power, the phase that of the mean
};

// Takes the pixels of the image window by window, row of windows by row of
// windows, and puts the pixels of levels into their targets as soon as they are
// known.
// One thread at a time. Windows lie side by side: each pixel of the bounds comes once. The order of the virtual
// operations is fixed.
class KRV_GOBS_API ILevelReducer
{
public:
    virtual ~ILevelReducer();
    // Takes a window of the source. Throws what the targets throw when they store a tile.
    virtual void Add(const SourceWindow& oWindow) = 0;
};

// Whether levels of a factor are averages that one cascade makes together: factors that are powers of two up to 32768.
// Such levels cost one pass together; the others one each over the windows.
KRV_GOBS_API bool IsInCascade(const SourceForm& oForm, const ReductionRule& oRule, unsigned int nFactor);

// All levels of a cascade, one made from the unrounded sums of the other. Windows begin and end at multiples of the
// largest factor on the x axis, or at the image's edge. oBounds: all the pixels that will come.
// oTasks: ascending factors, each with its part and its target.
KRV_GOBS_API std::unique_ptr<ILevelReducer> MakeAverageCascade(const SourceForm& oForm,
                                                               const std::vector<LevelTask>& oTasks,
                                                               const PixelBounds& oBounds, bool bHalfValid);

// Any single level. Windows have all the columns that the level needs.
// The caller owns it; it is of use for one pass over the image, here and above.
KRV_GOBS_API std::unique_ptr<ILevelReducer> MakeLevelReducer(const SourceForm& oForm, const LevelTask& oTask,
                                                             const ReductionRule& oRule);

// The pixels of the image that a part of a level depends on.
// Cut at the image's borders. Kernels reach beyond the boxes of the level's pixels.
KRV_GOBS_API PixelBounds GetSourceBounds(const SourceForm& oForm, const LevelTask& oTask, Resampling eMethod);

} // namespace krv::gobs
