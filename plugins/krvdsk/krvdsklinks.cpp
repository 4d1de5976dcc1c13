// The channels of a native file that lie in another one, and what is seen of that file.
#include "plugins/krvdsk/krvdskdataset.h"
#include "plugins/krvdsk/link/linkedio.h"
#include "plugins/krvdsk/link/linkedlevels.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

namespace krv::plugins::krvdsk
{

using krv::datasources::IBitmapDataset;
using krv::datasources::IEphemerisDataset;
using krv::datasources::ILUTDataset;
using krv::datasources::IMathModelDataset;
using krv::datasources::IOverviewManager;
using krv::datasources::IPCTDataset;
using krv::datasources::IRasterDataset;
using krv::datasources::IRasterIO;

namespace
{

template <class Facet>
unsigned int LastNumber(Link& oLink, std::vector<unsigned int> (Facet::*pList)() const)
{
    const Facet* const poFacet = oLink.Find<Facet>();
    const std::vector<unsigned int> oList = poFacet != nullptr ? (poFacet->*pList)() : std::vector<unsigned int>();
    return oList.empty() ? 0 : *std::max_element(oList.begin(), oList.end());
}

} // namespace

void KrvdskDataset::ShowLink()
{
    const Catalogue& oCatalogue = GetCatalogue();
    mpoLink.reset();
    if (!oCatalogue.moLinkPath.empty())
        mpoLink = std::make_shared<Link>(GetFileName(), oCatalogue.moLinkPath, oCatalogue.moSize.mnWidth,
                                         oCatalogue.moSize.mnHeight, oCatalogue.moLinked);
}

// The file's own segments begin behind the linked file's numbers, so that references to those stay true.
void KrvdskDataset::LinkChannels(Catalogue& oCatalogue, const std::vector<krv::gobs::DataType>& oTypes,
                                 const Place& oPlace) const
{
    Link oLink(GetFileName(), oCatalogue.moLinkPath, oCatalogue.moSize.mnWidth, oCatalogue.moSize.mnHeight, {});
    oCatalogue.moLinked = FindLinkableChannels(oLink.Get(oPlace));
    const bool bSame = std::equal(oTypes.begin(), oTypes.end(), oCatalogue.moLinked.begin(), oCatalogue.moLinked.end(),
                                  [](const krv::gobs::DataType& oType, const Link::Channel& oChannel)
                                  { return oType == oChannel.moType; });
    if (!bSame)
        Refuse("the types are not those of the channels of more than one bit of " + oLink.GetName(), oPlace);
    for (const unsigned int nLast :
         {LastNumber(oLink, &IBitmapDataset::GetBitmapList), LastNumber(oLink, &IPCTDataset::GetPCTList),
          LastNumber(oLink, &ILUTDataset::GetLUTList), LastNumber(oLink, &IMathModelDataset::GetMathModelList),
          LastNumber(oLink, &IEphemerisDataset::GetEphemerisList)})
        oCatalogue.mnNextSegment = std::max(oCatalogue.mnNextSegment, std::min(nLast, UINT32_MAX - 1) + 1);
}

unsigned int KrvdskDataset::FindLinked(unsigned int nChannel) const
{
    const std::vector<Link::Channel>& oLinked = GetCatalogue().moLinked;
    return nChannel - 1 < oLinked.size() ? oLinked[nChannel - 1].mnNumber : 0;
}

unsigned int KrvdskDataset::FindOwnChannel(unsigned int nTheirs) const
{
    const std::vector<Link::Channel>& oLinked = GetCatalogue().moLinked;
    const auto oFound = std::find_if(oLinked.begin(), oLinked.end(),
                                     [nTheirs](const Link::Channel& oChannel) { return oChannel.mnNumber == nTheirs; });
    return oFound == oLinked.end() ? 0 : static_cast<unsigned int>(oFound - oLinked.begin()) + 1;
}

const IPCTDataset* KrvdskDataset::FindLinkedPCT(unsigned int nPCT) const
{
    return FindLinkedSegment(Segment::PCT, nPCT, &IPCTDataset::GetPCTList);
}

const ILUTDataset* KrvdskDataset::FindLinkedLUT(unsigned int nLUT) const
{
    return FindLinkedSegment(Segment::LUT, nLUT, &ILUTDataset::GetLUTList);
}

IBitmapDataset* KrvdskDataset::FindLinkedBitmap(unsigned int nBitmap) const
{
    return FindLinkedSegment(Segment::BITMAP, nBitmap, &IBitmapDataset::GetBitmapList);
}

std::vector<std::string> KrvdskDataset::GetLinkedFiles() const
{
    return mpoLink ? std::vector<std::string>{mpoLink->GetName()} : std::vector<std::string>();
}

// Linked channels alone are handed through. Together with others they come block by block like all channels do, which
// also refuses lists that make no sense.
IRasterIO* KrvdskDataset::GetRasterIO(const std::vector<unsigned int>& oChannels)
{
    std::vector<unsigned int> oSources;
    for (const unsigned int nChannel : oChannels)
        oSources.push_back(FindLinked(nChannel));
    std::unique_ptr<IRasterIO> poOwn(RecordDataset::GetRasterIO(oChannels));
    if (std::find(oSources.begin(), oSources.end(), 0U) != oSources.end())
        return poOwn.release();
    return new LinkedIO(mpoLink, {GetWidth(), GetHeight()},
                        [&] { return dynamic_cast<IRasterDataset&>(mpoLink->Get()).GetRasterIO(oSources); });
}

IOverviewManager* KrvdskDataset::GetOverviewManager()
{
    std::unique_ptr<IOverviewManager> poOwn(RecordDataset::GetOverviewManager());
    auto* const poLinked = mpoLink && !GetCatalogue().moLinked.empty() ? mpoLink->Find<IRasterDataset>() : nullptr;
    std::unique_ptr<IOverviewManager> poTheirs(poLinked != nullptr ? poLinked->GetOverviewManager() : nullptr);
    if (!poTheirs)
        return poOwn.release();
    const auto Source = [this](unsigned int nChannel)
    {
        return FindLinked(nChannel);
    };
    return new LinkedLevels(mpoLink, std::move(poOwn), std::move(poTheirs), Source, GetChanCount());
}

} // namespace krv::plugins::krvdsk
