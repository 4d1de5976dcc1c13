#include "operations/copy/detail/scaledreader.h"

#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/metadata/droppedtags.h"
#include "datasources/reader/checkrastercompatible.h"
#include "datasources/reader/defaultreader.h"
#include "gobs/mask/mask.h"
#include "gobs/mask/samplematch.h"
#include "gobs/raster/pixelvalue.h"
#include "gobs/raster/raster.h"
#include "operations/job/exceptions.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/raster/convertvalue.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <type_traits>

namespace krv::operations::detail
{

using krv::datasources::AuxiliaryData;
using krv::gobs::Mask;
using krv::gobs::Raster;

namespace
{

constexpr char NO_DATA[] = "NO_DATA_VALUE";

struct Limits
{
    double low;
    double high;
};

// The limits of a type; 0 and 1 for reals, whose values have no natural end.
Limits LimitsOf(const krv::gobs::DataType& oType)
{
    return krv::gobs::VisitPartType(oType,
                                    []<class Part>(std::type_identity<Part>)
                                    {
                                        using N = std::numeric_limits<Part>;
                                        return std::is_floating_point_v<Part> ? Limits{0, 1}
                                                                              : Limits{static_cast<double>(N::min()),
                                                                                       static_cast<double>(N::max())};
                                    });
}

// From the numbers of a request to those of the type.
ValueScale LineOf(const std::vector<double>& oScale, const Limits& oTo)
{
    const double nScale = (oTo.high - oTo.low) / (oScale[1] - oScale[0]);
    if (!std::isfinite(nScale) || nScale == 0)
        throw RequestException("the two numbers of each pair are to differ", "scale");
    return {nScale, oTo.low - oScale[0] * nScale};
}

} // namespace

ScaledReader::ScaledReader(const SourceFile& oFile, const CopyRequest& oRequest)
    : moType(oRequest.type.value_or(krv::gobs::eDT_32R))
{
    const auto oChannels = oFile.CheckChannels(oRequest.channels);
    SetSource({krv::datasources::CreateDefaultReader(&oFile.GetDataset(), oChannels), {true}});
    if (moType.IsComplex() || GetSource().GetDataType().IsComplex())
        throw RequestException(oFile.GetName() + ": complex values are not scaled");
    mpoValidity = oFile.MakeValidity(oChannels);
    mbValidity = mpoValidity->HasBitmap() || mpoValidity->HasAlpha() || mpoValidity->HasNoData();
    const bool bUnscale = oRequest.scale.empty();
    Limits oTo = LimitsOf(moType);
    if (mbValidity && !moType.IsReal())
        ++oTo.low;
    if (oRequest.scale.size() == 4)
        oTo = {oRequest.scale[2], oRequest.scale[3]};
    const bool bUnbounded = bUnscale && moType.IsReal();
    mnLow = bUnbounded ? -HUGE_VAL : std::min(oTo.low, oTo.high);
    mnHigh = bUnbounded ? HUGE_VAL : std::max(oTo.low, oTo.high);
    for (const unsigned int nChannel : oChannels)
    {
        moChannels.push_back(
            {bUnscale ? oFile.GetScale(nChannel) : LineOf(oRequest.scale, oTo), oFile.GetNoData(nChannel)});
        moOwnedInfos.push_back(std::make_unique<krv::datasources::ChannelInfo>(moType));
        moInfos.push_back(moOwnedInfos.back().get());
    }
    MakeRecord(oFile, oChannels, bUnscale);
}

ScaledReader::~ScaledReader() = default;

// What the copy's values stand for is what the source's did.
void ScaledReader::MakeRecord(const SourceFile& oFile, const std::vector<unsigned int>& oChannels, bool bUnscale)
{
    AuxiliaryData oSource = oFile.GetMetadata().GetCleanedMeta();
    krv::datasources::DropStatistics(oSource);
    moRecord = AuxiliaryData(static_cast<unsigned int>(oChannels.size()));
    krv::datasources::MetadataMap oMap = oSource.GetFileMetadata();
    oMap.erase(NO_DATA);
    if (mbValidity)
        oMap[NO_DATA] = moType.IsReal() ? "nan" : krv::NumberText(LimitsOf(moType).low);
    moRecord.SetFileMetadata(oMap);
    for (unsigned int i = 1; i <= oChannels.size() && oChannels[i - 1] <= oSource.GetChannelCount(); ++i)
    {
        oMap = oSource.GetChanMetadata(oChannels[i - 1]);
        for (const char* const pKey : {NO_DATA, "Scale", "Offset"})
            oMap.erase(pKey);
        const ValueScale oBefore = oFile.GetScale(oChannels[i - 1]);
        const ValueScale& oLine = moChannels[i - 1].line;
        if (!bUnscale)
        {
            oMap["Scale"] = krv::NumberText(oBefore.scale / oLine.scale);
            oMap["Offset"] = krv::NumberText(oBefore.offset - oBefore.scale * oLine.offset / oLine.scale);
        }
        moRecord.SetChanMetadata(oMap, i);
        moRecord.SetChannelDescription(oSource.GetChannelDescription(oChannels[i - 1]), i);
    }
}

void ScaledReader::ReadRaster(Raster* poRaster)
{
    krv::gobs::CheckRasterCompatible(poRaster, this);
    static_cast<void>(ReadValid(*poRaster));
}

std::unique_ptr<Mask> ScaledReader::ReadValid(Raster& oRaster)
{
    krv::datasources::IRasterReader& oSource = GetSource();
    Raster oPixels({oRaster.GetWidth(), oRaster.GetHeight(), oSource.GetChansCount(), oSource.GetDataType()},
                   oRaster.GetContext());
    oSource.ReadRaster(&oPixels);
    std::unique_ptr<Mask> poValid(mbValidity ? mpoValidity->BuildMask(oPixels) : nullptr);
    std::vector<std::unique_ptr<Mask>> oEmpty;
    for (std::size_t c = 0; c < moChannels.size(); ++c)
    {
        const auto* const poMask = mpoValidity->GetChannelMask(c);
        oEmpty.emplace_back(poMask != nullptr ? poMask->BuildMask(oPixels) : nullptr);
    }
    krv::gobs::VisitPartType(oPixels.GetDataType(),
                             [&]<class From>(std::type_identity<From>)
                             {
                                 krv::gobs::VisitPartType(moType, [&]<class To>(std::type_identity<To>)
                                                          { Fill<From, To>(oPixels, poValid.get(), oEmpty, oRaster); });
                             });
    return poValid;
}

template <class From, class To>
void ScaledReader::Fill(const Raster& oFrom, const Mask* poValid, const std::vector<std::unique_ptr<Mask>>& oEmpty,
                        Raster& oTo) const
{
    const auto* pFrom = reinterpret_cast<const From*>(oFrom.GetBuffer());
    auto* pTo = reinterpret_cast<To*>(oTo.GetBuffer());
    constexpr To NOTHING =
        std::is_floating_point_v<To> ? std::numeric_limits<To>::quiet_NaN() : std::numeric_limits<To>::lowest();
    std::vector<krv::gobs::SampleMatch<From>> oMatches;
    for (const Channel& oChannel : moChannels)
        oMatches.emplace_back(oChannel.noData);
    const std::uint64_t nPixels = oFrom.GetFullWidth() * oFrom.GetFullHeight();
    for (std::uint64_t nPixel = 0; nPixel < nPixels; ++nPixel)
    {
        const auto IsSet = [nPixel](const Mask& oMask)
        {
            return (oMask.GetBits()[nPixel / 8] & 128u >> nPixel % 8) != 0;
        };
        const bool bValid = poValid == nullptr || IsSet(*poValid);
        for (std::size_t c = 0; c < moChannels.size(); ++c, ++pFrom, ++pTo)
        {
            const double nValue = moChannels[c].line(static_cast<double>(*pFrom));
            *pTo = !bValid || (oEmpty[c] != nullptr && IsSet(*oEmpty[c])) || oMatches[c].Matches(*pFrom) ||
                           std::isnan(nValue)
                       ? NOTHING
                       : krv::raster::ConvertValue<To>(std::clamp(nValue, mnLow, mnHigh));
        }
    }
}

} // namespace krv::operations::detail
