// The channels of a native file that lie in another one, and what is seen of that file.
#include "datasources/metadata/levelbook.h"
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

// In rows of blocks. Both are of one size.
void CopyImage(IRasterIO& oFrom, IRasterIO& oTo, std::size_t nPixelBytes)
{
    const unsigned int nWidth = oTo.GetFileWidth(), nHeight = oTo.GetFileHeight();
    const unsigned int nRows = std::min(std::max(oTo.GetTileHeight(), 1U), nHeight);
    std::vector<unsigned char> oPixels(nPixelBytes * nWidth * nRows);
    for (unsigned int nY = 0; nY < nHeight; nY += nRows)
    {
        const unsigned int nCount = std::min(nRows, nHeight - nY);
        oFrom.ReadWindow(0U, nY, nWidth, nCount, oPixels.data());
        oTo.WriteWindow(0U, nY, nWidth, nCount, oPixels.data());
    }
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
    for (const krv::gobs::DataType& oType : oTypes)
        oCatalogue.moLinkedPlanes.push_back(oCatalogue.MakeLinkedPlane(oType, GetFileName(), oPlace));
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

krv::datasources::IChannelInfo* KrvdskDataset::GetChannelInfo(unsigned int nChannel) const
{
    const unsigned int nLinked = FindLinked(nChannel);
    const auto* const poTheirs = nLinked != 0 && mpoLink ? mpoLink->Find<IRasterDataset>() : nullptr;
    return poTheirs != nullptr ? poTheirs->GetChannelInfo(nLinked) : RecordDataset::GetChannelInfo(nChannel);
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
    if (!mpoLink || GetCatalogue().moLinked.empty())
        return poOwn.release();
    auto* const poLinked = mpoLink->Find<IRasterDataset>();
    std::unique_ptr<IOverviewManager> poTheirs(poLinked != nullptr ? poLinked->GetOverviewManager() : nullptr);
    const auto FindSource = [this](unsigned int nChannel, unsigned int nLevel)
    {
        const unsigned int nLinked = FindLinked(nChannel);
        if (nLinked == 0 || !GetCatalogue().moLevels.contains(nLevel))
            return nLinked;
        return GetCatalogue().moLinkedPlanes[nChannel - 1]->moTables.at(nLevel)->IsEmpty() ? nLinked : 0;
    };
    const auto TakeOver =
        [this, poOther = std::shared_ptr<IOverviewManager>(poTheirs ? poLinked->GetOverviewManager() : nullptr)](
            unsigned int nChannel, unsigned int nLevel)
    {
        if (nChannel != 0)
            TakeLevel(nLevel, *poOther);
    };
    const auto IsOld = [this](unsigned int nChannel, unsigned int nLevel)
    {
        return IsOutdated(nChannel, nLevel);
    };
    const auto NoteMade = [this](unsigned int nChannel, unsigned int nLevel)
    {
        NoteMadeOf(nChannel, nLevel);
    };
    return new LinkedLevels(mpoLink, std::move(poOwn), std::move(poTheirs),
                            {FindSource, TakeOver, IsOld, NoteMade, true, GetChanCount()});
}

// While the other file is not there its levels are as good as they were.
bool KrvdskDataset::IsOutdated(unsigned int nChannel, unsigned int nLevel) const
{
    if (FindLinked(nChannel) == 0)
        return false;
    const auto& oMadeOf = GetCatalogue().moLinkedPlanes[nChannel - 1]->moMadeOf;
    const auto oFound = oMadeOf.find(nLevel);
    const auto oNow = oFound == oMadeOf.end() || !mpoLink ? std::nullopt : mpoLink->FindState();
    return oNow && *oNow != oFound->second;
}

krv::datasources::AuxiliaryData KrvdskDataset::ReadAuxiliaryData()
{
    krv::datasources::AuxiliaryData oTags = RecordDataset::ReadAuxiliaryData();
    for (unsigned int nChannel = 1; nChannel <= GetCatalogue().moLinked.size(); ++nChannel)
        for (const auto& [nLevel, oSize] : GetCatalogue().moLevels)
            if (IsLevelValid(oTags, nChannel, nLevel) && IsOutdated(nChannel, nLevel))
                SetLevelValid(oTags, nChannel, nLevel, false, {});
    return oTags;
}

void KrvdskDataset::NoteMadeOf(unsigned int nChannel, unsigned int nLevel)
{
    if (FindLinked(nChannel) == 0)
        return;
    auto& oMadeOf = mpoWriter->GetCatalogue().moLinkedPlanes[nChannel - 1]->moMadeOf;
    if (const auto oNow = mpoLink->FindState())
        oMadeOf[nLevel] = *oNow;
    else
        oMadeOf.erase(nLevel);
    mpoWriter->Touch();
}

// A level of the other file becomes one of the file's own, for all linked channels whose it is.
void KrvdskDataset::TakeLevel(unsigned int nLevel, IOverviewManager& oTheirs)
{
    GetWriter("levels cannot be changed", Place::Current());
    const std::unique_ptr<IOverviewManager> poOwn(RecordDataset::GetOverviewManager());
    const bool bNew = !GetCatalogue().moLevels.contains(nLevel);
    if (bNew)
    {
        poOwn->CreateLevel(nLevel);
        LayOutLevel(nLevel, {oTheirs.GetLevelWidth(nLevel), oTheirs.GetLevelHeight(nLevel)});
    }
    try
    {
        for (unsigned int nChannel = 1; nChannel <= GetCatalogue().moLinked.size(); ++nChannel)
        {
            if (!GetCatalogue().moLinkedPlanes[nChannel - 1]->moTables.at(nLevel)->IsEmpty())
                continue;
            const unsigned int nSource = FindLinked(nChannel);
            const std::unique_ptr<IRasterIO> poFrom(oTheirs.GetOverviewIO(nLevel, {nSource})),
                poTo(poOwn->GetOverviewIO(nLevel, {nChannel}));
            CopyImage(*poFrom, *poTo, GetCatalogue().moLinked[nChannel - 1].moType.GetValueBits() / 8);
            poOwn->SetValid(nChannel, nLevel, oTheirs.IsValid(nSource, nLevel));
            NoteMadeOf(nChannel, nLevel);
        }
    }
    catch (...)
    {
        if (bNew)
            poOwn->DeleteLevel(nLevel);
        throw;
    }
}

// A bitmap of the other file becomes one of the file's own, under the number that it has.
void KrvdskDataset::TakeBitmap(unsigned int nBitmap)
{
    const Place oPlace = Place::Current();
    StoreWriter& oWriter = GetWriter("bitmaps cannot be changed", oPlace);
    IBitmapDataset* const poTheirs = FindLinkedBitmap(nBitmap);
    if (poTheirs == nullptr)
        return;
    if (oWriter.GetCatalogue().moSegments.contains(nBitmap))
        Refuse("the number of bitmap " + std::to_string(nBitmap) + " of " + mpoLink->GetName() +
                   " is that of something else here",
               oPlace);
    Segment oSegment;
    oSegment.moKind = Segment::BITMAP;
    oSegment.mpoPlane = oWriter.GetCatalogue().MakeBitmapPlane();
    oSegment.moDescription = poTheirs->GetBitmapDescription(nBitmap);
    oSegment.moMetadata = MakeBitmapTags(poTheirs->GetBitmapMetadata(nBitmap));
    const std::unique_ptr<IRasterIO> poFrom(poTheirs->GetBitmapIO({nBitmap}));
    oWriter.GetCatalogue().moSegments[nBitmap] = std::move(oSegment);
    oWriter.GetCatalogue().Describe();
    oWriter.Touch();
    std::erase_if(moBitmaps, [](const auto& oOpened) { return oOpened.first.first == 0; });
    try
    {
        const std::unique_ptr<IRasterIO> poTo(GetBitmapIO({nBitmap}));
        CopyImage(*poFrom, *poTo, 1);
    }
    catch (...)
    {
        DeleteBitmap(nBitmap);
        throw;
    }
}

} // namespace krv::plugins::krvdsk
