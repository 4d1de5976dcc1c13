// Measures native files against a plain file of the same tiles, which it writes and reads in the same run: both are
// brought to the disk at the same points, or neither is. What is read is compared first.

#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "gobs/raster/datatype.h"
#include "plugins/support/codec/blockcodec.h"

#include <fcntl.h>
#include <malloc.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <functional>
#include <memory>
#include <numeric>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

namespace
{

using namespace krv::benchmarks;
using namespace krv::datasources;
using Bytes = std::vector<unsigned char>;

constexpr unsigned int SIDE = 256;  // of a tile
constexpr unsigned int COMMIT = 64; // tiles
constexpr std::uint64_t FIRST = 16384;
constexpr int BUFFERS = 8;

struct Image
{
    const char* mpName;
    krv::gobs::NativeDataTypeCode meType;
    unsigned int mnChannels;
    unsigned int mnAcross; // tiles

    std::size_t GetTileBytes() const
    {
        return std::size_t{SIDE} * SIDE * mnChannels * (krv::gobs::DataType(meType).GetValueBits() / 8);
    }
    unsigned int CountTiles() const { return mnAcross * mnAcross; }
    std::uint64_t GetBytes() const { return CountTiles() * GetTileBytes(); }
    std::vector<unsigned int> GetChannels() const
    {
        std::vector<unsigned int> oChannels(mnChannels);
        std::iota(oChannels.begin(), oChannels.end(), 1U);
        return oChannels;
    }
};

constexpr Image IMAGES[] = {{"3 x 8U", krv::gobs::eDT_8U, 3, 37}, {"4 x 32R", krv::gobs::eDT_32R, 4, 16}};

// Of an image, smooth enough for codecs.
std::vector<Bytes> MakeTiles(const Image& oImage)
{
    std::mt19937 oRandom(1);
    std::vector<Bytes> oTiles;
    for (int nTile = 0; nTile < BUFFERS; ++nTile)
    {
        Bytes& oTile = oTiles.emplace_back(oImage.GetTileBytes());
        for (std::size_t n = 0; n < oTile.size(); ++n)
            oTile[n] = static_cast<unsigned char>(n / 96 + n % 3 * 40 + oRandom() % 4);
        if (oImage.meType == krv::gobs::eDT_32R)
            for (std::size_t n = 0; n + 4 <= oTile.size(); n += 4)
            {
                const float nValue = static_cast<float>(n / 64 % 1000) + static_cast<float>(oRandom() % 16) / 16;
                std::memcpy(&oTile[n], &nValue, 4);
            }
    }
    return oTiles;
}

// The tiles one behind the other.
class PlainFile
{
public:
    explicit PlainFile(const std::string& name, bool bNew)
        : mnFile(open(name.c_str(), bNew ? O_RDWR | O_CREAT | O_TRUNC : O_RDWR, 0600))
    {
        if (mnFile < 0)
            throw std::runtime_error("the plain file cannot be opened");
    }
    ~PlainFile() { close(mnFile); }
    PlainFile(const PlainFile&) = delete;
    PlainFile& operator=(const PlainFile&) = delete;

    void Write(std::uint64_t nOffset, const unsigned char* pBytes, std::size_t nBytes) const
    {
        if (pwrite(mnFile, pBytes, nBytes, static_cast<off_t>(nOffset)) != static_cast<ssize_t>(nBytes))
            throw std::runtime_error("the plain file cannot be written");
    }
    void Read(std::uint64_t nOffset, unsigned char* pBytes, std::size_t nBytes) const
    {
        if (pread(mnFile, pBytes, nBytes, static_cast<off_t>(nOffset)) != static_cast<ssize_t>(nBytes))
            throw std::runtime_error("the plain file cannot be read");
    }
    void Sync() const { fdatasync(mnFile); }

private:
    int mnFile;
};

class NativeFile
{
public:
    NativeFile(const std::string& name, const Image& oImage)
        : mpoDataset(DatasetManager::GetInstance()->Open(name, eReadOnly)), moImage(oImage)
    {
        OpenIO();
    }
    NativeFile(const std::string& name, const Image& oImage, const std::string& options)
        : mpoDataset(options == "update" ? DatasetManager::GetInstance()->Open(name, eUpdate)
                                         : DatasetManager::GetInstance()->NewDataset(name, "KRVDSK", options)),
          moImage(oImage)
    {
        if (options != "update")
            dynamic_cast<IRasterDataset&>(*mpoDataset)
                .Create(oImage.mnAcross * SIDE, oImage.mnAcross * SIDE,
                        std::vector<krv::gobs::DataType>(oImage.mnChannels, oImage.meType));
        OpenIO();
    }

    void Write(unsigned int nTile, const unsigned char* pBytes) const
    {
        mpoIO->WriteWindow(nTile % moImage.mnAcross * SIDE, nTile / moImage.mnAcross * SIDE, SIDE, SIDE,
                           const_cast<unsigned char*>(pBytes));
    }
    void Read(unsigned int nTile, unsigned char* pBytes) const
    {
        mpoIO->ReadWindow(nTile % moImage.mnAcross * SIDE, nTile / moImage.mnAcross * SIDE, SIDE, SIDE, pBytes);
    }
    void Sync() const { mpoDataset->Synchronize(); }
    void Close() const { mpoDataset->Close(); }

private:
    void OpenIO() { mpoIO.reset(dynamic_cast<IRasterDataset&>(*mpoDataset).GetRasterIO(moImage.GetChannels())); }

    std::unique_ptr<IDataset> mpoDataset;
    Image moImage;
    std::unique_ptr<IRasterIO> mpoIO;
};

// What is made before a run is not measured, neither is what goes after it.
struct Run
{
    std::function<void()> moBefore;
    std::function<void()> moRun;
    std::function<void()> moAfter;
};

// In turn, in another order every round; the disk has nothing left to do when a run begins.
std::vector<double> Measure(const std::vector<Run>& oRuns, int nRounds)
{
    std::vector<std::size_t> oOrder(oRuns.size());
    std::iota(oOrder.begin(), oOrder.end(), std::size_t{0});
    std::mt19937 oRandom(7);
    std::vector<std::vector<double>> oTimes(oRuns.size());
    for (int nRound = 0; nRound <= nRounds; ++nRound)
    {
        std::shuffle(oOrder.begin(), oOrder.end(), oRandom);
        for (const std::size_t nAt : oOrder)
        {
            oRuns[nAt].moBefore();
            sync();
            const double nSeconds = Seconds(oRuns[nAt].moRun);
            oRuns[nAt].moAfter();
            if (nRound != 0)
                oTimes[nAt].push_back(nSeconds);
        }
    }
    std::vector<double> oMedians;
    for (const std::vector<double>& oValues : oTimes)
        oMedians.push_back(Median(oValues));
    return oMedians;
}

std::string Rate(std::uint64_t nBytes, double nSeconds)
{
    return Number(static_cast<double>(nBytes) / nSeconds / (1U << 30)) + " GiB/s";
}

class Bench
{
public:
    Bench(const std::string& folder, const Image& oImage, int nRounds)
        : moImage(oImage), mnRounds(nRounds), moNative(folder + "/tiles.krv"), moPlain(folder + "/tiles.bin"),
          moTiles(MakeTiles(oImage))
    {
    }

    void MeasureWriting()
    {
        PrintHeading(std::string("Native file against a plain one, 256 MiB of ") + moImage.mpName);
        Compare("write", true, false, 0.8);
        Compare("write, synchronised every 64 tiles", true, true, 0.85);
        const double nSize = static_cast<double>(std::filesystem::file_size(moNative));
        PrintRow("size of a new file over its pixels, at most", nSize / static_cast<double>(moImage.GetBytes()), 1.005);
        Compare("rewrite", false, false, 0);
        Compare("rewrite, synchronised every 64 tiles", false, true, 0.78);
    }

    void MeasureReading()
    {
        Fill("");
        Bytes oTile(moImage.GetTileBytes()), oOther(oTile.size());
        std::vector<unsigned int> oTiles(moImage.CountTiles());
        std::iota(oTiles.begin(), oTiles.end(), 0U);
        std::unique_ptr<NativeFile> poNative = std::make_unique<NativeFile>(moNative, moImage);
        const PlainFile oPlain(moPlain, false);
        const auto ReadNative = [&]
        {
            for (const unsigned int nTile : oTiles)
                poNative->Read(nTile, oTile.data());
            Keep(oTile.data());
        };
        const auto ReadPlain = [&]
        {
            for (const unsigned int nTile : oTiles)
                oPlain.Read(FIRST + nTile * oTile.size(), oOther.data(), oOther.size());
            Keep(oOther.data());
        };
        for (const unsigned int nTile : oTiles)
        {
            poNative->Read(nTile, oTile.data());
            oPlain.Read(FIRST + nTile * oTile.size(), oOther.data(), oOther.size());
            if (oTile != oOther)
                throw std::runtime_error("a tile was read wrongly");
        }
        const auto Nothing = [] {
        };
        const auto Print = [&](const std::string& what, const std::function<void()>& oBefore, double nGoal)
        {
            const auto oTimes = Measure({{oBefore, ReadNative, Nothing}, {Nothing, ReadPlain, Nothing}}, 3 * mnRounds);
            PrintRow(what, oTimes[1] / oTimes[0], nGoal, Rate(moImage.GetBytes(), oTimes[0]));
        };
        Print("read", Nothing, 0.95);
        Print(
            "first read, with checksums", [&] { poNative = std::make_unique<NativeFile>(moNative, moImage); }, 0.75);
        ReadNative();
        std::shuffle(oTiles.begin(), oTiles.end(), std::mt19937(3));
        Print("read in any order", Nothing, 0.95);
    }

    void MeasureCodec(const std::string& name)
    {
        const krv::plugins::codec::BlockCodec& oCodec = *krv::plugins::codec::FindBlockCodec(name);
        const auto poEncoder = oCodec.mpMakeEncoder(std::nullopt);
        const auto poDecoder = oCodec.mpMakeDecoder();
        const std::string options = "PREDICTOR=NO COMPRESS=" + name;
        std::unique_ptr<NativeFile> poNative;
        std::unique_ptr<PlainFile> poPlain;
        std::vector<std::pair<std::uint64_t, std::size_t>> oPlaces(moImage.CountTiles());
        Bytes oCoded(poEncoder->GetBound(moImage.GetTileBytes())), oTile(moImage.GetTileBytes());
        std::uint64_t nEnd = FIRST;
        const auto WritePlain = [&]
        {
            nEnd = FIRST;
            for (unsigned int nTile = 0; nTile < moImage.CountTiles(); ++nTile)
            {
                const std::size_t nBytes =
                    poEncoder->Encode(GetTile(nTile), oTile.size(), oCoded.data(), oCoded.size());
                poPlain->Write(nEnd, oCoded.data(), nBytes);
                oPlaces[nTile] = {nEnd, nBytes};
                nEnd += nBytes;
            }
        };
        const auto ReadPlain = [&]
        {
            for (const auto& [nOffset, nBytes] : oPlaces)
            {
                poPlain->Read(nOffset, oCoded.data(), nBytes);
                poDecoder->Decode(oCoded.data(), nBytes, oTile.data(), oTile.size());
            }
            Keep(oTile.data());
        };
        const auto Nothing = [] {
        };
        auto oTimes = Measure({{[&] { poNative = std::make_unique<NativeFile>(moNative, moImage, options); },
                                [&]
                                {
                                    for (unsigned int nTile = 0; nTile < moImage.CountTiles(); ++nTile)
                                        poNative->Write(nTile, GetTile(nTile));
                                },
                                [&]
                                {
                                    poNative->Close();
                                }},
                               {[&] { poPlain = std::make_unique<PlainFile>(moPlain, true); }, WritePlain, Nothing}},
                              mnRounds);
        PrintRow(name + ", write", oTimes[1] / oTimes[0], 0.95, Rate(moImage.GetBytes(), oTimes[0]));
        const double nSize = static_cast<double>(std::filesystem::file_size(moNative));
        PrintRow(name + ", size over that of the blocks, at most", nSize / static_cast<double>(nEnd - FIRST), 1.03);
        poNative = std::make_unique<NativeFile>(moNative, moImage);
        const auto ReadNative = [&]
        {
            for (unsigned int nTile = 0; nTile < moImage.CountTiles(); ++nTile)
                poNative->Read(nTile, oTile.data());
            Keep(oTile.data());
        };
        oTimes = Measure({{Nothing, ReadNative, Nothing}, {Nothing, ReadPlain, Nothing}}, 2 * mnRounds);
        PrintRow(name + ", read", oTimes[1] / oTimes[0], 0.95, Rate(moImage.GetBytes(), oTimes[0]));
    }

    void MeasureSize()
    {
        Fill("");
        {
            const NativeFile oFile(moNative, moImage, "update");
            for (unsigned int nTime = 0; nTime < 10; ++nTime)
                WriteAll(oFile, true);
            oFile.Close();
        }
        const double nSize = static_cast<double>(std::filesystem::file_size(moNative));
        PrintRow("size after all was rewritten ten times, at most", nSize / static_cast<double>(moImage.GetBytes()),
                 1.1);
    }

private:
    const unsigned char* GetTile(unsigned int nTile) const { return moTiles[nTile % BUFFERS].data(); }

    template <class File>
    void WriteAll(const File& oFile, bool bSync) const
    {
        for (unsigned int nTile = 0; nTile < moImage.CountTiles(); ++nTile)
        {
            if constexpr (std::is_same_v<File, PlainFile>)
                oFile.Write(FIRST + nTile * moImage.GetTileBytes(), GetTile(nTile), moImage.GetTileBytes());
            else
                oFile.Write(nTile, GetTile(nTile));
            if (bSync && (nTile + 1) % COMMIT == 0)
                oFile.Sync();
        }
    }

    void Fill(const std::string& options) const
    {
        const NativeFile oNative(moNative, moImage, options);
        WriteAll(oNative, false);
        oNative.Close();
        WriteAll(PlainFile(moPlain, true), false);
    }

    void Compare(const std::string& what, bool bNew, bool bSync, double nGoal)
    {
        if (!bNew)
            Fill("");
        std::unique_ptr<NativeFile> poNative;
        std::unique_ptr<PlainFile> poPlain;
        const auto oTimes = Measure({{[&]
                                      {
                                          if (bNew)
                                              std::filesystem::remove(moNative);
                                          poNative =
                                              std::make_unique<NativeFile>(moNative, moImage, bNew ? "" : "update");
                                      },
                                      [&] { WriteAll(*poNative, bSync); },
                                      [&]
                                      {
                                          poNative->Close();
                                          poNative.reset();
                                      }},
                                     {[&]
                                      {
                                          if (bNew)
                                              std::filesystem::remove(moPlain);
                                          poPlain = std::make_unique<PlainFile>(moPlain, bNew);
                                      },
                                      [&] { WriteAll(*poPlain, bSync); },
                                      [&]
                                      {
                                          poPlain.reset();
                                      }}},
                                    mnRounds);
        PrintRow(what, oTimes[1] / oTimes[0], nGoal, Rate(moImage.GetBytes(), oTimes[0]));
    }

    Image moImage;
    int mnRounds;
    std::string moNative;
    std::string moPlain;
    std::vector<Bytes> moTiles;
};

// A million tiles: how long it takes until the first one is read, and what memory that takes.
void MeasureOpening(const std::string& folder)
{
    constexpr unsigned int SMALL = 16, SIZE = 16000;
    const std::string name = folder + "/million.krv";
    DatasetManager& oManager = *DatasetManager::GetInstance();
    {
        const std::unique_ptr<IDataset> poNew(oManager.NewDataset(name, "KRVDSK", "BLOCKXSIZE=16 BLOCKYSIZE=16"));
        auto& oRaster = dynamic_cast<IRasterDataset&>(*poNew);
        oRaster.Create(SIZE, SIZE, {krv::gobs::eDT_8U});
        const std::unique_ptr<IRasterIO> poIO(oRaster.GetRasterIO({1}));
        Bytes oRow(std::size_t{SIZE} * SMALL, 7);
        for (unsigned int nY = 0; nY < SIZE; nY += SMALL)
            poIO->WriteWindow(0U, nY, SIZE, SMALL, oRow.data());
        poNew->Close();
    }
    std::vector<double> oTimes;
    std::size_t nMost = 0;
    Bytes oTile(SMALL * SMALL);
    for (int nRound = 0; nRound < 11; ++nRound)
    {
        const std::size_t nBefore = mallinfo2().uordblks;
        oTimes.push_back(Seconds(
            [&]
            {
                const std::unique_ptr<IDataset> poDataset(oManager.Open(name, eReadOnly));
                const std::unique_ptr<IRasterIO> poIO(dynamic_cast<IRasterDataset&>(*poDataset).GetRasterIO({1}));
                poIO->ReadWindow(8000U, 8000U, SMALL, SMALL, oTile.data());
                nMost = std::max(nMost, mallinfo2().uordblks - nBefore);
            }));
    }
    PrintHeading("A file of a million tiles");
    PrintRow("opening it and reading one: milliseconds, at most", Median(oTimes) * 1000, 2);
    PrintRow("memory of that: MiB, at most", static_cast<double>(nMost) / (1U << 20), 2);
}

} // namespace

int main(int nArguments, char** pArguments)
{
    const Arguments oArguments(nArguments, pArguments,
                               "FOLDER [--rounds N] [--only writing|reading|codecs|size|opening]");
    const std::string folder = oArguments.GetWords().front();
    std::filesystem::create_directories(folder);
    const auto nRounds = static_cast<int>(oArguments.GetNumber("rounds", 5));
    for (const Image& oImage : IMAGES)
    {
        Bench oBench(folder, oImage, nRounds);
        if (oArguments.Wants("writing"))
            oBench.MeasureWriting();
        if (oArguments.Wants("reading"))
            oBench.MeasureReading();
        for (const char* const pName : {"ZSTD", "LZ4"})
            if (oArguments.Wants("codecs"))
                oBench.MeasureCodec(pName);
        if (oArguments.Wants("size"))
            oBench.MeasureSize();
    }
    if (oArguments.Wants("opening"))
        MeasureOpening(folder);
    return 0;
}
