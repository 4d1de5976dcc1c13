#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "gobs/pct/pct.h"
#include "plugins/raw/headertext.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <memory>
#include <optional>
#include <string>

namespace krv::plugins::raw
{

// What a header says beyond the form of the pixels, and how it is said. Tags of the file: "NO_DATA_VALUE" (data ignore
// value), "ImageDescription", "DefaultRed", "DefaultGreen", "DefaultBlue", "DefaultGray" (default bands); of a channel:
// its description (band names), "Wavelength" and "FWHM" with "WavelengthUnits", "Scale" and "Offset" (data gain and
// offset values). Every other key is a tag of the file under its own name, its value with braces where it has them.

krv::datasources::AuxiliaryData ReadTags(const HeaderText& oHeader, unsigned int nChannels);
// Makes the header say the tags as far as it can, and no others; returns what it cannot say.
krv::datasources::AuxiliaryData WriteTags(krv::datasources::AuxiliaryData oTags, HeaderText& oHeader);

// By "map info" along the axes of the map; no value when there is none, for one that is rotated, since readers do not
// agree on the direction, and for one without sense.
std::optional<krv::ogc::cs::GeocodingInfo> ReadGeocoding(const HeaderText& oHeader);
// False when the header cannot say it: a rotation, or rows that do not go south.
bool WriteGeocoding(const krv::ogc::cs::GeocodingInfo& oGeocoding, const krv::ogc::cs::ICRS* poCRS,
                    HeaderText& oHeader);

void RemoveGeocoding(HeaderText& oHeader);

// By "coordinate system string", or else by the names of "map info". Null when there is neither; trouble: why what is
// there means nothing.
std::unique_ptr<krv::ogc::cs::ICRS> ReadCRS(const HeaderText& oHeader, std::string* pTrouble = nullptr);
// False when the header cannot say it.
bool WriteCRS(const krv::ogc::cs::ICRS& oCRS, HeaderText& oHeader);

// Leaves where the image lies on the map.
void RemoveCRS(HeaderText& oHeader);

// The colours of classes, value 0 the first.
std::optional<krv::gobs::PCT> ReadClasses(const HeaderText& oHeader);
// False for a table that is not a list of opaque colours of 8 bits for the values from 0 on.
bool WriteClasses(const krv::gobs::PCT& oTable, HeaderText& oHeader);
void RemoveClasses(HeaderText& oHeader);

} // namespace krv::plugins::raw
