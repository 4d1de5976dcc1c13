#include "datasources/reader/derived/totalpowerrasterreader.h"

#include "datasources/metadata/nodatavalue.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/reader/multitypereader.h"
#include "datasources/reader/readervalidity.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/rasterview.h"
#include "tests/datasources/reader/readertest.h"
#include "tests/support/memoryreader.h"

#include <cmath>

namespace krv::test
{

namespace
{

using namespace krv::datasources;
using namespace krv::gobs;

// How each channel counts, as a loop of one's own adds it up: its weight, and whether as a square.
struct Term
{
    double weight = 0;
    bool square = true;
};

std::vector<double> PowerOf(const Raster& oRaster, const std::vector<Term>& oTerms)
{
    std::vector<double> oPower;
    VisitPixelType(oRaster.GetDataType(),
                   [&]<class Value>(std::type_identity<Value>)
                   {
                       using Part = krv::gobs::PartOf<Value>;
                       const auto* p = reinterpret_cast<const Part*>(oRaster.GetBuffer());
                       const std::size_t nPixels = oRaster.GetFullWidth() * oRaster.GetFullHeight();
                       for (std::size_t n = 0; n < nPixels; ++n)
                       {
                           double nSum = 0;
                           for (const Term& oTerm : oTerms)
                           {
                               const double nReal = static_cast<double>(*p++);
                               const double nImaginary = PARTS_OF<Value> == 2 ? static_cast<double>(*p++) : 0;
                               if (oTerm.weight != 0)
                                   nSum +=
                                       oTerm.weight * (oTerm.square ? nReal * nReal + nImaginary * nImaginary : nReal);
                           }
                           oPower.push_back(nSum);
                       }
                   });
    return oPower;
}

std::vector<double> ValuesOf(const Raster& oRaster)
{
    std::vector<double> oValues;
    for (std::size_t n = 0; n < oRaster.GetFullWidth() * oRaster.GetFullHeight(); ++n)
        oValues.push_back(oRaster.GetDataType() == DataType(eDT_64R)
                              ? reinterpret_cast<const double*>(oRaster.GetBuffer())[n]
                              : static_cast<double>(reinterpret_cast<const float*>(oRaster.GetBuffer())[n]));
    return oValues;
}

// Equal but for the rounding to the type of the result and the order of additions; NaN where the other is.
void ExpectEqual(const std::vector<double>& oFound, const std::vector<double>& oExpected, bool bDouble)
{
    ASSERT_EQ(oFound.size(), oExpected.size());
    for (std::size_t n = 0; n < oFound.size(); ++n)
    {
        const double nExpected = bDouble ? oExpected[n] : static_cast<double>(static_cast<float>(oExpected[n]));
        if (std::isnan(nExpected))
            ASSERT_TRUE(std::isnan(oFound[n])) << n;
        else
            ASSERT_LE(std::fabs(oFound[n] - nExpected), (bDouble ? 1e-14 : 6.1e-8) * std::fabs(nExpected)) << n;
    }
}

class TotalPowerRasterReaderTest : public ReaderTest
{
protected:
    void ExpectPower(IRasterReader& oPower, IRasterReader& oSource, const std::vector<Term>& oTerms)
    {
        for (IRasterReader* const poReader : {&oPower, &oSource})
            poReader->SetMargins(3, 2, eMirror);
        const RasterPtr oFound(oPower.ReadRaster(0, 1, 19, 13));
        const RasterPtr oPixels(oSource.ReadRaster(0, 1, 19, 13));
        ExpectEqual(ValuesOf(*oFound), PowerOf(*oPixels, oTerms), oPower.GetDataType() == DataType(eDT_64R));
    }

    std::string Why(const std::string& matrixType, const std::vector<DataType>& oTypes,
                    const PowerRequest& oRequest = {})
    {
        moModel->moTypes = oTypes;
        moModel->moAuxiliary = AuxiliaryData(static_cast<unsigned int>(oTypes.size()));
        moModel->moAuxiliary.SetFileMetadataValue("Matrix_Type", matrixType);
        const auto poDataset = MakeDataset();
        return Error([&] { TotalPowerRasterReader oReader(poDataset.get(), false, oRequest); });
    }
};

} // namespace

TEST_F(TotalPowerRasterReaderTest, EveryTypeAddsUpAsStraightLoopsDo)
{
    for (int nCode = eDT_8U; nCode <= eDT_C64R; ++nCode)
    {
        const DataType oType(static_cast<NativeDataTypeCode>(nCode));
        const bool bWide = (oType.GetBits() == 32 && !oType.IsReal()) || oType.GetBits() == 64;
        moModel->moTypes.assign(5, oType);
        moModel->moAuxiliary = AuxiliaryData(5);
        const auto poDataset = MakeDataset();
        for (const Channels& oChannels : {Channels{2}, Channels{1, 4}, Channels{3, 1, 2}, Channels{1, 2, 3, 4, 5}})
        {
            SCOPED_TRACE(oType.Describe() + " x " + std::to_string(oChannels.size()));
            BasicReader oSource(poDataset.get(), oChannels, false);
            std::vector<Term> oTerms(oChannels.size(), {1, oType.IsComplex()});
            if (oType.IsComplex() && oTerms.size() == 3)
                oTerms[1].weight = 2;
            TotalPowerRasterReader oPower(&oSource, false);
            EXPECT_EQ(oPower.GetDataType(), DataType(bWide ? eDT_64R : eDT_32R));
            EXPECT_FALSE(oPower.HasValidity());
            EXPECT_EQ(oPower.GetAuxiliaryData().GetChanMetadataValue("NO_DATA_VALUE", 1), "");
            ExpectPower(oPower, oSource, oTerms);

            PowerRequest oRequest;
            for (Term& oTerm : oTerms)
            {
                oTerm = {0.25 * static_cast<double>(oRequest.moWeights.size() + 1), true};
                oRequest.moWeights.push_back(oTerm.weight);
            }
            oRequest.meSource = oType.IsComplex() ? eScatteringElements : eAmplitudes;
            TotalPowerRasterReader oWeighted(&oSource, false, oRequest);
            ExpectPower(oWeighted, oSource, oTerms);
        }
    }
}

// Squares of the largest 16-bit parts do not overflow.
TEST_F(TotalPowerRasterReaderTest, ExtremesOfShortPartsAreExact)
{
    SyntheticDataset oDataset(moModel);
    std::vector<std::int16_t> oSamples(2 * 40, -32768);
    MemoryReader oSource(oDataset, 8, 5, {1}, eDT_C16S, {reinterpret_cast<const char*>(oSamples.data()), 160});
    TotalPowerRasterReader oPower(&oSource, false);
    const RasterPtr oRaster(oPower.ReadRaster(0, 0, 8, 5));
    ExpectEqual(ValuesOf(*oRaster), std::vector<double>(40, 2147483648.0), false);
}

TEST_F(TotalPowerRasterReaderTest, MatricesAreTheirDiagonal)
{
    struct Case
    {
        std::string matrixType;
        std::vector<DataType> types;
        std::vector<std::string> descriptions;
        Channels diagonal;
    };
    const Case CASES[] = {
        {"C3", {eDT_32R, eDT_C32R, eDT_C32R, eDT_32R, eDT_C32R, eDT_32R}, {}, {1, 4, 6}},
        {"coherency", {eDT_32R, eDT_32R, eDT_32R}, {}, {1, 2, 3}},
        {"T2", std::vector<DataType>(4, eDT_32R), {}, {1, 4}},
        {"T4", std::vector<DataType>(4, eDT_32R), {}, {1, 2, 3, 4}},
        {"T3", std::vector<DataType>(9, eDT_64R), {}, {1, 6, 9}},
        {"C3", std::vector<DataType>(6, eDT_C32R), {}, {1, 4, 6}},
        {"T3", std::vector<DataType>(5, eDT_32R), {"T33", "T12_imag", "T11", "T12_real", "t22.bin"}, {1, 3, 5}}};
    for (const Case& oCase : CASES)
    {
        SCOPED_TRACE(oCase.matrixType + " " + std::to_string(oCase.types.size()));
        const auto nChannels = static_cast<unsigned int>(oCase.types.size());
        moModel->moTypes = oCase.types;
        moModel->moAuxiliary = AuxiliaryData(nChannels);
        moModel->moAuxiliary.SetFileMetadataValue("Matrix_Type", oCase.matrixType);
        for (unsigned int n = 0; n < oCase.descriptions.size(); ++n)
            moModel->moAuxiliary.SetChannelDescription(oCase.descriptions[n], n + 1);
        const auto poDataset = MakeDataset();
        TotalPowerRasterReader oPower(poDataset.get(), false);
        BasicReader oDiagonal(poDataset.get(), oCase.diagonal, false);
        ExpectPower(oPower, oDiagonal, std::vector<Term>(oCase.diagonal.size(), {1, false}));
        // The same through a reader of all channels in a promoted type.
        Channels oAll(nChannels);
        std::vector<Term> oTerms(nChannels);
        for (unsigned int n = 1; n <= nChannels; ++n)
            oAll[n - 1] = n;
        for (const unsigned int n : oCase.diagonal)
            oTerms[n - 1] = {1, false};
        MultiTypeReader oPromoted(poDataset.get(), oAll, eOwnPlace);
        TotalPowerRasterReader oOverReader(&oPromoted, false);
        ExpectPower(oOverReader, oPromoted, oTerms);
    }
}

TEST_F(TotalPowerRasterReaderTest, WhatDoesNotFitIsNamed)
{
    EXPECT_NE(Why("", {eDT_C32R, eDT_32R}).find("Channel 2 is 32R"), std::string::npos);
    EXPECT_NE(Why("S2", {eDT_C32R, eDT_32R}).find("Channel 2 is 32R: scattering"), std::string::npos);
    EXPECT_NE(Why("I", {eDT_16U, eDT_C16S}).find("Channel 2 is C16S: intensities"), std::string::npos);
    EXPECT_NE(Why("amplitude", {eDT_C16S}).find("Channel 1 is C16S: amplitudes"), std::string::npos);
    EXPECT_NE(Why("C", std::vector<DataType>(4, eDT_32R)).find("no matrix"), std::string::npos);
    EXPECT_NE(Why("C3", std::vector<DataType>(4, eDT_32R)).find("no matrix"), std::string::npos);
    EXPECT_NE(Why("", {eDT_32R}, {eScatteringElements, {}, {}}).find("Channel 1 is 32R"), std::string::npos);
    EXPECT_NE(Why("", {eDT_32R}, {ePowerByRecord, {}, {1, 2}}).find("2 weights for 1"), std::string::npos);
    EXPECT_NE(Why("", {eDT_32R}, {ePowerByRecord, {2}, {}}).find("bounds"), std::string::npos);
    EXPECT_NE(Why("", {eDT_32R}, {ePowerByRecord, {1, 1}, {}}).find("twice"), std::string::npos);
    EXPECT_EQ(Why("unknown", {eDT_C32R, eDT_C32R}), "");
    EXPECT_EQ(Error([] { TotalPowerRasterReader oReader(static_cast<IRasterReader*>(nullptr), true); }),
              "data: The source reader is NULL");
    EXPECT_EQ(Error([] { TotalPowerRasterReader oReader(static_cast<IDataset*>(nullptr), true); }),
              "data: The dataset is NULL");
}

TEST_F(TotalPowerRasterReaderTest, APixelIsInvalidWhenAnyChannelIs)
{
    moModel->moTypes = {eDT_32R, eDT_32R, eDT_8U};
    moModel->moAuxiliary.SetChanMetadataValue("ColorInterp", "Alpha", 3);
    const auto poPlain = MakeDataset();
    for (const unsigned int nChannel : {1u, 2u})
    {
        const RasterPtr oOne(BasicReader(poPlain.get(), {nChannel}, false).ReadRaster(4 * nChannel, 3, 1, 1));
        moModel->moAuxiliary.SetChanMetadataValue(
            "NO_DATA_VALUE", SampleValue::FromReal(*reinterpret_cast<const float*>(oOne->GetBuffer())).GetText(),
            nChannel);
    }
    moModel->moBitmaps = {{1, ""}};
    const auto poDataset = MakeDataset();
    TotalPowerRasterReader oPower(poDataset.get(), false);
    BasicReader oSource(poDataset.get(), {1, 2}, false);
    ReaderValidity oSourceValidity(oSource, eAnyChannel), oPowerValidity(oPower);
    const RasterPtr oFound(oPower.ReadRaster(0, 0, 21, 17)), oPixels(oSource.ReadRaster(0, 0, 21, 17));
    const auto oExpected = oSourceValidity.Read(*oPixels);
    const auto oMask = oPowerValidity.Read(*oFound);
    EXPECT_FALSE(oMask->GetBit(4, 3) || oMask->GetBit(8, 3));
    std::vector<double> oValues = PowerOf(*oPixels, {{1, false}, {1, false}});
    for (std::size_t n = 0; n < oValues.size(); ++n)
    {
        ASSERT_EQ(oMask->GetBit(n % 21, n / 21), oExpected->GetBit(n % 21, n / 21));
        if (!oExpected->GetBit(n % 21, n / 21))
            oValues[n] = std::nan("");
    }
    ExpectEqual(ValuesOf(*oFound), oValues, false);

    // What the contract's functions say to "nan".
    float nValue = 5;
    EXPECT_TRUE(krv::qrfutils::GetNoDataValue(oPower, nValue, 1));
    EXPECT_EQ(nValue, 0);
    EXPECT_NE(Error([&] { GetNoDataMaskBuilder(oPower.GetAuxiliaryData(), eAnyChannel); }), "");
    EXPECT_TRUE(GetTypedNoData(oPower.GetAuxiliaryData(), 1)->IsNaN());
    EXPECT_EQ(oPower.GetAuxiliaryData().GetFileMetadataValue("scene"), "alps");
}

TEST_F(TotalPowerRasterReaderTest, LevelsAreOfferedWhereTheyHoldPower)
{
    moModel->moLevels = {2, 3, 4, 5};
    moModel->moAuxiliary.SetChanMetadataValue("_Overview_2", "valid AVERAGE", 1);
    moModel->moAuxiliary.SetChanMetadataValue("_Overview_3", "valid RMS", 1);
    moModel->moAuxiliary.SetChanMetadataValue("_Overview_4", "valid NEAREST", 1);
    const auto Levels = [&](const DataType& oType, ePowerSource eSource)
    {
        moModel->moTypes.assign(3, oType);
        const auto poDataset = MakeDataset();
        TotalPowerRasterReader oPower(poDataset.get(), false, {eSource, {1}, {}});
        const std::unique_ptr<IOverviewReaderAccessor> oLevels(oPower.GetOverviewReaderAccessor());
        for (const unsigned int nLevel : oLevels->GetLevels())
        {
            EXPECT_TRUE(oLevels->IsLevelValid(nLevel) && oLevels->IsValid(1, nLevel));
            const std::unique_ptr<IRasterReader> oLevel(oLevels->CreateRasterReader(nLevel));
            BasicReader oSource(poDataset.get(), {1}, false);
            const std::unique_ptr<IOverviewReaderAccessor> oSources(oSource.GetOverviewReaderAccessor());
            const std::unique_ptr<IRasterReader> oSourceLevel(oSources->CreateRasterReader(nLevel));
            const RasterPtr oFound(oLevel->GetRaster(0)), oPixels(oSourceLevel->GetRaster(0));
            ExpectEqual(ValuesOf(*oFound), PowerOf(*oPixels, {{1, oType.IsComplex() || eSource == eAmplitudes}}),
                        false);
        }
        return oLevels->GetLevels();
    };
    EXPECT_EQ(Levels(eDT_C16S, ePowerByRecord), (Channels{3, 4}));
    EXPECT_EQ(Levels(eDT_16U, eAmplitudes), (Channels{3, 4}));
    EXPECT_EQ(Levels(eDT_32R, ePowerByRecord), (Channels{2, 3, 4, 5}));
}

TEST_F(TotalPowerRasterReaderTest, NothingLeaksAtTheNthCall)
{
    moModel->moTypes = {eDT_32R, eDT_C32R, eDT_32R};
    moModel->moAuxiliary.SetFileMetadataValue("Matrix_Type", "T2");
    moModel->moBitmaps = {{1, ""}};
    moModel->moLevels = {2};
    const auto Use = [](IRasterReader& oReader)
    {
        const RasterPtr oTile(oReader.GetRaster(0));
        const std::unique_ptr<IOverviewReaderAccessor> oLevels(oReader.GetOverviewReaderAccessor());
        const std::unique_ptr<IRasterReader> oLevel(oLevels->CreateRasterReader(2));
        const RasterPtr oLevelTile(oLevel->GetRaster(0));
    };
    const auto OverFile = [&]
    {
        TotalPowerRasterReader oReader(moFile);
        Use(oReader);
    };
    const auto OverDataset = [&]
    {
        std::unique_ptr<IDataset> oDataset = MakeDataset();
        TotalPowerRasterReader oReader(oDataset.get(), true);
        static_cast<void>(oDataset.release());
        Use(oReader);
    };
    const auto OverReader = [&]
    {
        auto oSource = std::make_unique<MultiTypeReader>(moFile, Channels{1, 2, 3});
        TotalPowerRasterReader oReader(oSource.get(), true);
        static_cast<void>(oSource.release());
        Use(oReader);
    };
    FailAtEveryCall(OverFile, [] {});
    FailAtEveryCall(OverDataset, [] {});
    FailAtEveryCall(OverReader, [] {});
}

} // namespace krv::test
