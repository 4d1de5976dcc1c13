#include "datasources/overviews/overviewbuilder.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/writer/basicwriter.h"
#include "datasources/writer/ioverviewwriteraccessor.h"
#include "tests/datasources/reader/readertest.h"
#include "tests/support/conversionmodel.h"
#include "tests/support/facts.h"

#include <cmath>
#include <cstring>
#include <filesystem>
#include <optional>
#include <random>

namespace krv::test
{

namespace
{

using krv::datasources::BasicReader;
using krv::datasources::BasicWriter;
using krv::datasources::BuildOverviews;
using krv::datasources::IBitmapDataset;
using krv::datasources::IDataset;
using krv::datasources::IOverviewWriterAccessor;
using krv::datasources::IRasterDataset;
using krv::datasources::IRasterWriter;
using krv::datasources::OverviewOptions;
using krv::gobs::DataType;
using krv::gobs::Raster;
using Real = long double; // holds every sample of every type
__extension__ using Whole = __int128;

// Samples of an image, complex ones as two, and which of them count.
struct Picture
{
    unsigned int mnWidth;
    unsigned int mnHeight;
    unsigned int mnSamples;
    std::vector<Real> moValues;
    std::vector<bool> moValid;

    std::size_t At(unsigned int nX, unsigned int nY, unsigned int n) const
    {
        return (std::size_t{nY} * mnWidth + nX) * mnSamples + n;
    }
};

// Samples are stored as the type can hold them, and come back so.
void ConvertAs(const DataType& oType, std::vector<Real>& oValues, std::string& bytes, bool bToBytes)
{
    const Part& oPart = *Type(oType.GetNativeCode()).mpoPart;
    for (std::size_t n = 0; n < oValues.size(); ++n)
    {
        auto* const pSample = reinterpret_cast<unsigned char*>(bytes.data()) + n * oPart.mnBytes;
        if (bToBytes)
            oPart.Store(pSample, oValues[n]);
        oValues[n] = oPart.Load(pSample);
    }
}

struct Case
{
    const char* mpMethod;
    krv::gobs::NativeDataTypeCode meType;
    unsigned int mnChannels;
    std::optional<int> moNoData;
    bool mbMask;
    std::vector<unsigned int> moFactors;
    unsigned int mnWidth = 101;
    unsigned int mnHeight = 77;
};

// A pixel of a level by the definition of its method, from the whole image. Complex values: only by methods that take
// them part by part.
class BruteForce
{
public:
    BruteForce(const Picture& oImage, const Case& oCase, unsigned int nFactor)
        : moImage(oImage), method(oCase.mpMethod), moType(oCase.meType), mnFactor(nFactor)
    {
    }

    // Nothing when it is not valid.
    std::optional<Real> Get(unsigned int nX, unsigned int nY, unsigned int n)
    {
        if (method == "NEAREST")
        {
            const auto nAt = moImage.At(std::min((2 * nX + 1) * mnFactor / 2, moImage.mnWidth - 1),
                                        std::min((2 * nY + 1) * mnFactor / 2, moImage.mnHeight - 1), n);
            return moImage.moValid[nAt] ? std::optional<Real>(moImage.moValues[nAt]) : std::nullopt;
        }
        if (method == "BILINEAR" || method == "CUBIC" || method == "LANCZOS")
            return Weigh(nX, nY, n);
        std::vector<Real> oBox;
        for (unsigned int y = nY * mnFactor; y < std::min((nY + 1) * mnFactor, moImage.mnHeight); ++y)
            for (unsigned int x = nX * mnFactor; x < std::min((nX + 1) * mnFactor, moImage.mnWidth); ++x)
                if (moImage.moValid[moImage.At(x, y, n)])
                    oBox.push_back(moImage.moValues[moImage.At(x, y, n)]);
        return oBox.empty() ? std::nullopt : std::optional<Real>(Reduce(oBox));
    }

private:
    Real Reduce(std::vector<Real>& oBox) const
    {
        std::sort(oBox.begin(), oBox.end());
        if (method == "MIN" || method == "MAX")
            return method == "MIN" ? oBox.front() : oBox.back();
        if (method == "MODE")
        {
            auto oBest = std::pair(oBox.begin(), oBox.begin());
            for (auto oRun = oBest; oRun.second != oBox.end();)
            {
                oRun = std::equal_range(oRun.second, oBox.end(), *oRun.second);
                if (oRun.second - oRun.first > oBest.second - oBest.first)
                    oBest = oRun;
            }
            return *oBest.first;
        }
        Real nSum = 0;
        Whole nWhole = 0;
        for (const Real nValue : oBox)
        {
            nSum += method == "RMS" ? nValue * nValue : nValue;
            nWhole += moType.IsReal() ? 0 : static_cast<Whole>(nValue);
        }
        const auto nCount = static_cast<Whole>(oBox.size());
        if (method == "RMS")
            return Round(std::sqrt(nSum / static_cast<Real>(nCount)));
        if (moType.IsReal())
            return Round(nSum / static_cast<Real>(nCount));
        Whole nMean = nWhole / nCount - 1;
        while (2 * (nWhole - nMean * nCount) > nCount || (2 * (nWhole - nMean * nCount) == nCount && nMean % 2 != 0))
            ++nMean;
        return static_cast<Real>(nMean);
    }

    Real Round(Real nValue) const
    {
        if (!moType.IsReal())
            return std::nearbyint(nValue);
        return moType.GetBits() == 32 ? static_cast<float>(nValue) : static_cast<double>(nValue);
    }

    Real Weight(Real nDistance) const
    {
        const Real d = std::fabs(nDistance);
        if (method == "BILINEAR")
            return d < 1 ? 1 - d : 0;
        if (method == "CUBIC")
            return d <= 1  ? 1.5L * d * d * d - 2.5L * d * d + 1
                   : d < 2 ? -0.5L * d * d * d + 2.5L * d * d - 4 * d + 2
                           : 0;
        const Real nPi = 3.14159265358979323846264L;
        return d == 0 ? 1 : d < 3 ? std::sin(nPi * d) * std::sin(nPi * d / 3) * 3 / (nPi * nPi * d * d) : 0;
    }

    std::optional<Real> Weigh(unsigned int nX, unsigned int nY, unsigned int n) const
    {
        const Real nRadius = method == "BILINEAR" ? 1 : method == "CUBIC" ? 2 : 3;
        Real nSum = 0, nValid = 0, nTotal = 0, nLow = INFINITY, nHigh = -INFINITY;
        const auto nReach = static_cast<unsigned int>(nRadius) * mnFactor;
        for (unsigned int y = nY * mnFactor - std::min(nY * mnFactor, nReach);
             y < std::min((nY + 1) * mnFactor + nReach, moImage.mnHeight); ++y)
            for (unsigned int x = nX * mnFactor - std::min(nX * mnFactor, nReach);
                 x < std::min((nX + 1) * mnFactor + nReach, moImage.mnWidth); ++x)
            {
                const Real nDX = (x - (nX + 0.5L) * mnFactor + 0.5L) / mnFactor;
                const Real nDY = (y - (nY + 0.5L) * mnFactor + 0.5L) / mnFactor;
                if (std::fabs(nDX) >= nRadius || std::fabs(nDY) >= nRadius)
                    continue;
                const Real nWeight = Weight(nDX) * Weight(nDY);
                const auto nAt = moImage.At(x, y, n);
                nTotal += nWeight;
                if (!moImage.moValid[nAt])
                    continue;
                nValid += nWeight;
                nSum += nWeight * moImage.moValues[nAt];
                nLow = std::min(nLow, moImage.moValues[nAt]);
                nHigh = std::max(nHigh, moImage.moValues[nAt]);
            }
        if (nValid <= 0 || nValid < 0.5L * nTotal)
            return std::nullopt;
        return std::clamp(nSum / nValid, nLow, nHigh);
    }

    const Picture& moImage;
    std::string method;
    DataType moType;
    unsigned int mnFactor;
};

class OverviewBuilderTest : public ReaderTest
{
protected:
    OverviewBuilderTest()
    {
        moHome.Add(std::string(KRV_TEST_HOME) + "/lib/qrfformats/tif.so", "<Dataset><SupportsCreate/></Dataset>");
        krv::datasources::DatasetManager::DestroyInstance();
    }

    // Few different values, so that modes and no-data values are met; wide ones now and then.
    static Picture MakeImage(const Case& oCase, const DataType& oType)
    {
        std::mt19937_64 oRandom(7);
        Picture oImage{oCase.mnWidth, oCase.mnHeight, oCase.mnChannels * oType.GetParts(), {}, {}};
        oImage.moValues.resize(std::size_t{oCase.mnWidth} * oCase.mnHeight * oImage.mnSamples);
        oImage.moValid.assign(oImage.moValues.size(), true);
        const unsigned int nMagnitude = oType.GetBits() - (oType.IsSigned() ? 1 : 0);
        const Real nRange = oType.IsReal() ? 4096.0L : std::ldexp(1.0L, static_cast<int>(nMagnitude));
        for (Real& nValue : oImage.moValues)
            if (oRandom() % 4 == 0)
                nValue = std::floor(nRange * (static_cast<Real>(oRandom()) / std::ldexp(1.0L, 64)) * 1024) / 1024;
            else
                nValue = static_cast<Real>(oRandom() % 5) + (oType.IsReal() ? 0.375L : 0);
        return oImage;
    }

    std::string Make(const Case& oCase, Picture& oImage, std::string& bytes, const char* pName = "image.tif")
    {
        const DataType oType(oCase.meType);
        oImage = MakeImage(oCase, oType);
        bytes.resize(oImage.moValues.size() * oType.GetBits() / 8);
        ConvertAs(oType, oImage.moValues, bytes, true);
        const std::string file = moHome.GetFolder().GetPath() + "/" + pName;
        std::filesystem::remove(file);
        std::vector<unsigned int> oChannels;
        for (unsigned int n = 1; n <= oCase.mnChannels; ++n)
            oChannels.push_back(n);
        BasicWriter oWriter(file, oChannels, "TIF", "BLOCKXSIZE=32 BLOCKYSIZE=16 COMPRESS=DEFLATE");
        oWriter.CreateNewFile({oCase.mnWidth, oCase.mnHeight, oCase.mnChannels, oType});
        const Raster oRaster({oCase.mnWidth, oCase.mnHeight, oCase.mnChannels, oType}, {0, 0},
                             reinterpret_cast<unsigned char*>(bytes.data()), false);
        oWriter.WriteRaster(&oRaster);
        if (oCase.moNoData)
        {
            krv::datasources::AuxiliaryData oData(oCase.mnChannels);
            oData.SetFileMetadataValue("NO_DATA_VALUE", std::to_string(*oCase.moNoData));
            oWriter.SetAuxiliaryData(oData);
            for (std::size_t n = 0; n < oImage.moValid.size(); ++n)
                oImage.moValid[n] = oImage.moValues[n] != *oCase.moNoData;
        }
        if (oCase.mbMask)
            AddMask(oWriter, oImage);
        oWriter.Synchronize();
        return file;
    }

    static void AddMask(BasicWriter& oWriter, Picture& oImage)
    {
        auto& oBitmaps = dynamic_cast<IBitmapDataset&>(*oWriter.GetDataset());
        const unsigned int nBitmap = oBitmaps.CreateBitmap();
        oBitmaps.SetBitmapDescription(nBitmap, "");
        std::vector<unsigned char> oBits(std::size_t{oImage.mnWidth} * oImage.mnHeight);
        for (std::size_t n = 0; n < oBits.size(); ++n)
            oBits[n] = n % oImage.mnWidth > 20 && n % 7 != 0;
        for (std::size_t n = 0; n < oImage.moValid.size(); ++n)
            if (oBits[n / oImage.mnSamples] == 0)
                oImage.moValid[n] = false;
        const std::unique_ptr<krv::datasources::IRasterIO> oIO(oBitmaps.GetBitmapIO({nBitmap}));
        oIO->WriteWindow(0u, 0u, oImage.mnWidth, oImage.mnHeight, oBits.data());
    }

    static std::string ReadLevel(BasicWriter& oWriter, unsigned int nFactor)
    {
        const std::unique_ptr<IOverviewWriterAccessor> oLevels(oWriter.GetOverviewWriterAccessor());
        EXPECT_TRUE(oLevels->IsLevelValid(nFactor)) << nFactor;
        const std::unique_ptr<IRasterWriter> oLevel(oLevels->CreateRasterWriter(nFactor));
        return ReadPixels(*oLevel);
    }

    // The level of the mask says where the level is valid.
    static void ExpectMask(BasicWriter& oWriter, unsigned int nFactor, const std::vector<unsigned char>& oExpected)
    {
        auto& oBitmaps = dynamic_cast<IBitmapDataset&>(*oWriter.GetDataset());
        const std::unique_ptr<krv::datasources::IOverviewManager> oManager(oBitmaps.GetBitmapOverviewManager());
        ASSERT_TRUE(oManager->IsValid(1, nFactor));
        const std::unique_ptr<krv::datasources::IRasterIO> oIO(oManager->GetOverviewIO(nFactor, {1}));
        std::vector<unsigned char> oBits(oExpected.size());
        oIO->ReadWindow(0u, 0u, oIO->GetFileWidth(), oIO->GetFileHeight(), oBits.data());
        EXPECT_EQ(oBits, oExpected);
    }

    static void ExpectLevel(BasicWriter& oWriter, const Case& oCase, const Picture& oImage, unsigned int nFactor)
    {
        const DataType oType(oCase.meType);
        const unsigned int nWidth = (oImage.mnWidth + nFactor - 1) / nFactor;
        const unsigned int nHeight = (oImage.mnHeight + nFactor - 1) / nFactor;
        std::string bytes = ReadLevel(oWriter, nFactor);
        std::vector<Real> oValues(std::size_t{nWidth} * nHeight * oImage.mnSamples);
        ASSERT_EQ(bytes.size(), oValues.size() * oType.GetBits() / 8);
        ConvertAs(oType, oValues, bytes, false);
        BruteForce oBrute(oImage, oCase, nFactor);
        std::vector<unsigned char> oMask(std::size_t{nWidth} * nHeight);
        for (std::size_t n = 0; n < oValues.size(); ++n)
        {
            const std::size_t nPixel = n / oImage.mnSamples;
            const std::optional<Real> oExact =
                oBrute.Get(static_cast<unsigned int>(nPixel % nWidth), static_cast<unsigned int>(nPixel / nWidth),
                           static_cast<unsigned int>(n % oImage.mnSamples));
            oMask[nPixel] |= oExact.has_value();
            Real nExpected = oExact.value_or(oCase.moNoData.value_or(0));
            const Real nOff = std::fabs(oValues[n] - nExpected);
            const bool bNudged = oExact && oCase.moNoData && oValues[n] == *oCase.moNoData + 1 && nOff <= 1.5L;
            // Reals of 64 bits may differ in the last bit, weighed values somewhat more; halves go to the even side.
            const Real nTolerance = oType.IsReal() ? std::fabs(nExpected) * (oType.GetBits() == 32 ? 1e-7L : 1e-13L)
                                    : nExpected != std::nearbyint(nExpected) ? 0.5L + 1e-9L
                                                                             : 0;
            const bool bEven = oType.IsReal() || nOff != 0.5L || std::fmod(oValues[n], 2.0L) == 0 || nFactor % 2 != 0;
            ASSERT_TRUE((nOff <= nTolerance && bEven) || bNudged)
                << oCase.mpMethod << " " << oType.Describe() << " level " << nFactor << " sample " << n << ": "
                << oValues[n] << " instead of " << nExpected;
            ASSERT_FALSE(oExact && oCase.moNoData && oValues[n] == *oCase.moNoData) << n;
        }
        if (oCase.mbMask)
            ExpectMask(oWriter, nFactor, oMask);
    }
};

} // namespace

TEST_F(OverviewBuilderTest, LevelsEqualTheirDefinition)
{
    using namespace krv::gobs;
    const std::vector<unsigned int> oAll{2, 3, 4, 5, 8};
    const std::vector<unsigned int> oPowers{2, 4, 8, 16, 32, 64};
    std::vector<Case> oCases = {
        {"AVERAGE", eDT_8U, 4, {}, false, {4, 32}, 256, 320},
        {"AVERAGE", eDT_8U, 3, 77, false, oPowers, 421, 333},
        {"AVERAGE", eDT_16U, 2, 1000, false, oPowers, 421, 333}, // blocks with and without
        {"AVERAGE", eDT_16U, 1, {}, false, {2, 128, 256, 512}, 1100, 520},
        {"AVERAGE", eDT_32R, 3, 7, true, {2, 64}, 421, 333},
        {"AVERAGE", eDT_64S, 1, 4, false, oAll},
        {"NEAREST", eDT_8U, 3, 2, true, oAll},
        {"NEAREST", eDT_C64R, 1, {}, false, oAll},
        {"MODE", eDT_8U, 3, 2, true, oAll},
        {"MODE", eDT_8U, 2, {}, false, {2, 4, 8, 16, 32, 64, 128}, 301, 277},
        {"MODE", eDT_8U, 3, 3, false, {2, 4, 5, 16, 32}, 301, 277},
        {"MODE", eDT_16S, 1, 1, false, oAll},
        {"MODE", eDT_64R, 1, {}, false, oAll},
        {"MODE", eDT_64S, 1, {}, false, {16}},
        {"RMS", eDT_8U, 1, {}, true, oAll},
        {"RMS", eDT_32R, 2, {}, false, oAll},
        {"MIN", eDT_16S, 2, 0, false, oAll},
        {"MAX", eDT_64U, 1, {}, true, oAll},
        {"BILINEAR", eDT_8U, 3, {}, false, oAll},
        {"BILINEAR", eDT_16S, 1, 2, true, oAll},
        {"CUBIC", eDT_8U, 1, {}, false, oAll},
        {"CUBIC", eDT_32R, 2, {}, true, oAll},
        {"CUBIC", eDT_C32R, 1, {}, false, {3}},
        {"LANCZOS", eDT_8U, 2, 2, false, oAll},
        {"LANCZOS", eDT_64R, 1, {}, false, {2, 5}},
    };
    // What has loops of its own, and everything else.
    for (const auto eType : {eDT_8U, eDT_16U, eDT_32R})
        for (unsigned int nChannels = 1; nChannels <= 3; ++nChannels)
            oCases.push_back({"AVERAGE", eType, nChannels, {}, nChannels == 1 && eType == eDT_8U, oPowers, 421, 333});
    for (const auto eType : {eDT_8U, eDT_8S, eDT_16S, eDT_32U, eDT_32S, eDT_64U, eDT_64R, eDT_C16S, eDT_C32R})
        for (const bool bMask : {false, true})
            oCases.push_back({"AVERAGE", eType, bMask ? 2u : 1u, {}, bMask, oAll});
    for (const bool bMask : {false, true})
        oCases.push_back({"AVERAGE", eDT_8U, 3, 2, bMask, oAll});
    for (const Case& oCase : oCases)
    {
        Picture oImage;
        std::string bytes;
        BasicWriter oWriter(Make(oCase, oImage, bytes));
        ASSERT_TRUE(BuildOverviews(oWriter, oCase.moFactors, oCase.mpMethod));
        for (const unsigned int nFactor : oCase.moFactors)
            ExpectLevel(oWriter, oCase, oImage, nFactor);
        if (HasFatalFailure())
            return;
    }
}

TEST_F(OverviewBuilderTest, OptionsChangeWhatIsValidAndWhatIsAveraged)
{
    Case oCase{"average", krv::gobs::eDT_32R, 1, {}, false, {2}, 4, 2};
    const auto Build = [&](const std::vector<float>& oPixels, const DataType& oType, const OverviewOptions& oOptions)
    {
        oCase.mnWidth = static_cast<unsigned int>(oPixels.size() / 2 / oType.GetParts());
        Picture oImage;
        std::string bytes;
        oCase.meType = oType.GetNativeCode();
        BasicWriter oWriter(Make(oCase, oImage, bytes));
        std::vector<float> oCopy = oPixels;
        const Raster oRaster({oCase.mnWidth, 2, 1, oType}, {0, 0}, reinterpret_cast<unsigned char*>(oCopy.data()),
                             false);
        oWriter.WriteRaster(&oRaster);
        oWriter.SetTileSize(0, 0); // counts as a pixel
        EXPECT_TRUE(BuildOverviews(oWriter, {2}, oCase.mpMethod, oOptions));
        const std::unique_ptr<krv::datasources::IOverviewManager> oManager(
            dynamic_cast<IRasterDataset&>(*oWriter.GetDataset()).GetOverviewManager());
        EXPECT_EQ(oManager->GetResamplingName(), oOptions.mbPower                       ? "RMS"
                                                 : std::string(oCase.mpMethod) == "max" ? "MAX"
                                                                                        : "AVERAGE");
        const std::string level = ReadLevel(oWriter, 2);
        std::vector<float> oLevel(level.size() / sizeof(float));
        std::memcpy(oLevel.data(), level.data(), level.size());
        return oLevel;
    };
    const float nNaN = NAN;
    OverviewOptions oOptions;
    EXPECT_TRUE(std::isnan(Build({nNaN, 1, 2, 3, 3, 5, 4, 5}, krv::gobs::eDT_32R, oOptions)[0]));
    oOptions.mbNaNIsNoData = true;
    EXPECT_EQ(Build({nNaN, 1, nNaN, nNaN, 3, 5, 4, nNaN}, krv::gobs::eDT_32R, oOptions), (std::vector<float>{3, 4}));
    oOptions.mbHalfValid = true;
    const auto oHalf = Build({nNaN, 1, nNaN, nNaN, 3, 5, 4, nNaN}, krv::gobs::eDT_32R, oOptions);
    EXPECT_EQ(oHalf[0], 3);
    EXPECT_TRUE(std::isnan(oHalf[1]));
    OverviewOptions oPower;
    oPower.mbPower = true;
    const auto oRoot = Build({3, 4, -3, -4, 3, 4, 3, 4}, krv::gobs::eDT_C32R, oPower);
    EXPECT_FLOAT_EQ(oRoot[0], 3);
    EXPECT_FLOAT_EQ(oRoot[1], 4);
    oCase.mpMethod = "max";
    EXPECT_EQ(Build({3, 4, -5, 1, 1, 0, 2, 2}, krv::gobs::eDT_C32R, {}), (std::vector<float>{-5, 1}));
}

// All of the level is spoilt before; what the change does not reach stays so.
TEST_F(OverviewBuilderTest, ChangedPartIsRebuiltAlone)
{
    for (const char* const pMethod : {"average", "mode", "bilinear", "lanczos"})
    {
        const unsigned int nRadius = std::string(pMethod) == "bilinear" ? 1 : std::string(pMethod) == "lanczos" ? 3 : 0;
        Case oCase{pMethod, krv::gobs::eDT_64R, 2, {}, true, {2, 3, 4, 8}, 301, 277};
        Picture oImage;
        std::string bytes;
        BasicWriter oWriter(Make(oCase, oImage, bytes));
        ASSERT_TRUE(BuildOverviews(oWriter, oCase.moFactors, pMethod));
        Raster oPart({31, 25, 2, krv::gobs::eDT_64R}, {111, 150});
        std::memset(oPart.GetBuffer(), 0, oPart.GetBufferSize());
        oWriter.WriteRaster(&oPart);
        ASSERT_TRUE(BuildOverviews(oWriter, oCase.moFactors, pMethod));
        std::vector<std::string> oWhole;
        const std::unique_ptr<IOverviewWriterAccessor> oLevels(oWriter.GetOverviewWriterAccessor());
        for (const unsigned int nFactor : oCase.moFactors)
        {
            oWhole.push_back(ReadLevel(oWriter, nFactor));
            const std::unique_ptr<IRasterWriter> oLevel(oLevels->CreateRasterWriter(nFactor));
            Raster oSpoilt({oLevel->GetWidth(), oLevel->GetHeight(), 2, krv::gobs::eDT_64R}, {0, 0});
            std::memset(oSpoilt.GetBuffer(), 0x5A, oSpoilt.GetBufferSize());
            oLevel->WriteRaster(&oSpoilt);
        }
        OverviewOptions oOptions;
        oOptions.moChanged = OverviewOptions::Rectangle{111, 150, 31, 25};
        ASSERT_TRUE(BuildOverviews(oWriter, oCase.moFactors, pMethod, oOptions));
        for (std::size_t n = 0; n < oCase.moFactors.size(); ++n)
        {
            const unsigned int f = oCase.moFactors[n];
            const std::string level = ReadLevel(oWriter, f);
            const unsigned int nWidth = (oCase.mnWidth + f - 1) / f;
            for (std::size_t nPixel = 0; nPixel < level.size() / 16; ++nPixel)
            {
                const std::size_t nX = nPixel % nWidth;
                const std::size_t nY = nPixel / nWidth;
                const bool bReached = nX + nRadius >= 111 / f && nX < (111 + 31 + f - 1) / f + nRadius &&
                                      nY + nRadius >= 150 / f && nY < (150 + 25 + f - 1) / f + nRadius;
                const std::string expected = bReached ? oWhole[n].substr(nPixel * 16, 16) : std::string(16, 0x5A);
                ASSERT_EQ(level.substr(nPixel * 16, 16), expected)
                    << pMethod << " level " << f << " pixel " << nX << ", " << nY;
            }
        }
    }
}

TEST_F(OverviewBuilderTest, CancelAndFailuresLeaveTheFileAsItWas)
{
    const Case oCase{"average", krv::gobs::eDT_8U, 2, 3, true, {2, 4}, 70, 40};
    Picture oImage;
    std::string bytes;
    const std::string file = Make(oCase, oImage, bytes);
    const auto HasLevels = [&]
    {
        BasicReader oReader(file);
        const std::unique_ptr<krv::datasources::IOverviewReaderAccessor> oLevels(oReader.GetOverviewReaderAccessor());
        return !oLevels->GetLevels().empty();
    };
    {
        BasicWriter oWriter(file);
        unsigned int nCalls = 0;
        OverviewOptions oOptions;
        oOptions.moProgress = [&](std::uint64_t nDone, std::uint64_t nTotal)
        {
            EXPECT_LE(nDone, nTotal);
            return ++nCalls < 2;
        };
        EXPECT_FALSE(BuildOverviews(oWriter, {2, 4}, "average", oOptions));
        const std::unique_ptr<IOverviewWriterAccessor> oLevels(oWriter.GetOverviewWriterAccessor());
        EXPECT_FALSE(oLevels->IsLevelValid(2));
        EXPECT_NE(Error([&] { BuildOverviews(oWriter, {2}, "smooth"); }), "");
        EXPECT_NE(Error([&] { BuildOverviews(oWriter, {1}, "mode"); }), "");
        EXPECT_NE(Error([&] { BuildOverviews(oWriter, {129}, "mode"); }), "");
        const std::unique_ptr<IRasterWriter> oLevel(oLevels->CreateRasterWriter(2));
        EXPECT_EQ(Error([&] { BuildOverviews(*oLevel, {2}, "mode"); }),
                  "data: Overviews are built of image channels at full size");
    }
    EXPECT_FALSE(HasLevels());
    bool bThrown = true;
    for (unsigned int nCall = 1; bThrown; ++nCall)
    {
        {
            auto oDataset = Decorate(
                moProbe,
                std::unique_ptr<IDataset>(krv::datasources::DatasetManager::GetInstance()->Open(file, eUpdate)));
            moProbe.Arm(nCall);
            Error(
                [&]
                {
                    BasicWriter oWriter(dynamic_cast<IRasterDataset*>(oDataset.get()), Channels{1, 2});
                    BuildOverviews(oWriter, {2, 4}, "average");
                });
            bThrown = moProbe.HasThrown();
            ASSERT_EQ(moProbe.GetLive(), 1) << "call " << nCall;
            ASSERT_FALSE(moProbe.HasOrphans()) << "call " << nCall;
        }
        ASSERT_FALSE(HasLevels()) << "call " << nCall;
    }
}

} // namespace krv::test
