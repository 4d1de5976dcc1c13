// One meaning of valid: statistics, masks, the validity query, levels, margins and pictures say the same of a value.

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/validitysource.h"
#include "datasources/writer/basicwriter.h"
#include "datasources/writer/ioverviewwriteraccessor.h"
#include "gobs/mask/exactmaskdecision.h"
#include "gobs/mask/mask.h"
#include "gobs/mask/samplematch.h"
#include "gobs/raster/raster.h"
#include "operations/picture/reduction.h"
#include "operations/statistics/statistics.h"
#include "tests/support/nodatatexts.h"
#include "tests/tools/programrun.h"
#include "toolkit/exceptions/exceptions.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <memory>

namespace krv::tool
{

namespace
{

using namespace krv::datasources;
using namespace krv::gobs;

std::string BitsOf(IMaskBuilder* poBuilder, const Raster& oRaster)
{
    const std::unique_ptr<IMaskBuilder> oBuilder(poBuilder);
    const std::unique_ptr<Mask> oMask(oBuilder->BuildMask(oRaster));
    std::string bits;
    for (std::uint64_t n = 0; n < oMask->GetFullWidth() * oMask->GetFullHeight(); ++n)
        bits += oMask->GetBit(n % oMask->GetFullWidth(), n / oMask->GetFullWidth()) ? '1' : '0';
    return bits;
}

// One value for each text that the type holds, 1 + i too in complex types.
std::vector<std::string> MakeValues(const DataType& oType)
{
    std::vector<std::string> oValues;
    std::string value(static_cast<std::size_t>(oType.GetValueBits() / 8), '\0');
    for (const std::string& text : krv::test::NoDataTexts())
        if (StoreSample(*ParseNoData(text), oType, reinterpret_cast<unsigned char*>(value.data())))
            oValues.push_back(value);
    if (oType.IsComplex())
    {
        StoreSample(SampleValue::FromUnsigned(1), oType, reinterpret_cast<unsigned char*>(value.data()));
        oValues.push_back(value.replace(value.size() / 2, value.size() / 2, value, 0, value.size() / 2));
    }
    return oValues;
}

// Each value fills a box of 2 x 2 pixels.
std::unique_ptr<Raster> MakeImage(const DataType& oType)
{
    const std::vector<std::string> oValues = MakeValues(oType);
    auto oRaster = std::make_unique<Raster>(RasterInfo(2 * static_cast<unsigned int>(oValues.size()), 2, 1, oType),
                                            RasterContext(0, 0));
    for (std::size_t n = 0; n < oValues.size() * 4; ++n)
        std::memcpy(oRaster->GetBuffer() + n * oValues[0].size(), oValues[n / 2 % oValues.size()].data(),
                    oValues[0].size());
    return oRaster;
}

// The bits of the upper row, one for each box.
std::string PerBox(const std::string& bits)
{
    std::string boxes;
    for (std::size_t n = 0; n < bits.size() / 2; n += 2)
        boxes += bits[n];
    return boxes;
}

void ExpectMargins(IRasterReader& oSource, const AuxiliaryData& oRecord, bool bHeld)
{
    ExactHaloReader oHalo(&oSource, false);
    oHalo.SetMargins(1, 1, eNoData);
    if (!bHeld)
    {
        EXPECT_THROW(std::unique_ptr<Raster>(oHalo.ReadRaster(0, 0, 1, 1)), krv::DataException);
        return;
    }
    const std::unique_ptr<Raster> oCorner(oHalo.ReadRaster(0, 0, 1, 1));
    const std::string bits = BitsOf(GetTypedNoDataMaskBuilder(oRecord, eAnyChannel), *oCorner);
    EXPECT_EQ(bits.substr(0, 4) + bits[6], "11111");
}

void ExpectPicture(IRasterReader& oReader, const SampleValue& oValue, const std::string& background)
{
    operations::ProgressCounter oProgress({}, "test", 1);
    const operations::Plane oPlane =
        operations::Reduce(oReader, {oValue}, oReader.GetWidth(), oReader.GetHeight(), Resampling::eNearest, oProgress)
            .front();
    for (std::size_t n = 0; n < background.size(); ++n)
    {
        // What is not finite is not drawn either.
        const bool bDrawn = background[n] == '0' && !oReader.GetDataType().IsReal();
        EXPECT_TRUE(oPlane.coverage[n] == (bDrawn ? 1.0F : 0.0F) || oReader.GetDataType().IsReal()) << n;
        EXPECT_FALSE(background[n] == '1' && oPlane.coverage[n] != 0) << n;
    }
}

} // namespace

TEST(Validity, EverybodySaysTheSameOfAValue)
{
    const krv::conformance::TempFolder oFolder;
    for (const auto eType : {eDT_8U, eDT_8S, eDT_16U, eDT_16S, eDT_32U, eDT_32S, eDT_64U, eDT_64S, eDT_32R, eDT_64R,
                             eDT_C16S, eDT_C32S, eDT_C32R, eDT_C64R})
    {
        const DataType oType(eType);
        const std::unique_ptr<Raster> oMade = MakeImage(oType);
        const Raster& oImage = *oMade;
        for (const std::string& text : krv::test::NoDataTexts())
        {
            SCOPED_TRACE(oType.Describe() + " and " + text);
            const SampleValue oValue = *ParseNoData(text);
            const std::string file = oFolder.File(oType.Describe() + text + ".tif");
            BasicWriter oWriter(file, {1}, "TIF", "");
            oWriter.CreateNewFile(oImage.GetInfo());
            oWriter.WriteRaster(&oImage);
            AuxiliaryData oRecord(1);
            oRecord.SetFileMetadataValue("NO_DATA_VALUE", text);
            oWriter.SetAuxiliaryData(oRecord);

            const std::string background = BitsOf(GetTypedNoDataMaskBuilder(oRecord, eAnyChannel), oImage);
            std::string value(16, '\0');
            const bool bHeld = StoreSample(oValue, oType, reinterpret_cast<unsigned char*>(value.data()));
            EXPECT_EQ(background.find('1') != std::string::npos, bHeld);
            if (oValue.GetKind() == SampleValue::eReal && !oValue.IsNaN())
            {
                const MaskDecision oDecision(eAnyChannel, {oValue.GetReal()}, {1});
                EXPECT_EQ(BitsOf(new MaskDecisionBuilder(&oDecision), oImage), background);
            }

            std::string valid = background;
            for (char& cBit : valid)
                cBit = cBit == '1' ? '0' : '1';
            EXPECT_EQ(BitsOf(new ValiditySource(oWriter.GetDataset()), oImage), valid);

            const auto poGatherer = operations::StatisticsGatherer::Make(oType, oValue);
            poGatherer->Add(oImage.GetBuffer(), background.size(), 1);
            EXPECT_EQ(poGatherer->Get().noData, std::count(background.begin(), background.end(), '1'));
            ExpectPicture(oWriter, oValue, background);
            ExpectMargins(oWriter, oRecord, bHeld);

            BuildOverviews(oWriter, {2}, "AVERAGE");
            const std::unique_ptr<IOverviewWriterAccessor> oLevels(oWriter.GetOverviewWriterAccessor());
            const std::unique_ptr<IRasterWriter> oLevel(oLevels->CreateRasterWriter(2));
            const std::unique_ptr<Raster> oReduced(oLevel->ReadRaster(0, 0, oLevel->GetWidth(), 1));
            EXPECT_EQ(BitsOf(GetTypedNoDataMaskBuilder(oRecord, eAnyChannel), *oReduced), PerBox(background));
        }
    }
}

// A channel of values, no-data 0, and alpha, with a validity mask beside them.
TEST(Validity, MaskAndAlphaCountInStatisticsAsInLevels)
{
    const krv::conformance::TempFolder oFolder;
    const std::string file = oFolder.File("alpha.tif");
    constexpr unsigned int WIDTH = 30, HEIGHT = 22;
    Raster oImage({WIDTH, HEIGHT, 2, eDT_8U}, {0, 0}), oMask({WIDTH, HEIGHT, 1, eDT_8U}, {0, 0});
    std::string valid;
    std::int64_t nValid = 0, nNoData = 0;
    for (unsigned int n = 0; n < WIDTH * HEIGHT; ++n)
    {
        oImage.GetBuffer()[2 * n] = static_cast<unsigned char>(n % 7);
        oImage.GetBuffer()[2 * n + 1] = n % 5 != 0 ? 255 : 0;
        oMask.GetBuffer()[n] = n % 3 != 0;
        valid += n % 7 != 0 && n % 5 != 0 && n % 3 != 0 ? '1' : '0';
        nValid += valid.back() - '0';
        nNoData += n % 7 == 0 ? 1 : 0;
    }
    {
        BasicWriter oWriter(file, {1, 2}, "TIF", "");
        oWriter.CreateNewFile(oImage.GetInfo());
        oWriter.WriteRaster(&oImage);
        AuxiliaryData oRecord(2);
        oRecord.SetFileMetadataValue("NO_DATA_VALUE", "0");
        oRecord.SetChanMetadataValue("ColorInterp", "Alpha", 2);
        oWriter.SetAuxiliaryData(oRecord);
        auto& oBitmaps = dynamic_cast<IBitmapDataset&>(*oWriter.GetDataset());
        oBitmaps.SetBitmapDescription(oBitmaps.CreateBitmap(), "");
        BasicWriter(&oBitmaps, {1}).WriteRaster(&oMask);
        BuildOverviews(oWriter, {2}, "NEAREST");
        const std::unique_ptr<IOverviewWriterAccessor> oLevels(oWriter.GetOverviewWriterAccessor());
        const std::unique_ptr<IRasterWriter> oLevel(oLevels->CreateRasterWriter(2));
        const std::unique_ptr<Raster> oReduced(oLevel->ReadRaster(0, 0, WIDTH / 2, HEIGHT / 2));
        for (unsigned int n = 0; n < WIDTH / 2 * HEIGHT / 2; ++n)
            EXPECT_EQ(oReduced->GetBuffer()[2 * n] != 0,
                      valid[(2 * (n / (WIDTH / 2)) + 1) * WIDTH + 2 * (n % (WIDTH / 2)) + 1] == '1')
                << n;
        oWriter.Synchronize();
    }
    const auto Channels = [&file](const char* pMode)
    {
        return krv::test::RunKrv({"stats", file, pMode, "--json"}).Json()["channels"];
    };
    const auto oChannels = Channels("--channels=1,2"), oRaw = Channels("--raw");
    EXPECT_EQ(oChannels[0]["valid"], nValid);
    EXPECT_EQ(oChannels[0]["noDataCount"], nNoData);
    EXPECT_EQ(oChannels[0]["masked"], WIDTH * HEIGHT - nValid - nNoData);
    EXPECT_TRUE(oChannels[1]["of"] == "alpha" && oChannels[1]["mean"].is_null());
    EXPECT_EQ(oRaw[0]["valid"], WIDTH * HEIGHT - nNoData);
    EXPECT_EQ(oRaw[1]["max"], 255);
}

} // namespace krv::tool
