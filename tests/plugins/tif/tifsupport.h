#pragma once

#include "datasources/interfaces/accessmode.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterio.h"
#include "gobs/raster/datatype.h"
#include "plugins/tif/tifbuilder.h"
#include "plugins/tif/tifdataset.h"
#include "tools/conformance/tempfolder.h"

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

// Names in a folder.
std::vector<std::string> ListFolder(const std::string& folder);

} // namespace krv::test
