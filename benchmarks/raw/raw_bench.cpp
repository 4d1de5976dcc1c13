// Measures files of plain pixels against pread and a straight loop, the other byte order against this machine's, and
// levels in a file beside the image against levels inside, and what looking for files beside a TIFF costs where there
// are none. What is read is compared first.

#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/basicoverviewreaderaccessor.h"
#include "datasources/reader/basicreader.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/raster/raster.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <fcntl.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

namespace
{

using namespace krv::benchmarks;
using namespace krv::datasources;

constexpr unsigned int SIZE = 4096;
constexpr unsigned int CHANNELS = 4;
constexpr unsigned int TILE = 256;
constexpr unsigned int WINDOW = 300;
constexpr int WINDOWS = 400;
constexpr int ROUNDS = 9;
constexpr int SWAP_ROUNDS = 41; // what is compared differs by little more than the rounds do

using Value = std::uint16_t;

struct Rect
{
    unsigned int mnX;
    unsigned int mnY;
    unsigned int mnWidth;
    unsigned int mnHeight;
};

std::unique_ptr<IDataset> Open(const std::string& file, AccessMode eMode = eReadOnly)
{
    return std::unique_ptr<IDataset>(DatasetManager::GetInstance()->Open(file, eMode));
}

IRasterDataset& Rasters(IDataset& oDataset)
{
    return dynamic_cast<IRasterDataset&>(oDataset);
}

std::string MakeFile(const std::string& folder, const std::string& name, const std::string& format,
                     const std::string& options, krv::gobs::NativeDataTypeCode eType)
{
    const std::string file = folder + "/" + name;
    const std::unique_ptr<IDataset> poDataset(DatasetManager::GetInstance()->NewDataset(file, format, options));
    Rasters(*poDataset).Create(SIZE, SIZE, std::vector<krv::gobs::DataType>(CHANNELS, eType));
    const std::unique_ptr<IRasterIO> poIO(Rasters(*poDataset).GetRasterIO({1, 2, 3, 4}));
    std::mt19937 oRandom(1);
    std::vector<std::uint32_t> oRow(std::size_t{SIZE} * CHANNELS);
    for (unsigned int nY = 0; nY < SIZE; ++nY)
    {
        for (std::uint32_t& nValue : oRow)
            nValue = static_cast<std::uint32_t>(oRandom() >> 8);
        poIO->WriteWindow(0u, nY, SIZE, 1u, reinterpret_cast<unsigned char*>(oRow.data()));
    }
    poDataset->Close();
    return file;
}

// One pread for each row of a channel, or for what of a row lies together, and a loop over its values.
class ByHand
{
public:
    ByHand(const std::string& file, const std::string& interleave)
        : mnFile(open(file.c_str(), O_RDONLY)), moInterleave(interleave)
    {
    }
    ~ByHand() { close(mnFile); }

    void Read(const Rect& oRect, Value* pTarget)
    {
        if (moInterleave == "BIP")
        {
            for (unsigned int nRow = 0; nRow < oRect.mnHeight; ++nRow)
                Take((std::uint64_t{oRect.mnY + nRow} * SIZE + oRect.mnX) * CHANNELS, oRect.mnWidth * CHANNELS,
                     pTarget + std::size_t{nRow} * oRect.mnWidth * CHANNELS);
            return;
        }
        moRow.resize(oRect.mnWidth);
        for (unsigned int nRow = 0; nRow < oRect.mnHeight; ++nRow)
            for (unsigned int nChannel = 0; nChannel < CHANNELS; ++nChannel)
            {
                const std::uint64_t nLine = moInterleave == "BIL"
                                                ? std::uint64_t{oRect.mnY + nRow} * CHANNELS + nChannel
                                                : std::uint64_t{nChannel} * SIZE + oRect.mnY + nRow;
                Take(nLine * SIZE + oRect.mnX, oRect.mnWidth, moRow.data());
                Value* const pRow = pTarget + std::size_t{nRow} * oRect.mnWidth * CHANNELS + nChannel;
                for (unsigned int nAt = 0; nAt < oRect.mnWidth; ++nAt)
                    pRow[std::size_t{nAt} * CHANNELS] = moRow[nAt];
            }
    }

private:
    void Take(std::uint64_t nFirst, std::size_t nValues, Value* pTarget) const
    {
        const auto nBytes = static_cast<ssize_t>(nValues * sizeof(Value));
        if (pread(mnFile, pTarget, nValues * sizeof(Value), static_cast<off_t>(nFirst * sizeof(Value))) != nBytes)
            throw std::runtime_error("the file cannot be read");
    }

    int mnFile;
    std::string moInterleave;
    std::vector<Value> moRow;
};

std::vector<Rect> ListTiles()
{
    std::vector<Rect> oRects;
    for (unsigned int nY = 0; nY < SIZE; nY += TILE)
        for (unsigned int nX = 0; nX < SIZE; nX += TILE)
            oRects.push_back({nX, nY, TILE, TILE});
    return oRects;
}

std::vector<Rect> ListWindows()
{
    std::mt19937 oRandom(2);
    std::vector<Rect> oRects;
    for (int n = 0; n < WINDOWS; ++n)
        oRects.push_back({static_cast<unsigned int>(oRandom() % (SIZE - WINDOW)),
                          static_cast<unsigned int>(oRandom() % (SIZE - WINDOW)), WINDOW, WINDOW});
    return oRects;
}

void ReadAll(IRasterIO& oIO, const std::vector<Rect>& oRects, std::vector<unsigned char>& oBuffer)
{
    for (const Rect& oRect : oRects)
        oIO.ReadWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oBuffer.data());
}

void MeasureLayout(const std::string& folder, const std::string& interleave)
{
    const std::string file =
        MakeFile(folder, interleave + ".img", "RAW", "INTERLEAVE=" + interleave, krv::gobs::eDT_16U);
    ByHand oHand(file, interleave);
    const auto poDataset = Open(file);
    const std::unique_ptr<IRasterIO> poIO(Rasters(*poDataset).GetRasterIO({1, 2, 3, 4}));
    std::vector<unsigned char> oOurs(std::size_t{WINDOW} * WINDOW * CHANNELS * sizeof(Value)), oTheirs(oOurs.size());
    const std::pair<const char*, std::vector<Rect>> KINDS[] = {{"tiles", ListTiles()}, {"windows", ListWindows()}};
    for (const auto& [pKind, oRects] : KINDS)
    {
        for (const Rect& oRect : oRects)
        {
            poIO->ReadWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oOurs.data());
            oHand.Read(oRect, reinterpret_cast<Value*>(oTheirs.data()));
            if (std::memcmp(oOurs.data(), oTheirs.data(),
                            std::size_t{oRect.mnWidth} * oRect.mnHeight * CHANNELS * sizeof(Value)) != 0)
                throw std::runtime_error("a window was read wrongly");
        }
        const auto oTimes = MedianSeconds({{"library",
                                            [&, &oList = oRects]
                                            {
                                                ReadAll(*poIO, oList, oOurs);
                                            }},
                                           {"by hand",
                                            [&, &oList = oRects]
                                            {
                                                for (const Rect& oRect : oList)
                                                    oHand.Read(oRect, reinterpret_cast<Value*>(oTheirs.data()));
                                            }}},
                                          ROUNDS);
        PrintRow(interleave + ", " + pKind + " of four channels", oTimes[1] / oTimes[0], 0.95);
    }
}

// The same file under a second name, whose header tells of the other byte order: reading differs in nothing else, as
// the pages of two files do, which the system keeps in larger and smaller pieces.
std::string TurnRound(const std::string& file, const std::string& other)
{
    const auto HeaderOf = [](const std::string& name)
    {
        return std::filesystem::path(name).replace_extension(".hdr");
    };
    for (const std::filesystem::path& oOld : {std::filesystem::path(other), HeaderOf(other)})
        std::filesystem::remove(oOld);
    std::filesystem::create_hard_link(file, other);
    std::ifstream oLines(HeaderOf(file));
    std::ofstream oTurned(HeaderOf(other));
    for (std::string line; std::getline(oLines, line);)
        oTurned << (line.starts_with("byte order") ? "byte order = 1" : line) << '\n';
    return other;
}

void CheckSwapped(const std::vector<unsigned char>& oNative, const std::vector<unsigned char>& oSwapped,
                  std::size_t nBytes)
{
    for (std::size_t n = 0; n < oNative.size(); ++n)
        if (oNative[n] != oSwapped[n / nBytes * nBytes + nBytes - 1 - n % nBytes])
            throw std::runtime_error("a value was not turned round");
}

void MeasureSwapping(const std::string& folder, krv::gobs::NativeDataTypeCode eType, const char* pBits)
{
    for (const std::string interleave : {"BSQ", "BIP"})
    {
        const std::string native =
            MakeFile(folder, interleave + "LITTLE.img", "RAW", "INTERLEAVE=" + interleave + " BYTEORDER=LITTLE", eType);
        const auto oChannels =
            interleave == "BSQ" ? std::vector<unsigned int>{1} : std::vector<unsigned int>{1, 2, 3, 4};
        const std::size_t nBytes = krv::gobs::DataType(eType).GetValueBits() / 8;
        std::vector<std::unique_ptr<IDataset>> oDatasets;
        std::vector<std::unique_ptr<IRasterIO>> oIOs;
        std::vector<std::vector<unsigned char>> oBuffers;
        for (const std::string& file : {native, TurnRound(native, folder + "/" + interleave + "BIG.img")})
        {
            oDatasets.push_back(Open(file));
            oIOs.emplace_back(Rasters(*oDatasets.back()).GetRasterIO(oChannels));
            oBuffers.emplace_back(std::size_t{SIZE} * TILE * oChannels.size() * nBytes);
            ReadAll(*oIOs.back(), {{0, 0, SIZE, TILE}}, oBuffers.back());
        }
        CheckSwapped(oBuffers[0], oBuffers[1], nBytes);
        std::vector<Rect> oRects;
        for (unsigned int nY = 0; nY < SIZE; nY += TILE)
            oRects.push_back({0, nY, SIZE, TILE});
        const auto oTimes = MedianSeconds({{"native",
                                            [&]
                                            {
                                                ReadAll(*oIOs[0], oRects, oBuffers[0]);
                                            }},
                                           {"swapped",
                                            [&]
                                            {
                                                ReadAll(*oIOs[1], oRects, oBuffers[0]);
                                            }}},
                                          SWAP_ROUNDS);
        PrintRow(std::string(pBits) + " swapped against native, " + interleave, oTimes[0] / oTimes[1], 0.8);
    }
}

void ReadLevel(IRasterReader& oReader)
{
    for (unsigned int nTile = 0; nTile < oReader.GetTileCount(); ++nTile)
        Keep(std::unique_ptr<krv::gobs::Raster>(oReader.GetRaster(nTile))->GetBuffer());
}

void MeasureLevels(const std::string& folder)
{
    const std::string inside = MakeFile(folder, "inside.tif", "TIF", "", krv::gobs::eDT_16U);
    const std::string beside = MakeFile(folder, "beside.img", "RAW", "", krv::gobs::eDT_16U);
    for (const std::string& file : {inside, beside})
    {
        std::unique_ptr<IDataset> poDataset(DatasetManager::GetInstance()->OpenFormat("GDBALL", file, eUpdate));
        if (poDataset == nullptr)
            poDataset = Open(file, eUpdate);
        BasicWriter oWriter(&Rasters(*poDataset), {1, 2, 3, 4});
        BuildOverviews(oWriter, {2}, "average");
        poDataset->Close();
    }
    const auto poInside = Open(inside), poBeside = Open(beside);
    BasicOverviewReaderAccessor oInside(&Rasters(*poInside), {1, 2, 3, 4}), oBeside(&Rasters(*poBeside), {1, 2, 3, 4});
    const std::unique_ptr<IRasterReader> poOne(oInside.CreateRasterReader(2)), poOther(oBeside.CreateRasterReader(2));
    const auto oTimes = MedianSeconds({{"inside",
                                        [&]
                                        {
                                            ReadLevel(*poOne);
                                        }},
                                       {"beside",
                                        [&]
                                        {
                                            ReadLevel(*poOther);
                                        }}},
                                      ROUNDS);
    PrintRow("levels through an .ovr against levels inside", oTimes[0] / oTimes[1], 0.97);
}

// All that a file says of itself.
void AskAll(IDataset& oDataset)
{
    Keep(&dynamic_cast<IGeocodedDataset&>(oDataset).GetGeocoding());
    const std::unique_ptr<krv::ogc::cs::ICRS> poCRS(oDataset.ReadCRS());
    oDataset.ReadAuxiliaryData();
    dynamic_cast<IBitmapDataset&>(oDataset).GetBitmapList();
}

// The same file under a name that is itself a sidecar's has none: nobody looks for them.
void MeasureLooking(const std::string& folder)
{
    constexpr int TIMES = 400;
    const std::string file = MakeFile(folder, "alone.tif", "TIF", "", krv::gobs::eDT_8U);
    const std::string without = folder + "/alone.ovr";
    std::filesystem::copy_file(file, without, std::filesystem::copy_options::overwrite_existing);
    for (const bool bAsk : {false, true})
    {
        const auto OpenOften = [bAsk](const std::string& name)
        {
            for (int n = 0; n < TIMES; ++n)
                if (const auto poDataset = Open(name); bAsk)
                    AskAll(*poDataset);
        };
        const auto oTimes = MedianSeconds({{"looking",
                                            [&]
                                            {
                                                OpenOften(file);
                                            }},
                                           {"without",
                                            [&]
                                            {
                                                OpenOften(without);
                                            }}},
                                          ROUNDS);
        PrintRow(bAsk ? "the same, asked for all that it says" : "opening a TIFF where no sidecar exists",
                 oTimes[1] / oTimes[0], 1 / 1.1);
    }
}

} // namespace

int main(int nArguments, char** pArguments)
{
    const Arguments oArguments(nArguments, pArguments, "FOLDER [--only layouts|swapping|levels|looking]");
    const std::string folder = oArguments.GetWords().front();
    std::filesystem::create_directories(folder);
    PrintHeading("Plain pixels, against pread and a straight loop");
    for (const char* pInterleave : {"BSQ", "BIL", "BIP"})
        if (oArguments.Wants("layouts"))
            MeasureLayout(folder, pInterleave);
    if (oArguments.Wants("swapping"))
    {
        MeasureSwapping(folder, krv::gobs::eDT_16U, "16 bits");
        MeasureSwapping(folder, krv::gobs::eDT_32U, "32 bits");
    }
    if (oArguments.Wants("levels"))
        MeasureLevels(folder);
    if (oArguments.Wants("looking"))
        MeasureLooking(folder);
    return 0;
}
