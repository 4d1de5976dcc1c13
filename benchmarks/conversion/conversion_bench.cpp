// Measures conversion, merging and splitting against memcpy of the result in the same run: results of 16 KiB
// (first-level cache), 128 KiB (second), 2 MiB (third) and 96 MiB (memory).
//     krv_bench_conversion [--only convert|merge|split|stride] [--match TEXT]

#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "toolkit/core/hmalloc.h"
#include "toolkit/raster/copydata.h"
#include "toolkit/raster/merger.h"
#include "toolkit/raster/splitter.h"

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace
{

using namespace krv::benchmarks;
using namespace krv::raster;

constexpr int ROUNDS = 9;
constexpr std::uint64_t KIB = 1024;
constexpr std::uint64_t MIB = 1024 * KIB;
constexpr std::uint64_t SIZES[] = {16 * KIB, 128 * KIB, 2 * MIB, 96 * MIB};

struct FreeBlock
{
    void operator()(unsigned char* pBlock) const { HFree(pBlock); }
};
using Block = std::unique_ptr<unsigned char, FreeBlock>;

Block MakeBlock(std::uint64_t nBytes)
{
    Block oBlock(static_cast<unsigned char*>(HMalloc(nBytes)));
    std::memset(oBlock.get(), 1, nBytes);
    return oBlock;
}

std::string SizeText(std::uint64_t nBytes)
{
    return nBytes < MIB ? std::to_string(nBytes / KIB) + " KiB" : std::to_string(nBytes / MIB) + " MiB";
}

// nWritten: bytes that one run writes; memcpy moves as many.
void Measure(const std::string& name, std::uint64_t nWritten, double nGoal, const std::function<void()>& oWork,
             unsigned char* pTarget)
{
    const Block oResult = MakeBlock(nWritten);
    const auto nRepeats = std::max<std::uint64_t>(1, 24 * MIB / nWritten);
    const auto oRepeat = [nRepeats, pTarget](const std::function<void()>& oOnce)
    {
        for (std::uint64_t i = 0; i < nRepeats; ++i)
        {
            oOnce();
            Keep(pTarget);
        }
    };
    const auto oSeconds = MedianSeconds({{"memcpy",
                                          [&]
                                          {
                                              oRepeat([&] { std::memcpy(pTarget, oResult.get(), nWritten); });
                                          }},
                                         {"work",
                                          [&]
                                          {
                                              oRepeat(oWork);
                                          }}},
                                        ROUNDS);
    PrintRow(name + ", " + SizeText(nWritten), oSeconds[0] / oSeconds[1], nGoal,
             Number(static_cast<double>(nWritten * nRepeats) / oSeconds[1] / 1e9) + " GB/s written");
}

struct Conversion
{
    const char* msName;
    BufferType meFrom;
    BufferType meTo;
    double mnGoal;
};

void MeasureConversion(const Conversion& o, std::uint64_t nBytes)
{
    const std::uint64_t nValues = nBytes / BufferDataSize(o.meTo, 1);
    const Block oSource = MakeBlock(BufferDataSize(o.meFrom, nValues));
    const Block oTarget = MakeBlock(nBytes);
    const auto oWork = [&]
    {
        CopyData(oSource.get(), o.meFrom, 1, oTarget.get(), o.meTo, 1, nValues);
    };
    Measure(o.msName, nValues * BufferDataSize(o.meTo, 1), o.mnGoal, oWork, oTarget.get());
}

struct Merging
{
    const char* msName;
    std::vector<MergeSource> moSources;
    BufferType meTo;
    std::vector<MergeChannel> moChannels;
    double mnGoal;
};

void MeasureMerging(const Merging& o, std::uint64_t nBytes)
{
    const std::uint64_t nPixelBytes = BufferDataSize(o.meTo, o.moChannels.size());
    const std::uint64_t nPixels = nBytes / nPixelBytes;
    std::vector<Block> oBlocks;
    std::vector<const unsigned char*> oSources;
    for (const MergeSource& oSource : o.moSources)
    {
        oBlocks.push_back(MakeBlock(BufferDataSize(oSource.meType, nPixels * oSource.mnChannels)));
        oSources.push_back(oBlocks.back().get());
    }
    const Block oTarget = MakeBlock(nBytes);
    Merger oMerger(o.moSources, o.meTo, o.moChannels);
    const auto oWork = [&]
    {
        oMerger.Run(oSources, oTarget.get(), nPixels);
    };
    Measure(o.msName, nPixels * nPixelBytes, o.mnGoal, oWork, oTarget.get());
}

struct Splitting
{
    const char* msName;
    BufferType meFrom;
    unsigned int mnChannels;
    std::vector<SplitTarget> moTargets;
    bool mbCounted; // values that change
    double mnGoal;
};

// Beside memcpy of the source, which is the larger side as a rule. The values are those of all types.
void MeasureSplitting(const Splitting& o, std::uint64_t nBytes)
{
    const std::uint64_t nPixelBytes = BufferDataSize(o.meFrom, o.mnChannels);
    const std::uint64_t nPixels = nBytes / nPixelBytes;
    const Block oSource = MakeBlock(nBytes);
    std::vector<unsigned char> oSmall(nPixels * o.mnChannels);
    for (std::size_t n = 0; n < oSmall.size(); ++n)
        oSmall[n] = static_cast<unsigned char>(n * 7);
    CopyData(oSmall.data(), eBT_8U, 1, oSource.get(), o.meFrom, 1, oSmall.size());
    std::vector<Block> oBlocks;
    std::vector<unsigned char*> oTargets;
    for (const SplitTarget& oTarget : o.moTargets)
    {
        oBlocks.push_back(MakeBlock(BufferDataSize(oTarget.meType, nPixels * oTarget.moChannels.size())));
        oTargets.push_back(oBlocks.back().get());
    }
    Splitter oSplitter(o.meFrom, o.mnChannels, o.moTargets);
    std::vector<std::uint64_t> oChanged(o.mnChannels);
    const auto oWork = [&]
    {
        oSplitter.Run(oSource.get(), oTargets, nPixels, o.mbCounted ? oChanged.data() : nullptr);
    };
    const Block oTarget = MakeBlock(nBytes);
    Measure(o.msName, nPixels * nPixelBytes, o.mnGoal, oWork, oTarget.get());
}

struct Strides
{
    const char* msName;
    BufferType meFrom;
    std::uint64_t mnFromStride;
    BufferType meTo;
    std::uint64_t mnToStride;
    unsigned int mnChannels;
};

void MeasureStrides(const Strides& o, std::uint64_t nBytes)
{
    const std::uint64_t nPixels = nBytes / BufferDataSize(o.meTo, o.mnChannels);
    const Block oSource = MakeBlock(BufferDataSize(o.meFrom, nPixels * o.mnFromStride));
    const Block oTarget = MakeBlock(BufferDataSize(o.meTo, nPixels * o.mnToStride));
    const auto oWork = [&]
    {
        CopyData(oSource.get(), o.meFrom, o.mnFromStride, oTarget.get(), o.meTo, o.mnToStride, nPixels, o.mnChannels);
    };
    Measure(o.msName, nPixels * BufferDataSize(o.meTo, o.mnChannels), 0, oWork, oTarget.get());
}

const Conversion CONVERSIONS[] = {
    {"8U to 32R", eBT_8U, eBT_32R, 0.9},     {"16U to 32R", eBT_16U, eBT_32R, 0.9},
    {"16U to 64R", eBT_16U, eBT_64R, 0.9},   {"16S to 32S", eBT_16S, eBT_32S, 0.9},
    {"32R to 16U", eBT_32R, eBT_16U, 0.4},   {"32R to 8U", eBT_32R, eBT_8U, 0},
    {"32R to 32U", eBT_32R, eBT_32U, 0},     {"64R to 16S", eBT_64R, eBT_16S, 0},
    {"64R to 32R", eBT_64R, eBT_32R, 0},     {"32S to 16U", eBT_32S, eBT_16U, 0},
    {"16U to 8U", eBT_16U, eBT_8U, 0},       {"32U to 32R", eBT_32U, eBT_32R, 0},
    {"64S to 64R", eBT_64S, eBT_64R, 0},     {"64S to 32S", eBT_64S, eBT_32S, 0},
    {"C16S to C32R", eBT_C16S, eBT_C32R, 0}, {"C32R to 32R", eBT_C32R, eBT_32R, 0},
    {"32R to C32R", eBT_32R, eBT_C32R, 0},
};

// Sources and channels count from 0.
const Merging MERGINGS[] = {
    {"{3 x 8U, 16U} to 4 x 32R", {{eBT_8U, 3}, {eBT_16U, 1}}, eBT_32R, {{0, 0}, {0, 1}, {0, 2}, {1, 0}}, 0.75},
    {"{2 x 8U, 16U, 32R} to 4 x 64R",
     {{eBT_8U, 2}, {eBT_16U, 1}, {eBT_32R, 1}},
     eBT_64R,
     {{0, 0}, {1, 0}, {0, 1}, {2, 0}},
     1.0},
    {"{2 x 8U, 16U} to 3 x 16U", {{eBT_8U, 2}, {eBT_16U, 1}}, eBT_16U, {{0, 0}, {1, 0}, {0, 1}}, 0},
    {"{8U, 16S, 32R} to 3 x 32R", {{eBT_8U, 1}, {eBT_16S, 1}, {eBT_32R, 1}}, eBT_32R, {{0, 0}, {1, 0}, {2, 0}}, 0},
    {"{8U, 64S} to 2 x 64S", {{eBT_8U, 1}, {eBT_64S, 1}}, eBT_64S, {{0, 0}, {1, 0}}, 0},
    {"{32R, C32R} to 2 x C32R", {{eBT_32R, 1}, {eBT_C32R, 1}}, eBT_C32R, {{0, 0}, {1, 0}}, 0},
    {"{7 x 16U, 8U, 32R} to 9 x 32R",
     {{eBT_16U, 7}, {eBT_8U, 1}, {eBT_32R, 1}},
     eBT_32R,
     {{0, 0}, {0, 1}, {1, 0}, {0, 2}, {0, 3}, {0, 4}, {2, 0}, {0, 5}, {0, 6}},
     0},
};

const Splitting SPLITTINGS[] = {
    {"3 x 32R to {8U, 16U, 32R}", eBT_32R, 3, {{eBT_8U, {0}}, {eBT_16U, {1}}, {eBT_32R, {2}}}, false, 0.75},
    {"the same, counted", eBT_32R, 3, {{eBT_8U, {0}}, {eBT_16U, {1}}, {eBT_32R, {2}}}, true, 0.75},
    {"6 x 64R to {3 x 8U, 2 x 16S, 64R}, counted",
     eBT_64R,
     6,
     {{eBT_8U, {0, 2, 4}}, {eBT_16S, {1, 3}}, {eBT_64R, {5}}},
     true,
     0.75},
    {"4 x 16U to {3 x 8U, 16U}, counted", eBT_16U, 4, {{eBT_8U, {0, 1, 2}}, {eBT_16U, {3}}}, true, 0},
    {"3 x 32S to {8U, 16S, 32S}, counted", eBT_32S, 3, {{eBT_8U, {0}}, {eBT_16S, {1}}, {eBT_32S, {2}}}, true, 0},
};

const Strides STRIDES[] = {
    {"one of 3 x 8U out", eBT_8U, 3, eBT_8U, 1, 1},       {"one of 3 x 8U in", eBT_8U, 1, eBT_8U, 3, 1},
    {"one of 4 x 16U out", eBT_16U, 4, eBT_16U, 1, 1},    {"one of 4 x 16U in", eBT_16U, 1, eBT_16U, 4, 1},
    {"one of 3 x 8U to 32R", eBT_8U, 3, eBT_32R, 1, 1},   {"3 x 8U to 3 of 4 x 32R", eBT_8U, 3, eBT_32R, 4, 3},
    {"16U to one of 4 x 32R", eBT_16U, 1, eBT_32R, 4, 1},
};

} // namespace

int main(int nArguments, char** sArguments)
{
    const Arguments oArguments(nArguments, sArguments, "[--only convert|merge|split|stride] [--match TEXT]");
    const std::string match = oArguments.GetOption("match");
    const auto oMeasureAll = [&](const char* sPart, const char* sTitle, const auto& oWorkloads, auto Work)
    {
        if (!oArguments.Wants(sPart))
            return;
        PrintHeading(sTitle);
        for (const auto& oWorkload : oWorkloads)
            for (const std::uint64_t nBytes : SIZES)
                if (std::string(oWorkload.msName).find(match) != std::string::npos)
                    Work(oWorkload, nBytes);
    };
    oMeasureAll("convert", "Packed conversion against memcpy of the result", CONVERSIONS, MeasureConversion);
    oMeasureAll("merge", "Merging against memcpy of the result", MERGINGS, MeasureMerging);
    oMeasureAll("split", "Splitting against memcpy of the source", SPLITTINGS, MeasureSplitting);
    oMeasureAll("stride", "Strided conversion against memcpy of the values written", STRIDES, MeasureStrides);
}
