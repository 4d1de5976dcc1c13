#include "operations/copy/detail/copyplan.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/irasterdataset.h"
#include "gobs/mask/samplematch.h"
#include "gobs/raster/pixelvalue.h"
#include "operations/job/exceptions.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <fmt/format.h>

#include <algorithm>
#include <memory>
#include <set>

namespace krv::operations::detail
{

namespace
{

void Warn(const std::string& message)
{
    krv::nspio::Warning::Warn(message);
}

bool Holds(const krv::gobs::DataType& oType, const krv::datasources::NoDataValue& oValue)
{
    return krv::gobs::VisitPartType(oType, [&oValue]<class Part>(std::type_identity<Part>)
                                    { return krv::gobs::ToSample<Part>(oValue).has_value(); });
}

} // namespace

CopyPlan::CopyPlan(const CopyRequest& oRequest)
{
    for (const std::string& name : oRequest.sources)
        moSources.push_back(std::make_unique<SourceFile>(name, eReadOnly, oRequest.noData));
    CheckSizes();
    ChooseChannels(oRequest.channels);
    ChooseWindow(oRequest.window);
    ChooseTypes(oRequest);
    WarnOfLosses();
}

void CopyPlan::CheckSizes() const
{
    const auto& oFirst = moSources.front()->GetRaster();
    for (const auto& poSource : moSources)
    {
        const auto& oOther = poSource->GetRaster();
        if (oOther.GetWidth() != oFirst.GetWidth() || oOther.GetHeight() != oFirst.GetHeight())
            throw krv::DataException(fmt::format("{}: it is of {} x {} pixels, {} of {} x {}; only files of one size "
                                                 "can be stacked",
                                                 poSource->GetName(), oOther.GetWidth(), oOther.GetHeight(),
                                                 moSources.front()->GetName(), oFirst.GetWidth(), oFirst.GetHeight()));
    }
}

void CopyPlan::ChooseChannels(const std::vector<unsigned int>& oWanted)
{
    std::vector<CopiedChannel> oAll;
    for (std::size_t s = 0; s < moSources.size(); ++s)
    {
        for (const unsigned int nChannel : moSources[s]->CheckChannels({}))
        {
            const krv::gobs::DataType oType = moSources[s]->GetType(nChannel);
            oAll.push_back({s, nChannel, oType, oType});
        }
    }
    for (const unsigned int nChannel : oWanted)
    {
        if (nChannel == 0 || nChannel > oAll.size())
            throw RequestException(fmt::format("{}: there is no channel {}; the channels are 1 to {}",
                                               moSources.size() == 1 ? moSources.front()->GetName() : "all files",
                                               nChannel, oAll.size()),
                                   "channels");
        moChannels.push_back(oAll[nChannel - 1]);
    }
    if (oWanted.empty())
        moChannels = std::move(oAll);
}

void CopyPlan::ChooseWindow(const WindowRequest& oRequest)
{
    const auto oWanted = FindWindow(*moSources.front(), oRequest);
    const unsigned int nWidth = moSources.front()->GetRaster().GetWidth();
    const unsigned int nHeight = moSources.front()->GetRaster().GetHeight();
    moWindow = oWanted.value_or(PixelWindow{0, 0, nWidth, nHeight});
    const bool bInside =
        std::uint64_t{moWindow.x} + moWindow.width <= nWidth && std::uint64_t{moWindow.y} + moWindow.height <= nHeight;
    if (moWindow.width == 0 || moWindow.height == 0 || !bInside)
        throw RequestException(fmt::format("{}: the window {} x {} at {}, {} is not inside the image of {} x {} pixels",
                                           moSources.front()->GetName(), moWindow.width, moWindow.height, moWindow.x,
                                           moWindow.y, nWidth, nHeight));
}

void CopyPlan::ChooseTypes(const CopyRequest& oRequest)
{
    std::optional<krv::gobs::DataType> oType = oRequest.type;
    if (oRequest.promote)
        oType = krv::gobs::PromoteType(GetTypes());
    mbTypesKept = !oType;
    for (CopiedChannel& oChannel : moChannels)
        oChannel.to = oType.value_or(oChannel.from);
}

void CopyPlan::WarnOfLosses()
{
    std::set<std::string> oConversions;
    for (std::size_t i = 0; i < moChannels.size(); ++i)
    {
        const CopiedChannel& oChannel = moChannels[i];
        if (krv::gobs::IsLossless(oChannel.from, oChannel.to))
            continue;
        oConversions.insert(oChannel.from.Describe() + " to " + oChannel.to.Describe());
        const OptionalNoData oValue = moSources[oChannel.source]->GetNoData(oChannel.channel);
        if (oValue && Holds(oChannel.from, *oValue) && !Holds(oChannel.to, *oValue))
            Warn(fmt::format("channel {}: type {} cannot hold the no-data value {}; its pixels become other values",
                             i + 1, oChannel.to.Describe(), oValue->GetText()));
    }
    mbLossy = !oConversions.empty();
    if (mbLossy)
        Warn(fmt::format("values may change in the conversion from {}", fmt::join(oConversions, ", ")));
}

unsigned int CopyPlan::GetNarrowBits() const
{
    unsigned int nAll = 0;
    for (const CopiedChannel& oChannel : moChannels)
    {
        const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(
            moSources[oChannel.source]->GetRaster().GetChannelInfo(oChannel.channel));
        const unsigned int nBits = poInfo->GetNativeDataType().GetBits();
        if (!mbTypesKept || nBits >= oChannel.from.GetBits() || (nAll != 0 && nBits != nAll))
            return 0;
        nAll = nBits;
    }
    return nAll;
}

bool CopyPlan::IsCut() const
{
    const auto& oRaster = moSources.front()->GetRaster();
    return moWindow.width != oRaster.GetWidth() || moWindow.height != oRaster.GetHeight();
}

bool CopyPlan::AreTypesKept() const
{
    return std::all_of(moChannels.begin(), moChannels.end(),
                       [](const CopiedChannel& oChannel) { return oChannel.from == oChannel.to; });
}

bool CopyPlan::IsWholeFile() const
{
    unsigned int nNext = 0;
    return moSources.size() == 1 && moChannels.size() == moSources.front()->GetChannelCount() &&
           std::all_of(moChannels.begin(), moChannels.end(),
                       [&nNext](const CopiedChannel& oChannel) { return oChannel.channel == ++nNext; });
}

std::vector<krv::gobs::DataType> CopyPlan::GetTypes() const
{
    std::vector<krv::gobs::DataType> oTypes;
    for (const CopiedChannel& oChannel : moChannels)
        oTypes.push_back(oChannel.to);
    return oTypes;
}

} // namespace krv::operations::detail
