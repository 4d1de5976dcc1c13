#include "datasources/maskbuilder/bitmapmaskbuilder.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicreader.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "toolkit/core/hblock.h"
#include "toolkit/exceptions/exceptions.h"

#include <vector>

namespace krv::datasources
{

// The dataset has no owner before the reader stands, intended: a failure leaves it undeleted.
BitmapMaskBuilder::BitmapMaskBuilder(const std::string& fileName, unsigned int nBitmap)
{
    auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(DatasetManager::GetInstance()->Open(fileName, eReadOnly));
    if (poBitmaps == nullptr)
        throw krv::DataException("Invalid dataset - bitmap not supported", Place::AtLine(40));
    Use(poBitmaps, nBitmap, true);
}

BitmapMaskBuilder::BitmapMaskBuilder(IBitmapDataset* poDataset, unsigned int nBitmap, bool bOwnsDataset)
{
    Use(poDataset, nBitmap, bOwnsDataset);
}

BitmapMaskBuilder::BitmapMaskBuilder(const BitmapMaskBuilder&) = default;
BitmapMaskBuilder& BitmapMaskBuilder::operator=(const BitmapMaskBuilder&) = default;

BitmapMaskBuilder::~BitmapMaskBuilder()
{
    mpoReader.reset();
}

void BitmapMaskBuilder::Use(IBitmapDataset* poDataset, unsigned int nBitmap, bool bOwnsDataset)
{
    mpoReader = std::make_shared<BasicReader>(poDataset, std::vector<unsigned int>{nBitmap}, false);
    if (bOwnsDataset)
        mpoDataset.reset(poDataset);
    else
        mpoDataset = std::shared_ptr<IBitmapDataset>(std::shared_ptr<IBitmapDataset>(), poDataset);
}

krv::gobs::Mask* BitmapMaskBuilder::BuildMask(const krv::gobs::Raster& oRaster) const
{
    return BuildMask(oRaster.GetInfo(), oRaster.GetContext());
}

krv::gobs::Mask* BitmapMaskBuilder::BuildMask(const krv::gobs::RasterInfo& oInfo,
                                              const krv::gobs::RasterContext& oContext) const
{
    const krv::gobs::DataType oType(krv::gobs::eDT_8U);
    const krv::gobs::RasterInfo oBytesInfo(oInfo.GetWidth(), oInfo.GetHeight(), 1, oType);
    const std::uint64_t nBytes = krv::gobs::BufferBytes(oInfo.GetWidth() + 2ull * oContext.GetXMargin(),
                                                        oInfo.GetHeight() + 2ull * oContext.GetYMargin(), 1, oType);
    HBlock oBytes(static_cast<unsigned char*>(HMalloc(nBytes)));
    krv::gobs::Raster oRaster(oBytesInfo, oContext, oBytes.get(), false);
    mpoReader->SetMargins(oContext.GetXMargin(), oContext.GetYMargin(), eMirror);
    mpoReader->ReadRaster(&oRaster);
    return new krv::gobs::Mask(oBytesInfo, oContext, oBytes.release(), true);
}

} // namespace krv::datasources
