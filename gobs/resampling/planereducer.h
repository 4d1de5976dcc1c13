#pragma once

#include "gobs/api.h"
#include "gobs/resampling/nodatasamples.h"
#include "gobs/resampling/resampling.h"

#include <memory>
#include <vector>

namespace krv::gobs
{

class Raster;

// One channel at the size of a picture.
// Rows top to bottom, width * height numbers in each list.
struct Plane
{
    unsigned int width = 0;
    unsigned int height = 0;
    std::vector<float> values;   // magnitude for complex channels; 0 where nothing is valid
    std::vector<float> coverage; // share of the pixel's source pixels that are valid, 0 to 1
};

// Reduces an image to planes of any smaller size, whose values are not rounded to the image's type as those of levels
// are. Values that are no-data, not a number or infinite are not valid. Sum works on a tile by itself, on any thread;
// one thread adds the sums of all tiles in their order, so that the planes are the same whoever made them. Holds sums
// for the rows of one row of tiles.
// One reducer for one image: tiles of the whole of it are added, then the planes taken.
class KRV_GOBS_API PlaneReducer
{
public:
    // What the pixels of a tile add to the planes.
    struct Sums;

    // The size of the planes is not more than that of the image. oNumbers: one per channel. eMethod: eAverage is the
    // mean of the valid source pixels that fall into a pixel, eNearest the one at their centre; ParameterException for
    // others.
    // Sizes in pixels, at least 1.
    PlaneReducer(const DataType& oType, unsigned int nSourceWidth, unsigned int nSourceHeight, unsigned int nWidth,
                 unsigned int nHeight, const NoDataNumbers& oNumbers, Resampling eMethod);
    ~PlaneReducer();

    // The sums of a tile of the image without margins. Any thread.
    std::shared_ptr<const Sums> Sum(const Raster& oTile) const;
    // The tiles of the image, each once, row by row from the left.
    // One thread. Sums may come from any.
    void Add(const Sums& oSums);
    void Add(const Raster& oTile) { Add(*Sum(oTile)); }
    // After the last tile.
    // One for each channel. The reducer is of no more use.
    std::vector<Plane> TakePlanes();

private:
    class Implementation;
    std::unique_ptr<Implementation> mpoImplementation;
};

// Where pixel i of nTarget pixels starts among nSource pixels.
// i from 0 to nTarget, which gives nSource: pixel i is made of those from SourceStart(i) to SourceStart(i + 1).
inline unsigned int SourceStart(unsigned int i, unsigned int nSource, unsigned int nTarget)
{
    return static_cast<unsigned int>(static_cast<unsigned long long>(i) * nSource / nTarget);
}

} // namespace krv::gobs
