#pragma once

#include "plugins/jp2/reading/boxes.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <array>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::jp2
{

using Uuid = std::array<unsigned char, 16>;

// Of boxes with geographic tags, and with metadata as XMP.
constexpr Uuid GEOTIFF_UUID = {0xb1, 0x4b, 0xf8, 0xbd, 0x08, 0x3d, 0x4b, 0x43,
                               0xa5, 0xae, 0x8c, 0xd7, 0xd5, 0xa6, 0xce, 0x03};
constexpr Uuid XMP_UUID = {0xbe, 0x7a, 0xcf, 0xcb, 0x97, 0xa9, 0x42, 0xe8,
                           0x9c, 0x71, 0x99, 0x94, 0x91, 0xe3, 0xaf, 0xac};

// What the first UUID box of a kind holds behind its UUID; no value when there is none.
std::optional<std::vector<unsigned char>> FindUuid(const support::File& oFile, const std::vector<Box>& oBoxes,
                                                   const Uuid& oUuid);

// The place of an image on the ground.
struct GeoPlace
{
    std::unique_ptr<krv::ogc::cs::ICRS> mpoCRS;
    krv::ogc::cs::GeocodingInfo moGeocoding;
};

// From the geographic tags, and what these lack from the text in GML. What cannot be used goes to oTroubles. Throws
// what reading the file throws.
GeoPlace ReadGeoPlace(const support::File& oFile, const std::vector<Box>& oBoxes, std::vector<std::string>& oTroubles);

} // namespace krv::plugins::jp2
