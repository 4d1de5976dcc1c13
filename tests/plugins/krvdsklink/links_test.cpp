#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/iencodedblocks.h"
#include "datasources/interfaces/iephemerisdataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ilinkeddataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/interfaces/iverifieddataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/levelbook.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/utils/createlinkedpix.h"
#include "datasources/utils/loadmathmodel.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/rasterinfo.h"
#include "tests/support/facts.h"
#include "tests/support/telldataset.h"
#include "tests/support/thrown.h"
#include "toolkit/mathmodel/rpcmodel.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"
#include "tools/conformance/formathome.h"

#include <algorithm>
#include <filesystem>
#include <memory>
#include <random>

#include <gtest/gtest.h>

namespace
{

using namespace krv::datasources;
using namespace krv::test;
using Bytes = std::vector<unsigned char>;
using Numbers = std::vector<unsigned int>;
using DatasetPtr = std::unique_ptr<IDataset>;
using IOPtr = std::unique_ptr<IRasterIO>;

constexpr char CREATE[] = "<Dataset><SupportsCreate/></Dataset>";

template <class Facet>
Facet& As(IDataset& oDataset)
{
    return dynamic_cast<Facet&>(oDataset);
}

krv::gobs::DataType GetType(IRasterDataset& oRaster, unsigned int nChannel)
{
    return std::unique_ptr<IChannelInfo>(oRaster.GetChannelInfo(nChannel))->GetDataType();
}

krv::gobs::DataType GetNativeType(IRasterDataset& oRaster, unsigned int nChannel)
{
    return std::unique_ptr<IChannelInfo>(oRaster.GetChannelInfo(nChannel))->GetNativeDataType();
}

// All pixels, in rows of blocks.
Bytes ReadAll(IRasterIO& oIO, std::size_t nPixelBytes)
{
    const std::size_t nRow = oIO.GetFileWidth() * nPixelBytes;
    Bytes oPixels(nRow * oIO.GetFileHeight());
    for (unsigned int nY = 0; nY < oIO.GetFileHeight(); nY += oIO.GetTileHeight())
        oIO.ReadWindow(0U, nY, oIO.GetFileWidth(), std::min(oIO.GetTileHeight(), oIO.GetFileHeight() - nY),
                       oPixels.data() + nY * nRow);
    return oPixels;
}

Bytes ReadChannels(IDataset& oDataset, const Numbers& oChannels)
{
    auto& oRaster = As<IRasterDataset>(oDataset);
    const IOPtr poIO(oRaster.GetRasterIO(oChannels));
    return ReadAll(*poIO, oChannels.size() * GetType(oRaster, oChannels.front()).GetValueBits() / 8);
}

void Fill(IDataset& oDataset, unsigned int nChannel, unsigned char nValue)
{
    const IOPtr poIO(As<IRasterDataset>(oDataset).GetRasterIO({nChannel}));
    Bytes oPixels(std::size_t{poIO->GetFileWidth()} * poIO->GetFileHeight(), nValue);
    poIO->WriteWindow(0U, 0U, poIO->GetFileWidth(), poIO->GetFileHeight(), oPixels.data());
}

class LinkTest : public ::testing::Test
{
protected:
    LinkTest()
    {
        for (const char* const pFormat : {"krvdsk", "tif"})
            moHome.Add(std::string(KRV_TEST_HOME) + "/lib/qrfformats/" + pFormat + ".so", CREATE);
    }

    static DatasetManager& Manager() { return *DatasetManager::GetInstance(); }
    static DatasetPtr Open(const std::string& file, AccessMode eMode = eReadOnly)
    {
        return DatasetPtr(Manager().Open(file, eMode));
    }
    std::string File(const std::string& name) const { return moHome.GetFolder().File(name); }

    // A file of 8U channels; channel n holds n.
    std::string Make(const std::string& name, const std::string& format, unsigned int nWidth, unsigned int nHeight,
                     unsigned int nChannels, krv::gobs::DataType oType = krv::gobs::eDT_8U) const
    {
        const DatasetPtr poDataset(Manager().NewDataset(File(name), format, ""));
        As<IRasterDataset>(*poDataset).Create(nWidth, nHeight, std::vector<krv::gobs::DataType>(nChannels, oType));
        for (unsigned int nChannel = 1; nChannel <= nChannels && oType == krv::gobs::eDT_8U; ++nChannel)
            Fill(*poDataset, nChannel, static_cast<unsigned char>(nChannel));
        poDataset->Close();
        return File(name);
    }
    void Link(const std::string& target, const std::string& source) const
    {
        const DatasetPtr poLink(CreateLinkedPix(target, source));
        ASSERT_NE(poLink, nullptr);
        poLink->Close();
    }

    krv::conformance::FormatHome moHome;
};

// Whether two managers say the same; either may be null, which is no levels.
void ExpectSameLevels(IOverviewManager* poFrom, IOverviewManager* poTo, const Numbers& oChannels, std::size_t nBytes)
{
    const std::unique_ptr<IOverviewManager> poOne(poFrom), poTwo(poTo);
    const Numbers oLevels = poOne ? poOne->GetLevels() : Numbers();
    ASSERT_EQ(poTwo ? poTwo->GetLevels() : Numbers(), oLevels);
    for (const unsigned int nLevel : oLevels)
    {
        EXPECT_EQ(poTwo->GetLevelWidth(nLevel), poOne->GetLevelWidth(nLevel));
        EXPECT_EQ(poTwo->GetLevelHeight(nLevel), poOne->GetLevelHeight(nLevel));
        for (const unsigned int nChannel : oChannels)
        {
            ASSERT_EQ(poTwo->IsValid(nChannel, nLevel), poOne->IsValid(nChannel, nLevel));
            if (!poOne->IsValid(nChannel, nLevel))
                continue;
            const IOPtr poFirst(poOne->GetOverviewIO(nLevel, {nChannel}));
            const IOPtr poSecond(poTwo->GetOverviewIO(nLevel, {nChannel}));
            EXPECT_TRUE(ReadAll(*poFirst, nBytes) == ReadAll(*poSecond, nBytes)) << nLevel << " " << nChannel;
        }
    }
}

void ExpectSameBitmaps(IDataset& oSource, IDataset& oLink)
{
    auto& oFrom = As<IBitmapDataset>(oSource);
    auto& oTo = As<IBitmapDataset>(oLink);
    const Numbers oBitmaps = oFrom.GetBitmapList();
    ASSERT_EQ(oTo.GetBitmapList(), oBitmaps);
    EXPECT_EQ(FindValidityMask(oTo), FindValidityMask(oFrom));
    if (oBitmaps.empty())
        return;
    const IOPtr poFrom(oFrom.GetBitmapIO(oBitmaps)), poTo(oTo.GetBitmapIO(oBitmaps));
    EXPECT_TRUE(ReadAll(*poFrom, oBitmaps.size()) == ReadAll(*poTo, oBitmaps.size()));
    for (const unsigned int nBitmap : oBitmaps)
    {
        EXPECT_EQ(oTo.GetBitmapDescription(nBitmap), oFrom.GetBitmapDescription(nBitmap));
        EXPECT_EQ(oTo.GetBitmapMetadata(nBitmap), oFrom.GetBitmapMetadata(nBitmap));
    }
    ExpectSameLevels(oFrom.GetBitmapOverviewManager(), oTo.GetBitmapOverviewManager(), oBitmaps, 1);
}

void ExpectSamePlace(IDataset& oSource, IDataset& oLink)
{
    EXPECT_EQ(As<IGeocodedDataset>(oLink).GetGeocoding(), As<IGeocodedDataset>(oSource).GetGeocoding());
    const std::unique_ptr<krv::ogc::cs::ICRS> poFrom(oSource.ReadCRS()), poTo(oLink.ReadCRS());
    ASSERT_EQ(poTo == nullptr, poFrom == nullptr);
    EXPECT_TRUE(!poFrom || poTo->IsEquivalent(*poFrom)) << poFrom->GetWKT();
    auto& oModels = As<IMathModelDataset>(oSource);
    ASSERT_EQ(As<IMathModelDataset>(oLink).GetMathModelList(), oModels.GetMathModelList());
    if (!oModels.HasMathModel())
        return;
    using krv::mathmodel::IMathModel;
    using krv::mathmodel::RpcModel;
    const std::unique_ptr<IMathModel> poOne(krv::core::LoadMathModel(&oSource, 0));
    const std::unique_ptr<IMathModel> poTwo(krv::core::LoadMathModel(&oLink, 0));
    EXPECT_EQ(dynamic_cast<RpcModel&>(*poOne).GetCoefficients(), dynamic_cast<RpcModel&>(*poTwo).GetCoefficients());
}

} // namespace

// A link of every real TIFF: its pixels, levels, masks, tables, models, place and metadata are those of the file.
TEST_F(LinkTest, EveryRealFileIsSeenThroughItsLink)
{
    if (GetFacts().empty())
        GTEST_SKIP() << "the real files are not there";
    unsigned int nLinked = 0;
    for (const Facts& oFacts : GetFacts())
    {
        SCOPED_TRACE(oFacts["file"]);
        if (!Manager().CanOpen(oFacts.GetPath(), eReadOnly))
            continue;
        const DatasetPtr poSource = Open(oFacts.GetPath());
        Link(File("links/scene.krv"), oFacts.GetPath());
        const DatasetPtr poLink = Open(File("links/scene.krv"));
        auto& oFrom = As<IRasterDataset>(*poSource);
        auto& oTo = As<IRasterDataset>(*poLink);
        ASSERT_EQ(oTo.GetChanCount(), oFrom.GetChanCount()); // single bits come as bytes
        EXPECT_TRUE(As<IEncodedBlocks>(*poLink).GetEncodedForm(1) == As<IEncodedBlocks>(*poSource).GetEncodedForm(1));
        const krv::gobs::DataType oType = GetType(oFrom, 1);
        const std::size_t nBytes = oType.GetValueBits() / 8;
        for (unsigned int nChannel = 1; nChannel <= oFrom.GetChanCount(); ++nChannel)
        {
            ASSERT_EQ(GetType(oTo, nChannel), oType);
            EXPECT_EQ(GetNativeType(oTo, nChannel), GetNativeType(oFrom, nChannel));
            EXPECT_TRUE(ReadChannels(*poSource, {nChannel}) == ReadChannels(*poLink, {nChannel})) << nChannel;
        }
        EXPECT_EQ(poLink->ReadAuxiliaryData().GetFileMetadata(),
                  poSource->ReadAuxiliaryData().GetCleanedMeta().GetFileMetadata());
        ExpectSamePlace(*poSource, *poLink);
        ExpectSameBitmaps(*poSource, *poLink);
        ExpectSameLevels(oFrom.GetOverviewManager(), oTo.GetOverviewManager(), {1}, nBytes);
        auto& oTables = As<IPCTDataset>(*poSource);
        ASSERT_EQ(As<IPCTDataset>(*poLink).GetPCTList(), oTables.GetPCTList());
        for (const unsigned int nTable : oTables.GetPCTList())
        {
            const std::unique_ptr<krv::gobs::PCT> poFirst(oTables.GetPCT(nTable));
            const std::unique_ptr<krv::gobs::PCT> poSecond(As<IPCTDataset>(*poLink).GetPCT(nTable));
            EXPECT_EQ(poFirst->GetEntries().size(), poSecond->GetEntries().size());
            EXPECT_EQ(As<IPCTDataset>(*poLink).GetPCTChannel(nTable), 1U);
        }
        ++nLinked;
    }
    EXPECT_GT(nLinked, 200U);
}

TEST_F(LinkTest, APairThatIsMovedTogetherStillReads)
{
    Make("one/data/my scene.tif", "TIF", 40, 30, 2);
    std::filesystem::create_directories(File("one/links"));
    Link(File("one/links/scene.krv"), File("one/data/my scene.tif"));
    std::filesystem::rename(File("one"), File("two"));
    const DatasetPtr poLink = Open(File("two/links/scene.krv"));
    EXPECT_TRUE(poLink->IsLinked());
    EXPECT_EQ(As<ILinkedDataset>(*poLink).GetLinkedFiles(),
              std::vector<std::string>{File("two/links/../data/my scene.tif")});
    EXPECT_EQ(ReadChannels(*poLink, {2}), Bytes(1200, 2));
}

TEST_F(LinkTest, ASourceThatIsGoneOrAnotherIsToldWhenItIsRead)
{
    const std::string source = Make("scene.tif", "TIF", 40, 30, 2);
    const std::string link = File("scene.krv");
    Link(link, source);
    const auto Read = [&]
    {
        // Everything but pixels goes on.
        const DatasetPtr poLink = Open(link);
        auto& oRaster = As<IRasterDataset>(*poLink);
        EXPECT_EQ(oRaster.GetChanCount(), 2U);
        EXPECT_TRUE(As<IBitmapDataset>(*poLink).GetBitmapList().empty());
        EXPECT_TRUE(As<IMathModelDataset>(*poLink).GetMathModelList().empty());
        const std::unique_ptr<IOverviewManager> poLevels(oRaster.GetOverviewManager());
        EXPECT_TRUE(!poLevels || poLevels->GetLevels().empty());
        const IOPtr poIO(oRaster.GetRasterIO({1, 2}));
        EXPECT_EQ(poIO->GetFileWidth(), 40U);
        return Error([&] { ReadAll(*poIO, 2); });
    };
    const std::string start = "io: " + link + ": its pixels lie in " + source + ": ";
    EXPECT_EQ(Read(), "");
    std::filesystem::rename(source, File("away.tif"));
    EXPECT_EQ(Read(), start + "No such file or directory");
    Make("scene.tif", "TIF", 41, 30, 2);
    EXPECT_EQ(Read(), start + "it is of 41 x 30 pixels now, no longer of 40 x 30");
    Make("scene.tif", "TIF", 40, 30, 2, krv::gobs::eDT_16S);
    EXPECT_EQ(Read(), start + "its channel 1 is of the type 16S now, no longer 8U");
    Make("scene.tif", "TIF", 40, 30, 1);
    EXPECT_EQ(Read(), start + "it has no channel 2 any more");
    krv::conformance::WriteFile(source, "something else");
    EXPECT_EQ(Read(), start + "no format recognises it");
    Make("scene.tif", "TIF", 40, 30, 3);
    EXPECT_EQ(Read(), "");
}

TEST_F(LinkTest, OwnChannelsStandBesideLinkedOnes)
{
    const std::string source = Make("scene.tif", "TIF", 300, 280, 3);
    const std::string link = File("scene.krv");
    Link(link, source);
    {
        const DatasetPtr poLink = Open(link, eUpdate);
        auto& oRaster = As<IRasterDataset>(*poLink);
        krv::gobs::RasterInfo oInfo(300, 280, 1, krv::gobs::eDT_8U);
        oRaster.AddNewChannel(oInfo);
        Fill(*poLink, 4, 9);
        EXPECT_EQ(Error([&] { Fill(*poLink, 2, 9); }),
                  "data: " + link + ": its pixels lie in " + source + " and are not written from here");
        const IOPtr poMixed(oRaster.GetRasterIO({4, 2}));
        Bytes oPixels(std::size_t{300} * 280 * 2);
        EXPECT_NE(Error([&] { poMixed->WriteWindow(0U, 0U, 300U, 280U, oPixels.data()); }), "");
        poLink->Close();
    }
    const auto Expect = [&](const Numbers& oChannels, const Bytes& oPixel)
    {
        const DatasetPtr poLink = Open(link);
        const Bytes oPixels = ReadChannels(*poLink, oChannels);
        for (std::size_t n = 0; n < oPixels.size(); ++n)
            ASSERT_EQ(oPixels[n], oPixel[n % oPixel.size()]) << n;
    };
    Expect({4, 2, 1}, {9, 2, 1});
    Expect({3, 1, 3}, {3, 1, 3});
    {
        const DatasetPtr poLink = Open(link, eUpdate);
        As<IRasterDataset>(*poLink).DeleteChannel(2);
        EXPECT_EQ(ReadChannels(*poLink, {2, 3}).at(1), 9);
        poLink->Close();
    }
    Expect({1, 2, 3}, {1, 3, 9});
    {
        const DatasetPtr poLink = Open(link, eUpdate);
        As<IRasterDataset>(*poLink).DeleteChannel(3);
        EXPECT_EQ(As<IRasterDataset>(*poLink).GetChanCount(), 2U);
        poLink->Close();
    }
    Expect({2, 1}, {3, 1});
    EXPECT_EQ(ReadChannels(*Open(source), {2}), Bytes(std::size_t{300} * 280, 2)); // as it was
}

TEST_F(LinkTest, LevelsAreThoseOfBoth)
{
    const std::string source = Make("scene.tif", "TIF", 300, 280, 1);
    {
        const DatasetPtr poSource = Open(source, eUpdate);
        const std::unique_ptr<IOverviewManager> poLevels(As<IRasterDataset>(*poSource).GetOverviewManager());
        poLevels->CreateLevel(4);
        const IOPtr poIO(poLevels->GetOverviewIO(4, {1}));
        Bytes oPixels(std::size_t{75} * 70, 77);
        poIO->WriteWindow(0U, 0U, 75U, 70U, oPixels.data());
        poLevels->SetValid(1, 4, true);
        poSource->Close();
    }
    const std::string link = File("scene.krv");
    Link(link, source);
    const DatasetPtr poLink = Open(link, eUpdate);
    auto& oRaster = As<IRasterDataset>(*poLink);
    const krv::gobs::RasterInfo oInfo(300, 280, 1, krv::gobs::eDT_8U);
    oRaster.AddNewChannel(oInfo);
    const std::unique_ptr<IOverviewManager> poLevels(oRaster.GetOverviewManager());
    poLevels->CreateLevel(2);
    poLevels->CreateLevel(4);
    EXPECT_EQ(poLevels->GetLevels(), (Numbers{2, 4}));
    EXPECT_TRUE(poLevels->IsValid(1, 4));
    EXPECT_FALSE(poLevels->IsValid(1, 2));
    EXPECT_FALSE(poLevels->IsValid(2, 4));
    Bytes oPixels(std::size_t{75} * 70, 55);
    const IOPtr poOwn(poLevels->GetOverviewIO(4, {2}));
    poOwn->WriteWindow(0U, 0U, 75U, 70U, oPixels.data());
    poLevels->SetValid(2, 4, true);
    EXPECT_TRUE(poLevels->IsValid(2, 4));
    const IOPtr poBoth(poLevels->GetOverviewIO(4, {2, 1}));
    const Bytes oBoth = ReadAll(*poBoth, 2);
    EXPECT_EQ(oBoth[0], 55);
    EXPECT_EQ(oBoth[1], 77);
    EXPECT_EQ(poLevels->GetAuxiliaryData(4).GetChannelCount(), 2U);
    // Blocks are had of the one and of the other, not of both together.
    EXPECT_FALSE(As<IEncodedBlocks>(*poLink).GetEncodedForm(4).mbReadable);
    // What the link is to say of it is said here, with the pixels that it had.
    poLevels->SetValid(1, 4, false);
    EXPECT_FALSE(poLevels->IsValid(1, 4));
    EXPECT_EQ(ReadAll(*IOPtr(poLevels->GetOverviewIO(4, {1})), 1), Bytes(std::size_t{75} * 70, 77));
    poLevels->DeleteLevel(4);
    EXPECT_TRUE(poLevels->IsValid(1, 4));
    EXPECT_NE(Error([&] { poLevels->DeleteLevel(4); }).find("lies in " + source), std::string::npos);
    poLink->Close();
}

// As those of the source itself would be, which is not touched; they are there when it is gone.
TEST_F(LinkTest, OverviewsOfALinkedFileAreItsOwn)
{
    const std::string source = Make("scene.tif", "TIF", 301, 277, 2), link = File("scene.krv");
    const auto Build = [](IDataset& oDataset)
    {
        BasicWriter oWriter(&As<IRasterDataset>(oDataset), {1, 2});
        EXPECT_TRUE(BuildOverviews(oWriter, {2, 4}, "average"));
        oDataset.Close();
    };
    {
        const DatasetPtr poSource = Open(source, eUpdate);
        Bytes oRandom(std::size_t{301} * 277 * 2), oBits(std::size_t{301} * 277);
        for (std::size_t n = 0; n < oRandom.size(); ++n)
            oRandom[n] = static_cast<unsigned char>(n * n / 7);
        for (std::size_t n = 0; n < oBits.size(); ++n)
            oBits[n] = n % 301 < 200;
        IOPtr(As<IRasterDataset>(*poSource).GetRasterIO({1, 2}))->WriteWindow(0U, 0U, 301U, 277U, oRandom.data());
        auto& oBitmaps = As<IBitmapDataset>(*poSource);
        const unsigned int nMask = oBitmaps.CreateBitmap();
        oBitmaps.SetBitmapDescription(nMask, ""); // of valid pixels
        IOPtr(oBitmaps.GetBitmapIO({nMask}))->WriteWindow(0U, 0U, 301U, 277U, oBits.data());
        // Levels are there already: one of another method and a side that was rounded down, one that is out of date.
        const std::unique_ptr<IOverviewManager> poLevels(As<IRasterDataset>(*poSource).GetOverviewManager());
        poLevels->CreateLevel(2);
        poLevels->CreateLevel(4);
        EncodedForm oForm = As<IEncodedBlocks>(*poSource).GetEncodedForm(4);
        oForm.mnWidth = 75;
        ASSERT_TRUE(As<IEncodedBlocks>(*poSource).SetEncodedForm(4, oForm));
        for (const unsigned int nChannel : {1U, 2U})
            poLevels->SetValid(nChannel, 4, true);
        poSource->Close();
    }
    const std::string bytes = krv::conformance::ReadFile(source);
    Link(link, source);
    Build(*Open(link, eUpdate));
    EXPECT_EQ(krv::conformance::ReadFile(source), bytes);
    krv::conformance::WriteFile(File("copy.tif"), bytes);
    Build(*Open(File("copy.tif"), eUpdate));
    const DatasetPtr poLink = Open(link), poCopy = Open(File("copy.tif"));
    EXPECT_EQ(TellDataset(*poLink), TellDataset(*poCopy));
    std::filesystem::remove(source);
    const DatasetPtr poLeft = Open(link);
    ExpectSameLevels(As<IRasterDataset>(*poCopy).GetOverviewManager(), As<IRasterDataset>(*poLeft).GetOverviewManager(),
                     {1, 2}, 1);
    EXPECT_TRUE(As<IVerifiedDataset>(*poLeft).Verify({}).empty());
    // And they go with their channel.
    const DatasetPtr poFewer = Open(link, eUpdate);
    As<IRasterDataset>(*poFewer).DeleteChannel(1);
    poFewer->Close();
    EXPECT_TRUE(std::unique_ptr<IOverviewManager>(As<IRasterDataset>(*Open(link)).GetOverviewManager())->IsValid(1, 2));
}

// Whatever the way from the link to the file whose pixels change, and until they are made anew.
TEST_F(LinkTest, LevelsOfAnImageThatChangedAreOutdated)
{
    const std::string source = Make("scene.tif", "TIF", 301, 277, 1), link = File("scene.krv"), far = File("far.krv");
    Link(link, source);
    Link(far, link);
    const auto Build = [](const std::string& file, bool bAdd)
    {
        const DatasetPtr poDataset = Open(file, eUpdate);
        if (bAdd)
            As<IRasterDataset>(*poDataset).AddNewChannel({301, 277, 1, krv::gobs::eDT_8U});
        BasicWriter oWriter(&As<IRasterDataset>(*poDataset), {1});
        EXPECT_TRUE(BuildOverviews(oWriter, {2, 4}, "average"));
        BasicWriter oOther(&As<IRasterDataset>(*poDataset), {2});
        EXPECT_TRUE(BuildOverviews(oOther, {2, 4}, "average"));
        poDataset->Close();
    };
    const auto AreValid = [](const std::string& file, unsigned int nChannel)
    {
        const DatasetPtr poDataset = Open(file);
        const std::unique_ptr<IOverviewManager> poLevels(As<IRasterDataset>(*poDataset).GetOverviewManager());
        EXPECT_EQ(poLevels->GetLevels(), (Numbers{2, 4}));
        EXPECT_EQ(poLevels->IsValid(nChannel, 2), poLevels->IsValid(nChannel, 4));
        EXPECT_EQ(poLevels->IsValid(nChannel, 4), IsLevelValid(poDataset->ReadAuxiliaryData(), nChannel, 4));
        return poLevels->IsValid(nChannel, 4);
    };
    Build(far, true); // while the file that it leads to has none
    Build(link, true);
    EXPECT_TRUE(AreValid(link, 1) && AreValid(far, 2));
    Build(far, false); // its link became longer
    EXPECT_TRUE(AreValid(far, 1));
    {
        const DatasetPtr poSource = Open(source, eUpdate);
        Fill(*poSource, 1, 200);
        poSource->Close();
    }
    for (const std::string& file : {link, far})
    {
        EXPECT_FALSE(AreValid(file, 1)) << file;
        EXPECT_TRUE(AreValid(file, 2)) << file;
    }
    Build(link, false);
    EXPECT_TRUE(AreValid(link, 1));
    EXPECT_FALSE(AreValid(far, 1));
    std::filesystem::remove(source); // the levels are what is left of it
    EXPECT_TRUE(AreValid(link, 1));
}

// Of a link with levels and a channel of its own.
TEST_F(LinkTest, DamageIsFoundOrDoesNoHarm)
{
    const std::string source = Make("scene.tif", "TIF", 90, 70, 2), link = File("scene.krv");
    Link(link, source);
    {
        const DatasetPtr poLink = Open(link, eUpdate);
        As<IRasterDataset>(*poLink).AddNewChannel({90, 70, 1, krv::gobs::eDT_8U});
        Fill(*poLink, 3, 9);
        BasicWriter oWriter(&As<IRasterDataset>(*poLink), {1, 2, 3});
        EXPECT_TRUE(BuildOverviews(oWriter, {2}, "average"));
        poLink->Close();
    }
    const auto Tell = [&](AccessMode eMode)
    {
        std::string told;
        const std::string error = Error([&] { told = TellDataset(*Open(link, eMode)); });
        return error.empty() ? told : "refused: " + error;
    };
    const auto Write = [&](const std::string& bytes)
    {
        std::filesystem::remove(link);
        krv::conformance::WriteFile(link, bytes);
    };
    const std::string last = krv::conformance::ReadFile(link), told = Tell(eReadOnly);
    // Without the state before, which would be the file's instead.
    std::string whole;
    for (const std::size_t nRoot : {std::size_t{4096}, std::size_t{8192}})
    {
        const std::string one = std::string(last).replace(nRoot, 512, 512, '\0');
        Write(one);
        if (Tell(eReadOnly) == told)
            whole = one;
    }
    ASSERT_FALSE(whole.empty());
    std::mt19937 oRandom(8);
    int nRefused = 0;
    for (int nTime = 0; nTime < 2000; ++nTime)
    {
        std::string damaged = whole;
        // Without its first bytes no format knows the file.
        const std::size_t nAt = 12 + oRandom() % (whole.size() - 12);
        const std::size_t nEnd = std::min(nAt + 1 + oRandom() % 40, whole.size());
        for (std::size_t nByte = nAt; nByte < nEnd; ++nByte)
            damaged[nByte] = static_cast<char>(oRandom());
        if (nTime % 4 == 0)
            damaged.resize(nAt);
        Write(damaged);
        const std::string got = Tell(nTime % 2 == 0 ? eReadOnly : eUpdate);
        const bool bRefused = got.starts_with("refused: ");
        ASSERT_TRUE(bRefused ? got.find(link) != std::string::npos : got == told) << nAt << "\n" << got;
        nRefused += bRefused;
    }
    EXPECT_GT(nRefused, 500);
}

TEST_F(LinkTest, SegmentsOfTheSourceKeepTheirNumbers)
{
    const std::string source = Make("scene.tif", "TIF", 40, 30, 1);
    {
        const DatasetPtr poSource = Open(source, eUpdate);
        auto& oBitmaps = As<IBitmapDataset>(*poSource);
        EXPECT_EQ(oBitmaps.CreateBitmap(), 1U);
        oBitmaps.SetBitmapDescription(1, "lake");
        As<IMathModelDataset>(*poSource).CreateMathModel(krv::mathmodel::RpcModel(krv::mathmodel::RpcCoefficients()));
        poSource->Close();
    }
    const std::string link = File("scene.krv");
    Link(link, source);
    const DatasetPtr poLink = Open(link, eUpdate);
    auto& oBitmaps = As<IBitmapDataset>(*poLink);
    auto& oModels = As<IMathModelDataset>(*poLink);
    EXPECT_EQ(oBitmaps.CreateBitmap(), 4U); // behind model 3
    EXPECT_EQ(oBitmaps.GetBitmapList(), (Numbers{1, 4}));
    EXPECT_EQ(oBitmaps.GetBitmapDescription(1), "lake");
    krv::mathmodel::RpcCoefficients oOwn;
    oOwn.lineOffset = 5;
    EXPECT_EQ(oModels.CreateMathModel(krv::mathmodel::RpcModel(oOwn)), 5U);
    EXPECT_EQ(oModels.GetMathModelList(), (Numbers{3, 5}));
    const IOPtr poIO(oBitmaps.GetBitmapIO({4}));
    Bytes oSet(1200, 1);
    poIO->WriteWindow(0U, 0U, 40U, 30U, oSet.data());
    const IOPtr poBoth(oBitmaps.GetBitmapIO({1, 4}));
    const Bytes oBits = ReadAll(*poBoth, 2);
    EXPECT_TRUE(oBits[0] == 0 && oBits[1] == 1);
    EXPECT_NE(Error([&] { oBitmaps.DeleteBitmap(1); }).find(source), std::string::npos);
    EXPECT_NE(Error([&] { oModels.DeleteMathModel(3); }).find(source), std::string::npos);
    oModels.DeleteMathModel(5);
    const Bytes oRecords = {1, 0, 2};
    EXPECT_EQ(As<IEphemerisDataset>(*poLink).CreateEphemeris("two lines", oRecords), 6U);
    poLink->Close();

    const DatasetPtr poAgain = Open(link);
    EXPECT_EQ(As<IMathModelDataset>(*poAgain).GetMathModelList(), Numbers{3});
    const EphemerisRecords oRead = As<IEphemerisRecords>(*poAgain).ReadEphemeris(6);
    EXPECT_EQ(oRead.kind, "two lines");
    EXPECT_EQ(oRead.bytes, oRecords);
    EXPECT_NE(Error([&] { As<IEphemerisDataset>(*poAgain).BuildMathModel(6, 0); }), "");
    EXPECT_NE(Error([&] { krv::core::LoadMathModel(poAgain.get(), 1); }), ""); // nothing makes one from the orbit
}

TEST_F(LinkTest, ChainsAreReadAndLoopsAreRefused)
{
    std::string last = Make("scene.tif", "TIF", 40, 30, 1);
    for (int n = 1; n <= 8; ++n)
    {
        const std::string link = File("link" + std::to_string(n) + ".krv");
        Link(link, last);
        last = link;
    }
    EXPECT_EQ(ReadChannels(*Open(last), {1}), Bytes(1200, 1));
    EXPECT_NE(Error([&] { CreateLinkedPix(File("ninth.krv"), last); }).find("more than 8 links"), std::string::npos);
    EXPECT_FALSE(std::filesystem::exists(File("ninth.krv")));
    // Files that change their names can make what no program would have made.
    std::filesystem::rename(File("link5.krv"), File("scene.tif"));
    EXPECT_NE(Error([&] { ReadChannels(*Open(File("link3.krv")), {1}); }).find("itself"), std::string::npos);
    EXPECT_NE(Error([&] { ReadChannels(*Open(File("link8.krv")), {1}); }), "");
}

TEST_F(LinkTest, WhatDoesNotFitTheSourceIsNotMade)
{
    Make("scene.tif", "TIF", 40, 30, 2);
    const auto Create = [&](const std::string& options, const std::vector<krv::gobs::DataType>& oTypes)
    {
        const DatasetPtr poDataset(Manager().NewDataset(File("scene.krv"), "KRVDSK", options));
        return Error([&] { As<IRasterDataset>(*poDataset).Create(40, 30, oTypes); });
    };
    const krv::gobs::DataType o8U = krv::gobs::eDT_8U;
    EXPECT_EQ(Create("COMPRESS=ZSTD FILENOCREATE=scene.tif", {o8U, o8U}), "");
    EXPECT_NE(Create("FILENOCREATE=scene.tif", {o8U}).find("types"), std::string::npos);
    EXPECT_NE(Create("FILENOCREATE=missing here.tif", {o8U}).find("missing here.tif"), std::string::npos);
    EXPECT_FALSE(std::filesystem::exists(File("scene.krv")));
}
