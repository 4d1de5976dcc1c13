#pragma once

#include "datasources/writer/detail/leveltarget.h"
#include "gobs/mask/imaskbuilder.h"

#include <memory>
#include <vector>

namespace krv::datasources
{
class AuxiliaryData;
class IRasterWriter;
} // namespace krv::datasources

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
    bool IsNeeded() const { return mpoPixels != nullptr || !moChannels.empty(); }
    // The number of the mask bitmap that takes part, or 0.
    unsigned int GetBitmap() const { return mnBitmap; }
    // A byte per value of the raster, which has no margins; valid until the next
    // call.
    const unsigned char* Mark(const krv::gobs::Raster& oRaster);

private:
    struct Channel
    {
        unsigned int mnPosition; // from 0
        std::unique_ptr<const krv::gobs::IMaskBuilder> mpoNoData;
    };

    void AddChannels(const AuxiliaryData& oMetadata, const krv::gobs::DataType& oType, bool bNaN);

    std::unique_ptr<const krv::gobs::IMaskBuilder> mpoOwned;
    const krv::gobs::IMaskBuilder* mpoPixels = nullptr;
    std::vector<Channel> moChannels;
    unsigned int mnBitmap = 0;
    std::vector<unsigned char> moBytes;
};

// For values of the writer's channels.
std::unique_ptr<IValueFinisher> MakeValueFinisher(const AuxiliaryData& oMetadata, const SourceForm& oForm,
                                                  bool bNaNIsNoData);

} // namespace krv::datasources::detail
