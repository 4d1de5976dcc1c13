#include "tests/plugins/tif/tifsupport.h"

#include "datasources/interfaces/ichannelinfo.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <numeric>

#include <tiffio.h>

namespace krv::test
{

namespace
{

std::string soComplaints;

void Note(const char*, const char* pFormat, va_list oArguments)
{
    char aText[512];
    std::vsnprintf(aText, sizeof(aText), pFormat, oArguments);
    soComplaints += std::string(aText) + "; ";
}

// One strip or tile into its place.
void Place(Judgement& oJudgement, const unsigned char* pBlock, std::size_t nSampleBytes, bool bBits, unsigned int nX,
           unsigned int nY, unsigned int nBlockWidth, unsigned int nRows, unsigned int nPlane)
{
    const unsigned int nInBlock = oJudgement.mbSeparate ? 1 : oJudgement.mnChannels;
    for (unsigned int nRow = 0; nRow < nRows && nY + nRow < oJudgement.mnHeight; ++nRow)
        for (unsigned int nColumn = 0; nColumn < nBlockWidth && nX + nColumn < oJudgement.mnWidth; ++nColumn)
            for (unsigned int nChannel = 0; nChannel < nInBlock; ++nChannel)
            {
                const std::size_t nTo =
                    ((std::size_t{nY + nRow} * oJudgement.mnWidth + nX + nColumn) * oJudgement.mnChannels + nChannel +
                     nPlane) *
                    nSampleBytes;
                const std::size_t nFrom = std::size_t{nRow} * nBlockWidth * nInBlock + nColumn * nInBlock + nChannel;
                if (bBits)
                    oJudgement.moPixels[nTo] =
                        pBlock[nRow * ((nBlockWidth + 7) / 8) + nColumn / 8] >> (7 - nColumn % 8) & 1;
                else
                    std::memcpy(&oJudgement.moPixels[nTo], pBlock + nFrom * nSampleBytes, nSampleBytes);
            }
}

} // namespace

TifPointer OpenTif(const std::string& fileName, AccessMode eMode)
{
    krv::plugins::tif::TifBuilder oBuilder;
    return TifPointer(static_cast<krv::plugins::tif::TifDataset*>(oBuilder.Open(fileName, eMode)));
}

TifPointer CreateTif(const std::string& fileName, const std::string& options)
{
    krv::plugins::tif::TifBuilder oBuilder;
    return TifPointer(static_cast<krv::plugins::tif::TifDataset*>(oBuilder.Create(fileName, options)));
}

TifPointer CreateTif(const std::string& fileName, const std::string& options, unsigned int nWidth, unsigned int nHeight,
                     unsigned int nChannels, const krv::gobs::DataType& oType)
{
    TifPointer poDataset = CreateTif(fileName, options);
    poDataset->Create(nWidth, nHeight, std::vector<krv::gobs::DataType>(nChannels, oType));
    return poDataset;
}

std::vector<unsigned int> AllChannels(unsigned int nCount)
{
    std::vector<unsigned int> oChannels(nCount);
    std::iota(oChannels.begin(), oChannels.end(), 1u);
    return oChannels;
}

Bytes ReadAll(krv::datasources::IRasterIO& oIO, std::size_t nPixelBytes)
{
    const std::size_t nPitch = oIO.GetFileWidth() * nPixelBytes;
    Bytes oPixels(nPitch * oIO.GetFileHeight(), 0xCD);
    oIO.ReadWindow(0u, 0u, oIO.GetFileWidth(), oIO.GetFileHeight(), oPixels.data());
    return oPixels;
}

void WriteAll(krv::datasources::IRasterIO& oIO, std::size_t nPixelBytes, const Bytes& oPixels)
{
    const std::size_t nPitch = oIO.GetFileWidth() * nPixelBytes;
    for (unsigned int nY = 0; nY < oIO.GetFileHeight(); nY += oIO.GetTileHeight())
        for (unsigned int nX = 0; nX < oIO.GetFileWidth(); nX += oIO.GetTileWidth())
        {
            const unsigned int nWidth = std::min(oIO.GetTileWidth(), oIO.GetFileWidth() - nX);
            const unsigned int nHeight = std::min(oIO.GetTileHeight(), oIO.GetFileHeight() - nY);
            Bytes oTile(nWidth * nHeight * nPixelBytes);
            for (unsigned int nRow = 0; nRow < nHeight; ++nRow)
                std::memcpy(oTile.data() + nRow * nWidth * nPixelBytes,
                            oPixels.data() + (nY + nRow) * nPitch + nX * nPixelBytes, nWidth * nPixelBytes);
            oIO.WriteWindow(nX, nY, nWidth, nHeight, oTile.data());
        }
}

std::size_t PixelBytes(const krv::plugins::tif::TifDataset& oDataset)
{
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(oDataset.GetChannelInfo(1));
    return poInfo->GetDataType().GetValueBits() / 8 * oDataset.GetChanCount();
}

Bytes ReadAll(krv::plugins::tif::TifDataset& oDataset)
{
    const IOPointer poIO(oDataset.GetRasterIO(AllChannels(oDataset.GetChanCount())));
    return ReadAll(*poIO, PixelBytes(oDataset));
}

void WriteAll(krv::plugins::tif::TifDataset& oDataset, const Bytes& oPixels)
{
    const IOPointer poIO(oDataset.GetRasterIO(AllChannels(oDataset.GetChanCount())));
    WriteAll(*poIO, PixelBytes(oDataset), oPixels);
}

Bytes MakePixels(unsigned int nWidth, unsigned int nHeight, unsigned int nChannels, const krv::gobs::DataType& oType,
                 unsigned int nSeed)
{
    const std::size_t nPartBytes = oType.GetBits() / 8;
    const std::size_t nParts = std::size_t{nWidth} * nHeight * nChannels * oType.GetParts();
    Bytes oPixels(nParts * nPartBytes);
    std::mt19937 oRandom(nSeed);
    std::int64_t nWalk = 0;
    for (std::size_t nAt = 0; nAt < nParts; ++nAt)
    {
        nWalk += static_cast<int>(oRandom() % 7) - 3;
        const std::uint64_t nBits = oRandom() % 50 == 0 ? oRandom() * 0x9E3779B97F4A7C15ull : nWalk;
        unsigned char* pPart = oPixels.data() + nAt * nPartBytes;
        const float nFloat = static_cast<float>(nWalk) * 0.37f;
        const double nDouble = static_cast<double>(nWalk) * 0.37;
        if (oType.IsReal() && nPartBytes == 4)
            std::memcpy(pPart, &nFloat, 4);
        else if (oType.IsReal())
            std::memcpy(pPart, &nDouble, 8);
        else
            std::memcpy(pPart, &nBits, nPartBytes);
    }
    return oPixels;
}

Judgement Judge(const std::string& fileName, unsigned int nDirectory)
{
    soComplaints.clear();
    TIFFSetErrorHandler(&Note);
    TIFFSetWarningHandler(nullptr);
    Judgement oJudgement;
    const std::unique_ptr<TIFF, void (*)(TIFF*)> poTiff(TIFFOpen(fileName.c_str(), "rm"), &TIFFClose);
    if (!poTiff || TIFFSetDirectory(poTiff.get(), static_cast<tdir_t>(nDirectory)) != 1)
    {
        oJudgement.moComplaints = "cannot be opened: " + soComplaints;
        return oJudgement;
    }
    TIFF* pTiff = poTiff.get();
    std::uint16_t nBits = 1;
    std::uint16_t nPlanar = 1;
    std::uint32_t nBlockWidth = 0;
    std::uint32_t nBlockHeight = 0;
    TIFFGetField(pTiff, TIFFTAG_IMAGEWIDTH, &oJudgement.mnWidth);
    TIFFGetField(pTiff, TIFFTAG_IMAGELENGTH, &oJudgement.mnHeight);
    TIFFGetFieldDefaulted(pTiff, TIFFTAG_SAMPLESPERPIXEL, &oJudgement.mnChannels);
    TIFFGetFieldDefaulted(pTiff, TIFFTAG_BITSPERSAMPLE, &nBits);
    TIFFGetFieldDefaulted(pTiff, TIFFTAG_COMPRESSION, &oJudgement.mnCompression);
    TIFFGetField(pTiff, TIFFTAG_PREDICTOR, &oJudgement.mnPredictor);
    TIFFGetFieldDefaulted(pTiff, TIFFTAG_PLANARCONFIG, &nPlanar);
    oJudgement.mbTiled = TIFFIsTiled(pTiff) != 0;
    oJudgement.mbSeparate = nPlanar == PLANARCONFIG_SEPARATE;
    oJudgement.mbBig = TIFFIsBigTIFF(pTiff) != 0;
    nBlockWidth = oJudgement.mnWidth;
    TIFFGetField(pTiff, TIFFTAG_TILEWIDTH, &nBlockWidth);
    TIFFGetFieldDefaulted(pTiff, oJudgement.mbTiled ? TIFFTAG_TILELENGTH : TIFFTAG_ROWSPERSTRIP, &nBlockHeight);
    nBlockHeight = oJudgement.mbTiled ? nBlockHeight : std::min(nBlockHeight, oJudgement.mnHeight);

    if (oJudgement.mnCompression == COMPRESSION_JPEG)
        TIFFSetField(pTiff, TIFFTAG_JPEGCOLORMODE, JPEGCOLORMODE_RGB); // all samples, whatever the subsampling
    const std::size_t nSampleBytes = nBits == 1 ? 1 : nBits / 8;
    const bool bPlaced = nBits == 1 || nBits % 8 == 0;
    oJudgement.moPixels.assign(
        std::size_t{oJudgement.mnWidth} * oJudgement.mnHeight * oJudgement.mnChannels * nSampleBytes, 0xEE);
    const auto nSize = oJudgement.mbTiled ? TIFFTileSize(pTiff) : TIFFStripSize(pTiff);
    Bytes oBlock(static_cast<std::size_t>(nSize));
    const std::uint32_t nBlocks = oJudgement.mbTiled ? TIFFNumberOfTiles(pTiff) : TIFFNumberOfStrips(pTiff);
    const unsigned int nAcross = (oJudgement.mnWidth + nBlockWidth - 1) / nBlockWidth;
    const unsigned int nDown = (oJudgement.mnHeight + nBlockHeight - 1) / nBlockHeight;
    for (std::uint32_t nBlock = 0; nBlock < nBlocks; ++nBlock)
    {
        std::fill(oBlock.begin(), oBlock.end(), static_cast<unsigned char>(0));
        if (TIFFGetStrileByteCount(pTiff, nBlock) != 0)
        {
            if (oJudgement.mbTiled)
                TIFFReadEncodedTile(pTiff, nBlock, oBlock.data(), nSize);
            else
                TIFFReadEncodedStrip(pTiff, nBlock, oBlock.data(), nSize);
        }
        const unsigned int nInPlane = nBlock % (nAcross * nDown);
        if (bPlaced)
            Place(oJudgement, oBlock.data(), nSampleBytes, nBits == 1, nInPlane % nAcross * nBlockWidth,
                  nInPlane / nAcross * nBlockHeight, nBlockWidth, nBlockHeight, nBlock / (nAcross * nDown));
    }
    oJudgement.moComplaints = soComplaints;
    return oJudgement;
}

std::vector<std::string> ListFolder(const std::string& folder)
{
    std::vector<std::string> oNames;
    for (const auto& oEntry : std::filesystem::directory_iterator(folder))
        oNames.push_back(oEntry.path().filename().string());
    std::sort(oNames.begin(), oNames.end());
    return oNames;
}

Bytes Handmade::Finish(std::uint32_t nNext, std::size_t nSize) const
{
    Bytes oFile;
    for (const unsigned int nByte : {0x49U, 0x49U, 42U, 0U, 8U, 0U, 0U, 0U, mnEntries, 0U})
        oFile.push_back(static_cast<unsigned char>(nByte));
    oFile.insert(oFile.end(), moEntries.begin(), moEntries.end());
    for (int nByte = 0; nByte < 4; ++nByte)
        oFile.push_back(static_cast<unsigned char>(nNext >> (8 * nByte)));
    oFile.resize(std::max(nSize, oFile.size()));
    return oFile;
}

} // namespace krv::test
