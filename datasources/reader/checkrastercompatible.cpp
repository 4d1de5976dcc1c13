#include "datasources/reader/checkrastercompatible.h"

#include "datasources/reader/irasterreader.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

namespace krv::gobs
{

void CheckRasterCompatible(const Raster* poRaster, const krv::datasources::IRasterReader* poReader,
                           const krv::Place& oPlace)
{
    if (poRaster == nullptr)
        throw krv::DataException("The raster is NULL", oPlace);
    if (poRaster->GetChansCount() != poReader->GetChansCount())
        throw krv::DataException("The raster has " + std::to_string(poRaster->GetChansCount()) + " channels where " +
                                     std::to_string(poReader->GetChansCount()) + " are expected",
                                 oPlace);
    if (poRaster->GetDataType() != poReader->GetDataType())
        throw krv::DataException("The raster has the data type " + poRaster->GetDataType().Describe() + " where " +
                                     poReader->GetDataType().Describe() + " is expected",
                                 oPlace);
}

} // namespace krv::gobs
