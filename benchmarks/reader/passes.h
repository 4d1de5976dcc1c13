#pragma once

#include "benchmarks/support/measure.h"
#include "benchmarks/support/scene.h"
#include "datasources/reader/basicreader.h"
#include "gobs/raster/raster.h"
#include "toolkit/cache/tilestore.h"

#include <memory>
#include <string>
#include <vector>

// Passes over the tiles of an image, by whatever reads them.
namespace krv::benchmarks
{

// The process's tiles outlive the dataset they are of: what an earlier pass left there must not count.
inline void ForgetTiles()
{
    krv::cache::TileStore::Process().Clear();
}

inline std::unique_ptr<krv::datasources::BasicReader> OpenScene(const SceneFile& oScene)
{
    ForgetTiles();
    return std::make_unique<krv::datasources::BasicReader>(oScene.moPath, std::vector<unsigned int>());
}

inline void ReadTiles(krv::datasources::BasicReader& oReader, unsigned int nBegin, unsigned int nEnd)
{
    for (unsigned int nTile = nBegin; nTile < nEnd; ++nTile)
    {
        const std::unique_ptr<krv::gobs::Raster> oRaster(oReader.GetRaster(nTile));
        Keep(oRaster->GetBuffer());
    }
}

// Of a source with ReadTile(number).
template <typename Source>
void ReadTilesOf(Source& oSource, unsigned int nEnd)
{
    for (unsigned int nTile = 0; nTile < nEnd; ++nTile)
        Keep(oSource.ReadTile(nTile));
}

inline std::string Rate(double nBytes, double nSeconds)
{
    return Number(nBytes / nSeconds / 1e6, 0) + " MB/s";
}

} // namespace krv::benchmarks
