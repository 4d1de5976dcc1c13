#pragma once

#include "datasources/api.h"
#include "gobs/mask/samplevalue.h"
#include "gobs/resampling/resampling.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::gobs
{
class IMaskBuilder;
}

namespace krv::threading
{
class IExecutor;
}

namespace krv::datasources
{

class IRasterReader;
class IRasterWriter;

using krv::gobs::GetResamplingName;
using krv::gobs::ParseResampling;
using krv::gobs::Resampling;

// Powers of two, up to the first level with both sides below 256 pixels; none for an image that small.
// 2, 4, 8, 16, 32, 64 for 10980 x 10980.
KRV_DATASOURCES_API std::vector<unsigned int> GetDefaultLevels(unsigned int nWidth, unsigned int nHeight);

// The defaults make levels of all of the image, in the calling thread.
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
    // The no-data value of all channels, in place of what the dataset records.
    std::optional<krv::gobs::SampleValue> moNoData;
    // Only this part of the image changed: of levels that exist just the pixels that depend on it are written. Levels
    // that do not exist are built whole.
    std::optional<Rectangle> moChanged;
    // Called between pieces of work with the source pixels done and to do; false stops the work. May throw.
    std::function<bool(std::uint64_t nDone, std::uint64_t nTotal)> moProgress;
    // Which pixels are valid (set bits), instead of what the dataset says. Borrowed. No mask levels are made then.
    const krv::gobs::IMaskBuilder* mpoValidity = nullptr;
    // Whose threads encode levels and, with readers of their own, read the image; borrowed. Null: the calling one does
    // all. Levels are the same, byte for byte.
    krv::threading::IExecutor* mpoExecutor = nullptr;
    // Makes a reader of just the pixels that the writer would read, over a dataset of its own, for one thread. Called
    // by any thread. Null: there can be no more. Without it the writer reads.
    std::function<std::shared_ptr<IRasterReader>()> moMakeReader;
};

// Builds levels (reduction factors from 2 on) of the writer's channels in one pass over the image, each as if it were
// made from the full resolution. Levels that do not exist are created, those of another size than above made anew.
// Memory: about the width of the image times the height of a tile for each level, and a few windows of the image for
// each thread.
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
// Example: the usual levels of a file:
//   BasicWriter oWriter("scene.tif");
//   BuildOverviews(oWriter, GetDefaultLevels(oWriter.GetWidth(), oWriter.GetHeight()), "AVERAGE");
//   oWriter.Synchronize();
KRV_DATASOURCES_API bool BuildOverviews(IRasterWriter& oWriter, const std::vector<unsigned int>& oLevels,
                                        const std::string& method, const OverviewOptions& oOptions = {});

} // namespace krv::datasources
