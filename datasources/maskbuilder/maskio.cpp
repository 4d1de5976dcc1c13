#include "datasources/maskbuilder/maskio.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/maskbuilder/bitmapmaskbuilder.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

#include <vector>

namespace krv::datasources
{

krv::gobs::Mask* ReadMask(IBitmapDataset& oDataset, unsigned int nBitmap, krv::gobs::RasterInfo& oInfo,
                          krv::gobs::RasterContext& oContext)
{
    return BitmapMaskBuilder(&oDataset, nBitmap, false).BuildMask(oInfo, oContext);
}

unsigned int WriteMask(IBitmapDataset& oDataset, const krv::gobs::Mask& oMask, int nBitmap)
{
    const auto* const poRoot = dynamic_cast<const IDataset*>(&oDataset);
    if (poRoot == nullptr)
        throw krv::DataException("Dataset is not Valid.", Place::None()); // the capital is intended
    if (!poRoot->Exists())
        throw krv::DataException("Dataset doesn't exist.", Place::None());
    const unsigned int nWritten = nBitmap < 1 ? oDataset.CreateBitmap() : static_cast<unsigned int>(nBitmap);
    BasicWriter oWriter(&oDataset, std::vector<unsigned int>{nWritten});
    if (!oWriter.FileExists())
        throw krv::DataException("Unable to create bitmap, file doesn't exist.", Place::None());
    krv::gobs::Raster oRaster({oMask.GetWidth(), oMask.GetHeight(), 1, krv::gobs::eDT_8U}, oMask.GetContext());
    oMask.RetrieveRaster(oRaster);
    oWriter.WriteRaster(&oRaster);
    return nWritten;
}

} // namespace krv::datasources
