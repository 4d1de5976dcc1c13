#pragma once

#include "datasources/overviews/overviewbuilder.h"
#include "gobs/mask/imaskbuilder.h"
#include "gobs/raster/raster.h"
#include "gobs/resampling/nodatasamples.h"

#include <memory>
#include <vector>

namespace krv::datasources
{
class IRasterWriter;
}

namespace krv::datasources::detail
{

// Which samples of a writer's rasters take part in levels: those of valid
// pixels that are not their own channel's no-data value.
class SampleValidity
{
public:
    // The writer's dataset, when it shows one, outlives this.
    SampleValidity(IRasterWriter& oWriter, const OverviewOptions& oOptions);
    ~SampleValidity();

    // Whether there is anything that could make a sample invalid.
    bool IsNeeded() const { return mpoPixels != nullptr || mpoTest != nullptr || !moChannels.empty(); }
    // Of the writer's channels.
    const krv::gobs::NoDataNumbers& GetNoData() const { return moNoData; }
    // The number of the mask bitmap that takes part, or 0.
    unsigned int GetBitmap() const { return mnBitmap; }
    // A byte per value of the raster, which has no margins; null when all are valid. Good until the next call.
    const unsigned char* Mark(const krv::gobs::Raster& oRaster);
    // A byte per row of that raster, 1 where something is not valid.
    const unsigned char* GetRows() const { return moRows.data(); }

private:
    struct Channel
    {
        unsigned int mnPosition; // from 0
        const krv::gobs::IMaskBuilder* mpoBackground;
    };

    void AddChannels(const krv::gobs::DataType& oType, bool bNaN);
    void MarkSamples(const krv::gobs::Raster& oRaster);
    void MarkPixels(const krv::gobs::Raster& oRaster);
    void MarkChannel(const krv::gobs::Raster& oRaster, const Channel& oChannel);
    unsigned char* GetRow(std::size_t nRow);
    const unsigned char* FillRows();

    krv::gobs::NoDataNumbers moNoData;
    std::unique_ptr<const krv::gobs::IMaskBuilder> mpoOwned;
    const krv::gobs::IMaskBuilder* mpoPixels = nullptr;
    std::unique_ptr<const krv::gobs::ISampleTest> mpoTest; // of plain types
    std::vector<Channel> moChannels;                       // of complex types, or with masks of their own
    std::vector<std::unique_ptr<const krv::gobs::IMaskBuilder>> moComplex;
    unsigned int mnBitmap = 0;
    std::vector<unsigned char> moBytes;
    std::vector<unsigned char> moRows;
    std::size_t mnValues = 0; // of a row
};

} // namespace krv::datasources::detail
