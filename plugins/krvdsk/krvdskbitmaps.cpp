// The bitmaps of a native file and their levels.
#include "datasources/metadata/levelbook.h"
#include "plugins/krvdsk/krvdskdataset.h"
#include "plugins/krvdsk/link/linkedio.h"
#include "plugins/krvdsk/link/linkedlevels.h"
#include "plugins/support/image/rasterio.h"
#include "plugins/support/image/stackedio.h"

#include <algorithm>

namespace krv::plugins::krvdsk
{

// The levels of all bitmaps, which count for channels in the order of their numbers. The book is in their metadata.
class KrvdskDataset::BitmapLevels : public support::LevelStore
{
public:
    explicit BitmapLevels(KrvdskDataset& oDataset) : moDataset(oDataset) {}

    std::vector<Level> GetLevels() const override
    {
        std::vector<Level> oLevels;
        for (const auto& [nLevel, oSize] : moDataset.GetCatalogue().moBitmapLevels)
            oLevels.push_back({nLevel, oSize.mnWidth, oSize.mnHeight});
        return oLevels;
    }

    std::shared_ptr<support::BlockImage> OpenLevel(unsigned int nLevel) override
    {
        return moDataset.OpenBitmap(0, nLevel);
    }

    unsigned int FindChannel(unsigned int nChannel) const override
    {
        const std::vector<unsigned int> oList = moDataset.ListSegments(Segment::BITMAP);
        const auto oFound = std::find(oList.begin(), oList.end(), nChannel);
        return oFound == oList.end() ? 0 : static_cast<unsigned int>(oFound - oList.begin()) + 1;
    }

    const krv::datasources::AuxiliaryData& GetBook() const override
    {
        const std::vector<unsigned int> oList = moDataset.ListSegments(Segment::BITMAP);
        moBook = krv::datasources::AuxiliaryData(static_cast<unsigned int>(oList.size()));
        for (unsigned int nAt = 0; nAt < oList.size(); ++nAt)
            moBook.SetChanMetadata(moDataset.GetCatalogue().moSegments.at(oList[nAt]).moMetadata, nAt + 1);
        return moBook;
    }

    void MakeLevel(const Level& oLevel, const krv::datasources::AuxiliaryData& oBook, const Place&) override
    {
        Catalogue& oCatalogue = moDataset.mpoWriter->GetCatalogue();
        for (const unsigned int nBitmap : moDataset.ListSegments(Segment::BITMAP))
            oCatalogue.moSegments.at(nBitmap).mpoPlane->moTables[oLevel.mnNumber] =
                oCatalogue.MakeTable({oLevel.mnWidth, oLevel.mnHeight});
        oCatalogue.moBitmapLevels[oLevel.mnNumber] = {oLevel.mnWidth, oLevel.mnHeight};
        oCatalogue.Describe();
        Store(oBook);
    }

    void DropLevel(unsigned int nLevel, const krv::datasources::AuxiliaryData& oBook, const Place&) override
    {
        Catalogue& oCatalogue = moDataset.mpoWriter->GetCatalogue();
        for (const unsigned int nBitmap : moDataset.ListSegments(Segment::BITMAP))
        {
            Plane& oPlane = *oCatalogue.moSegments.at(nBitmap).mpoPlane;
            moDataset.mpoWriter->DropTable(*oPlane.moTables.at(nLevel));
            oPlane.moTables.erase(nLevel);
        }
        oCatalogue.moBitmapLevels.erase(nLevel);
        moDataset.moBitmaps.erase({0, nLevel});
        Store(oBook);
    }

    void WriteBook(const krv::datasources::AuxiliaryData& oBook, bool, const Place&) override { Store(oBook); }

    // The first change of a bitmap makes its levels outdated.
    void Forget(unsigned int nBitmap)
    {
        if (moDataset.GetCatalogue().moBitmapLevels.empty())
            return;
        krv::datasources::AuxiliaryData oBook = GetBook();
        const unsigned int nFound = FindChannel(nBitmap);
        bool bNews = false;
        for (const auto& [nLevel, oSize] : moDataset.GetCatalogue().moBitmapLevels)
            if (IsLevelValid(oBook, nFound, nLevel))
            {
                SetLevelValid(oBook, nFound, nLevel, false, {});
                bNews = true;
            }
        if (bNews)
            Store(oBook);
    }

private:
    void Store(const krv::datasources::AuxiliaryData& oBook)
    {
        const std::vector<unsigned int> oList = moDataset.ListSegments(Segment::BITMAP);
        for (unsigned int nAt = 0; nAt < oList.size(); ++nAt)
            moDataset.mpoWriter->GetCatalogue().moSegments.at(oList[nAt]).moMetadata = oBook.GetChanMetadata(nAt + 1);
        moDataset.mpoWriter->Touch();
    }

    KrvdskDataset& moDataset;
    mutable krv::datasources::AuxiliaryData moBook;
};

// nBitmap: 0 for a level of all of them.
std::shared_ptr<support::BlockImage> KrvdskDataset::OpenBitmap(unsigned int nBitmap, unsigned int nLevel)
{
    std::shared_ptr<support::BlockImage>& poImage = moBitmaps[{nBitmap, nLevel}];
    if (poImage)
        return poImage;
    std::vector<std::shared_ptr<Plane>> oPlanes;
    for (const auto& [nNumber, oSegment] : GetCatalogue().moSegments)
        if (oSegment.mpoPlane && (nBitmap == 0 || nNumber == nBitmap))
            oPlanes.push_back(oSegment.mpoPlane);
    const auto BeforeWrite = [this, nBitmap]
    {
        if (nBitmap != 0 && mpoBitmapLevels)
            mpoBitmapLevels->Forget(nBitmap);
    };
    const Catalogue& oCatalogue = GetCatalogue();
    const ImageSize& oSize = nLevel == 1 ? oCatalogue.moSize : oCatalogue.moBitmapLevels.at(nLevel);
    poImage =
        std::make_shared<support::BlockImage>(MakeSource(std::move(oPlanes), nLevel, oSize, BeforeWrite), GetCache());
    return poImage;
}

std::vector<unsigned int> KrvdskDataset::ListInside() const
{
    return ListWithLinked(Segment::BITMAP, &krv::datasources::IBitmapDataset::GetBitmapList);
}

std::string KrvdskDataset::DescribeInside(unsigned int nBitmap) const
{
    if (const auto* const poTheirs = FindLinkedBitmap(nBitmap))
        return poTheirs->GetBitmapDescription(nBitmap);
    return GetSegment(Segment::BITMAP, nBitmap, Place::Current()).moDescription;
}

std::vector<unsigned int> KrvdskDataset::GetBitmapList() const
{
    std::vector<unsigned int> oList = ListInside();
    if (std::none_of(oList.begin(), oList.end(),
                     [this](unsigned int nBitmap) { return DescribeInside(nBitmap).empty(); }))
        for (const unsigned int nMask : GetSidecars().ListMasks())
            oList.push_back(support::FIRST_BESIDE + nMask);
    return oList;
}

unsigned int KrvdskDataset::FindBeside(unsigned int nBitmap) const
{
    const unsigned int nMask = nBitmap > support::FIRST_BESIDE ? nBitmap - support::FIRST_BESIDE : 0;
    if (nMask == 0 || !GetSidecars().HasMask(nMask))
        return 0;
    const std::vector<unsigned int> oInside = ListInside();
    const bool bBeside =
        std::none_of(oInside.begin(), oInside.end(),
                     [&](unsigned int nOne) { return nOne == nBitmap || DescribeInside(nOne).empty(); });
    return bBeside ? nMask : 0;
}

krv::datasources::IRasterIO* KrvdskDataset::GetBitmapIO(const std::vector<unsigned int>& oBitmaps)
{
    std::vector<std::unique_ptr<krv::datasources::IRasterIO>> oParts;
    for (const unsigned int nBitmap : oBitmaps)
    {
        if (const unsigned int nBeside = FindBeside(nBitmap))
        {
            oParts.emplace_back(GetSidecars().OpenMask(nBeside, false));
            continue;
        }
        if (auto* const poTheirs = FindLinkedBitmap(nBitmap))
        {
            oParts.push_back(std::make_unique<LinkedIO>(mpoLink, LinkedIO::Size{GetWidth(), GetHeight()},
                                                        [&] { return poTheirs->GetBitmapIO({nBitmap}); }));
            continue;
        }
        GetSegment(Segment::BITMAP, nBitmap, Place::Current());
        oParts.push_back(std::make_unique<support::RasterIO>(OpenBitmap(nBitmap, 1), std::vector<unsigned int>{1}));
    }
    if (oParts.size() == 1)
        return oParts.front().release();
    return new support::StackedIO(std::move(oParts), 1, 1);
}

krv::datasources::MetadataMap KrvdskDataset::MakeBitmapTags(const krv::datasources::MetadataMap& oMetadata) const
{
    krv::datasources::AuxiliaryData oBook(1);
    oBook.SetChanMetadata(oMetadata, 1);
    for (const auto& [nLevel, oSize] : GetCatalogue().moBitmapLevels)
        SetLevelValid(oBook, 1, nLevel, false, {});
    return oBook.GetChanMetadata(1);
}

unsigned int KrvdskDataset::CreateBitmap()
{
    const Place oPlace = Place::Current();
    Catalogue& oCatalogue = GetWriter("bitmaps cannot be added", oPlace).GetCatalogue();
    Segment oSegment;
    oSegment.moKind = Segment::BITMAP;
    oSegment.mpoPlane = oCatalogue.MakeBitmapPlane();
    oSegment.moMetadata = MakeBitmapTags({});
    oSegment.moDescription = "Bitmap " + std::to_string(oCatalogue.mnNextSegment);
    const unsigned int nBitmap = AddSegment(std::move(oSegment), oPlace);
    std::erase_if(moBitmaps, [](const auto& oOpened) { return oOpened.first.first == 0; });
    return nBitmap;
}

void KrvdskDataset::DeleteBitmap(unsigned int nBitmap)
{
    DeleteSegment(Segment::BITMAP, nBitmap, Place::Current());
    std::erase_if(moBitmaps, [nBitmap](const auto& oOpened)
                  { return oOpened.first.first == nBitmap || oOpened.first.first == 0; });
    Catalogue& oCatalogue = mpoWriter->GetCatalogue();
    if (ListSegments(Segment::BITMAP).empty())
        oCatalogue.moBitmapLevels.clear();
}

std::string KrvdskDataset::GetBitmapDescription(unsigned int nBitmap) const
{
    const unsigned int nBeside = FindBeside(nBitmap);
    return nBeside != 0 ? GetSidecars().DescribeMask(nBeside) : DescribeInside(nBitmap);
}

void KrvdskDataset::SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription)
{
    EditSegment(Segment::BITMAP, nBitmap, Place::Current()).moDescription = oDescription;
}

// What it says of its levels is kept by their manager.
krv::datasources::MetadataMap KrvdskDataset::GetBitmapMetadata(unsigned int nBitmap) const
{
    if (const unsigned int nBeside = FindBeside(nBitmap))
        return GetSidecars().GetMaskTags(nBeside);
    if (const auto* const poTheirs = FindLinkedBitmap(nBitmap))
        return poTheirs->GetBitmapMetadata(nBitmap);
    krv::datasources::AuxiliaryData oBook(1);
    oBook.SetChanMetadata(GetSegment(Segment::BITMAP, nBitmap, Place::Current()).moMetadata, 1);
    krv::datasources::MetadataMap oMap = oBook.GetChanMetadata(1);
    for (const auto& [key, value] : oBook.GetChanOverviewMetadata(1))
        oMap.erase(key);
    return oMap;
}

void KrvdskDataset::SetBitmapMetadata(unsigned int nBitmap, const krv::datasources::MetadataMap& oMetadata)
{
    Segment& oSegment = EditSegment(Segment::BITMAP, nBitmap, Place::Current());
    krv::datasources::AuxiliaryData oOld(1), oNew(1);
    oOld.SetChanMetadata(oSegment.moMetadata, 1);
    oNew.SetChanMetadata(oMetadata, 1);
    for (const auto& [nLevel, oSize] : GetCatalogue().moBitmapLevels)
        CopyLevel(oOld, oNew, nLevel);
    oSegment.moMetadata = oNew.GetChanMetadata(1);
}

krv::datasources::IOverviewManager* KrvdskDataset::GetBitmapOverviewManager()
{
    auto* const poLinked = mpoLink ? mpoLink->Find<krv::datasources::IBitmapDataset>() : nullptr;
    if (GetBitmapList().empty())
        return nullptr;
    if (!mpoBitmapLevels)
        mpoBitmapLevels = std::make_shared<BitmapLevels>(*this);
    std::unique_ptr<krv::datasources::IOverviewManager> poOwn =
        std::make_unique<support::OverviewManager>(*this, *mpoBitmapLevels);
    std::unique_ptr<krv::datasources::IOverviewManager> poTheirs(
        poLinked != nullptr ? poLinked->GetBitmapOverviewManager() : nullptr);
    if (poLinked == nullptr || poLinked->GetBitmapList().empty())
        return poOwn.release();
    const auto FindSource = [this](unsigned int nBitmap, unsigned int)
    {
        return FindLinkedBitmap(nBitmap) != nullptr ? nBitmap : 0;
    };
    const auto TakeOver = [this](unsigned int nBitmap, unsigned int)
    {
        for (const unsigned int nTheirs : nBitmap == 0 ? GetBitmapList() : std::vector<unsigned int>{nBitmap})
            TakeBitmap(nTheirs);
    };
    return new LinkedLevels(mpoLink, std::move(poOwn), std::move(poTheirs),
                            {FindSource, TakeOver, {}, {}, false, static_cast<unsigned int>(GetBitmapList().size())});
}

} // namespace krv::plugins::krvdsk
