// Measures masks from polygons against other rasterisers and against the writing of the finished spans, and masks from
// bitmaps against the reading of the 8-bit tiles.
//     krv_bench_masks [FOLDER] [--only rings|stars|bitmaps]

#include "benchmarks/masks/bitrun.h"
#include "benchmarks/masks/otherrasterisers.h"
#include "benchmarks/support/arguments.h"
#include "benchmarks/support/measure.h"
#include "benchmarks/support/scene.h"
#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/maskbuilder/bitmapmaskbuilder.h"
#include "datasources/maskbuilder/maskio.h"
#include "datasources/maskbuilder/polygonmaskbuilder.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/rasterrange.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "toolkit/core/gglshape.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <exception>
#include <memory>
#include <numbers>
#include <string>
#include <vector>

namespace
{

using namespace krv::benchmarks;
using namespace krv::datasources;
using namespace krv::gobs;

constexpr int SIZE = 8192;

std::vector<GDBVertex> Circle(int nVertices, double nRadius, double nInnerRadius)
{
    std::vector<GDBVertex> oRing;
    for (int i = 0; i < nVertices; ++i)
    {
        const double nAngle = 2 * std::numbers::pi * i / nVertices;
        const double nLength = i % 2 == 0 ? nRadius : nInnerRadius;
        oRing.push_back({SIZE / 2 + nLength * std::cos(nAngle), SIZE / 2 + nLength * std::sin(nAngle)});
    }
    return oRing;
}

Rings Ring(int nVertices)
{
    return {Circle(nVertices / 2, 0.49 * SIZE, 0.49 * SIZE), Circle(nVertices / 2, 0.3 * SIZE, 0.3 * SIZE)};
}

Rings Star(int nVertices)
{
    return {Circle(nVertices, 0.49 * SIZE, 0.2 * SIZE)};
}

// Rings one after the other, as the builder takes them.
struct Outline
{
    explicit Outline(const Rings& oRings)
    {
        for (const auto& oRing : oRings)
        {
            starts.push_back(static_cast<int>(vertices.size()));
            vertices.insert(vertices.end(), oRing.begin(), oRing.end());
        }
    }
    std::vector<GDBVertex> vertices;
    std::vector<int> starts;
};

std::unique_ptr<Mask> MaskOf(const Outline& oOutline, const Raster& oRaster)
{
    const PolygonMaskBuilder oBuilder(oOutline.vertices.data(), static_cast<int>(oOutline.vertices.size()),
                                      oOutline.starts.data(), static_cast<int>(oOutline.starts.size()), SIZE);
    return std::unique_ptr<Mask>(oBuilder.BuildMask(oRaster));
}

// The spans of every row, and a mask of nothing but them.
class Spans
{
public:
    explicit Spans(const Outline& oOutline)
    {
        const GGLPolyRaster oPolygon(oOutline.vertices.data(), static_cast<int>(oOutline.vertices.size()),
                                     oOutline.starts.data(), static_cast<int>(oOutline.starts.size()), SIZE);
        std::vector<double> oCrossings;
        for (int nRow = 0; nRow < SIZE; ++nRow)
        {
            oPolygon.GetScanline(nRow, oCrossings);
            for (std::size_t i = 0; i < oCrossings.size(); i += 2)
            {
                const int nStart = static_cast<int>(oCrossings[i] + 0.5);
                const int nEnd = std::max(nStart, static_cast<int>(oCrossings[i + 1] - 0.5));
                moSpans.push_back({static_cast<std::uint16_t>(nStart), static_cast<std::uint16_t>(nEnd)});
            }
            moRowEnds.push_back(moSpans.size());
        }
    }

    std::unique_ptr<Mask> Write(const Raster& oRaster) const
    {
        auto poMask = std::make_unique<Mask>(oRaster.GetInfo(), oRaster.GetContext());
        std::size_t i = 0;
        for (std::uint64_t nRow = 0; nRow < SIZE; ++nRow)
        {
            for (; i < moRowEnds[nRow]; ++i)
                SetBitRun(poMask->GetBits(), nRow * SIZE + moSpans[i].start, nRow * SIZE + moSpans[i].end);
        }
        return poMask;
    }

    std::size_t GetCount() const { return moSpans.size(); }

private:
    struct Span
    {
        std::uint16_t start;
        std::uint16_t end;
    };
    std::vector<Span> moSpans;
    std::vector<std::size_t> moRowEnds;
};

void MeasurePolygon(const std::string& name, const Rings& oRings)
{
    const Raster oRaster({SIZE, SIZE, 1, eDT_BIT}, {});
    const Outline oOutline(oRings);
    const Spans oSpans(oOutline);
    const auto poOurs = MaskOf(oOutline, oRaster), poTheirs = oSpans.Write(oRaster);
    if (!std::equal(poOurs->GetBits(), poOurs->GetBits() + poOurs->GetBitsSize(), poTheirs->GetBits()))
        throw std::runtime_error(name + ": the mask is not that of the spans");
    std::vector<Candidate> oCandidates{{"mask",
                                        [&]
                                        {
                                            Keep(MaskOf(oOutline, oRaster)->GetBits());
                                        }},
                                       {"spans", [&]
                                        {
                                            Keep(oSpans.Write(oRaster)->GetBits());
                                        }}};
    const auto oCairo = CairoFill(oRings, SIZE), oAgg = AggFill(oRings, SIZE);
    for (const auto& oFill : {oCairo, oAgg})
    {
        if (oFill)
            oCandidates.push_back({"", oFill});
    }
    const auto oSeconds = MedianSeconds(oCandidates, oSpans.GetCount() > 10000000 ? 3 : 101);
    // What would be left if there were no edges at all.
    const auto Limit = [&oSeconds](std::size_t nOther)
    {
        return "spans alone: " + Number(oSeconds[nOther] / oSeconds[1]);
    };
    PrintRow(name + ": speed of the spans alone", oSeconds[1] / oSeconds[0], 0.5,
             Number(oSeconds[0] * 1e3) + " ms, " + std::to_string(oSpans.GetCount()) + " spans");
    std::size_t nNext = 2;
    if (oCairo)
    {
        PrintRow(name + ": times cairo, A1 without antialiasing", oSeconds[nNext] / oSeconds[0], 3, Limit(nNext));
        ++nNext;
    }
    if (oAgg)
        PrintRow(name + ": times AGG, aliased scan lines", oSeconds[nNext] / oSeconds[0], 8, Limit(nNext));
}

void MeasurePolygons(const std::string& name, Rings (*pMake)(int))
{
    PrintHeading("Masks from polygons, 8192 x 8192: " + name + "s");
    for (const int nVertices : {1000, 100000})
        MeasurePolygon(name + " of " + std::to_string(nVertices), pMake(nVertices));
}

void MeasureBitmaps(const std::string& folder)
{
    PrintHeading("Masks from bitmaps, one tile after the other");
    const SceneFile oScene = MakeScene(folder, {"masked", 1, 8, false}, "none", 512, 4096);
    DatasetManager& oManager = *DatasetManager::GetInstance();
    const std::unique_ptr<IDataset> poDataset(oManager.Open(oScene.moPath, eUpdate));
    auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(poDataset.get());
    if (poBitmaps == nullptr)
        throw std::runtime_error("the scene has no bitmaps");
    if (poBitmaps->GetBitmapList().empty())
    {
        GGLShape oShape;
        oShape.AddRing({{100, 100}, {4000, 700}, {2500, 4000}});
        const Raster oRaster({oScene.mnSize, oScene.mnSize, 1, eDT_BIT}, {});
        const std::unique_ptr<Mask> poMask(PolygonMaskBuilder(oShape, 0, 0).BuildMask(oRaster));
        WriteMask(*poBitmaps, *poMask, 0);
        poDataset->Synchronize();
    }
    const unsigned int nBitmap = poBitmaps->GetBitmapList().front();
    BasicReader oBytes(poBitmaps, {nBitmap}, false), oChannel(poDataset.get(), {1}, false);
    const BitmapMaskBuilder oBuilder(poBitmaps, nBitmap, false);
    std::vector<std::pair<RasterInfo, RasterContext>> oTiles;
    oBytes.SetTileSize(512, 512);
    oChannel.SetTileSize(512, 512);
    for (const std::unique_ptr<Raster> poTile : RasterRange(oBytes))
        oTiles.emplace_back(poTile->GetInfo(), poTile->GetContext());
    const auto ReadAll = [](BasicReader& oReader)
    {
        for (const std::unique_ptr<Raster> poTile : RasterRange(oReader))
            Keep(poTile->GetBuffer());
    };
    const auto BuildAll = [&]
    {
        for (const auto& [oInfo, oContext] : oTiles)
            Keep(std::unique_ptr<Mask>(oBuilder.BuildMask(oInfo, oContext))->GetBits());
    };
    const auto oSeconds = MedianSeconds({{"mask", BuildAll},
                                         {"bytes",
                                          [&]
                                          {
                                              ReadAll(oBytes);
                                          }},
                                         {"channel",
                                          [&]
                                          {
                                              ReadAll(oChannel);
                                          }}},
                                        9);
    PrintRow("mask of a 512 x 512 tile: speed of its bytes", oSeconds[1] / oSeconds[0], 0.5);
    PrintRow("the same: speed of an uncompressed 8-bit channel", oSeconds[2] / oSeconds[0], 0);
}

} // namespace

int main(int nArguments, char** pArguments)
try
{
    const Arguments oArguments(nArguments, pArguments, "[FOLDER] [--only rings|stars|bitmaps]");
    const std::string folder = oArguments.GetWords().empty() ? "build/bench" : oArguments.GetWords().front();
    if (oArguments.Wants("rings"))
        MeasurePolygons("ring", &Ring);
    if (oArguments.Wants("stars"))
        MeasurePolygons("star", &Star);
    if (oArguments.Wants("bitmaps"))
        MeasureBitmaps(folder);
    return 0;
}
catch (const std::exception& oError)
{
    std::fprintf(stderr, "krv_bench_masks: %s\n", oError.what());
    return 1;
}
