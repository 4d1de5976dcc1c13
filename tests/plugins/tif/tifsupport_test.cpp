#include "tests/plugins/tif/tifsupport.h"

#include <algorithm>
#include <atomic>
#include <cstdio>
#include <filesystem>
#include <numeric>

#include <unistd.h>

namespace krv::test
{

std::vector<unsigned int> AllChannels(unsigned int nCount)
{
    std::vector<unsigned int> oChannels(nCount);
    std::iota(oChannels.begin(), oChannels.end(), 1u);
    return oChannels;
}

std::vector<unsigned char> ReadAll(krv::datasources::IRasterIO& oIO, std::size_t nPixelBytes)
{
    const std::size_t nPitch = oIO.GetFileWidth() * nPixelBytes;
    std::vector<unsigned char> oPixels(nPitch * oIO.GetFileHeight(), 0xCD);
    for (unsigned int nRow = 0; nRow < oIO.GetFileHeight();)
    {
        const unsigned int nRows = std::min(oIO.GetTileHeight(), oIO.GetFileHeight() - nRow);
        oIO.ReadWindow(0u, nRow, oIO.GetFileWidth(), nRows, oPixels.data() + nRow * nPitch);
        nRow += nRows;
    }
    return oPixels;
}

TemporaryFile::TemporaryFile(const std::string& ending)
{
    static std::atomic<int> nCount = 0;
    moName = (std::filesystem::temp_directory_path() /
              ("krvtif" + std::to_string(::getpid()) + "_" + std::to_string(nCount++) + ending))
                 .string();
}

TemporaryFile::~TemporaryFile()
{
    std::remove(moName.c_str());
}

} // namespace krv::test
