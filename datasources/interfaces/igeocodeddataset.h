#pragma once

#include "datasources/api.h"

namespace krv::ogc::cs
{
class GeocodingInfo;
}

namespace krv::datasources
{

// The affine georeferencing of a dataset. The order of the virtual operations is public and fixed.
// Sensor models and control points are other ways to place an image: IMathModelDataset, and tags of the record.
class KRV_DATASOURCES_API IGeocodedDataset
{
public:
    virtual ~IGeocodedDataset();

    // From continuous pixel coordinates, (0, 0) the outer corner of the first pixel, to the map; owned by the dataset.
    // The identity where the file names none.
    virtual const krv::ogc::cs::GeocodingInfo& GetGeocoding() const = 0;
    // Replaces it; a reference that GetGeocoding gave before is of no more use. Throws DataException for a transform
    // without an inverse and for a dataset that is not open for updating.
    virtual void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo) = 0;
};

} // namespace krv::datasources
