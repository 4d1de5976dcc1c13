// Measures what is particular to TIFF files: pixels of one bit, the fax codings, PackBits, and opening. Each way of
// reading is compared with the other one first.

#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"

#include <fcntl.h>
#include <tiffio.h>
#include <unistd.h>

#include <cmath>
#include <cstring>
#include <filesystem>
#include <memory>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

namespace
{

using namespace krv::benchmarks;
using krv::datasources::DatasetManager;
using Bytes = std::vector<unsigned char>;
using TiffPointer = std::unique_ptr<TIFF, void (*)(TIFF*)>;

constexpr unsigned int SIZE = 8192;
constexpr unsigned int TILE = 256;
constexpr unsigned int STRIP = 32;
constexpr int ROUNDS = 15;

struct Kind
{
    const char* mpName;
    std::uint16_t mnBits;
    std::uint16_t mnCompression;
    bool mbTiled;

    std::string GetName() const
    {
        return std::string(mpName) + ", " + std::to_string(mnBits) + (mnBits == 1 ? " bit" : " bits") +
               (mbTiled ? ", tiles" : ", strips");
    }
    unsigned int GetWidth() const { return mbTiled ? TILE : SIZE; }
    unsigned int GetRows() const { return mbTiled ? TILE : STRIP; }
    unsigned int GetBlocks() const { return SIZE / GetWidth() * (SIZE / GetRows()); }
    std::size_t GetStoredBytes() const { return std::size_t{GetWidth()} * GetRows() * mnBits / 8; }
};

constexpr Kind KINDS[] = {
    {"no compression", 1, COMPRESSION_NONE, true},      {"no compression", 1, COMPRESSION_NONE, false},
    {"CCITT group 4", 1, COMPRESSION_CCITTFAX4, true},  {"CCITT group 4", 1, COMPRESSION_CCITTFAX4, false},
    {"CCITT group 3", 1, COMPRESSION_CCITTFAX3, false}, {"PackBits", 1, COMPRESSION_PACKBITS, true},
    {"PackBits", 8, COMPRESSION_PACKBITS, true},        {"PackBits", 8, COMPRESSION_PACKBITS, false}};

// Land with a ragged coast, in classes when a pixel has eight bits.
unsigned int MakePixel(const Kind& oKind, unsigned int nX, unsigned int nY)
{
    const double nHeight = std::sin(nX * 0.011) * std::cos(nY * 0.013) + 0.3 * std::sin(nX * 0.09 + nY * 0.05) +
                           0.05 * std::sin(nX * 0.9 + nY * 1.1);
    return oKind.mnBits == 1 ? nHeight > 0 : static_cast<unsigned int>(8 + 6 * nHeight);
}

std::string MakeFile(const std::string& folder, const Kind& oKind)
{
    const std::string name = folder + "/" + oKind.GetName() + ".tif";
    if (std::filesystem::exists(name))
        return name;
    const TiffPointer poTiff(TIFFOpen(name.c_str(), "w"), &TIFFClose);
    TIFFSetField(poTiff.get(), TIFFTAG_IMAGEWIDTH, SIZE);
    TIFFSetField(poTiff.get(), TIFFTAG_IMAGELENGTH, SIZE);
    TIFFSetField(poTiff.get(), TIFFTAG_BITSPERSAMPLE, oKind.mnBits);
    TIFFSetField(poTiff.get(), TIFFTAG_SAMPLESPERPIXEL, 1);
    TIFFSetField(poTiff.get(), TIFFTAG_PHOTOMETRIC,
                 oKind.mnBits == 1 ? PHOTOMETRIC_MINISWHITE : PHOTOMETRIC_MINISBLACK);
    TIFFSetField(poTiff.get(), TIFFTAG_COMPRESSION, oKind.mnCompression);
    if (oKind.mbTiled)
        TIFFSetField(poTiff.get(), TIFFTAG_TILEWIDTH, TILE);
    TIFFSetField(poTiff.get(), oKind.mbTiled ? TIFFTAG_TILELENGTH : TIFFTAG_ROWSPERSTRIP, oKind.GetRows());
    for (unsigned int nBlock = 0; nBlock < oKind.GetBlocks(); ++nBlock)
    {
        Bytes oBlock(oKind.GetStoredBytes());
        const unsigned int nAcross = SIZE / oKind.GetWidth();
        for (unsigned int nAt = 0; nAt < oKind.GetWidth() * oKind.GetRows(); ++nAt)
        {
            const unsigned int nX = nBlock % nAcross * oKind.GetWidth() + nAt % oKind.GetWidth();
            const unsigned int nPixel =
                MakePixel(oKind, nX, nBlock / nAcross * oKind.GetRows() + nAt / oKind.GetWidth());
            const unsigned int nShift = oKind.mnBits == 1 ? 7 - nAt % 8 : 0;
            oBlock[nAt * oKind.mnBits / 8] =
                static_cast<unsigned char>(oBlock[nAt * oKind.mnBits / 8] | nPixel << nShift);
        }
        const auto pWrite = oKind.mbTiled ? &TIFFWriteEncodedTile : &TIFFWriteEncodedStrip;
        pWrite(poTiff.get(), nBlock, oBlock.data(), static_cast<tmsize_t>(oBlock.size()));
    }
    return name;
}

// Blocks one after the other into one buffer, a byte for a pixel.
class ByHand
{
public:
    ByHand(const std::string& name, const Kind& oKind)
        : moKind(oKind), moTiff(TIFFOpen(name.c_str(), "rm"), &TIFFClose), mnFile(open(name.c_str(), O_RDONLY)),
          moStored(oKind.GetStoredBytes()), moPixels(std::size_t{oKind.GetWidth()} * oKind.GetRows())
    {
        for (unsigned int nBlock = 0; nBlock < oKind.GetBlocks(); ++nBlock)
            moOffsets.push_back(static_cast<off_t>(TIFFGetStrileOffset(moTiff.get(), nBlock)));
    }
    ~ByHand() { close(mnFile); }

    const Bytes& Read(unsigned int nBlock)
    {
        unsigned char* const pStored = moKind.mnBits == 1 ? moStored.data() : moPixels.data();
        const auto nBytes = static_cast<tmsize_t>(moStored.size());
        const auto pRead = moKind.mbTiled ? &TIFFReadEncodedTile : &TIFFReadEncodedStrip;
        if (moKind.mnCompression == COMPRESSION_NONE
                ? pread(mnFile, pStored, moStored.size(), moOffsets[nBlock]) != nBytes
                : pRead(moTiff.get(), nBlock, pStored, nBytes) != nBytes)
            throw std::runtime_error("a block cannot be read");
        unsigned char* pPixel = moPixels.data();
        for (std::size_t nAt = 0; moKind.mnBits == 1 && nAt < moStored.size(); ++nAt)
            for (int nBit = 7; nBit >= 0; --nBit)
                *pPixel++ = pStored[nAt] >> nBit & 1;
        return moPixels;
    }

private:
    Kind moKind;
    TiffPointer moTiff;
    int mnFile;
    std::vector<off_t> moOffsets;
    Bytes moStored;
    Bytes moPixels;
};

class ByLibrary
{
public:
    ByLibrary(const std::string& name, const Kind& oKind)
        : moKind(oKind), moDataset(DatasetManager::GetInstance()->Open(name, eReadOnly)),
          moIO(dynamic_cast<krv::datasources::IRasterDataset&>(*moDataset).GetRasterIO({1})),
          moPixels(std::size_t{oKind.GetWidth()} * oKind.GetRows())
    {
    }

    // A window, of the place and size of a block.
    const Bytes& Read(unsigned int nBlock)
    {
        const unsigned int nAcross = SIZE / moKind.GetWidth();
        moIO->ReadWindow(nBlock % nAcross * moKind.GetWidth(), nBlock / nAcross * moKind.GetRows(), moKind.GetWidth(),
                         moKind.GetRows(), moPixels.data());
        return moPixels;
    }

    // All of the image in windows of the size that the file prefers, which of strips are several.
    void ReadAll()
    {
        const unsigned int nRows = moIO->GetTileHeight();
        moPixels.resize(std::size_t{moIO->GetTileWidth()} * nRows);
        for (unsigned int nY = 0; nY < SIZE; nY += nRows)
            for (unsigned int nX = 0; nX < SIZE; nX += moIO->GetTileWidth())
                moIO->ReadWindow(nX, nY, moIO->GetTileWidth(), std::min(nRows, SIZE - nY), moPixels.data());
    }

private:
    Kind moKind;
    std::unique_ptr<krv::datasources::IDataset> moDataset;
    std::unique_ptr<krv::datasources::IRasterIO> moIO;
    Bytes moPixels;
};

void MeasureReading(const std::string& folder, const Kind& oKind)
{
    const std::string name = MakeFile(folder, oKind);
    ByHand oHand(name, oKind);
    ByLibrary oLibrary(name, oKind);
    for (unsigned int nBlock = 0; nBlock < oKind.GetBlocks(); ++nBlock)
        if (oHand.Read(nBlock) != oLibrary.Read(nBlock))
            throw std::runtime_error("a block was read wrongly");
    // Opened anew, so that nothing is in a cache.
    const auto oTimes = MedianSeconds({{"library",
                                        [&]
                                        {
                                            ByLibrary(name, oKind).ReadAll();
                                        }},
                                       {"by hand",
                                        [&]
                                        {
                                            for (unsigned int nBlock = 0; nBlock < oKind.GetBlocks(); ++nBlock)
                                                Keep(oHand.Read(nBlock).data());
                                        }}},
                                      ROUNDS);
    PrintRow(oKind.GetName(), oTimes[1] / oTimes[0], oKind.mnCompression == COMPRESSION_PACKBITS ? 1.0 : 0.9,
             Number(SIZE * 1e-6 * SIZE / oTimes[0], 0) + " million pixels a second");
}

void MeasureOpening(const std::string& folder, const std::string& what, const std::string& name)
{
    constexpr int OPENINGS = 10000;
    DatasetManager* const poManager = DatasetManager::GetInstance();
    std::vector<std::string> oNames;
    for (int nFile = 0; nFile < 100; ++nFile)
    {
        oNames.push_back(folder + "/opened" + std::to_string(nFile) + ".tif");
        std::filesystem::copy_file(name, oNames.back(), std::filesystem::copy_options::overwrite_existing);
    }
    const auto oTimes =
        MedianSeconds({{"library",
                        [&]
                        {
                            for (int n = 0; n < OPENINGS; ++n)
                                delete poManager->Open(oNames[static_cast<std::size_t>(n) % oNames.size()], eReadOnly);
                        }},
                       {"libtiff",
                        [&]
                        {
                            for (int n = 0; n < OPENINGS; ++n)
                                TIFFClose(TIFFOpen(oNames[static_cast<std::size_t>(n) % oNames.size()].c_str(), "r"));
                        }}},
                      ROUNDS);
    PrintRow("10,000 openings, " + what + ", time against libtiff", oTimes[0] / oTimes[1], 0,
             "at most 1.2; " + Number(oTimes[0] / OPENINGS * 1e6, 1) + " microseconds");
}

// A small tile of each of the usual kinds, with a level, a mask and a name.
std::string MakeSmall(const std::string& folder)
{
    const std::string name = folder + "/small.tif";
    const TiffPointer poTiff(TIFFOpen(name.c_str(), "w"), &TIFFClose);
    for (const std::uint32_t nKind : {0, FILETYPE_REDUCEDIMAGE, FILETYPE_MASK})
    {
        const unsigned int nSize = nKind == FILETYPE_REDUCEDIMAGE ? TILE / 2 : TILE;
        const int nChannels = nKind == FILETYPE_MASK ? 1 : 3;
        TIFFSetField(poTiff.get(), TIFFTAG_SUBFILETYPE, nKind);
        TIFFSetField(poTiff.get(), TIFFTAG_IMAGEWIDTH, nSize);
        TIFFSetField(poTiff.get(), TIFFTAG_IMAGELENGTH, nSize);
        TIFFSetField(poTiff.get(), TIFFTAG_BITSPERSAMPLE, nKind == FILETYPE_MASK ? 1 : 8);
        TIFFSetField(poTiff.get(), TIFFTAG_SAMPLESPERPIXEL, nChannels);
        TIFFSetField(poTiff.get(), TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG);
        TIFFSetField(poTiff.get(), TIFFTAG_PHOTOMETRIC, nKind == FILETYPE_MASK ? PHOTOMETRIC_MASK : PHOTOMETRIC_RGB);
        TIFFSetField(poTiff.get(), TIFFTAG_COMPRESSION, COMPRESSION_ADOBE_DEFLATE);
        TIFFSetField(poTiff.get(), TIFFTAG_TILEWIDTH, TILE / 2);
        TIFFSetField(poTiff.get(), TIFFTAG_TILELENGTH, TILE / 2);
        TIFFSetField(poTiff.get(), TIFFTAG_SOFTWARE, "benchmark");
        Bytes oTile(static_cast<std::size_t>(TIFFTileSize(poTiff.get())), 7);
        for (std::uint32_t nTile = 0; nTile < TIFFNumberOfTiles(poTiff.get()); ++nTile)
            TIFFWriteEncodedTile(poTiff.get(), nTile, oTile.data(), static_cast<tmsize_t>(oTile.size()));
        TIFFWriteDirectory(poTiff.get());
    }
    return name;
}

} // namespace

int main(int nArguments, char** pArguments)
{
    const Arguments oArguments(nArguments, pArguments, "FOLDER [FILE...] [--only blocks|opening]");
    const std::string folder = oArguments.GetWords().front();
    std::filesystem::create_directories(folder);
    TIFFSetWarningHandler(nullptr);
    if (oArguments.Wants("blocks"))
    {
        PrintHeading("Blocks of one bit and of other codings, against libtiff or pread and a plain loop");
        for (const Kind& oKind : KINDS)
            MeasureReading(folder, oKind);
    }
    if (oArguments.Wants("opening"))
    {
        PrintHeading("Opening and closing through the manager");
        MeasureOpening(folder, "small file", MakeSmall(folder));
        for (std::size_t nAt = 1; nAt < oArguments.GetWords().size(); ++nAt)
            MeasureOpening(folder, std::filesystem::path(oArguments.GetWords()[nAt]).filename(),
                           oArguments.GetWords()[nAt]);
    }
    return 0;
}
