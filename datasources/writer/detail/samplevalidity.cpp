#include "datasources/writer/detail/samplevalidity.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/reader/idatasetaccess.h"
#include "datasources/reader/validitysource.h"
#include "datasources/writer/irasterwriter.h"
#include "gobs/mask/exactmaskdecision.h"
#include "gobs/mask/mask.h"
#include "gobs/mask/samplematch.h"
#include "toolkit/nspio/warning.h"

#include <cmath>
#include <cstring>
#include <limits>
#include <type_traits>

namespace krv::datasources::detail
{

namespace
{

using krv::gobs::ExactMaskDecision;
using krv::gobs::IMaskBuilder;
using krv::gobs::Mask;

std::unique_ptr<ValiditySource> MakeSource(IRasterWriter& oWriter)
{
    const auto* const poAccess = dynamic_cast<const IDatasetAccess*>(&oWriter);
    if (poAccess != nullptr && poAccess->GetDataset() != nullptr)
        return std::make_unique<ValiditySource>(poAccess->GetDataset(), poAccess->GetChannels());
    krv::nspio::Warning::Warn("Overviews: the writer does not show its dataset, so that a validity mask and an alpha "
                              "channel that is not among the written ones take no part",
                              "datasources/writer/overviewbuilder", 0);
    return std::make_unique<ValiditySource>(oWriter);
}

bool IsSet(const unsigned char* pBits, std::size_t nBit)
{
    return (pBits[nBit / 8] & 128u >> nBit % 8) != 0;
}

template <typename T>
T Above(T nValue)
{
    const bool bUp = nValue < std::numeric_limits<T>::max();
    if constexpr (std::is_floating_point_v<T>)
        return std::nextafter(nValue, bUp ? std::numeric_limits<T>::infinity() : T(0));
    else
        return static_cast<T>(bUp ? nValue + 1 : nValue - 1);
}

// Complex values: the no-data value is that of the real part, the imaginary one
// is 0, or NaN with it.
template <typename T>
class ValueFinisher : public IValueFinisher
{
public:
    ValueFinisher(const AuxiliaryData& oMetadata, const SourceForm& oForm, bool bNaNIsNoData)
        : mnParts(oForm.moType.GetParts())
    {
        for (unsigned int nChannel = 1; nChannel <= oForm.mnChannels; ++nChannel)
        {
            const auto oValue = GetTypedNoData(oMetadata, nChannel);
            const std::optional<T> oSample = oValue ? krv::gobs::ToSample<T>(*oValue) : std::nullopt;
            Rule oRule{oSample.has_value(), oSample.value_or(T(0))};
            if (!oSample && bNaNIsNoData && std::is_floating_point_v<T>)
                oRule = {true, std::numeric_limits<T>::quiet_NaN()};
            moRules.push_back(oRule);
        }
    }

    void Finish(unsigned char* pPixels, const unsigned char* pValid, std::size_t nPixels) const override
    {
        for (std::size_t nPixel = 0; nPixel < nPixels; ++nPixel)
            for (const Rule& oRule : moRules)
            {
                FinishValue(oRule, pPixels, *pValid++ != 0);
                pPixels += mnParts * sizeof(T);
            }
    }

private:
    struct Rule
    {
        bool mbNoData;
        T mnValue; // 0 without one
    };

    void FinishValue(const Rule& oRule, unsigned char* pValue, bool bValid) const
    {
        T aValue[2] = {};
        std::memcpy(aValue, pValue, mnParts * sizeof(T));
        if (!bValid)
        {
            aValue[0] = oRule.mnValue;
            aValue[1] = oRule.mnValue != oRule.mnValue ? oRule.mnValue : T(0);
        }
        else if (oRule.mbNoData && aValue[0] == oRule.mnValue && aValue[1] == T(0))
            aValue[0] = Above(aValue[0]);
        else
            return;
        std::memcpy(pValue, aValue, mnParts * sizeof(T));
    }

    std::size_t mnParts;
    std::vector<Rule> moRules;
};

} // namespace

SampleValidity::SampleValidity(IRasterWriter& oWriter, const OverviewOptions& oOptions)
    : mpoPixels(oOptions.mpoValidity)
{
    if (mpoPixels == nullptr)
    {
        std::unique_ptr<ValiditySource> oSource = MakeSource(oWriter);
        mnBitmap = oSource->GetBitmap();
        if (oSource->HasNoData() || oSource->HasBitmap() || oSource->HasAlpha())
        {
            mpoOwned = std::move(oSource);
            mpoPixels = mpoOwned.get();
        }
    }
    AddChannels(oWriter.GetAuxiliaryData(), oWriter.GetDataType(), oOptions.mbNaNIsNoData);
}

SampleValidity::~SampleValidity() = default;

// Of a single channel the source says all, as long as nobody else speaks for
// it.
void SampleValidity::AddChannels(const AuxiliaryData& oMetadata, const krv::gobs::DataType& oType, bool bNaN)
{
    const bool bAllSaid = oMetadata.GetChannelCount() == 1 && mpoOwned != nullptr;
    for (unsigned int nChannel = 1; nChannel <= oMetadata.GetChannelCount(); ++nChannel)
    {
        std::optional<NoDataValue> oValue = GetTypedNoData(oMetadata, nChannel);
        const bool bAddNaN = bNaN && oType.IsReal();
        if ((!oValue || bAllSaid) && !bAddNaN)
            continue;
        if (!oValue)
            oValue = NoDataValue::FromReal(std::numeric_limits<double>::quiet_NaN());
        const ExactMaskDecision oDecision(krv::gobs::eAnyChannel, {*oValue}, {nChannel}, bAddNaN);
        moChannels.push_back({nChannel - 1, std::make_unique<krv::gobs::MaskDecisionBuilder>(&oDecision)});
    }
}

const unsigned char* SampleValidity::Mark(const krv::gobs::Raster& oRaster)
{
    const std::size_t nPixels = std::size_t{oRaster.GetWidth()} * oRaster.GetHeight();
    const std::size_t nChannels = oRaster.GetChansCount();
    moBytes.assign(nPixels * nChannels, 1);
    if (mpoPixels != nullptr)
    {
        const std::unique_ptr<Mask> oMask(mpoPixels->BuildMask(oRaster));
        for (std::size_t n = 0; n < nPixels; ++n)
            if (!IsSet(oMask->GetBits(), n))
                std::memset(moBytes.data() + n * nChannels, 0, nChannels);
    }
    for (const Channel& oChannel : moChannels)
    {
        const std::unique_ptr<Mask> oMask(oChannel.mpoNoData->BuildMask(oRaster));
        for (std::size_t n = 0; n < nPixels; ++n)
            if (IsSet(oMask->GetBits(), n))
                moBytes[n * nChannels + oChannel.mnPosition] = 0;
    }
    return moBytes.data();
}

std::unique_ptr<IValueFinisher> MakeValueFinisher(const AuxiliaryData& oMetadata, const SourceForm& oForm,
                                                  bool bNaNIsNoData)
{
    return ForSampleType(oForm.moType,
                         [&](auto nSample) -> std::unique_ptr<IValueFinisher> {
                             return std::make_unique<ValueFinisher<decltype(nSample)>>(oMetadata, oForm, bNaNIsNoData);
                         });
}

} // namespace krv::datasources::detail
