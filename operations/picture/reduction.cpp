#include "operations/picture/reduction.h"

#include "datasources/reader/irasterreader.h"
#include "datasources/reader/rasterrange.h"
#include "gobs/raster/raster.h"

#include <memory>

namespace krv::operations
{

std::vector<Plane> Reduce(krv::datasources::IRasterReader& oReader, const krv::gobs::NoDataNumbers& oNumbers,
                          unsigned int nWidth, unsigned int nHeight, Resampling eMethod, ProgressCounter& oCounter)
{
    krv::gobs::PlaneReducer oReducer(oReader.GetDataType(), oReader.GetWidth(), oReader.GetHeight(), nWidth, nHeight,
                                     oNumbers, eMethod);
    oReader.SetMargins(0, 0, eMirror);
    for (const std::unique_ptr<krv::gobs::Raster> poTile : krv::datasources::RasterRange(oReader))
    {
        oReducer.Add(*poTile);
        oCounter.Advance(poTile->GetBufferSize());
    }
    return oReducer.TakePlanes();
}

} // namespace krv::operations
