#pragma once

#include "datasources/datasets/filelessdataset.h"
#include "gobs/mask/samplevalue.h"
#include "gobs/raster/datatype.h"

#include <memory>
#include <vector>

namespace krv::datasources
{

// A channel whose pixels all have one value.
// Example: {eDT_8U, 255} or {eDT_C32R, 1.5, -2}.
struct ConstChannel
{
    // nImaginary: of complex types. NaN and the infinities are values of real types.
    ConstChannel(const krv::gobs::DataType& oType, double nValue, double nImaginary = 0)
        : moType(oType), moValue(krv::gobs::SampleValue::FromReal(nValue)),
          moImaginary(krv::gobs::SampleValue::FromReal(nImaginary))
    {
    }
    // For integers that a double does not hold.
    ConstChannel(const krv::gobs::DataType& oType, const krv::gobs::SampleValue& oValue)
        : moType(oType), moValue(oValue), moImaginary(krv::gobs::SampleValue::FromUnsigned(0))
    {
    }

    krv::gobs::DataType moType;         // of the pixels that are handed out
    krv::gobs::SampleValue moValue;     // the real part of a complex one
    krv::gobs::SampleValue moImaginary; // 0 for types that are not complex
};

// An image of any size that is nowhere stored: every pixel of a channel has the channel's value. It stands in for a
// file that is missing, for a background, or for a scene in a test. Pixels cannot be written; metadata, geocoding and
// reference system can, and live as long as the object. There are no levels. I/O objects may outlive it.
// Costs the time to fill a buffer and no memory of pixels. Example, a background beside a scene of 10980 x 10980
// pixels:
//   ConstRasterDataset oSea(10980, 10980, {{eDT_16U, 0}});
class KRV_DATASOURCES_API ConstRasterDataset : public FilelessDataset
{
public:
    // Throws DataException for a side of 0 or above 2^31 - 1, for no channels, for one-bit channels and others that no
    // I/O hands out, and for a value that no sample of its channel's type equals, naming the channel.
    ConstRasterDataset(unsigned int nWidth, unsigned int nHeight, const std::vector<ConstChannel>& oChannels);
    ~ConstRasterDataset() override;

    // What WriteAuxiliaryData gave last; empty at first.
    AuxiliaryData ReadAuxiliaryData() override;
    void WriteAuxiliaryData(const AuxiliaryData& oData) override;

    // A copy of what UpdateCRS got; null at first.
    krv::ogc::cs::ICRS* ReadCRS() const override;
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override;

    // Blocks of 512 x 512 pixels or of the image's size where that is smaller.
    IRasterIO* GetRasterIO(const std::vector<unsigned int>& oChannels) override;
    unsigned int GetWidth() const override;
    unsigned int GetHeight() const override;
    unsigned int GetChanCount() const override;

    // The stored type is the one that is handed out.
    IChannelInfo* GetChannelInfo(unsigned int nChannel) const override;

    // The identity until it is set.
    const krv::ogc::cs::GeocodingInfo& GetGeocoding() const override;
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo) override;

private:
    struct State;

    std::unique_ptr<State> mpoState;
};

} // namespace krv::datasources
