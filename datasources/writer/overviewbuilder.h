#pragma once

#include "datasources/api.h"

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace krv::gobs
{
class IMaskBuilder;
}

namespace krv::datasources
{

class IRasterWriter;

// How the pixels of a level are made from those of the image. A level of factor f has the size ceil(width / f) by
// ceil(height / f); pixel i stands for the box [i * f, min((i + 1) * f, size)) on each axis. Integers are rounded half
// to even. Samples that are not valid take no part.
enum class Resampling
{
    eNearest,  // the source pixel floor((i + 0.5) * f)
    eAverage,  // the mean of the box; of complex values the mean of both parts
    eMode,     // the most frequent value of the box, of several the smallest
    eBilinear, // kernels stretched by f around (i + 0.5) * f - 0.5, of the weights of valid pixels inside the image;
    eCubic,    // cubic (Keys, -0.5) and lanczos (3 lobes) keep to the range of the pixels that they weigh. Complex
    eLanczos,  // values are weighed part by part
    eRms,      // the root of the mean square of the box; of complex values as eAverage with mbPower
    eMin,      // the smallest value of the box, NaN only when there is no other; of complex values that of the
    eMax       // smallest, the largest magnitude
};

// NEAREST, AVERAGE, MODE, BILINEAR, CUBIC, LANCZOS, RMS, MIN, MAX in any letter case; else ParameterException.
KRV_DATASOURCES_API Resampling ParseResampling(const std::string& name);
// The name in capitals.
KRV_DATASOURCES_API std::string GetResamplingName(Resampling eMethod);

// Powers of two, up to the first level with both sides below 256 pixels; none for an image that small.
KRV_DATASOURCES_API std::vector<unsigned int> GetDefaultLevels(unsigned int nWidth, unsigned int nHeight);

struct OverviewOptions
{
    // Pixels of the image.
    struct Rectangle
    {
        unsigned int mnX;
        unsigned int mnY;
        unsigned int mnWidth;
        unsigned int mnHeight;
    };

    // A pixel of a box method is valid only when at least half of its box is, instead of a single pixel.
    bool mbHalfValid = false;
    // Complex averages: the magnitude is the root of the mean power, the phase that of the mean. Their levels are
    // recorded as RMS, which is the same.
    bool mbPower = false;
    // NaN samples of real channels are not valid; without it they count like any value.
    bool mbNaNIsNoData = false;
    // Only this part of the image changed: of levels that exist just the pixels that depend on it are written. Levels
    // that do not exist are built whole.
    std::optional<Rectangle> moChanged;
    // Called between pieces of work with the source pixels done and to do; false stops the work. May throw.
    std::function<bool(std::uint64_t nDone, std::uint64_t nTotal)> moProgress;
    // Which pixels are valid (set bits), instead of what the dataset says. Borrowed. No mask levels are made then.
    const krv::gobs::IMaskBuilder* mpoValidity = nullptr;
};

// Builds levels (reduction factors from 2 on) of the writer's channels in one pass over the image, each as if it were
// made from the full resolution. Levels that do not exist are created, those of another size than above made anew.
// Memory: about the width of the image times the height of a tile for each level.
//
// Valid is a sample when ValiditySource says so of its pixel (no-data, mask bitmap and alpha of the dataset, which the
// writer shows by IDatasetAccess; of one that does not, no-data and alpha of its own channels, and a warning is given)
// and it is not itself the no-data value of its channel. Pixels of a level without valid samples get the channel's
// no-data value, else 0; a result that equals the no-data value by accident becomes the next value above it (below, for
// the largest of the type). Where the format holds levels of the dataset's mask, those say which pixels of the level
// are valid.
//
// Levels are marked with the method and as not valid while they are written, as valid at the end. Nothing is
// synchronised: that is the caller's, after success. False when the progress callback stopped the work; then, and after
// an exception, the levels are not valid and the file on the disk is as of the last Synchronize.
// Throws DataException for a writer of bitmaps or of a level and for a dataset without overviews, ParameterException
// for an unknown method, an empty list and a factor below 2.
KRV_DATASOURCES_API bool BuildOverviews(IRasterWriter& oWriter, const std::vector<unsigned int>& oLevels,
                                        const std::string& method, const OverviewOptions& oOptions = {});

} // namespace krv::datasources
