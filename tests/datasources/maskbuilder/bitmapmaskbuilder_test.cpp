#include "datasources/maskbuilder/bitmapmaskbuilder.h"

#include "datasources/maskbuilder/maskio.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/mask/mask.h"
#include "tests/datasources/reader/readertest.h"

#include <cstring>

namespace krv::test
{

namespace
{

using krv::datasources::BasicWriter;
using krv::datasources::BitmapMaskBuilder;
using krv::datasources::DatasetManager;
using krv::datasources::IBitmapDataset;
using krv::datasources::IDataset;
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
        moHome.Add(std::string(KRV_TEST_HOME) + "/lib/qrfformats/tif.so", "<Dataset><SupportsCreate/></Dataset>");
        DatasetManager::DestroyInstance();
        RegisterSynthetic();
    }
};

void ExpectSameBits(const Mask& oMask, const Mask& oOther)
{
    ASSERT_EQ(oMask.GetBitsSize(), oOther.GetBitsSize());
    EXPECT_EQ(std::memcmp(oMask.GetBits(), oOther.GetBits(), oMask.GetBitsSize()), 0);
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

// Whole masks of real files are written and read by the command.
TEST_F(MaskFileTest, APartReplacesItsCentreAlone)
{
    const std::string file = moHome.GetFolder().File("image.tif");
    BasicWriter oWriter(file, {1}, "TIF", "");
    const RasterInfo oInfo(300, 200, 1, krv::gobs::eDT_8U);
    oWriter.CreateNewFile(oInfo);
    auto& oBitmaps = dynamic_cast<IBitmapDataset&>(*oWriter.GetDataset());
    const RasterInfo oPartInfo(61, 33, 1, krv::gobs::eDT_BIT);
    Mask oWhole(oInfo, {}), oPart(oPartInfo, RasterContext(100, 50, 3, 2));
    for (std::uint64_t i = 0; i < 300 * 200; i += 7)
        oWhole.SetBit(i % 300, i / 300);
    for (std::uint64_t i = 0; i < 67 * 37; i += 3)
        oPart.SetBit(i % 67, i / 67);
    EXPECT_EQ(WriteMask(oBitmaps, oWhole, 0), 1u);
    EXPECT_EQ(WriteMask(oBitmaps, oWhole, -7), 2u);
    EXPECT_EQ(WriteMask(oBitmaps, oPart, 2), 2u);
    EXPECT_THROW(WriteMask(oBitmaps, Mask(oPartInfo, RasterContext(-100000, 50)), 0), krv::Exception);
    oWriter.Synchronize();

    const std::unique_ptr<IDataset> poRead(DatasetManager::GetInstance()->Open(file, eReadOnly));
    auto& oRead = dynamic_cast<IBitmapDataset&>(*poRead);
    EXPECT_EQ(oRead.GetBitmapList(), (Channels{1, 2})) << "the refused one left one behind";
    RasterContext oWhere;
    RasterInfo oAll = oInfo;
    ExpectSameBits(oWhole, *std::unique_ptr<Mask>(ReadMask(oRead, 1, oAll, oWhere)));
    const std::unique_ptr<Mask> poMask(ReadMask(oRead, 2, oAll, oWhere));
    for (unsigned int y = 0; y < 200; ++y)
        for (unsigned int x = 0; x < 300; ++x)
        {
            const bool bInside = x >= 100 && x < 161 && y >= 50 && y < 83;
            ASSERT_EQ(poMask->GetBit(x, y), bInside ? oPart.GetBit(x - 97, y - 48) : oWhole.GetBit(x, y))
                << x << " " << y;
        }
    EXPECT_THROW(WriteMask(oRead, oWhole, 0), krv::Exception) << "not open for update";
    EXPECT_THROW(ReadMask(oRead, 4000, oAll, oWhere), krv::Exception) << "no such bitmap";
}

} // namespace

} // namespace krv::test
