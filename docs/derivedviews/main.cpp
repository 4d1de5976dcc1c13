// The readers over readers and the datasets without a file at work on the sample scene, each stored as an image of its
// own: the pictures of the documentation are quick looks of them (scripts/pictures).
//     derivedviews RGB.tif PAN.tif FOLDER
#include "datasources/datasets/constrasterdataset.h"
#include "datasources/datasets/memorydataset.h"
#include "datasources/datasets/metacomplexdataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/derived/pctrasterreader.h"
#include "datasources/reader/derived/rastercache.h"
#include "datasources/reader/derived/totalpowerrasterreader.h"
#include "datasources/reader/derived/transformrasterreader.h"
#include "datasources/reader/multitypereader.h"
#include "datasources/writer/memorywriter.h"
#include "datasources/writer/multitypewriter.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/raster.h"
#include "gobs/resampling/gridmap.h"

#include <cmath>
#include <cstdio>
#include <exception>
#include <memory>
#include <numeric>
#include <random>
#include <string>
#include <vector>

namespace
{

using namespace krv::datasources;
using krv::gobs::AffineMap;
using krv::gobs::Raster;
using krv::gobs::Resampling;
using krv::ogc::cs::GeocodingInfo;
using RasterPtr = std::unique_ptr<Raster>;

constexpr unsigned int SIDE = 512;

// Every tile of a reader into another image, as a program would that works on them.
void Copy(IRasterReader& oReader, IRasterWriter& oWriter)
{
    for (unsigned int n = 0; n < oReader.GetTileCount(); ++n)
        oWriter.WriteRaster(RasterPtr(oReader.GetRaster(n)).get());
}

void Store(IRasterReader& oReader, const std::string& file)
{
    std::vector<unsigned int> oChannels(oReader.GetChansCount());
    std::iota(oChannels.begin(), oChannels.end(), 1u);
    BasicWriter oWriter(file, oChannels, "TIF", "");
    oWriter.CreateNewFile({oReader.GetWidth(), oReader.GetHeight(), oReader.GetChansCount(), oReader.GetDataType()});
    oWriter.SetAuxiliaryData(oReader.GetAuxiliaryData().GetCleanedMeta());
    Copy(oReader, oWriter);
    oWriter.Synchronize();
}

// A scene in a square of SIDE pixels.
std::shared_ptr<AffineMap> Reduce(const IRasterReader& oScene)
{
    const double nStep = static_cast<double>(oScene.GetWidth()) / SIDE;
    return std::make_shared<AffineMap>(GeocodingInfo(0, nStep, 0, 0, 0, nStep));
}

// Brightness as classes, each with a colour.
void ShowColours(IRasterReader& oPan, const std::string& file)
{
    const krv::gobs::RGBTuple<std::uint16_t> COLOURS[] = {
        {8000, 16000, 40000},  {10000, 30000, 50000}, {10000, 36000, 16000}, {30000, 46000, 16000},
        {50000, 50000, 20000}, {48000, 34000, 20000}, {60000, 60000, 60000}};
    krv::gobs::PCT oTable;
    double nFrom = 0;
    for (const auto& oColour : COLOURS)
    {
        oTable.Add({nFrom, nFrom + 130, oColour});
        nFrom += 130;
    }
    TransformRasterReader oSmall(&oPan, Reduce(oPan), {SIDE, SIDE, Resampling::eAverage}, false);
    PCTRasterReader oColours(&oSmall, oTable, false, eWithAlpha);
    Store(oColours, file);
}

// The scene as a radar would see it: I and Q in memory, as complex pairs, as power.
void ShowPower(IRasterReader& oPan, const std::string& partFile, const std::string& powerFile)
{
    TransformRasterReader oSmall(&oPan, Reduce(oPan), {SIDE, SIDE, Resampling::eAverage}, false);
    const RasterPtr oValues(oSmall.ReadRaster(0, 0, SIDE, SIDE));
    MemoryWriter oParts({SIDE, SIDE, 2, krv::gobs::eDT_16S});
    Raster oRaster({SIDE, SIDE, 2, krv::gobs::eDT_16S}, {0, 0});
    const auto* const pValues = reinterpret_cast<const std::uint16_t*>(oValues->GetBuffer());
    auto* const pParts = reinterpret_cast<std::int16_t*>(oRaster.GetBuffer());
    std::minstd_rand oRandom(1);
    std::normal_distribution<double> oSpeckle;
    for (unsigned int n = 0; n < 2 * SIDE * SIDE; ++n)
        pParts[n] = static_cast<std::int16_t>(12 * std::sqrt(pValues[n / 2]) * oSpeckle(oRandom));
    oParts.WriteRaster(&oRaster);
    BasicReader oFirst(oParts.Share().release(), {1}, true);
    Store(oFirst, partFile);
    MetaComplexDataset oPairs(oParts.Share().release(), {{1, 2}}, true);
    TotalPowerRasterReader oPower(&static_cast<IDataset&>(oPairs), false);
    Store(oPower, powerFile);
}

// A scene's brightness as amplitude beside a phase that grows to the south-east, as complex pairs: the real part of
// them, which has a fringe for each turn of the phase.
void ShowPairs(IRasterReader& oPan, const std::string& file)
{
    TransformRasterReader oSmall(&oPan, Reduce(oPan), {SIDE, SIDE, Resampling::eAverage}, false);
    const RasterPtr oValues(oSmall.ReadRaster(0, 0, SIDE, SIDE));
    MemoryWriter oParts({SIDE, SIDE, 2, krv::gobs::eDT_32R});
    Raster oRaster({SIDE, SIDE, 2, krv::gobs::eDT_32R}, {0, 0});
    const auto* const pValues = reinterpret_cast<const std::uint16_t*>(oValues->GetBuffer());
    auto* const pParts = reinterpret_cast<float*>(oRaster.GetBuffer());
    for (unsigned int n = 0; n < SIDE * SIDE; ++n)
    {
        const double nX = n % SIDE, nY = n / SIDE;
        pParts[2 * n] = pValues[n];
        pParts[2 * n + 1] = static_cast<float>(std::remainder((nX * nX + nY * nY) / 3000, 6.283185307179586));
    }
    oParts.WriteRaster(&oRaster);
    MetaComplexDataset oPairs(oParts.Share().release(), {{1, 2}}, true, eAmplitudePhase);
    BasicReader oComplex(static_cast<IDataset*>(&oPairs), {}, false);
    const RasterPtr oScene(oComplex.ReadRaster(0, 0, SIDE, SIDE));
    Raster oReal({SIDE, SIDE, 1, krv::gobs::eDT_32R}, {0, 0});
    for (unsigned int n = 0; n < SIDE * SIDE; ++n)
        reinterpret_cast<float*>(oReal.GetBuffer())[n] = reinterpret_cast<const float*>(oScene->GetBuffer())[2 * n];
    MemoryWriter oShown({SIDE, SIDE, 1, krv::gobs::eDT_32R});
    oShown.WriteRaster(&oReal);
    BasicReader oReader(oShown.Share().release(), {}, true);
    Store(oReader, file);
}

// A square of SIDE pixels of a scene, turned by twenty degrees about its centre.
std::shared_ptr<AffineMap> Turn(const IRasterReader& oScene)
{
    const double nStep = static_cast<double>(oScene.GetWidth()) / SIDE, nCosine = nStep * std::cos(0.35),
                 nSine = nStep * std::sin(0.35), nHalf = SIDE / 2.0;
    return std::make_shared<AffineMap>(GeocodingInfo(nStep * nHalf - nHalf * (nCosine - nSine), nCosine, -nSine,
                                                     nStep * nHalf - nHalf * (nCosine + nSine), nSine, nCosine));
}

void ShowTransform(IRasterReader& oScene, const std::string& file)
{
    TransformRasterReader oTurned(&oScene, Turn(oScene), {SIDE, SIDE, Resampling::eCubic}, false);
    Store(oTurned, file);
}

// A viewer asks a cache above a turned scene for three windows that overlap. What the picture has of each tile is its
// mean with a colour of the window that had it made; what was never made stays black.
void ShowCache(IRasterReader& oScene, const std::string& file)
{
    constexpr unsigned int TILE = 32;
    constexpr unsigned int WINDOWS[3][4] = {{40, 60, 200, 180}, {150, 130, 220, 200}, {290, 260, 190, 210}};
    TransformRasterReader oTurned(&oScene, Turn(oScene), {SIDE, SIDE, Resampling::eCubic}, false);
    RasterCache oCache(&oTurned, false, {TILE, TILE});
    MemoryWriter oWriter({SIDE, SIDE, 3, krv::gobs::eDT_8U});
    for (unsigned int nWindow = 0; nWindow < 3; ++nWindow)
    {
        const unsigned int* const pWindow = WINDOWS[nWindow];
        for (unsigned int nY = pWindow[1] / TILE * TILE; nY < pWindow[1] + pWindow[3]; nY += TILE)
            for (unsigned int nX = pWindow[0] / TILE * TILE; nX < pWindow[0] + pWindow[2]; nX += TILE)
            {
                const auto nMade = oCache.GetStatistics().mnMisses;
                const RasterPtr oTile(oCache.ReadRaster(nX, nY, TILE, TILE));
                if (oCache.GetStatistics().mnMisses == nMade)
                    continue; // it was there
                unsigned char* const p = oTile->GetBuffer();
                for (unsigned int n = 0; n < TILE * TILE * 3; ++n)
                    p[n] = static_cast<unsigned char>(n % 3 == nWindow ? (p[n] + 255) / 2 : p[n]);
                oWriter.WriteRaster(oTile.get());
            }
    }
    std::printf("cache: %llu tiles made, %llu found\n",
                static_cast<unsigned long long>(oCache.GetStatistics().mnMisses),
                static_cast<unsigned long long>(oCache.GetStatistics().mnHits));
    BasicReader oReader(oWriter.Share().release(), {}, true);
    Store(oReader, file);
}

// Colours of one byte and a brightness of reals, written as one raster and read as one image.
void ShowMixed(IRasterReader& oScene, const std::string& file)
{
    TransformRasterReader oSmall(&oScene, Reduce(oScene), {SIDE, SIDE, Resampling::eAverage}, false);
    const RasterPtr oColours(oSmall.ReadRaster(0, 0, SIDE, SIDE));
    MemoryDataset oStack;
    MixedTypes oTypes;
    oTypes.moChannels = {krv::gobs::eDT_8U, krv::gobs::eDT_8U, krv::gobs::eDT_8U, krv::gobs::eDT_32R};
    MultiTypeWriter oWriter(static_cast<IRasterDataset*>(&oStack), {1, 2, 3, 4}, oTypes);
    oWriter.CreateNewFile({SIDE, SIDE, 4, krv::gobs::eDT_32R});
    Raster oRaster({SIDE, SIDE, 4, krv::gobs::eDT_32R}, {0, 0});
    auto* p = reinterpret_cast<float*>(oRaster.GetBuffer());
    const unsigned char* pColour = oColours->GetBuffer();
    for (unsigned int n = 0; n < SIDE * SIDE; ++n, p += 4, pColour += 3)
    {
        for (unsigned int c = 0; c < 3; ++c)
            p[c] = pColour[c];
        const float nSum = p[1] + p[0];
        p[3] = nSum > 0 ? (p[1] - p[0]) / nSum : 0; // how green
    }
    oWriter.WriteRaster(&oRaster);
    BasicReader oIndex(static_cast<IDataset*>(&oStack), {4}, false);
    Store(oIndex, file);
}

// An image of one value for each channel, in another grid as any other image: a turned square.
void ShowConstant(const std::string& file)
{
    ConstRasterDataset oGround(SIDE, SIDE,
                               {{krv::gobs::eDT_8U, 30}, {krv::gobs::eDT_8U, 90}, {krv::gobs::eDT_8U, 150}});
    BasicReader oColour(static_cast<IDataset*>(&oGround), {}, false);
    TransformRequest oRequest{SIDE, SIDE, Resampling::eBilinear};
    oRequest.moBackground = {230};
    TransformRasterReader oTurned(&oColour, Turn(oColour), oRequest, false);
    Store(oTurned, file);
}

// A ground of one value, on which only some windows of a scene lie: what nobody wrote takes no memory.
void ShowMemory(IRasterReader& oScene, const std::string& file)
{
    TransformRasterReader oSmall(&oScene, Reduce(oScene), {SIDE, SIDE, Resampling::eAverage}, false);
    MemoryOptions oOptions;
    oOptions.mnFill = 230;
    MemoryWriter oWriter({SIDE, SIDE, 3, krv::gobs::eDT_8U}, oOptions);
    for (const unsigned int nX : {0u, 256u})
        oWriter.WriteRaster(RasterPtr(oSmall.ReadRaster(nX, nX, 256, 256)).get());
    std::printf("memory: %llu bytes of %u\n", static_cast<unsigned long long>(oWriter.GetBytes()), SIDE * SIDE * 3);
    BasicReader oReader(oWriter.Share().release(), {}, true);
    Store(oReader, file);
}

} // namespace

int main(int nArguments, char** pArguments)
{
    if (nArguments != 4)
    {
        std::fprintf(stderr, "usage: derivedviews RGB.tif PAN.tif FOLDER\n");
        return 2;
    }
    try
    {
        BasicReader oScene(pArguments[1]), oPan(pArguments[2]);
        const std::string folder = std::string(pArguments[3]) + "/";
        ShowColours(oPan, folder + "colours.tif");
        ShowPower(oPan, folder + "inphase.tif", folder + "power.tif");
        ShowPairs(oPan, folder + "pairs.tif");
        ShowTransform(oScene, folder + "transform.tif");
        ShowCache(oScene, folder + "cache.tif");
        ShowMixed(oScene, folder + "mixed.tif");
        ShowConstant(folder + "constant.tif");
        ShowMemory(oScene, folder + "memory.tif");
    }
    catch (const std::exception& oError)
    {
        std::fprintf(stderr, "derivedviews: %s\n", oError.what());
        return 1;
    }
    return 0;
}
