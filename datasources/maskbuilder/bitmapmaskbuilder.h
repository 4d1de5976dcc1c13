#pragma once

#include "datasources/api.h"
#include "gobs/mask/imaskbuilder.h"

#include <memory>
#include <string>

namespace krv::gobs
{
class RasterContext;
class RasterInfo;
} // namespace krv::gobs

namespace krv::datasources
{

class IBitmapDataset;
class IRasterReader;

// Makes masks from a bitmap of a file: a set bit is one that the file has set, as it is stored. Margins that the file
// does not have are mirrored, eMirror; what the reader refuses, it refuses here. Copies share the reader and, when it
// is owned, the dataset; the last one deletes them. One thread at a time, copies included.
// Example: the mask of a tile by bitmap 2: BitmapMaskBuilder("scene.tif", 2).BuildMask(*poTile); the caller owns it.
class KRV_DATASOURCES_API BitmapMaskBuilder : public krv::gobs::IMaskBuilder
{
public:
    // Bitmap nBitmap (from 1) of a file, which is opened for reading. Throws DataException "Invalid dataset - bitmap
    // not supported" for a format without bitmaps. Whatever throws after the file was opened leaves the dataset
    // undeleted, intended.
    BitmapMaskBuilder(const std::string& fileName, unsigned int nBitmap);
    // The bitmaps of an open dataset. With bOwnsDataset the builder deletes it; it stays the caller's when the
    // constructor throws.
    BitmapMaskBuilder(IBitmapDataset* poDataset, unsigned int nBitmap, bool bOwnsDataset);
    BitmapMaskBuilder(const BitmapMaskBuilder&);
    BitmapMaskBuilder& operator=(const BitmapMaskBuilder&);
    // The reader goes before the dataset.
    ~BitmapMaskBuilder() override;

    // A new mask over the full extent, owned by the caller. Throws what reading the file throws.
    krv::gobs::Mask* BuildMask(const krv::gobs::Raster& oRaster) const override;
    // The region by size and place alone: width and height of the one, position and margins of the other.
    krv::gobs::Mask* BuildMask(const krv::gobs::RasterInfo& oInfo, const krv::gobs::RasterContext& oContext) const;

private:
    void Use(IBitmapDataset* poDataset, unsigned int nBitmap, bool bOwnsDataset);

    std::shared_ptr<IRasterReader> mpoReader;
    std::shared_ptr<IBitmapDataset> mpoDataset; // deletes nothing unless owned
};

} // namespace krv::datasources
