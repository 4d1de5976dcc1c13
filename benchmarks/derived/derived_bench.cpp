// Measures readers over readers, in one process and interleaved rounds.
//     krv_bench_derived [FILE] [--size N] [--only colour|power|transform|cache]
// Sources are in memory, so that nothing but the readers counts; FILE is a complex scene, whose whole path as power is
// measured against reading it. Transforms are turned by some degrees and measured against libvips with one thread, when
// that is there.

#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/windowedio.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/derived/rastercache.h"
#include "datasources/reader/derived/totalpowerrasterreader.h"
#include "datasources/reader/derived/transformrasterreader.h"
#include "gobs/pct/colourmapper.h"
#include "gobs/power/powersum.h"
#include "gobs/raster/raster.h"
#include "gobs/resampling/gridmap.h"

#ifdef KRV_BENCH_VIPS
#include <vips/vips.h>
#endif

#include <cmath>
#include <cstring>
#include <memory>
#include <random>
#include <string>
#include <utility>
#include <vector>

namespace
{

using namespace krv::benchmarks;
using namespace krv::datasources;
using krv::gobs::DataType;
using krv::gobs::Raster;
using krv::gobs::Resampling;

using Bytes = std::vector<unsigned char>;

// Smooth pixels with some noise.
template <typename T>
Bytes MakePixels(unsigned int nSize, unsigned int nSamples)
{
    Bytes oBytes(std::size_t{nSize} * nSize * nSamples * sizeof(T));
    std::minstd_rand oRandom(5);
    T* const p = reinterpret_cast<T*>(oBytes.data());
    for (std::size_t n = 0; n < oBytes.size() / sizeof(T); ++n)
        p[n] = static_cast<T>(100 + 80 * std::sin(static_cast<double>(n / nSamples % nSize) * 0.01) +
                              static_cast<double>(oRandom() % 20));
    return oBytes;
}

class MemoryIO : public WindowedIO<IRasterIO>
{
public:
    MemoryIO(unsigned int nSize, std::size_t nPixelBytes, const Bytes& oBytes)
        : mnSize(nSize), mnPixelBytes(nPixelBytes), moBytes(oBytes)
    {
    }
    unsigned int GetFileWidth() const override { return mnSize; }
    unsigned int GetFileHeight() const override { return mnSize; }
    unsigned int GetTileWidth() const override { return 512; }
    unsigned int GetTileHeight() const override { return 512; }

private:
    std::size_t GetPixelBytes() const override { return mnPixelBytes; }
    void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override
    {
        for (std::size_t n = 0; n < oRect.mnHeight; ++n)
            std::memcpy(pTarget + n * nPitch, moBytes.data() + ((oRect.mnY + n) * mnSize + oRect.mnX) * mnPixelBytes,
                        oRect.mnWidth * mnPixelBytes);
    }
    void WritePixels(const PixelRect&, const unsigned char*, std::size_t) override {}

    unsigned int mnSize;
    std::size_t mnPixelBytes;
    const Bytes& moBytes;
};

// Nothing but a record.
class NoDataset : public IDataset
{
public:
    explicit NoDataset(unsigned int nChannels) : moRecord(nChannels) {}
    IFileFormat* GetFileFormat() const override { return nullptr; }
    FileAccessState Delete() override { return eDone; }
    bool Exists() const override { return true; }
    std::string GetName() override { return "memory"; }
    AuxiliaryData ReadAuxiliaryData() override { return moRecord; }
    void WriteAuxiliaryData(const AuxiliaryData&) override {}
    krv::ogc::cs::ICRS* ReadCRS() const override { return nullptr; }
    void UpdateCRS(const krv::ogc::cs::ICRS&) const override {}
    bool IsLinked() const override { return false; }
    void Synchronize() override {}
    bool IsOpen() const override { return true; }
    void Close() override {}

private:
    AuxiliaryData moRecord;
};

class MemoryReader : public BasicReader
{
public:
    MemoryReader(IDataset& oDataset, unsigned int nChannels, const DataType& oType, unsigned int nSize,
                 const Bytes& oBytes)
    {
        std::vector<unsigned int> oChannels;
        for (unsigned int n = 1; n <= nChannels; ++n)
            oChannels.push_back(n);
        SetDataset(&oDataset, oChannels, false);
        SetRasterIO(std::make_unique<MemoryIO>(nSize, oType.GetValueBits() / 8 * nChannels, oBytes), oType);
    }
};

void ReadAll(IRasterReader& oReader)
{
    for (unsigned int n = 0; n < oReader.GetTileCount(); ++n)
    {
        const std::unique_ptr<Raster> poTile(oReader.GetRaster(n));
        Keep(poTile->GetBuffer());
    }
}

// A kernel, tile by tile, against memcpy of as many bytes.
template <typename Kernel>
void MeasureKernel(const std::string& name, const Bytes& oInput, std::size_t nPixels, std::size_t nInputBytes,
                   std::size_t nOutputBytes, std::size_t nCopied, double nGoal, const Kernel& oKernel)
{
    constexpr std::size_t TILE = 512 * 512;
    Bytes oOutput(TILE * std::max(nOutputBytes, nCopied)), oSame(nCopied == nInputBytes ? 0 : nPixels * nCopied, 1);
    const auto oTimes = MedianSeconds({{"kernel",
                                        [&]
                                        {
                                            for (std::size_t n = 0; n + TILE <= nPixels; n += TILE)
                                                oKernel(oInput.data() + n * nInputBytes, TILE, oOutput.data());
                                            Keep(oOutput.data());
                                        }},
                                       {"memcpy",
                                        [&]
                                        {
                                            for (std::size_t n = 0; n + TILE <= nPixels; n += TILE)
                                            {
                                                const unsigned char* const pFrom = nCopied == nInputBytes
                                                                                       ? oInput.data() + n * nInputBytes
                                                                                       : oSame.data();
                                                std::memcpy(oOutput.data(), pFrom, TILE * nCopied);
                                                Keep(oOutput.data());
                                            }
                                        }}},
                                      9);
    PrintRow(name, oTimes[1] / oTimes[0], nGoal);
}

void MeasureColours(unsigned int nSize)
{
    PrintHeading("Colours, against memcpy of the output");
    std::vector<krv::gobs::RGBTuple<std::uint16_t>> oColours;
    for (unsigned int n = 0; n < 256; ++n)
        oColours.push_back({static_cast<std::uint16_t>(n * 257), static_cast<std::uint16_t>(65535 - n * 200),
                            static_cast<std::uint16_t>(n * n)});
    const auto oTable = krv::gobs::PCT::FromColours(oColours);
    const Bytes oBytes = MakePixels<std::uint8_t>(nSize, 1), oWords = MakePixels<std::uint16_t>(nSize, 1);
    const std::size_t nPixels = std::size_t{nSize} * nSize;
    for (const bool bAlpha : {false, true})
    {
        const std::size_t nColour = bAlpha ? 4 : 3;
        const std::string suffix = bAlpha ? ", with alpha" : "";
        const krv::gobs::ColourMapper oOf8(oTable, krv::gobs::eDT_8U, bAlpha),
            oOf16(oTable, krv::gobs::eDT_16U, bAlpha);
        MeasureKernel("8U" + suffix, oBytes, nPixels, 1, nColour, nColour, 0.5,
                      [&](const unsigned char* p, std::size_t n, unsigned char* q) { oOf8.Run(p, n, q); });
        MeasureKernel("16U" + suffix, oWords, nPixels, 2, nColour, nColour, 0,
                      [&](const unsigned char* p, std::size_t n, unsigned char* q) { oOf16.Run(p, n, q); });
    }
}

void MeasurePower(unsigned int nSize, const std::string& file)
{
    PrintHeading("Power, against memcpy of the input");
    const std::size_t nPixels = std::size_t{nSize} * nSize;
    const auto Measure = [&](const DataType& oType, unsigned int nChannels, const Bytes& oBytes, double nGoal)
    {
        const krv::gobs::PowerSum oSum(
            oType, std::vector<krv::gobs::PowerTerm>(nChannels, {krv::gobs::PowerTerm::eSquare, 1}));
        const std::size_t nBytes = oType.GetValueBits() / 8 * nChannels;
        MeasureKernel(oType.Describe() + " x " + std::to_string(nChannels), oBytes, nPixels, nBytes, 8, nBytes, nGoal,
                      [&](const unsigned char* p, std::size_t n, unsigned char* q) { oSum.Run(p, n, q); });
    };
    const Bytes oShort = MakePixels<std::int16_t>(nSize, 8), oReal = MakePixels<float>(nSize, 8);
    Measure(krv::gobs::eDT_C16S, 1, oShort, 0.7);
    Measure(krv::gobs::eDT_C16S, 4, oShort, 0.7);
    Measure(krv::gobs::eDT_C32R, 1, oReal, 0.7);
    Measure(krv::gobs::eDT_C32R, 4, oReal, 0.7);
    if (file.empty())
        return;
    BasicReader oPlain(file);
    TotalPowerRasterReader oPower(file);
    const auto oTimes = MedianSeconds({{"power",
                                        [&]
                                        {
                                            ReadAll(oPower);
                                        }},
                                       {"plain",
                                        [&]
                                        {
                                            ReadAll(oPlain);
                                        }}},
                                      31);
    PrintRow("the file's whole path, against reading it", oTimes[1] / oTimes[0], 0.9);
}

krv::ogc::cs::GeocodingInfo Turned(unsigned int nSize)
{
    const double nCosine = std::cos(0.2), nSine = std::sin(0.2), nHalf = nSize / 2.0;
    return {nHalf - nHalf * nCosine + nHalf * nSine, nCosine, -nSine,
            nHalf - nHalf * nSine - nHalf * nCosine, nSine,   nCosine};
}

#ifdef KRV_BENCH_VIPS
// What libvips does with an image in memory; the result is taken out of it.
template <typename Operation>
void RunVips(const Bytes& oBytes, unsigned int nSize, int nBands, VipsBandFormat eFormat, const Operation& oOperation)
{
    VipsImage* const poImage = vips_image_new_from_memory(oBytes.data(), oBytes.size(), static_cast<int>(nSize),
                                                          static_cast<int>(nSize), nBands, eFormat);
    VipsImage* poOut = nullptr;
    if (oOperation(poImage, &poOut) != 0)
        throw std::runtime_error(vips_error_buffer());
    std::size_t nResult = 0;
    void* const pResult = vips_image_write_to_memory(poOut, &nResult);
    Keep(pResult);
    g_free(pResult);
    g_object_unref(poOut);
    g_object_unref(poImage);
}

// The map from the source to the result, which is of the size of the source.
int TransformByVips(VipsImage* poImage, VipsImage** ppOut, const krv::ogc::cs::GeocodingInfo& oMap, const char* pName)
{
    VipsInterpolate* const poInterpolate = vips_interpolate_new(pName);
    VipsArrayInt* const poArea =
        vips_array_int_newv(4, 0, 0, vips_image_get_width(poImage), vips_image_get_height(poImage));
    const double a = oMap.GetXPerColumn(), b = oMap.GetXPerRow(), c = oMap.GetYPerColumn(), d = oMap.GetYPerRow();
    const double nDeterminant = a * d - b * c;
    const int nFailed = vips_affine(poImage, ppOut, d / nDeterminant, -b / nDeterminant, -c / nDeterminant,
                                    a / nDeterminant, "interpolate", poInterpolate, "oarea", poArea, "odx",
                                    (b * oMap.GetYOffset() - d * oMap.GetXOffset()) / nDeterminant, "ody",
                                    (c * oMap.GetXOffset() - a * oMap.GetYOffset()) / nDeterminant, nullptr);
    vips_area_unref(VIPS_AREA(poArea));
    g_object_unref(poInterpolate);
    return nFailed;
}
#endif

void MeasureTransforms([[maybe_unused]] unsigned int nSize, [[maybe_unused]] const char* pProgram)
{
#ifdef KRV_BENCH_VIPS
    PrintHeading("Transforms, against libvips with one thread");
    if (VIPS_INIT(pProgram) != 0)
        throw std::runtime_error("libvips does not start");
    vips_concurrency_set(1);
    vips_cache_set_max(0);
    struct Method
    {
        Resampling method;
        const char* name;
        VipsKernel kernel;
        double goal;
    };
    const Method METHODS[] = {{Resampling::eNearest, "nearest", VIPS_KERNEL_NEAREST, 2},
                              {Resampling::eBilinear, "bilinear", VIPS_KERNEL_LINEAR, 2},
                              {Resampling::eCubic, "bicubic", VIPS_KERNEL_CUBIC, 1.5}};
    // Coarser is a reduction there, whose kernels are stretched as here.
    constexpr double COARSER = 2.6;
    const std::pair<const char*, krv::ogc::cs::GeocodingInfo> MAPS[] = {
        {"turned", Turned(nSize)}, {"finer", {10.3, 0.8, 0, 5.2, 0, 0.7}}, {"coarser", {0, COARSER, 0, 0, 0, COARSER}}};
    const Bytes oBytes = MakePixels<std::uint8_t>(nSize, 3), oReals = MakePixels<float>(nSize, 1);
    for (const bool bReal : {false, true})
    {
        const Bytes& oPixels = bReal ? oReals : oBytes;
        const unsigned int nChannels = bReal ? 1 : 3;
        NoDataset oDataset(nChannels);
        MemoryReader oSource(oDataset, nChannels, bReal ? krv::gobs::eDT_32R : krv::gobs::eDT_8U, nSize, oPixels);
        for (const auto& [pMap, oMap] : MAPS)
        {
            const bool bCoarser = oMap.GetXPerColumn() == COARSER;
            const unsigned int nResult = bCoarser ? static_cast<unsigned int>(nSize / COARSER) : nSize;
            for (const Method& oMethod : METHODS)
            {
                const krv::ogc::cs::GeocodingInfo& oTerms = oMap; // a structured binding does not go into a closure
                TransformRasterReader oReader(&oSource, std::make_shared<krv::gobs::AffineMap>(oMap),
                                              {nResult, nResult, oMethod.method}, false);
                const auto Vips = [&](VipsImage* poImage, VipsImage** ppOut)
                {
                    return bCoarser ? vips_reduce(poImage, ppOut, COARSER, COARSER, "kernel", oMethod.kernel, nullptr)
                                    : TransformByVips(poImage, ppOut, oTerms, oMethod.name);
                };
                const auto oTimes = MedianSeconds({{"reader",
                                                    [&]
                                                    {
                                                        ReadAll(oReader);
                                                    }},
                                                   {"vips",
                                                    [&]
                                                    {
                                                        RunVips(oPixels, nSize, static_cast<int>(nChannels),
                                                                bReal ? VIPS_FORMAT_FLOAT : VIPS_FORMAT_UCHAR, Vips);
                                                    }}},
                                                  5);
                const double nMegapixels = static_cast<double>(nResult) * nResult / 1e6;
                PrintRow(std::string(pMap) + ", " + (bReal ? "32R, " : "8U x 3, ") + oMethod.name,
                         oTimes[1] / oTimes[0], bCoarser ? 0 : oMethod.goal,
                         Number(nMegapixels / oTimes[0], 0) + " megapixels of the result a second");
            }
        }
    }
#endif
}

void MeasureCache(unsigned int nSize)
{
    PrintHeading("Cache: repeated windows of a transform, against copying rows");
    const Bytes oBytes = MakePixels<std::uint8_t>(nSize, 3);
    NoDataset oDataset(3);
    MemoryReader oSource(oDataset, 3, krv::gobs::eDT_8U, nSize, oBytes);
    TransformRasterReader oTransform(&oSource, std::make_shared<krv::gobs::AffineMap>(Turned(nSize)),
                                     {nSize, nSize, Resampling::eBilinear}, false);
    RasterCache oCache(&oTransform, false, {512, 512});
    const std::unique_ptr<Raster> poWhole(oTransform.ReadRaster(0, 0, nSize, nSize));
    std::minstd_rand oRandom(3);
    std::vector<std::pair<unsigned int, unsigned int>> oWindows(300);
    for (auto& [nX, nY] : oWindows)
    {
        nX = static_cast<unsigned int>(oRandom() % (nSize - 512));
        nY = static_cast<unsigned int>(oRandom() % (nSize - 512));
    }
    const auto oTimes = MedianSeconds(
        {{"cache",
          [&]
          {
              for (const auto& [nX, nY] : oWindows)
              {
                  const std::unique_ptr<Raster> poRaster(oCache.ReadRaster(nX, nY, 512, 512));
                  Keep(poRaster->GetBuffer());
              }
          }},
         {"rows",
          [&]
          {
              for (const auto& [nX, nY] : oWindows)
              {
                  Raster oRaster({512, 512, 3, krv::gobs::eDT_8U}, {static_cast<int>(nX), static_cast<int>(nY)});
                  for (std::size_t n = 0; n < 512; ++n)
                      std::memcpy(oRaster.GetBuffer() + n * 512 * 3, poWhole->GetBuffer() + ((nY + n) * nSize + nX) * 3,
                                  512 * 3);
                  Keep(oRaster.GetBuffer());
              }
          }}},
        9);
    PrintRow("512 x 512 of 8U x 3", oTimes[1] / oTimes[0], 0.9);
}

} // namespace

int main(int nArguments, char** pArguments)
{
    const Arguments oArguments(nArguments, pArguments, "[FILE] [--size N] [--only colour|power|transform|cache]");
    const unsigned int nSize = oArguments.GetNumber("--size", 2048);
    if (oArguments.Wants("colour"))
        MeasureColours(nSize);
    if (oArguments.Wants("power"))
        MeasurePower(nSize, oArguments.GetWords().empty() ? "" : oArguments.GetWords().front());
    if (oArguments.Wants("transform"))
        MeasureTransforms(nSize, pArguments[0]);
    if (oArguments.Wants("cache"))
        MeasureCache(nSize);
    return 0;
}
