#pragma once

#include "plugins/tif/geo/geokeylist.h"
#include "plugins/tif/geo/geokeys.h"
#include "plugins/tif/writing/fileeditor.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <memory>
#include <vector>

namespace krv::plugins::tif
{

// Stores the geographic part of a page in its tags.
class GeoWriter
{
public:
    // Both outlive it; all tags of the page are in memory.
    GeoWriter(FileEditor& oEditor, std::shared_ptr<PageModel> poPage) : moEditor(oEditor), mpoPage(std::move(poPage)) {}

    // For the outer corner of the first pixel; the identity removes what is there. Pixel scale and tie point where
    // they can say it, else the matrix.
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo);
    // What positions in the file mean; the geocoding stays what it is.
    void SetRasterType(bool bPoint);
    void RemoveRasterType();
    // In place of a geocoding.
    void SetTiePoints(const std::vector<TiePoint>& oPoints);

    // By its code, else by its parts, else as a text: the first of these that reads back as the same system. Throws
    // DataException when none does.
    void SetCRS(const krv::ogc::cs::ICRS& oCRS, const Place& oPlace);

private:
    bool IsPoint() const;
    bool Try(const GeoKeyList& oKeys, const krv::ogc::cs::ICRS& oCRS);

    FileEditor& moEditor;
    std::shared_ptr<PageModel> mpoPage;
};

} // namespace krv::plugins::tif
