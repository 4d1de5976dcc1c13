// Measures no-data masks against memcpy of the same tiles, and how work on metadata tags grows with their number.
//     krv_bench_metadata [--only masks|tags]

#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/metadatafilters.h"
#include "gobs/mask/mask.h"
#include "gobs/mask/maskdecision.h"
#include "gobs/raster/raster.h"

#include <algorithm>
#include <cstring>
#include <ctime>
#include <functional>
#include <limits>
#include <memory>
#include <numeric>
#include <random>
#include <string>
#include <vector>

namespace
{

using namespace krv::benchmarks;
using namespace krv::gobs;
using krv::datasources::AuxiliaryData;

constexpr std::uint64_t BYTES_A_ROUND = 8ull << 20;
constexpr std::uint64_t COLD_BYTES = 192ull << 20;
// Short rounds, so that few of them are interrupted.
constexpr int ROUNDS = 41;

// Tiles that are visited in turn: a single one stays in the caches, a set larger than them does not.
class TileSet
{
public:
    TileSet(unsigned int nSize, unsigned int nChannels, NativeDataTypeCode eType, bool bCold)
    {
        const RasterInfo oInfo(nSize, nSize, nChannels, eType);
        const std::uint64_t nBytes = BufferBytes(nSize, nSize, nChannels, eType);
        const std::uint64_t nTiles = bCold ? COLD_BYTES / nBytes : 1;
        for (std::uint64_t n = 0; n < nTiles; ++n)
        {
            moTiles.push_back(std::make_unique<Raster>(oInfo, RasterContext()));
            std::memset(moTiles.back()->GetBuffer(), static_cast<int>(n % 3), nBytes);
        }
        mnVisits = std::max<std::uint64_t>(bCold ? nTiles : BYTES_A_ROUND / nBytes, 1);
        moCopy = std::make_unique<Raster>(oInfo, RasterContext());
    }

    void Copy()
    {
        for (std::uint64_t n = 0; n < mnVisits; ++n)
        {
            std::memcpy(moCopy->GetBuffer(), moTiles[n % moTiles.size()]->GetBuffer(), moCopy->GetBufferSize());
            Keep(moCopy->GetBuffer());
        }
    }

    void Mark(const IMaskBuilder& oBuilder)
    {
        for (std::uint64_t n = 0; n < mnVisits; ++n)
        {
            const std::unique_ptr<Mask> oMask(oBuilder.BuildMask(*moTiles[n % moTiles.size()]));
            Keep(oMask->GetBits());
        }
    }

private:
    std::vector<std::unique_ptr<Raster>> moTiles;
    std::unique_ptr<Raster> moCopy;
    std::uint64_t mnVisits;
};

// memcpy's time by that of the masks, for each rule; the value lies in a third of the tiles, or is NaN.
std::vector<double> MaskRatios(TileSet& oTiles, unsigned int nChannels, double nValue, int nRounds)
{
    std::vector<unsigned int> oChannels(nChannels);
    std::iota(oChannels.begin(), oChannels.end(), 1u);
    const std::vector<double> oValues(nChannels, nValue);
    const MaskDecision oAny(eAnyChannel, oValues, oChannels);
    const MaskDecision oAll(eAllChannels, oValues, oChannels);
    const MaskDecisionBuilder oAnyBuilder(&oAny);
    const MaskDecisionBuilder oAllBuilder(&oAll);
    const auto oSeconds = MedianSeconds({{"memcpy",
                                          [&]
                                          {
                                              oTiles.Copy();
                                          }},
                                         {"any",
                                          [&]
                                          {
                                              oTiles.Mark(oAnyBuilder);
                                          }},
                                         {"all",
                                          [&]
                                          {
                                              oTiles.Mark(oAllBuilder);
                                          }}},
                                        nRounds);
    return {oSeconds[0] / oSeconds[1], oSeconds[0] / oSeconds[2]};
}

void MeasureMasks(const std::string& name, NativeDataTypeCode eType, unsigned int nChannels, double nValue)
{
    double nLowest = std::numeric_limits<double>::infinity();
    std::string remarks = "any, all:";
    for (const unsigned int nSize : {256u, 512u, 0u})
    {
        TileSet oTiles(nSize == 0 ? 512 : nSize, nChannels, eType, nSize == 0);
        const std::vector<double> oRatios = MaskRatios(oTiles, nChannels, nValue, nSize == 0 ? 7 : ROUNDS);
        remarks += (nSize == 0 ? "  uncached " : "  tile of " + std::to_string(nSize) + " ") + Number(oRatios[0]) +
                   ", " + Number(oRatios[1]);
        nLowest = std::min({nLowest, oRatios[0], oRatios[1]});
    }
    PrintRow("mask " + std::to_string(nChannels) + " x " + name, nLowest, nChannels == 3 ? 0.0 : 0.5, remarks);
}

void MeasureAllMasks()
{
    PrintHeading("no-data masks: the lowest of memcpy's time / the mask's time");
    for (const unsigned int nChannels : {1u, 4u, 3u})
    {
        for (int nCode = eDT_8U; nCode <= eDT_C64R; ++nCode)
        {
            const auto eType = static_cast<NativeDataTypeCode>(nCode);
            MeasureMasks(DataType(eType).Describe(), eType, nChannels, 0.0);
            if (DataType(eType).IsReal())
                MeasureMasks(DataType(eType).Describe() + " NaN", eType, nChannels,
                             std::numeric_limits<double>::quiet_NaN());
        }
    }
}

// The processor's time, since long runs are interrupted more often than short ones: the least of several rounds.
double ProcessorSeconds(const std::function<void()>& oRun)
{
    double nLeast = std::numeric_limits<double>::infinity();
    for (int nRound = 0; nRound < ROUNDS; ++nRound)
    {
        const std::clock_t nStart = std::clock();
        oRun();
        nLeast = std::min(nLeast, static_cast<double>(std::clock() - nStart) / CLOCKS_PER_SEC);
    }
    return nLeast;
}

std::vector<std::string> MakeKeys(unsigned int nCount)
{
    constexpr const char* STEMS[] = {"Histogram_", "_Overview_", "Sensor_Gain_", "Acquisition-", "My_Default", "PCT"};
    std::vector<std::string> oKeys;
    for (unsigned int n = 0; n < nCount; ++n)
        oKeys.push_back(STEMS[n % std::size(STEMS)] + std::to_string(n) + (n % 11 == 0 ? "_REF" : ""));
    std::shuffle(oKeys.begin(), oKeys.end(), std::mt19937(5));
    return oKeys;
}

AuxiliaryData Edited(const std::vector<std::string>& oKeys)
{
    AuxiliaryData oData(1);
    for (const std::string& key : oKeys)
        oData.SetChanMetadataValue(key, "first", 1);
    for (const std::string& key : oKeys)
        oData.SetChanMetadataValue(key, "second", 1);
    for (const std::string& key : oKeys)
        oData.RemoveChanMetadataValue(key, 1);
    return oData;
}

void MeasureTags()
{
    constexpr unsigned int FEW = 2500;
    constexpr unsigned int GROWTH = 4;
    PrintHeading("tags: the time of one of 2,500 by that of one of 10,000 (1: linear)");
    const std::vector<std::string> oFew = MakeKeys(FEW);
    const std::vector<std::string> oMany = MakeKeys(FEW * GROWTH);
    const AuxiliaryData oFewTags = Edited(oFew);
    const AuxiliaryData oManyTags = Edited(oMany);
    const std::unique_ptr<krv::qrfutils::IMetadataFilter> oFilter(krv::qrfutils::GetMetadataFilter(31));
    const auto oKeep = [](const AuxiliaryData& oData)
    {
        Keep(&oData.GetChanMetadata(1));
    };
    const auto oRow = [&](const char* pName, const std::function<void()>& oShort, const std::function<void()>& oLong)
    {
        const double nShort = ProcessorSeconds(oShort) / FEW;
        const double nLong = ProcessorSeconds(oLong) / (FEW * GROWTH);
        PrintRow(pName, nShort / nLong, 0.5,
                 Number(nShort * 1e9, 0) + " ns a tag of 2,500, " + Number(nLong * 1e9, 0) + " ns of 10,000");
    };
    oRow(
        "set, change and drop each tag", [&] { oKeep(Edited(oFew)); }, [&] { oKeep(Edited(oMany)); });
    oRow(
        "copy", [&] { oKeep(AuxiliaryData(oFewTags)); }, [&] { oKeep(AuxiliaryData(oManyTags)); });
    oRow(
        "copy and filter by all categories", [&] { oKeep(oFewTags.GetFilteredMeta(nullptr, oFilter.get())); },
        [&] { oKeep(oManyTags.GetFilteredMeta(nullptr, oFilter.get())); });
    oRow(
        "copy and clean", [&] { oKeep(oFewTags.GetCleanedMeta()); }, [&] { oKeep(oManyTags.GetCleanedMeta()); });
}

} // namespace

int main(int nArguments, char** pArguments)
{
    const Arguments oArguments(nArguments, pArguments, "[--only masks|tags]");
    if (oArguments.Wants("masks"))
        MeasureAllMasks();
    if (oArguments.Wants("tags"))
        MeasureTags();
}
