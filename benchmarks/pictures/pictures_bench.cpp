// Compares reading whole pictures with libvips alone, row by row in one thread, by the processor's time.

#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicreader.h"
#include "gobs/raster/raster.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <filesystem>
#include <memory>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

#include <vips/vips.h>

namespace
{

using namespace krv::benchmarks;
using namespace krv::datasources;

// Terrain in three colours, with noise in the lowest bits.
std::string MakeFile(const std::string& folder, const std::string& type, unsigned int nSize)
{
    std::string file = folder + "/picture_" + std::to_string(nSize) + "." + type;
    if (std::filesystem::exists(file))
        return file;
    const std::unique_ptr<IDataset> poDataset(DatasetManager::GetInstance()->NewDataset(file, type, ""));
    auto& oRasters = dynamic_cast<IRasterDataset&>(*poDataset);
    oRasters.Create(nSize, nSize, std::vector<krv::gobs::DataType>(3, krv::gobs::eDT_8U));
    const std::unique_ptr<IRasterIO> poIO(oRasters.GetRasterIO({1, 2, 3}));
    std::minstd_rand oRandom(1);
    std::vector<unsigned char> oRow(std::size_t{nSize} * 3);
    for (unsigned int nY = 0; nY < nSize; ++nY)
    {
        for (std::size_t nAt = 0; nAt < oRow.size(); ++nAt)
            oRow[nAt] = static_cast<unsigned char>(
                120 + 90 * std::sin(static_cast<double>(nAt) * 0.003) * std::cos(nY * 0.007) + oRandom() % 8);
        poIO->WriteWindow(0u, nY, nSize, 1u, oRow.data());
    }
    poDataset->Close();
    return file;
}

// All rows into one buffer.
void ReadByVips(const std::string& file, std::vector<unsigned char>& oPixels)
{
    constexpr int ROWS = 64;
    VipsImage* const pImage = vips_image_new_from_file(file.c_str(), "access", VIPS_ACCESS_SEQUENTIAL, nullptr);
    if (pImage == nullptr)
        throw std::runtime_error("libvips does not open the file");
    VipsRegion* const pRegion = vips_region_new(pImage);
    const std::size_t nRow = VIPS_IMAGE_SIZEOF_LINE(pImage);
    for (int nY = 0; nY < pImage->Ysize; nY += ROWS)
    {
        const VipsRect oRect = {0, nY, pImage->Xsize, std::min(ROWS, pImage->Ysize - nY)};
        if (vips_region_prepare(pRegion, &oRect) != 0)
            throw std::runtime_error("libvips does not decode the file");
        for (int nAt = 0; nAt < oRect.height; ++nAt)
            std::memcpy(oPixels.data() + static_cast<std::size_t>(nY + nAt) * nRow,
                        VIPS_REGION_ADDR(pRegion, 0, nY + nAt), nRow);
    }
    g_object_unref(pRegion);
    g_object_unref(pImage);
}

// Tile by tile, as readers do; nothing of it was decoded before.
void ReadTiles(const std::string& file, std::vector<unsigned char>* poPixels = nullptr)
{
    BasicReader oReader(file, {1, 2, 3});
    std::size_t nDone = 0;
    for (unsigned int nTile = 0; nTile < oReader.GetTileCount(); ++nTile)
    {
        const std::unique_ptr<krv::gobs::Raster> poRaster(oReader.GetRaster(nTile));
        Keep(poRaster->GetBuffer());
        if (poPixels != nullptr)
            std::memcpy(poPixels->data() + nDone, poRaster->GetBuffer(), poRaster->GetBufferSize());
        nDone += poRaster->GetBufferSize();
    }
}

} // namespace

int main(int nArguments, char** pArguments)
{
    const Arguments oArguments(nArguments, pArguments, "FOLDER [--size N] [--rounds N]");
    const std::string& folder = oArguments.GetWords().front();
    std::filesystem::create_directories(folder);
    const unsigned int nSize = oArguments.GetNumber("size", 4096);
    PrintHeading("Pictures, " + std::to_string(nSize) + " x " + std::to_string(nSize) + ", three channels of 8U");
    vips_init("bench");
    vips_cache_set_max(0);
    for (const char* pType : {"png", "jpg"})
    {
        const std::string file = MakeFile(folder, pType, nSize);
        std::vector<unsigned char> oAlone(std::size_t{nSize} * nSize * 3), oOurs(oAlone.size());
        ReadByVips(file, oAlone);
        ReadTiles(file, &oOurs);
        if (oAlone != oOurs)
            throw std::runtime_error("the picture was read wrongly");
        const std::vector<double> oTimes =
            MedianSeconds({{"libvips",
                            [&]
                            {
                                ReadByVips(file, oAlone);
                            }},
                           {"library",
                            [&]
                            {
                                ReadTiles(file);
                            }}},
                          static_cast<int>(oArguments.GetNumber("rounds", 5)), Clock::eProcessor);
        PrintRow(std::string("whole ") + pType, oTimes[0] / oTimes[1], 0.95,
                 Number(1e-6 * nSize * nSize / oTimes[1], 1) + " million pixels a second");
    }
}
