#pragma once

#include "datasources/interfaces/accessmode.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterio.h"
#include "gobs/raster/datatype.h"
#include "plugins/tif/tifbuilder.h"
#include "plugins/tif/tifdataset.h"
#include "tools/conformance/tempfolder.h"

#include <algorithm>
#include <cstdint>
#include <memory>
#include <random>
#include <string>
#include <vector>

namespace krv::test
{

using namespace krv::conformance;

using Bytes = std::vector<unsigned char>;
using TifPointer = std::unique_ptr<krv::plugins::tif::TifDataset>;
using IOPointer = std::unique_ptr<krv::datasources::IRasterIO>;

// Datasets of the format's builder, without a manager.
TifPointer OpenTif(const std::string& fileName, AccessMode eMode = eReadOnly);
TifPointer CreateTif(const std::string& fileName, const std::string& options);
// The same with an image.
TifPointer CreateTif(const std::string& fileName, const std::string& options, unsigned int nWidth, unsigned int nHeight,
                     unsigned int nChannels, const krv::gobs::DataType& oType);

std::vector<unsigned int> AllChannels(unsigned int nCount);

// The whole image of an I/O object in and out, in windows of its preferred block.
Bytes ReadAll(krv::datasources::IRasterIO& oIO, std::size_t nPixelBytes);
void WriteAll(krv::datasources::IRasterIO& oIO, std::size_t nPixelBytes, const Bytes& oPixels);
Bytes ReadAll(krv::plugins::tif::TifDataset& oDataset);
void WriteAll(krv::plugins::tif::TifDataset& oDataset, const Bytes& oPixels);
std::size_t PixelBytes(const krv::plugins::tif::TifDataset& oDataset);

// Values that compress a little and hold no not-a-number.
Bytes MakePixels(unsigned int nWidth, unsigned int nHeight, unsigned int nChannels, const krv::gobs::DataType& oType,
                 unsigned int nSeed);

// What libtiff alone makes of a directory of a file: pixel-interleaved samples in this machine's order, of whole bytes
// or single bits widened to bytes; those of other widths are only decoded. What libtiff complains about is in the
// second one, empty when nothing.
struct Judgement
{
    std::uint32_t mnWidth = 0;
    std::uint32_t mnHeight = 0;
    std::uint16_t mnChannels = 0;
    std::uint16_t mnCompression = 0;
    std::uint16_t mnPredictor = 1;
    bool mbTiled = false;
    bool mbSeparate = false;
    bool mbBig = false;
    Bytes moPixels;
    std::string moComplaints;
};
Judgement Judge(const std::string& fileName, unsigned int nDirectory = 0);

inline void WriteBytes(const std::string& fileName, const Bytes& oBytes)
{
    WriteFile(fileName, {oBytes.begin(), oBytes.end()});
}

// A little-endian classic file put together entry by entry.
class Handmade
{
public:
    void Add(std::uint16_t nTag, std::uint16_t nType, std::uint32_t nCount, std::uint32_t nValue)
    {
        Put(nTag, 2);
        Put(nType, 2);
        Put(nCount, 4);
        Put(nValue, 4);
        ++mnEntries;
    }

    Bytes Finish(std::uint32_t nNext = 0, std::size_t nSize = 0) const;

    // One channel of 8 bits in strips.
    static Handmade Image(std::uint32_t nWidth, std::uint32_t nHeight, std::uint32_t nRowsPerStrip,
                          std::uint16_t nCompression, std::uint32_t nStrips, std::uint32_t nOffset,
                          std::uint32_t nBytes, std::uint16_t nBits = 8, std::uint16_t nPhotometric = 1,
                          std::uint16_t nChannels = 1)
    {
        Handmade oFile;
        oFile.Add(256, 4, 1, nWidth);
        oFile.Add(257, 4, 1, nHeight);
        oFile.Add(258, 3, 1, nBits);
        oFile.Add(259, 3, 1, nCompression);
        oFile.Add(262, 3, 1, nPhotometric);
        oFile.Add(273, 4, nStrips, nOffset);
        oFile.Add(277, 3, 1, nChannels);
        oFile.Add(278, 4, 1, nRowsPerStrip);
        oFile.Add(279, 4, nStrips, nBytes);
        return oFile;
    }

private:
    void Put(std::uint32_t nValue, int nBytes)
    {
        for (int nByte = 0; nByte < nBytes; ++nByte)
            moEntries.push_back(static_cast<unsigned char>(nValue >> (8 * nByte)));
    }

    Bytes moEntries;
    unsigned int mnEntries = 0;
};

// Names in a folder.
std::vector<std::string> ListFolder(const std::string& folder);

} // namespace krv::test
