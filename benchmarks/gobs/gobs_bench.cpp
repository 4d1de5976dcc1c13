// Measures raster allocation against reused buffers, margins and masks against memcpy of the tile.
//     krv_bench_gobs [--only memory|margins|masks]

#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/margins.h"
#include "gobs/raster/raster.h"
#include "toolkit/core/hmalloc.h"

#include <algorithm>
#include <cstring>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace
{

using namespace krv::benchmarks;
using namespace krv::gobs;

constexpr int ROUNDS = 9;
constexpr std::uint64_t KIB = 1024;
constexpr std::uint64_t MIB = 1024 * KIB;

std::string SizeText(std::uint64_t nBytes)
{
    return nBytes < MIB ? std::to_string(nBytes / KIB) + " KiB" : std::to_string(nBytes / MIB) + " MiB";
}

RasterInfo BytesInfo(std::uint64_t nBytes)
{
    return {static_cast<unsigned int>(nBytes), 1, 1, DataType(eDT_8U)};
}

// What a reader does to a raster: fill all of it.
void Fill(unsigned char* pBuffer, std::uint64_t nBytes)
{
    std::memset(pBuffer, 1, nBytes);
    Keep(pBuffer);
}

void EightAliveTogether(std::uint64_t nBytes)
{
    constexpr int ALIVE = 8;
    const int nRepeats = static_cast<int>(std::max<std::uint64_t>(1, 256 * MIB / (ALIVE * nBytes)));
    std::vector<std::unique_ptr<Raster>> oReused;
    for (int i = 0; i < ALIVE; ++i)
        oReused.push_back(std::make_unique<Raster>(BytesInfo(nBytes), RasterContext()));
    const auto Repeat = [&](auto Work)
    {
        for (int n = 0; n < nRepeats; ++n)
            Work();
    };
    const auto Fresh = [&]
    {
        std::vector<std::unique_ptr<Raster>> oRasters;
        for (int i = 0; i < ALIVE; ++i)
        {
            oRasters.push_back(std::make_unique<Raster>(BytesInfo(nBytes), RasterContext()));
            Fill(oRasters.back()->GetBuffer(), nBytes);
        }
    };
    const auto Malloc = [&]
    {
        std::vector<std::unique_ptr<unsigned char[]>> oBuffers;
        for (int i = 0; i < ALIVE; ++i)
        {
            oBuffers.push_back(std::make_unique_for_overwrite<unsigned char[]>(nBytes));
            Fill(oBuffers.back().get(), nBytes);
        }
    };
    const auto Kept = [&]
    {
        for (const auto& oRaster : oReused)
            Fill(oRaster->GetBuffer(), nBytes);
    };
    const auto oSeconds = MedianSeconds({{"reused",
                                          [&]
                                          {
                                              Repeat(Kept);
                                          }},
                                         {"raster",
                                          [&]
                                          {
                                              Repeat(Fresh);
                                          }},
                                         {"malloc",
                                          [&]
                                          {
                                              Repeat(Malloc);
                                          }}},
                                        ROUNDS);
    PrintRow("8 rasters of " + SizeText(nBytes), oSeconds[0] / oSeconds[1], 0.85,
             "plain malloc " + Number(oSeconds[0] / oSeconds[2]));
}

void OneAtATime(std::uint64_t nBytes)
{
    constexpr int REPEATS = 400;
    std::vector<unsigned char> oFile(nBytes, 1);
    Raster oReused(BytesInfo(nBytes), RasterContext());
    const auto Into = [&](Raster& oRaster)
    {
        std::memcpy(oRaster.GetBuffer(), oFile.data(), nBytes);
        Keep(oRaster.GetBuffer());
    };
    const auto Reuse = [&]
    {
        for (int i = 0; i < REPEATS; ++i)
            Into(oReused);
    };
    const auto Fresh = [&]
    {
        for (int i = 0; i < REPEATS; ++i)
            Into(*std::make_unique<Raster>(BytesInfo(nBytes), RasterContext()));
    };
    const auto Edges = [&] // every eighth is followed by a narrow one, as at the end of a row of tiles
    {
        for (int i = 0; i < REPEATS; ++i)
        {
            Into(*std::make_unique<Raster>(BytesInfo(nBytes), RasterContext()));
            if (i % 8 == 0)
                Fill(std::make_unique<Raster>(BytesInfo(nBytes / 3), RasterContext())->GetBuffer(), nBytes / 3);
        }
    };
    const auto Empty = [&]
    {
        for (int i = 0; i < REPEATS; ++i)
            Keep(std::make_unique<Raster>(BytesInfo(nBytes), RasterContext())->GetBuffer());
    };
    const auto Parallel = [&]
    {
        std::thread oOther(Fresh);
        Fresh();
        oOther.join();
    };
    const auto oSeconds = MedianSeconds(
        {{"reuse", Reuse}, {"fresh", Fresh}, {"edges", Edges}, {"empty", Empty}, {"parallel", Parallel}}, ROUNDS);
    PrintRow("new, copy " + SizeText(nBytes) + ", delete", oSeconds[0] / oSeconds[1], 0,
             "new and delete alone " + Number(oSeconds[3] / REPEATS * 1e9, 0) + " ns of " +
                 Number(oSeconds[0] / REPEATS * 1e9, 0) + " ns");
    PrintRow("  with narrow ones between", oSeconds[0] / oSeconds[2], 0);
    PrintRow("  two threads against one", 2 * oSeconds[1] / oSeconds[4], 0);
}

void MeasureMemory()
{
    PrintHeading("Raster memory against reused buffers");
    for (std::uint64_t nBytes : {64 * KIB, 192 * KIB, 768 * KIB, 2 * MIB, 4 * MIB, 16 * MIB, 48 * MIB})
        EightAliveTogether(nBytes);
    HTrim();
    for (std::uint64_t nBytes : {192 * KIB, 4 * MIB})
        OneAtATime(nBytes);
}

void MeasureMargins(unsigned int nMargin, unsigned int nChannels, NativeDataTypeCode eType)
{
    Raster oRaster(RasterInfo(256, 256, nChannels, DataType(eType)), RasterContext(0, 0, nMargin, nMargin));
    std::memset(oRaster.GetBuffer(), 1, oRaster.GetBufferSize());
    std::vector<unsigned char> oCopy(oRaster.GetBufferSize());
    constexpr int REPEATS = 200;
    const auto Copy = [&]
    {
        for (int i = 0; i < REPEATS; ++i)
        {
            std::memcpy(oCopy.data(), oRaster.GetBuffer(), oCopy.size());
            Keep(oCopy.data());
        }
    };
    const auto Run = [&](eMarginBehaviour eBehaviour)
    {
        for (int i = 0; i < REPEATS; ++i)
        {
            FillRasterMargins(&oRaster, eBehaviour, 15);
            Keep(oRaster.GetBuffer());
        }
    };
    const auto oSeconds = MedianSeconds({{"copy", Copy},
                                         {"mirror",
                                          [&]
                                          {
                                              Run(eMirror);
                                          }},
                                         {"constant",
                                          [&]
                                          {
                                              Run(eConstant);
                                          }}},
                                        ROUNDS);
    PrintRow("margin " + std::to_string(nMargin) + " of 256 x 256 x " + std::to_string(nChannels) + " " +
                 DataType(eType).Describe(),
             oSeconds[0] / oSeconds[1], 0, "constant " + Number(oSeconds[0] / oSeconds[2]));
}

void MeasureAllMargins()
{
    PrintHeading("Margins of all four sides against memcpy of the tile");
    for (unsigned int nMargin : {8u, 32u})
    {
        MeasureMargins(nMargin, 3, eDT_8U);
        MeasureMargins(nMargin, 1, eDT_16U);
        MeasureMargins(nMargin, 4, eDT_32R);
        MeasureMargins(nMargin, 7, eDT_16U);
    }
}

void MeasureMasks()
{
    PrintHeading("Masks against memcpy of the 8-bit tile");
    const RasterInfo oInfo(512, 512, 1, DataType(eDT_8U));
    Raster oRaster(oInfo, RasterContext(0, 0, 1, 1));
    std::memset(oRaster.GetBuffer(), 1, oRaster.GetBufferSize());
    std::vector<unsigned char> oCopy(oRaster.GetBufferSize());
    const Mask oMask(oInfo, oRaster.GetContext(), oRaster.GetBuffer(), false);
    constexpr int REPEATS = 100;
    const auto Repeat = [](auto Work)
    {
        for (int i = 0; i < REPEATS; ++i)
            Work();
    };
    const auto Copy = [&]
    {
        std::memcpy(oCopy.data(), oRaster.GetBuffer(), oCopy.size());
        Keep(oCopy.data());
    };
    const auto Pack = [&]
    {
        Keep(std::make_unique<Mask>(oInfo, oRaster.GetContext(), oRaster.GetBuffer(), false)->GetBits());
    };
    const auto Count = [&]
    {
        const std::uint64_t nSet = oMask.CountSetInCentre();
        Keep(&nSet);
    };
    const auto oSeconds = MedianSeconds({{"memcpy",
                                          [&]
                                          {
                                              Repeat(Copy);
                                          }},
                                         {"pack",
                                          [&]
                                          {
                                              Repeat(Pack);
                                          }},
                                         {"retrieve",
                                          [&]
                                          {
                                              Repeat([&] { oMask.RetrieveRaster(oRaster); });
                                          }},
                                         {"count",
                                          [&]
                                          {
                                              Repeat(Count);
                                          }}},
                                        ROUNDS);
    PrintRow("pack", oSeconds[0] / oSeconds[1], 0);
    PrintRow("RetrieveRaster", oSeconds[0] / oSeconds[2], 0);
    PrintRow("CountSetInCentre", oSeconds[0] / oSeconds[3], 0);
}

} // namespace

int main(int nArguments, char** sArguments)
{
    const Arguments oArguments(nArguments, sArguments, "[--only memory|margins|masks]");
    if (oArguments.Wants("memory"))
        MeasureMemory();
    if (oArguments.Wants("margins"))
        MeasureAllMargins();
    if (oArguments.Wants("masks"))
        MeasureMasks();
}
