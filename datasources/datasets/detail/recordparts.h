#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <memory>

namespace krv::datasources::detail
{

// What a dataset in memory knows of its image beside the pixels.
struct RecordParts
{
    AuxiliaryData moTags;
    std::unique_ptr<const krv::ogc::cs::ICRS> mpoCRS; // null without one
    krv::ogc::cs::GeocodingInfo moGeocoding;

    // As a dataset hands its reference system out: a new object or null.
    krv::ogc::cs::ICRS* CloneCRS() const { return mpoCRS != nullptr ? mpoCRS->Clone() : nullptr; }
};

} // namespace krv::datasources::detail
