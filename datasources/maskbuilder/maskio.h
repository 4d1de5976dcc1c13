#pragma once

#include "datasources/api.h"

namespace krv::gobs
{
class Mask;
class RasterContext;
class RasterInfo;
} // namespace krv::gobs

namespace krv::datasources
{

class IBitmapDataset;

// A new mask, owned by the caller, of a bitmap (from 1) of a dataset: width and height of the one description, position
// and margins of the other. As BitmapMaskBuilder, for one mask.
// Throws DataException for a bitmap that is not there.
KRV_DATASOURCES_API krv::gobs::Mask* ReadMask(IBitmapDataset& oDataset, unsigned int nBitmap,
                                              krv::gobs::RasterInfo& oInfo, krv::gobs::RasterContext& oContext);

// Stores the centre of a mask at its position in a bitmap of a dataset that is open for update; the bits stay as they
// are. A bitmap number below 1 makes a new bitmap, which goes again when the mask cannot be stored. Returns the number
// of the bitmap. Throws DataException "Dataset is not Valid." for a dataset without IDataset, "Dataset doesn't exist."
// for one without a file, and "Unable to create bitmap, file doesn't exist." when the file has gone after that.
// Nothing is synchronised here: the bitmap is the file's after Synchronize of the dataset.
KRV_DATASOURCES_API unsigned int WriteMask(IBitmapDataset& oDataset, const krv::gobs::Mask& oMask, int nBitmap);

} // namespace krv::datasources
