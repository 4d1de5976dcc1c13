// Measures rational polynomials against the definition written down as one loop, and reading through a link against
// reading its source.
//     krv_bench_links

#include "benchmarks/support/measure.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/utils/createlinkedpix.h"
#include "gobs/raster/datatype.h"
#include "toolkit/mathmodel/rpcmodel.h"

#include <cstdio>
#include <filesystem>
#include <memory>
#include <vector>

#include <unistd.h>

namespace
{

using namespace krv::benchmarks;
using namespace krv::datasources;
using krv::mathmodel::RpcCoefficients;
using krv::mathmodel::RpcModel;

constexpr std::size_t POINTS = 65536;
constexpr int ROUNDS = 21;
constexpr int LINK_ROUNDS = 101; // a pass takes milliseconds, and a hundredth is of interest

RpcCoefficients MakeModel()
{
    RpcCoefficients oC;
    oC.lineOffset = oC.lineScale = 10000;
    oC.sampleOffset = oC.sampleScale = 12000;
    oC.latitudeOffset = 43;
    oC.latitudeScale = oC.longitudeScale = 0.1;
    oC.heightScale = 500;
    for (std::size_t n = 1; n < 20; ++n)
    {
        oC.lineNumerator[n] = 1e-3 / static_cast<double>(n);
        oC.sampleNumerator[n] = -2e-3 / static_cast<double>(n);
        oC.lineDenominator[n] = oC.sampleDenominator[n] = 1e-4 / static_cast<double>(n);
    }
    oC.lineNumerator[2] = -1.1;
    oC.sampleNumerator[1] = 1.05;
    return oC;
}

double Polynomial(const RpcCoefficients::Polynomial& oC, const double* pTerms)
{
    double nSum = 0;
    for (std::size_t n = 0; n < oC.size(); ++n)
        nSum += oC[n] * pTerms[n];
    return nSum;
}

// Ground to image as the form's definition reads.
void PlainLoop(const RpcCoefficients& oC, const std::vector<double> (&oGround)[3], std::vector<double> (&oImage)[2])
{
    for (std::size_t i = 0; i < POINTS; ++i)
    {
        const double nL = (oGround[0][i] - oC.longitudeOffset) / oC.longitudeScale;
        const double nP = (oGround[1][i] - oC.latitudeOffset) / oC.latitudeScale;
        const double nH = (oGround[2][i] - oC.heightOffset) / oC.heightScale;
        const double aTerms[20] = {1,
                                   nL,
                                   nP,
                                   nH,
                                   nL * nP,
                                   nL * nH,
                                   nP * nH,
                                   nL * nL,
                                   nP * nP,
                                   nH * nH,
                                   nP * nL * nH,
                                   nL * nL * nL,
                                   nL * nP * nP,
                                   nL * nH * nH,
                                   nL * nL * nP,
                                   nP * nP * nP,
                                   nP * nH * nH,
                                   nL * nL * nH,
                                   nP * nP * nH,
                                   nH * nH * nH};
        oImage[0][i] =
            oC.sampleOffset + 0.5 +
            oC.sampleScale * Polynomial(oC.sampleNumerator, aTerms) / Polynomial(oC.sampleDenominator, aTerms);
        oImage[1][i] = oC.lineOffset + 0.5 +
                       oC.lineScale * Polynomial(oC.lineNumerator, aTerms) / Polynomial(oC.lineDenominator, aTerms);
    }
}

void MeasureModels()
{
    PrintHeading("Rational polynomials: time of the plain loop over ours");
    const RpcModel oModel(MakeModel());
    std::vector<double> oGround[3], oImage[2] = {std::vector<double>(POINTS), std::vector<double>(POINTS)};
    std::vector<double> oBack[2] = {oImage[0], oImage[1]};
    for (std::size_t i = 0; i < POINTS; ++i)
    {
        oGround[0].push_back(0.2 * static_cast<double>(i % 256) / 255 - 0.1);
        oGround[1].push_back(43 + 0.2 * static_cast<double>(i / 256) / 255 - 0.1);
        oGround[2].push_back(static_cast<double>(i % 7) * 100 - 300);
    }
    const auto Forward = [&]
    {
        oModel.GroundToImage(POINTS, oGround[0].data(), oGround[1].data(), oGround[2].data(), oImage[0].data(),
                             oImage[1].data());
    };
    const auto Back = [&]
    {
        oModel.ImageToGround(POINTS, oImage[0].data(), oImage[1].data(), oGround[2].data(), oBack[0].data(),
                             oBack[1].data());
    };
    const auto oSeconds = MedianSeconds({{"plain",
                                          [&]
                                          {
                                              PlainLoop(oModel.GetCoefficients(), oGround, oImage);
                                          }},
                                         {"forward", Forward},
                                         {"back", Back}},
                                        ROUNDS);
    const auto PerPoint = [](double nSeconds)
    {
        return Number(nSeconds / POINTS * 1e9, 1) + " ns a point";
    };
    PrintRow("ground to image", oSeconds[0] / oSeconds[1], 0,
             PerPoint(oSeconds[1]) + ", plain " + PerPoint(oSeconds[0]));
    PrintRow("image to ground", oSeconds[0] / oSeconds[2], 0, PerPoint(oSeconds[2]));
}

void ReadTiles(IDataset& oDataset)
{
    const std::unique_ptr<IRasterIO> poIO(dynamic_cast<IRasterDataset&>(oDataset).GetRasterIO({1, 2, 3}));
    std::vector<unsigned char> oTile(std::size_t{256} * 256 * 3);
    for (unsigned int nY = 0; nY < poIO->GetFileHeight(); nY += 256)
        for (unsigned int nX = 0; nX < poIO->GetFileWidth(); nX += 256)
            poIO->ReadWindow(nX, nY, 256U, 256U, oTile.data());
    Keep(oTile.data());
}

void MeasureLinks()
{
    PrintHeading("Reading 48 MiB of tiles through a link: time of the source over that of the link");
    const std::filesystem::path oFolder =
        std::filesystem::temp_directory_path() / ("krvlinks." + std::to_string(getpid()));
    std::filesystem::create_directories(oFolder);
    DatasetManager& oManager = *DatasetManager::GetInstance();
    for (const char* const pFormat : {"TIF", "KRVDSK"})
    {
        const std::string source = oFolder / (std::string("scene.") + pFormat), link = oFolder / "link.krv";
        {
            const std::unique_ptr<IDataset> poNew(oManager.NewDataset(source, pFormat, ""));
            auto& oRaster = dynamic_cast<IRasterDataset&>(*poNew);
            oRaster.Create(4096, 4096, std::vector<krv::gobs::DataType>(3, krv::gobs::eDT_8U));
            const std::unique_ptr<IRasterIO> poIO(oRaster.GetRasterIO({1, 2, 3}));
            std::vector<unsigned char> oRow(std::size_t{4096} * 256 * 3);
            for (std::size_t n = 0; n < oRow.size(); ++n)
                oRow[n] = static_cast<unsigned char>(n * 7 % 251);
            for (unsigned int nY = 0; nY < 4096; nY += 256)
                poIO->WriteWindow(0U, nY, 4096U, 256U, oRow.data());
            poNew->Close();
        }
        std::unique_ptr<IDataset>(CreateLinkedPix(link, source))->Close();
        const std::unique_ptr<IDataset> poSource(oManager.Open(source, eReadOnly)),
            poLink(oManager.Open(link, eReadOnly));
        const auto oSeconds = MedianSeconds({{"source",
                                              [&]
                                              {
                                                  ReadTiles(*poSource);
                                              }},
                                             {"link",
                                              [&]
                                              {
                                                  ReadTiles(*poLink);
                                              }}},
                                            LINK_ROUNDS);
        PrintRow(std::string("link to ") + pFormat, oSeconds[0] / oSeconds[1], 0.98,
                 Number(48 / 1024.0 / oSeconds[1]) + " GiB/s");
    }
    std::filesystem::remove_all(oFolder);
}

} // namespace

int main()
{
    MeasureModels();
    MeasureLinks();
    return 0;
}
