#pragma once

#include "plugins/tif/geo/geokeys.h"
#include "plugins/tif/writing/fileeditor.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <memory>
#include <vector>

namespace krv::plugins::tif
{

// Stores the geographic part of a page in its tags (plugins/support/geotiff/geotags.h has the rules).
class GeoWriter
{
public:
    // Both outlive it; all tags of the page are in memory.
    GeoWriter(FileEditor& oEditor, std::shared_ptr<PageModel> poPage) : moEditor(oEditor), mpoPage(std::move(poPage)) {}

    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo);
    void SetRasterType(bool bPoint);
    void RemoveRasterType();
    void SetTiePoints(const std::vector<TiePoint>& oPoints);
    void SetCRS(const krv::ogc::cs::ICRS& oCRS, const Place& oPlace);
    void RemoveCRS();

private:
    support::GeoTags GetTags() const;
    void StorePlace(const support::GeoTags& oTags);
    void StoreKeys(const support::GeoTags& oTags);

    FileEditor& moEditor;
    std::shared_ptr<PageModel> mpoPage;
};

} // namespace krv::plugins::tif
