// Compares reading JPEG 2000 with OpenJPEG alone over the same file: lossless samples of 16 bits in tiles. Both decode
// with one thread unless a row says otherwise; times are those of the processor, since the machine may have other work.

#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicreader.h"
#include "gobs/raster/raster.h"

#include <openjpeg.h>

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <functional>
#include <memory>
#include <random>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

namespace
{

using namespace krv::benchmarks;
using namespace krv::datasources;

struct Scene
{
    std::string moName;
    unsigned int mnSize;
    unsigned int mnTile;

    unsigned int GetTilesAcross() const { return (mnSize - 1) / mnTile + 1; }
};

// Terrain with noise in the lowest bits, as sensors have it.
Scene MakeFile(const std::string& folder, unsigned int nSize, unsigned int nTile)
{
    const Scene oScene{folder + "/scene_" + std::to_string(nSize) + "_" + std::to_string(nTile) + ".jp2", nSize, nTile};
    if (std::filesystem::exists(oScene.moName))
        return oScene;
    const std::string sides = std::to_string(nTile);
    const std::unique_ptr<IDataset> poDataset(DatasetManager::GetInstance()->NewDataset(
        oScene.moName, "JP2", "BLOCKXSIZE=" + sides + " BLOCKYSIZE=" + sides));
    auto& oRasters = dynamic_cast<IRasterDataset&>(*poDataset);
    oRasters.Create(nSize, nSize, {krv::gobs::eDT_16U});
    const std::unique_ptr<IRasterIO> poIO(oRasters.GetRasterIO({1}));
    std::minstd_rand oRandom(1);
    std::vector<std::uint16_t> oPixels;
    for (unsigned int nY = 0; nY < nSize; nY += nTile)
        for (unsigned int nX = 0; nX < nSize; nX += nTile)
        {
            const unsigned int nWidth = std::min(nTile, nSize - nX), nHeight = std::min(nTile, nSize - nY);
            oPixels.resize(std::size_t{nWidth} * nHeight);
            for (std::size_t nAt = 0; nAt < oPixels.size(); ++nAt)
            {
                const double nColumn = nX + nAt % nWidth, nRow = nY + nAt / nWidth;
                const double nValue = 2000 + 800 * std::sin(nColumn * 0.011) * std::cos(nRow * 0.013) +
                                      200 * std::sin(nColumn * 0.11 + nRow * 0.07);
                oPixels[nAt] = static_cast<std::uint16_t>(nValue + oRandom() % 16);
            }
            poIO->WriteWindow(nX, nY, nWidth, nHeight, reinterpret_cast<unsigned char*>(oPixels.data()));
        }
    poDataset->Close();
    return oScene;
}

// OpenJPEG with one codec over the file.
class ByOpenJpeg
{
public:
    explicit ByOpenJpeg(const Scene& oScene)
        : moStream(opj_stream_create_default_file_stream(oScene.moName.c_str(), OPJ_TRUE), &opj_stream_destroy),
          moCodec(opj_create_decompress(OPJ_CODEC_JP2), &opj_destroy_codec), moImage(nullptr, &opj_image_destroy)
    {
        opj_dparameters_t oParameters;
        opj_set_default_decoder_parameters(&oParameters);
        opj_image_t* pImage = nullptr;
        if (!opj_setup_decoder(moCodec.get(), &oParameters) || !opj_read_header(moStream.get(), moCodec.get(), &pImage))
            throw std::runtime_error("OpenJPEG does not open the file");
        moImage.reset(pImage);
    }

    // Into samples of 16 bits, as the library gives them.
    void ReadTile(unsigned int nTile, std::vector<std::uint16_t>& oPixels)
    {
        if (!opj_get_decoded_tile(moCodec.get(), moStream.get(), moImage.get(), nTile))
            throw std::runtime_error("OpenJPEG does not decode a tile");
        const opj_image_comp_t& oComponent = moImage->comps[0];
        oPixels.resize(std::size_t{oComponent.w} * oComponent.h);
        for (std::size_t nAt = 0; nAt < oPixels.size(); ++nAt)
            oPixels[nAt] = static_cast<std::uint16_t>(oComponent.data[nAt]);
    }

private:
    std::unique_ptr<opj_stream_t, void (*)(opj_stream_t*)> moStream;
    std::unique_ptr<opj_codec_t, void (*)(opj_codec_t*)> moCodec;
    std::unique_ptr<opj_image_t, void (*)(opj_image_t*)> moImage;
};

void ReadAlone(const Scene& oScene, unsigned int nFirst = 0, unsigned int nStep = 1)
{
    ByOpenJpeg oJpeg(oScene);
    std::vector<std::uint16_t> oPixels;
    for (unsigned int nTile = nFirst; nTile < oScene.GetTilesAcross() * oScene.GetTilesAcross(); nTile += nStep)
        oJpeg.ReadTile(nTile, oPixels);
}

void ReadTiles(const Scene& oScene, unsigned int nMargin, unsigned int nFirst = 0, unsigned int nStep = 1)
{
    BasicReader oReader(oScene.moName);
    oReader.SetMargins(nMargin, nMargin, eReplicate);
    for (unsigned int nTile = nFirst; nTile < oReader.GetTileCount(); nTile += nStep)
    {
        const std::unique_ptr<krv::gobs::Raster> poRaster(oReader.GetRaster(nTile));
        Keep(poRaster->GetBuffer());
    }
}

void ReadLevel(const Scene& oScene, unsigned int nLevel)
{
    const std::unique_ptr<IDataset> poDataset(DatasetManager::GetInstance()->Open(oScene.moName, eReadOnly));
    const std::unique_ptr<IOverviewManager> poLevels(dynamic_cast<IRasterDataset&>(*poDataset).GetOverviewManager());
    const std::unique_ptr<IRasterIO> poIO(poLevels->GetOverviewIO(nLevel, {1}));
    std::vector<std::uint16_t> oPixels(std::size_t{poIO->GetFileWidth()} * poIO->GetFileHeight());
    poIO->ReadWindow(0u, 0u, poIO->GetFileWidth(), poIO->GetFileHeight(),
                     reinterpret_cast<unsigned char*>(oPixels.data()));
    Keep(oPixels.data());
}

void CheckPixels(const Scene& oScene)
{
    ByOpenJpeg oJpeg(oScene);
    BasicReader oReader(oScene.moName);
    std::vector<std::uint16_t> oPixels;
    for (const unsigned int nTile : {0u, oReader.GetTileCount() - 1})
    {
        const std::unique_ptr<krv::gobs::Raster> poRaster(oReader.GetRaster(nTile));
        oJpeg.ReadTile(nTile, oPixels);
        const auto* pRead = reinterpret_cast<const std::uint16_t*>(poRaster->GetBuffer());
        if (!std::equal(oPixels.begin(), oPixels.end(), pRead))
            throw std::runtime_error("a tile was read wrongly");
    }
}

void Measure(const Scene& oScene, int nRounds)
{
    CheckPixels(oScene);
    std::vector<std::uint16_t> oPixels;
    const auto Alone = [&]
    {
        ReadAlone(oScene);
    };
    const auto First = [&]
    {
        ByOpenJpeg(oScene).ReadTile(0, oPixels);
    };
    const auto LibraryFirst = [&]
    {
        BasicReader oReader(oScene.moName);
        const std::unique_ptr<krv::gobs::Raster> poRaster(oReader.GetRaster(0));
    };
    const std::vector<double> oTimes = MedianSeconds({{"alone", Alone},
                                                      {"library",
                                                       [&]
                                                       {
                                                           ReadTiles(oScene, 0);
                                                       }},
                                                      {"margins",
                                                       [&]
                                                       {
                                                           ReadTiles(oScene, 8);
                                                       }},
                                                      {"level",
                                                       [&]
                                                       {
                                                           ReadLevel(oScene, 8);
                                                       }},
                                                      {"alone, first", First},
                                                      {"library, first", LibraryFirst}},
                                                     nRounds, Clock::eProcessor);
    const std::string tiles = std::to_string(oScene.mnTile);
    const double nPixels = 1e-6 * oScene.mnSize * oScene.mnSize;
    PrintRow("tiles of " + tiles + " in order", oTimes[0] / oTimes[1], 0.97,
             Number(nPixels / oTimes[1], 1) + " million pixels a second");
    PrintRow("the same with margins of 8, each decoded once", oTimes[1] / oTimes[2], 0.9);
    PrintRow("level 8, part of the time of all pixels", oTimes[3] / oTimes[1], 0.05, "less is better");
    PrintRow("opening and the first tile, times OpenJPEG's", oTimes[5] / oTimes[4], 1.3, "less is better");
    // What the machine gives to two threads shows in OpenJPEG's own.
    const auto ByTwo = [](const std::function<void(unsigned int)>& oRead)
    {
        std::thread oOther([&oRead] { oRead(1); });
        oRead(0);
        oOther.join();
    };
    const std::vector<double> oWalls =
        MedianSeconds({{"one",
                        [&]
                        {
                            ReadTiles(oScene, 0);
                        }},
                       {"two",
                        [&]
                        {
                            ByTwo([&](unsigned int nFirst) { ReadTiles(oScene, 0, nFirst, 2); });
                        }},
                       {"alone, one", Alone},
                       {"alone, two",
                        [&]
                        {
                            ByTwo([&](unsigned int nFirst) { ReadAlone(oScene, nFirst, 2); });
                        }}},
                      nRounds);
    PrintRow("two threads, each with a reader of its own", oWalls[0] / oWalls[1], 1.8,
             "wall time, on an idle machine; OpenJPEG's own " + Number(oWalls[2] / oWalls[3]));
}

} // namespace

int main(int nArguments, char** pArguments)
{
    const Arguments oArguments(nArguments, pArguments, "FOLDER [--size N] [--rounds N]");
    const std::string& folder = oArguments.GetWords().front();
    std::filesystem::create_directories(folder);
    const unsigned int nSize = oArguments.GetNumber("size", 4096);
    PrintHeading("JPEG 2000, " + std::to_string(nSize) + " x " + std::to_string(nSize) + ", lossless, 16 bits");
    for (const unsigned int nTile : {512u, 1024u})
        Measure(MakeFile(folder, nSize, nTile), static_cast<int>(oArguments.GetNumber("rounds", 3)));
}
