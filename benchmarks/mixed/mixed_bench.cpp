// Measures reading a stack of images of different types as one type against reading the groups of one type by
// themselves, tile by tile: through readers of the files, and from a DEMO file that the stack is written to. And
// writing rasters of one type into channels of three types in memory against memcpy of the rasters.
//     krv_bench_mixed FOLDER [FILE...] [--only reading|writing]
// The files are images of one size, made ones by default; FOLDER takes them and the stack.

#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "benchmarks/support/scene.h"
#include "datasources/datasets/memorydataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/multitypereader.h"
#include "datasources/writer/multitypewriter.h"
#include "gobs/raster/raster.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <map>
#include <memory>
#include <numeric>
#include <string>
#include <vector>

namespace
{

using namespace krv::benchmarks;
using namespace krv::datasources;
using krv::gobs::DataType;
using krv::gobs::Raster;

constexpr int ROUNDS = 31;
constexpr double BYTES_A_PASS = 64e6;
using Readers = std::vector<std::unique_ptr<IRasterReader>>;

struct Layer
{
    std::string moFile;
    unsigned int mnChannel;
    DataType moType;
};

std::vector<Layer> FindLayers(const std::vector<std::string>& oFiles)
{
    std::vector<Layer> oLayers;
    for (const std::string& file : oFiles)
    {
        const BasicReader oReader(file);
        for (unsigned int nChannel = 1; nChannel <= oReader.GetChansCount(); ++nChannel)
            oLayers.push_back({file, nChannel, oReader.GetDataType()});
    }
    return oLayers;
}

void WriteStack(const std::string& stack, const std::vector<Layer>& oLayers)
{
    BasicReader oFirst(oLayers.front().moFile, {oLayers.front().mnChannel});
    std::vector<DataType> oTypes;
    for (const Layer& oLayer : oLayers)
        oTypes.push_back(oLayer.moType);
    const std::unique_ptr<IDataset> oDataset(DatasetManager::GetInstance()->NewDataset(stack, "DEMO", ""));
    auto& oRasters = dynamic_cast<IRasterDataset&>(*oDataset);
    oRasters.Create(oFirst.GetWidth(), oFirst.GetHeight(), oTypes);
    for (unsigned int nLayer = 0; nLayer < oLayers.size(); ++nLayer)
    {
        BasicReader oReader(oLayers[nLayer].moFile, {oLayers[nLayer].mnChannel});
        const std::unique_ptr<Raster> oRaster(oReader.ReadRaster(0, 0, oFirst.GetWidth(), oFirst.GetHeight()));
        const std::unique_ptr<IRasterIO> oIO(oRasters.GetRasterIO({nLayer + 1}));
        oIO->WriteWindow(0u, 0u, oFirst.GetWidth(), oFirst.GetHeight(), oRaster->GetBuffer());
    }
    oDataset->Close();
}

// The groups are read tile by tile in turn, each into a raster of its own, as the mixed reader has to. A third
// candidate does that and copies a finished result: what is lost anyway where results are several times larger than
// what is read.
void Measure(const std::string& name, IRasterReader& oMixed, const Readers& oGroups)
{
    for (const auto& oGroup : oGroups)
        oGroup->SetTileSize(oMixed.GetTileWidth(), oMixed.GetTileHeight());
    const double nBytes = 1.0 * oMixed.GetWidth() * oMixed.GetHeight() * oMixed.GetChansCount() *
                          static_cast<double>(oMixed.GetDataType().GetValueBits()) / 8;
    // A pass of some length, so that memory that the other candidate's sizes displaced does not count.
    const int nRepeats = std::max(1, static_cast<int>(BYTES_A_PASS / nBytes));
    const auto oEachTile = [&](const auto& oRead)
    {
        for (int n = 0; n < nRepeats; ++n)
            for (unsigned int nTile = 0; nTile < oMixed.GetTileCount(); ++nTile)
                oRead(nTile);
    };
    const auto oReadTile = [](IRasterReader& oReader, unsigned int nTile)
    {
        Keep(std::unique_ptr<Raster>(oReader.GetRaster(nTile))->GetBuffer());
    };
    const auto oReadGroups = [&](unsigned int nTile)
    {
        for (const auto& oGroup : oGroups)
            oReadTile(*oGroup, nTile);
    };
    const std::unique_ptr<Raster> oFirst(oMixed.GetRaster(0));
    const auto oTimes =
        MedianSeconds({{"mixed",
                        [&]
                        {
                            oEachTile([&](unsigned int nTile) { oReadTile(oMixed, nTile); });
                        }},
                       {"groups",
                        [&]
                        {
                            oEachTile(oReadGroups);
                        }},
                       {"groups, result",
                        [&]
                        {
                            oEachTile(
                                [&](unsigned int nTile)
                                {
                                    oReadGroups(nTile);
                                    Raster oResult(oFirst->GetInfo(), oFirst->GetContext());
                                    std::memcpy(oResult.GetBuffer(), oFirst->GetBuffer(), oResult.GetBufferSize());
                                    Keep(oResult.GetBuffer());
                                });
                        }}},
                      ROUNDS);
    PrintRow(name + ", " + std::to_string(oMixed.GetChansCount()) + " x " + oMixed.GetDataType().Describe(),
             oTimes[1] / oTimes[0], 0.8,
             Number(oTimes[1] / oTimes[2]) + " with memcpy for merging; " +
                 Number(nBytes * nRepeats / oTimes[0] / 1e6, 0) + " MB/s of the result, tiles of " +
                 std::to_string(oMixed.GetTileWidth()) + " x " + std::to_string(oMixed.GetTileHeight()));
}

void MeasureStack(const std::string& stack, const std::vector<Layer>& oLayers, const DataType& oType)
{
    std::vector<unsigned int> oNumbers(oLayers.size());
    std::iota(oNumbers.begin(), oNumbers.end(), 1u);
    MultiTypeReader oMixed(stack, oNumbers, oType, eOwnPlace);
    std::map<DataType, std::vector<unsigned int>> oByType;
    for (unsigned int nLayer = 0; nLayer < oLayers.size(); ++nLayer)
        oByType[oLayers[nLayer].moType].push_back(nLayer + 1);
    Readers oGroups;
    for (const auto& [oGroupType, oChannels] : oByType)
        oGroups.push_back(std::make_unique<BasicReader>(stack, oChannels));
    Measure("DEMO stack", oMixed, oGroups);
}

void MeasureFiles(IDataset& oDataset, const std::vector<Layer>& oLayers, const DataType& oType)
{
    std::vector<IRasterReader*> oTakenOver;
    std::vector<unsigned int> oNumbers;
    Readers oGroups;
    for (const Layer& oLayer : oLayers)
    {
        oNumbers.push_back(oLayer.mnChannel);
        oTakenOver.push_back(new BasicReader(oLayer.moFile, {oLayer.mnChannel}));
        oGroups.push_back(std::make_unique<BasicReader>(oLayer.moFile, std::vector{oLayer.mnChannel}));
    }
    MultiTypeReader oMixed(&oDataset, oTakenOver, oNumbers, oType);
    Measure("the files", oMixed, oGroups);
}

// The tiles of an image are written over and over: none is new memory. One raster takes the place of all, as a program
// has that fills one and writes it. Processor time.
void MeasureWriting(const std::string& name, const std::vector<DataType>& oTypes, unsigned int nTile)
{
    constexpr unsigned int SIZE = 2048;
    MemoryDataset oDataset;
    oDataset.Create(SIZE, SIZE, oTypes);
    MultiTypeWriter oWriter(static_cast<IRasterDataset*>(&oDataset), {});
    Raster oRaster({nTile, nTile, oWriter.GetChansCount(), oWriter.GetDataType()}, {0, 0});
    std::memset(oRaster.GetBuffer(), 0, oRaster.GetBufferSize());
    std::vector<unsigned char> oCopy(std::uint64_t{SIZE} / nTile * SIZE / nTile * oRaster.GetBufferSize(), 1);
    const auto oEachTile = [&](const auto& oWrite)
    {
        for (unsigned int n = 0; n < SIZE / nTile * (SIZE / nTile); ++n)
            oWrite(n);
    };
    const auto oTimes = MedianSeconds({{"memcpy",
                                        [&]
                                        {
                                            oEachTile(
                                                [&](unsigned int n)
                                                {
                                                    std::memcpy(oCopy.data() + n * oRaster.GetBufferSize(),
                                                                oRaster.GetBuffer(), oRaster.GetBufferSize());
                                                    Keep(oCopy.data());
                                                });
                                        }},
                                       {"mixed",
                                        [&]
                                        {
                                            oEachTile(
                                                [&](unsigned int n)
                                                {
                                                    const Raster oTile(oRaster.GetInfo(),
                                                                       {static_cast<int>(n % (SIZE / nTile) * nTile),
                                                                        static_cast<int>(n / (SIZE / nTile) * nTile)},
                                                                       oRaster.GetBuffer(), false);
                                                    oWriter.WriteRaster(&oTile);
                                                });
                                        }}},
                                      ROUNDS, Clock::eProcessor);
    PrintRow(name + ", tiles of " + std::to_string(nTile), oTimes[0] / oTimes[1], 0.75,
             Number(static_cast<double>(oCopy.size()) / oTimes[1] / 1e9) + " GB/s of rasters");
}

void MeasureReading(const std::string& folder, std::vector<std::string> oFiles)
{
    const std::string stack = folder + "/stack.demo";
    std::filesystem::create_directories(folder);
    if (oFiles.empty())
        for (const SceneKind& oKind : {SceneKind{"3x8U", 3, 8, false}, SceneKind{"1x16U", 1, 16, false}})
            oFiles.push_back(MakeScene(folder, oKind, "deflate", 256, 2048).moPath);
    const std::vector<Layer> oLayers = FindLayers(oFiles);
    WriteStack(stack, oLayers);
    const std::unique_ptr<IDataset> oDataset(DatasetManager::GetInstance()->Open(oLayers.front().moFile, eReadOnly));
    PrintHeading("Several types as one against the groups by themselves");
    std::vector<DataType> oTypes;
    for (const Layer& oLayer : oLayers)
        oTypes.push_back(oLayer.moType);
    for (const DataType& oType : {krv::gobs::PromoteType(oTypes), DataType(krv::gobs::eDT_64R)})
    {
        MeasureStack(stack, oLayers, oType);
        MeasureFiles(*oDataset, oLayers, oType);
    }
}

} // namespace

int main(int nArguments, char** pArguments)
{
    const Arguments oArguments(nArguments, pArguments, "FOLDER [FILE...] [--only reading|writing]");
    const std::vector<std::string>& oWords = oArguments.GetWords();
    if (oArguments.Wants("reading"))
        MeasureReading(oWords.front(), {oWords.begin() + 1, oWords.end()});
    if (!oArguments.Wants("writing"))
        return 0;
    PrintHeading("Writing into three types against memcpy of the rasters");
    for (const unsigned int nTile : {256U, 1024U})
    {
        MeasureWriting("8U, 16U, 32R", {krv::gobs::eDT_8U, krv::gobs::eDT_16U, krv::gobs::eDT_32R}, nTile);
        MeasureWriting("3 x 8U, 2 x 16S, 64R",
                       {krv::gobs::eDT_8U, krv::gobs::eDT_16S, krv::gobs::eDT_8U, krv::gobs::eDT_64R,
                        krv::gobs::eDT_16S, krv::gobs::eDT_8U},
                       nTile);
    }
    return 0;
}
