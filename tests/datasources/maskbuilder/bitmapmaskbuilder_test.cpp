#include "datasources/maskbuilder/bitmapmaskbuilder.h"

#include "datasources/maskbuilder/maskio.h"
#include "datasources/maskbuilder/polygonmaskbuilder.h"
#include "gobs/mask/mask.h"
#include "tests/datasources/reader/readertest.h"
#include "tests/support/facts.h"
#include "toolkit/core/gglshape.h"

#include <cstring>
#include <filesystem>

namespace krv::test
{

namespace
{

using krv::datasources::BitmapMaskBuilder;
using krv::datasources::DatasetManager;
using krv::datasources::IBitmapDataset;
using krv::datasources::IDataset;
using krv::datasources::PolygonMaskBuilder;
using krv::datasources::ReadMask;
using krv::datasources::WriteMask;
using krv::gobs::Mask;
using krv::gobs::Raster;
using krv::gobs::RasterContext;
using krv::gobs::RasterInfo;

class MaskFileTest : public ReaderTest
{
protected:
    MaskFileTest()
    {
        moModel->moBitmaps = {{1, "first"}, {3, "third"}};
        moHome.Add(std::string(KRV_TEST_HOME) + "/lib/qrfformats/tif.so");
        DatasetManager::DestroyInstance();
        RegisterSynthetic();
    }

    // A copy of a real file, open for update; null without the data.
    std::unique_ptr<IDataset> OpenCopy(const std::string& name)
    {
        const std::filesystem::path oSource = std::filesystem::path(krv::test::DataFolder()) / name;
        moCopy = moHome.GetFolder().GetPath() + "/" + oSource.filename().string();
        if (!std::filesystem::exists(oSource))
            return nullptr;
        std::filesystem::copy_file(oSource, moCopy, std::filesystem::copy_options::overwrite_existing);
        std::filesystem::permissions(moCopy, std::filesystem::perms::owner_write, std::filesystem::perm_options::add);
        return Reopen(eUpdate);
    }
    std::unique_ptr<IDataset> Reopen(AccessMode eMode) const
    {
        return std::unique_ptr<IDataset>(DatasetManager::GetInstance()->Open(moCopy, eMode));
    }

    std::string moCopy;
};

void ExpectSameBits(const Mask& oMask, const Mask& oOther)
{
    ASSERT_EQ(oMask.GetBitsSize(), oOther.GetBitsSize());
    EXPECT_EQ(std::memcmp(oMask.GetBits(), oOther.GetBits(), oMask.GetBitsSize()), 0);
}

std::unique_ptr<Mask> StarMask(unsigned int nWidth, unsigned int nHeight, const RasterContext& oContext)
{
    GGLShape oShape;
    oShape.AddRing({{10, 5}, {300, 200}, {40, 220}, {310, 20}, {150, 230}, {-40, 90}});
    const Raster oRaster({nWidth, nHeight, 1, krv::gobs::eDT_BIT}, oContext);
    return std::unique_ptr<Mask>(PolygonMaskBuilder(oShape, 0, 0).BuildMask(oRaster));
}

TEST_F(MaskFileTest, MasksOfOneRegionAreTheSame)
{
    const BitmapMaskBuilder oNamed(moFile, 3);
    const auto poDataset = MakeDataset();
    auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(poDataset.get());
    for (const RasterContext& oContext :
         {RasterContext(0, 0), RasterContext(3, 2, 2, 1), RasterContext(0, 11, 4, 3), RasterContext(13, 10, 5, 5)})
    {
        RasterInfo oInfo(8, 6, 7, krv::gobs::eDT_64R);
        RasterContext oWhere = oContext;
        const std::unique_ptr<Mask> poMask(oNamed.BuildMask(oInfo, oContext));
        ExpectSameBits(*poMask, *std::unique_ptr<Mask>(ReadMask(*poBitmaps, 3, oInfo, oWhere)));
        const Raster oRaster({8, 6, 1, krv::gobs::eDT_BIT}, oContext);
        ExpectSameBits(*poMask, *std::unique_ptr<Mask>(oNamed.BuildMask(oRaster)));
    }
    EXPECT_THROW(oNamed.BuildMask(RasterInfo(8, 6, 1, krv::gobs::eDT_8U), RasterContext(0, 0, 11, 0)),
                 krv::DataException); // the reader's own limit for mirrored margins
    EXPECT_THROW(oNamed.BuildMask(RasterInfo(~0u, ~0u, 1, krv::gobs::eDT_8U), RasterContext(0, 0, ~0u, ~0u)),
                 krv::DataException);
}

TEST_F(MaskFileTest, TheDatasetGoesWithTheLastOwner)
{
    {
        auto oFirst = std::make_unique<BitmapMaskBuilder>(moFile, 1);
        BitmapMaskBuilder oSecond(moFile, 3);
        oSecond = *oFirst;
        const BitmapMaskBuilder oThird(oSecond);
        oFirst.reset();
        EXPECT_NE(std::unique_ptr<Mask>(oThird.BuildMask(RasterInfo(4, 4, 1, krv::gobs::eDT_8U), {})), nullptr);
    }
    EXPECT_EQ(moProbe.GetLive(), 0);
    const auto poDataset = MakeDataset();
    const int nLive = moProbe.GetLive();
    BitmapMaskBuilder(dynamic_cast<IBitmapDataset*>(poDataset.get()), 1, false);
    EXPECT_EQ(moProbe.GetLive(), nLive);
    const BitmapMaskBuilder oOwner(dynamic_cast<IBitmapDataset*>(MakeDataset().release()), 1, true);
    EXPECT_FALSE(moProbe.HasOrphans());
}

TEST_F(MaskFileTest, AFileWithoutBitmapsIsRefusedAndItsDatasetStays)
{
    IDataset* poLeft = nullptr;
    moMakeDataset = [&]
    {
        auto poDataset = std::make_unique<Synthetic<DatasetPart, RasterPart>>(moModel);
        poLeft = poDataset.get();
        return poDataset;
    };
    const auto oError = Thrown<krv::DataException>([&] { BitmapMaskBuilder(moFile, 1); });
    EXPECT_EQ(oError.GetMessage(), "Invalid dataset - bitmap not supported");
    ExpectPlace(oError, "BitmapMaskBuilder::BitmapMaskBuilder(", "datasources/maskbuilder/bitmapmaskbuilder", 40);
    ASSERT_NE(poLeft, nullptr);
    EXPECT_TRUE(poLeft->IsOpen());
    delete poLeft;
}

// Exists as often as it is told.
class Vanishing : public SyntheticDataset
{
public:
    Vanishing(const ImageModelPtr& poModel, int nTimes) : SyntheticDataset(poModel), mnTimes(nTimes) {}
    bool Exists() const override { return mnTimes-- > 0; }

private:
    mutable int mnTimes;
};

void ExpectWriteFails(IBitmapDataset& oDataset, const char* pMessage)
{
    const Mask oMask(RasterInfo(4, 4, 1, krv::gobs::eDT_BIT), {});
    const auto oError = Thrown<krv::DataException>([&] { WriteMask(oDataset, oMask, 1); });
    EXPECT_EQ(oError.GetMessage(), pMessage);
    ExpectNoPlace(oError);
}

TEST_F(MaskFileTest, WritingNeedsADatasetWithAFile)
{
    Synthetic<BitmapPart> oAlone(moModel);
    ExpectWriteFails(oAlone, "Dataset is not Valid.");
    Vanishing oGone(moModel, 0), oGoing(moModel, 2);
    ExpectWriteFails(oGone, "Dataset doesn't exist.");
    ExpectWriteFails(oGoing, "Unable to create bitmap, file doesn't exist.");
}

TEST_F(MaskFileTest, RealFilesKeepMasksBitForBit)
{
    for (const char* pName : {"optical/rgb_deflate.tif", "mask/hro_colorado_mask.tif", "overview/cog.tif"})
    {
        auto poDataset = OpenCopy(pName);
        if (poDataset == nullptr)
            GTEST_SKIP() << "no " << pName;
        auto* poBitmaps = dynamic_cast<IBitmapDataset*>(poDataset.get());
        const auto nBefore = poBitmaps->GetBitmapList().size();
        const auto* const poImage = dynamic_cast<krv::datasources::IRasterDataset*>(poDataset.get());
        const RasterContext oAll;
        RasterInfo oInfo(poImage->GetWidth(), poImage->GetHeight(), 1, krv::gobs::eDT_8U);
        const auto poWhole = StarMask(oInfo.GetWidth(), oInfo.GetHeight(), oAll);
        ASSERT_GT(poWhole->CountSet(), 1000u);
        const unsigned int nWhole = WriteMask(*poBitmaps, *poWhole, 0), nPart = WriteMask(*poBitmaps, *poWhole, -7);
        EXPECT_NE(nWhole, nPart);
        // A part with margins: only its centre goes to the file, in place of what was there.
        Mask oPart(RasterInfo(61, 33, 1, krv::gobs::eDT_BIT), RasterContext(100, 50, 3, 2));
        for (std::uint64_t i = 0; i < 67 * 37; i += 3)
            oPart.SetBit(i % 67, i / 67);
        EXPECT_EQ(WriteMask(*poBitmaps, oPart, static_cast<int>(nPart)), nPart);
        const Mask oOutside(RasterInfo(61, 33, 1, krv::gobs::eDT_BIT), RasterContext(-100000, 50));
        EXPECT_THROW(WriteMask(*poBitmaps, oOutside, 0), krv::Exception); // and leaves no bitmap behind, see below
        poDataset->Synchronize();
        poDataset.reset();

        poDataset = Reopen(eReadOnly);
        poBitmaps = dynamic_cast<IBitmapDataset*>(poDataset.get());
        EXPECT_EQ(poBitmaps->GetBitmapList().size(), nBefore + 2);
        RasterContext oWhere = oAll;
        ExpectSameBits(*poWhole, *std::unique_ptr<Mask>(ReadMask(*poBitmaps, nWhole, oInfo, oWhere)));
        const std::unique_ptr<Mask> poRead(ReadMask(*poBitmaps, nPart, oInfo, oWhere));
        for (unsigned int y = 0; y < oInfo.GetHeight(); ++y)
            for (unsigned int x = 0; x < oInfo.GetWidth(); ++x)
            {
                const bool bInside = x >= 100 && x < 161 && y >= 50 && y < 83;
                ASSERT_EQ(poRead->GetBit(x, y), bInside ? oPart.GetBit(x - 97, y - 48) : poWhole->GetBit(x, y))
                    << pName << " " << x << " " << y;
            }
        EXPECT_THROW(WriteMask(*poBitmaps, *poWhole, 0), krv::Exception) << "not open for update";
        EXPECT_THROW(ReadMask(*poBitmaps, 4000, oInfo, oWhere), krv::Exception) << "no such bitmap";
    }
}

} // namespace

} // namespace krv::test
