#include "datasources/datasets/constrasterdataset.h"

#include "datasources/interfaces/irasterio.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/validitysource.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/rasterview.h"
#include "tests/support/pixels.h"
#include "tests/support/thrown.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <cmath>
#include <limits>

namespace krv::test
{

using krv::datasources::BasicReader;
using krv::datasources::ConstRasterDataset;
using krv::datasources::IRasterIO;

TEST(ConstRasterDataset, EveryPixelHasTheValueOfItsChannel)
{
    ConstRasterDataset oDataset(
        700, 300, {{gobs::eDT_16S, -5}, {gobs::eDT_32R, std::nan("")}, {gobs::eDT_16S, 777}, {gobs::eDT_C32R, 1, -2}});
    BasicReader oReader(&oDataset, {3, 1, 3}, false);
    EXPECT_EQ(oReader.GetTileWidth(), 512u);
    EXPECT_EQ(oReader.GetTileHeight(), 300u);
    oReader.SetMargins(3, 2, eMirror);
    const std::unique_ptr<gobs::Raster> oTile(oReader.GetRaster(1));
    const auto* const pValues = reinterpret_cast<const std::int16_t*>(oTile->GetBuffer());
    for (std::uint64_t n = 0; n < oTile->GetFullWidth() * oTile->GetFullHeight(); ++n)
        ASSERT_TRUE(pValues[3 * n] == 777 && pValues[3 * n + 1] == -5 && pValues[3 * n + 2] == 777) << n;
    const std::string real = ReadPixels(BasicReader(&oDataset, {2}, false));
    for (std::size_t n = 0; n < real.size(); n += 4)
        ASSERT_TRUE(std::isnan(*reinterpret_cast<const float*>(real.data() + n)));
    const std::string complex = ReadPixels(BasicReader(&oDataset, {4}, false));
    EXPECT_EQ(reinterpret_cast<const float*>(complex.data())[700 * 300 * 2 - 1], -2.0F);
    // What of a window lies outside stays as it was.
    const std::unique_ptr<IRasterIO> oIO(oDataset.GetRasterIO({1}));
    std::vector<std::int16_t> oBuffer(6, 9);
    oIO->ReadWindow(-1, 299, 3, 2, 0, 0, 3, 2, reinterpret_cast<unsigned char*>(oBuffer.data()));
    EXPECT_EQ(oBuffer, (std::vector<std::int16_t>{9, -5, -5, 9, 9, 9}));
    EXPECT_THROW(oIO->WriteWindow(0U, 0U, 1U, 1U, reinterpret_cast<unsigned char*>(oBuffer.data())), DataException);
}

TEST(ConstRasterDataset, IntegersAreExactAndWhatNoSampleEqualsIsRefused)
{
    constexpr auto LARGE = std::numeric_limits<std::uint64_t>::max() - 2;
    ConstRasterDataset oLarge(2, 1, {{gobs::eDT_64U, gobs::SampleValue::FromUnsigned(LARGE)}});
    EXPECT_EQ(*reinterpret_cast<const std::uint64_t*>(ReadPixels(BasicReader(&oLarge, {1}, false)).data()), LARGE);
    const auto Refused = [](std::vector<datasources::ConstChannel> oChannels, unsigned int nWidth = 4)
    {
        return Error([&] { ConstRasterDataset(nWidth, 4, oChannels); });
    };
    EXPECT_EQ(Refused({{gobs::eDT_8U, 1}, {gobs::eDT_8U, 256}}),
              "data: <constant 4 x 4, 2 channels>: no value of channel 2, of the type 8U, equals 256");
    EXPECT_NE(Refused({{gobs::eDT_32S, 0.5}}), "");
    EXPECT_NE(Refused({{gobs::eDT_32R, 1, 1}}), "") << "a real channel has no imaginary part";
    EXPECT_NE(Refused({{gobs::eDT_BIT, 1}}), "");
    EXPECT_NE(Refused({}), "");
    EXPECT_NE(Refused({{gobs::eDT_8U, 1}}, 0), "");
    EXPECT_NE(Refused({{gobs::eDT_8U, 1}}, 1U << 31), "");
    ConstRasterDataset oDataset(5, 5, {{gobs::eDT_8U, 1}, {gobs::eDT_16U, 1}});
    EXPECT_EQ(Error(
                  [&] {
                      oDataset.GetRasterIO({1, 2});
                  }),
              "data: <constant 5 x 5, 2 channels>: channels 1 and 2 are of "
              "different types, 8U and 16U");
    EXPECT_NE(Error([&] { oDataset.GetRasterIO({3}); }), "");
    EXPECT_NE(Error([&] { oDataset.GetRasterIO({}); }), "");
    EXPECT_NE(Error([&] { oDataset.Create({5, 5, 1, gobs::eDT_8U}); }), "");
}

TEST(ConstRasterDataset, IsADatasetLikeAnyOther)
{
    ConstRasterDataset oDataset(40, 30, {{gobs::eDT_8U, 7}});
    EXPECT_EQ(oDataset.GetFileFormat(), nullptr);
    EXPECT_TRUE(oDataset.Exists());
    EXPECT_EQ(oDataset.Delete(), datasources::eDone);
    EXPECT_EQ(oDataset.GetOverviewManager(), nullptr);
    EXPECT_EQ(std::unique_ptr<ogc::cs::ICRS>(oDataset.ReadCRS()), nullptr);
    oDataset.UpdateCRS(*ogc::cs::CreateCRSFromEPSG(32633));
    oDataset.SetGeocoding({5e5, 10, 0, 5e6, 0, -10});
    datasources::AuxiliaryData oTags(1);
    oTags.SetChanMetadataValue("NO_DATA_VALUE", "7", 1);
    oDataset.WriteAuxiliaryData(oTags);
    EXPECT_THROW(oDataset.WriteAuxiliaryData(datasources::AuxiliaryData(2)), DataException);
    EXPECT_THROW(oDataset.SetGeocoding({0, 0, 0, 0, 0, 0}), DataException);
    const BasicReader oReader(&oDataset, {}, false);
    EXPECT_EQ(std::unique_ptr<ogc::cs::ICRS>(oReader.GetCRS())->GetEPSG(), 32633);
    EXPECT_EQ(std::unique_ptr<ogc::cs::GeocodingInfo>(oReader.GetGeocodingInfo())->GetXPerColumn(), 10);
    BasicReader oPixels(&oDataset, {}, false);
    const std::unique_ptr<gobs::Raster> oRaster(oPixels.GetRaster(0));
    const std::unique_ptr<gobs::Mask> oMask(datasources::ValiditySource(&oDataset).BuildMask(*oRaster));
    EXPECT_FALSE(oMask->GetBit(3, 3)) << "all of it is no-data";
    oDataset.Close();
    EXPECT_FALSE(oDataset.IsOpen());
    EXPECT_THROW(oDataset.GetRasterIO({1}), DataException);
    EXPECT_EQ(ReadPixels(oPixels), std::string(1200, '\7')) << "I/O objects stay";
}

} // namespace krv::test
