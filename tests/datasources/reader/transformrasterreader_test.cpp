#include "datasources/reader/derived/transformrasterreader.h"

#include "datasources/metadata/typednodata.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/readervalidity.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/pixelvalue.h"
#include "gobs/resampling/gridmap.h"
#include "gobs/resampling/leveltarget.h"
#include "tests/datasources/reader/readertest.h"
#include "tests/support/memoryreader.h"

#include <cmath>
#include <cstring>
#include <map>
#include <random>

namespace krv::test
{

namespace
{

using namespace krv::datasources;
using namespace krv::gobs;
using krv::ogc::cs::GeocodingInfo;

// An image as numbers, part by part, and which values of it are valid.
struct Numbers
{
    unsigned int width = 0;
    unsigned int height = 0;
    unsigned int values = 0; // of a pixel
    unsigned int parts = 1;  // of a value
    std::vector<double> samples;
    std::vector<bool> valid;

    double At(long long x, long long y, unsigned int nValue, unsigned int nPart) const
    {
        return samples[((static_cast<std::size_t>(y) * width + static_cast<std::size_t>(x)) * values + nValue) * parts +
                       nPart];
    }
    bool IsValid(long long x, long long y, unsigned int nValue) const
    {
        return x >= 0 && y >= 0 && x < width && y < height &&
               valid[(static_cast<std::size_t>(y) * width + static_cast<std::size_t>(x)) * values + nValue];
    }
};

Numbers NumbersOf(const Raster& oRaster)
{
    Numbers oNumbers{static_cast<unsigned int>(oRaster.GetFullWidth()),
                     static_cast<unsigned int>(oRaster.GetFullHeight()),
                     oRaster.GetChansCount(),
                     oRaster.GetDataType().GetParts(),
                     {},
                     {}};
    VisitPartType(oRaster.GetDataType(),
                  [&]<class T>(std::type_identity<T>)
                  {
                      const auto* const p = reinterpret_cast<const T*>(oRaster.GetBuffer());
                      const std::size_t nSamples =
                          std::size_t{oNumbers.width} * oNumbers.height * oNumbers.values * oNumbers.parts;
                      for (std::size_t n = 0; n < nSamples; ++n)
                          oNumbers.samples.push_back(static_cast<double>(p[n]));
                  });
    oNumbers.valid.assign(std::size_t{oNumbers.width} * oNumbers.height * oNumbers.values, true);
    return oNumbers;
}

double Weight(Resampling eMethod, double d)
{
    d = std::fabs(d);
    if (eMethod == Resampling::eBilinear)
        return std::max(0.0, 1 - d);
    if (eMethod == Resampling::eCubic)
    {
        if (d <= 1)
            return 1.5 * d * d * d - 2.5 * d * d + 1;
        return d < 2 ? -0.5 * d * d * d + 2.5 * d * d - 4 * d + 2 : 0;
    }
    if (d >= 3)
        return 0;
    const double p = M_PI * d;
    return d == 0 ? 1 : std::sin(p) / p * std::sin(p / 3) / (p / 3);
}

// One value of the result, by loops over the whole image; NaN parts when it is not valid.
std::vector<double> ValueAt(const Numbers& oImage, const GeocodingInfo& oMap, Resampling eMethod, double u, double v,
                            unsigned int nValue, bool bInteger)
{
    std::vector<double> oResult(oImage.parts, std::nan(""));
    const auto Nearest = [&]
    {
        const auto Clip = [](double n, unsigned int nSize)
        {
            if (n >= -1e-9 && n < 0)
                return 0.0;
            return n >= nSize && n <= nSize + 1e-9 ? nSize - 1.0 : std::floor(n);
        };
        const auto x = static_cast<long long>(Clip(u, oImage.width)),
                   y = static_cast<long long>(Clip(v, oImage.height));
        for (unsigned int n = 0; n < oImage.parts && oImage.IsValid(x, y, nValue); ++n)
            oResult[n] = oImage.At(x, y, nValue, n);
        return oResult;
    };
    if (eMethod == Resampling::eNearest)
        return Nearest();
    const double a = oMap.GetXPerColumn(), b = oMap.GetXPerRow(), c = oMap.GetYPerColumn(), d = oMap.GetYPerRow();
    if (eMethod == Resampling::eAverage || eMethod == Resampling::eMode)
    {
        bool bAnyPixel = false;
        std::map<std::vector<double>, unsigned int> oCounts;
        std::vector<double> oSum(oImage.parts, 0.0);
        unsigned int nCount = 0;
        for (long long y = 0; y < oImage.height; ++y)
        {
            for (long long x = 0; x < oImage.width; ++x)
            {
                const double dx = static_cast<double>(x) + 0.5 - u, dy = static_cast<double>(y) + 0.5 - v;
                const double i = (d * dx - b * dy) / (a * d - b * c), j = (a * dy - c * dx) / (a * d - b * c);
                // The first edge belongs to a footprint, its end to the next one.
                if (i < -0.5 - 1e-9 || i >= 0.5 - 1e-9 || j < -0.5 - 1e-9 || j >= 0.5 - 1e-9)
                    continue;
                bAnyPixel = true;
                if (!oImage.IsValid(x, y, nValue))
                    continue;
                std::vector<double> oOne;
                for (unsigned int n = 0; n < oImage.parts; ++n)
                    oOne.push_back(oImage.At(x, y, nValue, n));
                ++oCounts[oOne];
                ++nCount;
                for (unsigned int n = 0; n < oImage.parts; ++n)
                    oSum[n] += oOne[n];
            }
        }
        if (!bAnyPixel)
            return Nearest();
        unsigned int nMost = 0;
        for (const auto& [oOne, nTimes] : oCounts)
        {
            if (eMethod == Resampling::eMode && nTimes > nMost)
            {
                nMost = nTimes;
                oResult = oOne;
            }
        }
        for (unsigned int n = 0; n < oImage.parts && nCount > 0 && eMethod == Resampling::eAverage; ++n)
            oResult[n] = bInteger ? std::nearbyint(oSum[n] / nCount) : oSum[n] / nCount;
        return oResult;
    }
    const double sx = std::max(1.0, std::hypot(a, b)), sy = std::max(1.0, std::hypot(c, d));
    const double nRadius = eMethod == Resampling::eBilinear ? 1 : (eMethod == Resampling::eCubic ? 2 : 3);
    if (sx > 1000) // the image is next to nothing beneath such a kernel
        return oResult;
    double nTotal = 0, nSum = 0;
    std::vector<double> oSums(oImage.parts, 0.0), oLow(oImage.parts, HUGE_VAL), oHigh(oImage.parts, -HUGE_VAL);
    for (auto y = static_cast<long long>(v - 3 * sy - 2); y <= v + 3 * sy + 2; ++y)
    {
        for (auto x = static_cast<long long>(u - 3 * sx - 2); x <= u + 3 * sx + 2; ++x)
        {
            const double dx = (static_cast<double>(x) + 0.5 - u) / sx, dy = (static_cast<double>(y) + 0.5 - v) / sy;
            const double w = Weight(eMethod, dx) * Weight(eMethod, dy);
            nTotal += w;
            // All that the kernel reaches count for the range, also where it crosses zero.
            if (std::max(std::fabs(dx), std::fabs(dy)) > nRadius - 1e-9 || !oImage.IsValid(x, y, nValue))
                continue;
            nSum += w;
            for (unsigned int n = 0; n < oImage.parts; ++n)
            {
                oSums[n] += w * oImage.At(x, y, nValue, n);
                oLow[n] = std::min(oLow[n], oImage.At(x, y, nValue, n));
                oHigh[n] = std::max(oHigh[n], oImage.At(x, y, nValue, n));
            }
        }
    }
    if (!(nSum > 0) || 2 * nSum < nTotal * (1 - 1e-8))
        return oResult;
    for (unsigned int n = 0; n < oImage.parts; ++n)
    {
        oResult[n] = oSums[n] / nSum;
        if (eMethod != Resampling::eBilinear)
            oResult[n] = std::clamp(oResult[n], oLow[n], oHigh[n]);
    }
    return oResult;
}

constexpr unsigned int WIDTH = 37;
constexpr unsigned int HEIGHT = 29;

// Smooth and rough parts, such as the type holds.
std::string MakeImage(const DataType& oType, unsigned int nChannels)
{
    std::string bytes;
    std::mt19937 oRandom(7);
    VisitPartType(oType,
                  [&]<class T>(std::type_identity<T>)
                  {
                      for (unsigned int n = 0; n < WIDTH * HEIGHT * nChannels * oType.GetParts(); ++n)
                      {
                          const unsigned int nPixel = n / (nChannels * oType.GetParts());
                          const double nWave =
                              60 + 50 * std::sin(nPixel % WIDTH * 0.4) * std::cos(nPixel / WIDTH * 0.3);
                          const bool bRough = nPixel % WIDTH < WIDTH / 2;
                          const double nValue = bRough ? static_cast<double>(oRandom() % 120) : std::floor(nWave);
                          const T nSample = static_cast<T>(std::is_floating_point_v<T> ? nValue * 1.37 : nValue);
                          bytes.append(reinterpret_cast<const char*>(&nSample), sizeof(T));
                      }
                  });
    return bytes;
}

const std::map<std::string, GeocodingInfo>& Maps()
{
    static const std::map<std::string, GeocodingInfo> MAPS = {{"identity", {0, 1, 0, 0, 0, 1}},
                                                              {"shifted", {-2.3, 1, 0, 1.7, 0, 1}},
                                                              {"finer", {1, 0.4, 0, 2, 0, 0.37}},
                                                              {"halves", {0, 0.5, 0, 0, 0, 0.5}},
                                                              {"thirds", {0, 1 / 3.0, 0, 1e-11, 0, 1 / 3.0}},
                                                              {"half aside", {0.5, 1, 0, 1 - 1e-10, 0, 1}},
                                                              {"half aside, turned", {9.5, 0, 1, 2 + 1e-10, 1, 0}},
                                                              {"twos from edges", {0.5 + 1e-11, 2, 0, -0.5, 0, 2}},
                                                              {"threes", {0, 3, 0, 0.5 - 1e-11, 0, 3}},
                                                              {"turned", {9, 0.8, -0.5, -3, 0.45, 0.85}},
                                                              {"mirrored", {37, -1, 0, 29, 0, -1}},
                                                              {"quarter turn", {0, 0, 1, 29, -1, 0}},
                                                              {"coarser", {-1, 2, 0, -1, 0, 3}},
                                                              {"coarser and turned", {5, 1.9, -0.7, -4, 1.1, 2.3}},
                                                              {"elsewhere", {1e17, 1, 0, 0, 0, 1}},
                                                              {"far apart", {-3e9, 4e8, 0, -1e9, 0, 1.7e8}}};
    return MAPS;
}

class TransformRasterReaderTest : public ::testing::Test
{
protected:
    TransformRasterReaderTest() { mpoModel->moAuxiliary = AuxiliaryData(4); }

    std::unique_ptr<MemoryReader> Source(const DataType& oType, unsigned int nChannels)
    {
        Channels oChannels(nChannels);
        for (unsigned int n = 0; n < nChannels; ++n)
            oChannels[n] = n + 1;
        return std::make_unique<MemoryReader>(moDataset, WIDTH, HEIGHT, oChannels, oType, MakeImage(oType, nChannels));
    }

    // Compares every value of the result with the loops.
    void Compare(IRasterReader& oSource, const GeocodingInfo& oMap, Resampling eMethod)
    {
        const bool bInteger = !oSource.GetDataType().IsReal();
        TransformRequest oRequest{23, 19, eMethod};
        TransformRasterReader oReader(&oSource, std::make_shared<AffineMap>(oMap), oRequest, false);
        const RasterPtr oPixels(oSource.ReadRaster(0, 0, WIDTH, HEIGHT));
        Numbers oImage = NumbersOf(*oPixels);
        MarkInvalid(oSource, oImage);
        const RasterPtr oRaster(oReader.ReadRaster(0, 0, 23, 19));
        const Numbers oFound = NumbersOf(*oRaster);
        std::vector<double> oBackground;
        for (unsigned int n = 1; n <= oImage.values; ++n)
        {
            const auto oNoData = GetTypedNoData(oReader.GetAuxiliaryData(), n);
            const double nNone = bInteger ? 0 : std::nan("");
            oBackground.push_back(oNoData && !(bInteger && oNoData->IsNaN()) ? oNoData->GetReal() : nNone);
        }
        for (unsigned int j = 0; j < 19; ++j)
        {
            for (unsigned int i = 0; i < 23; ++i)
            {
                double u = 0, v = 0;
                oMap.RasterToMap(i + 0.5, j + 0.5, u, v);
                const bool bBoxes = eMethod == Resampling::eAverage || eMethod == Resampling::eMode;
                const bool bFar = !bBoxes && (std::fabs(u) > 1e6 || std::fabs(v) > 1e6);
                for (unsigned int n = 0; n < oImage.values; ++n)
                {
                    const auto oExpected = bFar ? std::vector<double>(oImage.parts, std::nan(""))
                                                : ValueAt(oImage, oMap, eMethod, u, v, n, bInteger);
                    for (unsigned int p = 0; p < oImage.parts; ++p)
                        ExpectNear(oFound.At(i, j, n, p), oExpected[p],
                                   p == 0 || bNaN(oBackground[n]) ? oBackground[n] : 0, eMethod, bInteger);
                    if (::testing::Test::HasFatalFailure())
                        FAIL() << "at " << i << " " << j << " channel " << n;
                }
            }
        }
    }

    static bool bNaN(double n) { return std::isnan(n); }

    void ExpectNear(double nFound, double nExpected, double nBackground, Resampling eMethod, bool bInteger)
    {
        if (std::isnan(nExpected))
        {
            if (std::isnan(nBackground))
                ASSERT_TRUE(std::isnan(nFound)) << nFound;
            else
                ASSERT_EQ(nFound, nBackground);
            return;
        }
        const bool bExact = eMethod == Resampling::eNearest || eMethod == Resampling::eMode;
        // An integer is the number rounded, whichever way where it is a half within the accuracy.
        double nTolerance = bExact ? 0 : (bInteger ? 0.5 + 1e-4 : 1e-5 * std::max(1.0, std::fabs(nExpected)));
        // What equals the no-data value by accident is beside it.
        if (bInteger && std::fabs(nExpected - nBackground) <= 0.5 + 1e-4)
            nTolerance = 1 + 1e-4 + 0.5;
        ASSERT_LE(std::fabs(nFound - nExpected), nTolerance) << nFound << " for " << nExpected;
    }

    // No-data of the channels, NaN, and the bitmap.
    void MarkInvalid(IRasterReader& oSource, Numbers& oImage)
    {
        const RasterPtr oBits(
            moBits ? BasicReader(static_cast<IBitmapDataset*>(&moDataset), {1}, false).ReadRaster(0, 0, WIDTH, HEIGHT)
                   : nullptr);
        for (std::size_t n = 0; n < oImage.valid.size(); ++n)
        {
            const auto oNoData =
                GetTypedNoData(oSource.GetAuxiliaryData(), static_cast<unsigned int>(n % oImage.values) + 1);
            const double* const p = &oImage.samples[n * oImage.parts];
            const double nOther = oImage.parts == 2 ? p[1] : 0;
            const bool bNoData = oNoData && p[0] == oNoData->GetReal() && nOther == 0;
            oImage.valid[n] = !bNoData && !std::isnan(p[0]) && !std::isnan(nOther) &&
                              (oBits == nullptr || oBits->GetBuffer()[n / oImage.values] != 0);
        }
    }

    ImageModelPtr mpoModel = std::make_shared<ImageModel>();
    SyntheticDataset moDataset{mpoModel};
    bool moBits = false;
};

class TransformRasterReaderProbe : public ReaderTest
{
};

constexpr Resampling METHODS[] = {Resampling::eNearest, Resampling::eBilinear, Resampling::eCubic,
                                  Resampling::eLanczos, Resampling::eAverage,  Resampling::eMode};

} // namespace

TEST_F(TransformRasterReaderTest, EveryMethodIsWhatStraightLoopsGive)
{
    struct Kind
    {
        NativeDataTypeCode type;
        unsigned int channels;
    };
    const Kind KINDS[] = {{eDT_8U, 1},  {eDT_8U, 3},  {eDT_8U, 4},   {eDT_8S, 1},   {eDT_16U, 2},
                          {eDT_16S, 3}, {eDT_32R, 1}, {eDT_32R, 2},  {eDT_32R, 3},  {eDT_32S, 1},
                          {eDT_64R, 2}, {eDT_64S, 1}, {eDT_C16S, 1}, {eDT_C32R, 2}, {eDT_C64R, 1}};
    for (const Kind& oKind : KINDS)
    {
        const auto oSource = Source(oKind.type, oKind.channels);
        for (const auto& [name, oMap] : Maps())
        {
            for (const Resampling eMethod : METHODS)
            {
                SCOPED_TRACE(DataType(oKind.type).Describe() + " x " + std::to_string(oKind.channels) + ", " + name +
                             ", " + GetResamplingName(eMethod));
                Compare(*oSource, oMap, eMethod);
                if (HasFatalFailure())
                    return;
            }
        }
    }
}

TEST_F(TransformRasterReaderTest, WhatIsNotValidTakesNoPart)
{
    mpoModel->moAuxiliary.SetChanMetadataValue("NO_DATA_VALUE", "60", 1);
    mpoModel->moAuxiliary.SetChanMetadataValue("NO_DATA_VALUE", "nan", 2);
    mpoModel->mnWidth = WIDTH;
    mpoModel->mnHeight = HEIGHT;
    for (const bool bBits : {false, true})
    {
        moBits = bBits;
        if (bBits)
            mpoModel->moBitmaps = {{1, ""}};
        for (const NativeDataTypeCode eType : {eDT_8U, eDT_16S, eDT_32R, eDT_C32R})
        {
            const auto oSource = Source(eType, 3);
            for (const auto& [name, oMap] : Maps())
            {
                for (const Resampling eMethod : METHODS)
                {
                    SCOPED_TRACE(DataType(eType).Describe() + ", " + name + ", " + GetResamplingName(eMethod));
                    Compare(*oSource, oMap, eMethod);
                    if (HasFatalFailure())
                        return;
                }
            }
        }
    }
}

// An image made coarser by a whole number is the level of that factor; boxes that reach outside are the level's alone.
TEST_F(TransformRasterReaderTest, ALevelIsTheSameImage)
{
    for (const NativeDataTypeCode eType : {eDT_16S, eDT_32R, eDT_64R})
    {
        const auto oSource = Source(eType, 2);
        const RasterPtr oPixels(oSource->ReadRaster(0, 0, WIDTH, HEIGHT));
        for (const unsigned int nFactor : {2u, 3u})
        {
            const unsigned int nWidth = WIDTH / nFactor, nHeight = HEIGHT / nFactor;
            for (const Resampling eMethod : {Resampling::eBilinear, Resampling::eCubic, Resampling::eLanczos,
                                             Resampling::eAverage, Resampling::eMode})
            {
                SCOPED_TRACE(DataType(eType).Describe() + ", " + std::to_string(nFactor) + ", " +
                             GetResamplingName(eMethod));
                const SourceForm oForm{WIDTH, HEIGHT, 2, eType, false};
                RasterPtr oLevel;
                const auto Store = [&](RasterPtr oTile)
                {
                    oLevel = std::move(oTile);
                };
                LevelTarget oTarget({{0, 0, nWidth, nHeight}, nWidth, nHeight, 2, eType, Store}, oForm, nullptr);
                MakeLevelReducer(oForm, {nFactor, {0, 0, nWidth, nHeight}, &oTarget}, {eMethod})
                    ->Add({{0, 0, WIDTH, HEIGHT}, oPixels->GetBuffer(), nullptr});
                ASSERT_NE(oLevel, nullptr);
                const Numbers oExpected = NumbersOf(*oLevel);
                TransformRequest oRequest{nWidth, nHeight, eMethod};
                oRequest.mbExact = true;
                const double n = nFactor;
                TransformRasterReader oReader(
                    oSource.get(), std::make_shared<AffineMap>(GeocodingInfo(0, n, 0, 0, 0, n)), oRequest, false);
                const RasterPtr oRaster(oReader.ReadRaster(0, 0, nWidth, nHeight));
                const Numbers oFound = NumbersOf(*oRaster);
                ASSERT_EQ(oFound.samples.size(), oExpected.samples.size());
                for (std::size_t i = 0; i < oFound.samples.size(); ++i)
                    ASSERT_NEAR(oFound.samples[i], oExpected.samples[i],
                                eType == eDT_16S ? 0 : 2e-6 * std::max(1.0, std::fabs(oExpected.samples[i])))
                        << i / 2 % nWidth << " " << i / 2 / nWidth;
            }
        }
    }
}

// A result does not depend on windows and tiles, and margins are those of the whole.
TEST_F(TransformRasterReaderTest, AnyWindowIsACropOfTheWhole)
{
    mpoModel->moAuxiliary.SetChanMetadataValue("NO_DATA_VALUE", "60", 1);
    std::mt19937 oRandom(11);
    const auto Number = [&](unsigned int nMost)
    {
        return static_cast<unsigned int>(oRandom() % (nMost + 1));
    };
    for (const NativeDataTypeCode eType : {eDT_8U, eDT_32R})
    {
        const auto oSource = Source(eType, 3);
        for (const auto& [name, oMap] : Maps())
        {
            for (const Resampling eMethod : METHODS)
            {
                SCOPED_TRACE(DataType(eType).Describe() + ", " + name + ", " + GetResamplingName(eMethod));
                TransformRasterReader oReader(oSource.get(), std::make_shared<AffineMap>(oMap), {31, 27, eMethod},
                                              false);
                ReaderValidity oValidity(oReader);
                const RasterPtr oWhole(oReader.ReadRaster(0, 0, 31, 27));
                const auto oWholeMask = oValidity.Read(*oWhole);
                std::string bits;
                for (unsigned int n = 0; n < 31 * 27; ++n)
                    bits += oWholeMask == nullptr || oWholeMask->GetBit(n % 31, n / 31) ? '\1' : '\0';
                MemoryReader oStored(moDataset, 31, 27, {1, 2, 3}, eType, PixelsOf(*oWhole));
                MemoryReader oStoredBits(moDataset, 31, 27, {1}, eDT_8U, bits);
                ExactHaloReader oPixels(&oStored, false), oBits(&oStoredBits, false);
                for (unsigned int n = 0; n < 8; ++n)
                {
                    const unsigned int x = Number(30), y = Number(26), w = 1 + Number(30 - x), h = 1 + Number(26 - y);
                    const unsigned int xm = n % 2 != 0 ? Number(12) : 0, ym = n % 2 != 0 ? Number(9) : 0;
                    for (IRasterReader* const poReader :
                         {static_cast<IRasterReader*>(&oReader), static_cast<IRasterReader*>(&oPixels),
                          static_cast<IRasterReader*>(&oBits)})
                        poReader->SetMargins(xm, ym, n % 4 == 1 ? eWrap : eMirror101);
                    const RasterPtr oWindow(oReader.ReadRaster(x, y, w, h)), oCrop(oPixels.ReadRaster(x, y, w, h)),
                        oCropBits(oBits.ReadRaster(x, y, w, h));
                    ASSERT_EQ(PixelsOf(*oWindow), PixelsOf(*oCrop)) << x << " " << y << " " << w << " " << h;
                    const auto oMask = oValidity.Read(*oWindow);
                    for (std::uint64_t i = 0; i < oCropBits->GetBufferSize(); ++i)
                        ASSERT_EQ(oMask == nullptr ||
                                      oMask->GetBit(i % oMask->GetFullWidth(), i / oMask->GetFullWidth()),
                                  oCropBits->GetBuffer()[i] != 0);
                }
            }
        }
    }
}

TEST_F(TransformRasterReaderTest, TheRecordAndThePlaceMoveAlong)
{
    mpoModel->moAuxiliary.SetFileMetadataValue("GroundControlPoints", "1 2 3 4 5");
    mpoModel->moAuxiliary.SetFileMetadataValue("scene", "alps");
    mpoModel->moAuxiliary.SetFileMetadataValue("STATISTICS_MEAN", "3");
    mpoModel->moGeocoding = {500000, 30, 0, 4600000, 0, -30};
    mpoModel->mnWidth = WIDTH;
    mpoModel->mnHeight = HEIGHT;
    const auto oSource = Source(eDT_32R, 1);
    const GeocodingInfo oTarget(500015, 12, 0, 4599990, 0, -12);
    TransformRasterReader oReader(
        oSource.get(),
        std::make_shared<AffineMap>(oTarget, *std::unique_ptr<GeocodingInfo>(oSource->GetGeocodingInfo())),
        {50, 40, Resampling::eBilinear}, false);
    const std::unique_ptr<GeocodingInfo> oPlace(oReader.GetGeocodingInfo());
    for (std::size_t n = 0; n < 6; ++n)
        EXPECT_NEAR(oPlace->GetTerms()[n], oTarget.GetTerms()[n], 1e-6);
    const AuxiliaryData oRecord = oReader.GetAuxiliaryData();
    EXPECT_EQ(oRecord.GetFileMetadataValue("GroundControlPoints"), "");
    EXPECT_EQ(oRecord.GetFileMetadataValue("STATISTICS_MEAN"), "");
    EXPECT_EQ(oRecord.GetFileMetadataValue("scene"), "alps");
    EXPECT_EQ(oReader.GetOverviewReaderAccessor(), nullptr);
    // Well inside the source nothing can be missing.
    EXPECT_FALSE(oReader.HasValidity());
    EXPECT_EQ(oRecord.GetChanMetadataValue("NO_DATA_VALUE", 1), "");
    TransformRasterReader oOutside(oSource.get(), std::make_shared<AffineMap>(GeocodingInfo(-3, 1, 0, 0, 0, 1)),
                                   {50, 40, Resampling::eCubic}, false);
    EXPECT_TRUE(oOutside.HasValidity());
    EXPECT_EQ(oOutside.GetAuxiliaryData().GetChanMetadataValue("NO_DATA_VALUE", 1), "nan");
    TransformRasterReader oFilled(oSource.get(), std::make_shared<AffineMap>(GeocodingInfo(-3, 1, 0, 0, 0, 1)),
                                  {50, 40, Resampling::eCubic, {-7}}, false);
    EXPECT_EQ(oFilled.GetAuxiliaryData().GetChanMetadataValue("NO_DATA_VALUE", 1), "-7");
    const RasterPtr oRaster(oFilled.ReadRaster(0, 0, 2, 2));
    EXPECT_EQ(*reinterpret_cast<const float*>(oRaster->GetBuffer()), -7);
}

// A coarser result is made of the coarsest level that is not coarser than it, unless it is to be exact.
TEST_F(TransformRasterReaderProbe, LevelsServe)
{
    moModel->mnWidth = 64;
    moModel->mnHeight = 48;
    moModel->moLevels = {2, 4, 8};
    moModel->moAuxiliary.SetChanMetadataValue("_Overview_4", "valid AVERAGE", 1);
    moModel->moAuxiliary.SetChanMetadataValue("_Overview_2", "valid NEAREST", 1);
    moModel->moAuxiliary.SetChanMetadataValue("_Overview_8", "valid MIN", 1);
    const auto Make = [](double nStep)
    {
        return std::make_shared<AffineMap>(GeocodingInfo(0, nStep, 0, 0, 0, nStep));
    };
    const auto Pixels = [&](IRasterReader& oSource, double nStep, bool bExact, Resampling eMethod)
    {
        TransformRequest oRequest{5, 4, eMethod};
        oRequest.mbExact = bExact;
        return ReadPixels(TransformRasterReader(&oSource, Make(nStep), oRequest, false));
    };
    BasicReader oSource(moFile, {1});
    const std::unique_ptr<IOverviewReaderAccessor> oLevels(oSource.GetOverviewReaderAccessor());
    const std::unique_ptr<IRasterReader> oTwo(oLevels->CreateRasterReader(2)), oFour(oLevels->CreateRasterReader(4));
    EXPECT_EQ(Pixels(oSource, 12, false, Resampling::eBilinear), Pixels(*oFour, 3, true, Resampling::eBilinear));
    EXPECT_EQ(Pixels(oSource, 3, false, Resampling::eMode), Pixels(*oTwo, 1.5, true, Resampling::eMode));
    EXPECT_EQ(Pixels(oSource, 12, false, Resampling::eNearest), Pixels(oSource, 12, true, Resampling::eNearest));
    EXPECT_NE(Pixels(oSource, 12, false, Resampling::eBilinear), Pixels(oSource, 12, true, Resampling::eBilinear));
}

TEST_F(TransformRasterReaderProbe, NothingLeaksAtTheNthCall)
{
    moModel->moLevels = {2, 4};
    moModel->moBitmaps = {{1, ""}};
    const auto poMap = std::make_shared<AffineMap>(GeocodingInfo(0, 5, 0, 0, 0, 5));
    const auto Use = [&]
    {
        auto oOwned = std::make_unique<BasicReader>(moFile, Channels{1, 2});
        TransformRasterReader oReader(oOwned.get(), poMap, {9, 7, Resampling::eAverage}, true);
        static_cast<void>(oOwned.release());
        oReader.SetMargins(20, 3, eMirror);
        const RasterPtr oTile(oReader.GetRaster(0));
        static_cast<void>(oReader.ReadValid(*oTile));
    };
    FailAtEveryCall(Use, [] {});
}

TEST_F(TransformRasterReaderTest, BadRequestsAreRefused)
{
    const auto oSource = Source(eDT_8U, 3);
    const auto oMap = std::make_shared<AffineMap>(GeocodingInfo());
    const auto Why =
        [&](IRasterReader* poSource, std::shared_ptr<const IGridMap> poMap, const TransformRequest& oRequest)
    {
        return Error([&] { TransformRasterReader oReader(poSource, poMap, oRequest, false); });
    };
    EXPECT_EQ(Why(nullptr, oMap, {4, 4}), "data: The source reader is NULL");
    EXPECT_EQ(Why(oSource.get(), nullptr, {4, 4}), "data: The map is NULL");
    EXPECT_EQ(Why(oSource.get(), oMap, {0, 4}), "data: The result has no pixels");
    EXPECT_NE(Why(oSource.get(), oMap, {4, 4, Resampling::eNearest, {1, 2}}).find("2 background values"),
              std::string::npos);
    EXPECT_NE(Why(oSource.get(), oMap, {4, 4, Resampling::eMax}), "");
    EXPECT_NE(Why(oSource.get(), oMap, {4294967295u, 4294967295u}), "");
    EXPECT_NE(Error([] { AffineMap oNone(GeocodingInfo(0, 1, 2, 0, 2, 4)); }), "");
    EXPECT_NE(Error([] { AffineMap oNone(GeocodingInfo(std::nan(""), 1, 0, 0, 0, 1)); }), "");
}

} // namespace krv::test
