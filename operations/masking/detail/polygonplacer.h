#pragma once

#include "operations/masking/masking.h"
#include "operations/masking/polygontext.h"
#include "operations/source/sourcefile.h"
#include "toolkit/core/gglshape.h"
#include "toolkit/ogc/cs/coordinatetransformation.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <cstddef>
#include <optional>
#include <vector>

namespace krv::operations::detail
{

// Takes polygons to the pixels of a file. Edges are straight in the system the polygons are given in. On the way to
// another system they are clipped to the surroundings of the image, so that parts which no projection reaches do no
// harm, and get as many vertices as their bend needs.
class PolygonPlacer
{
public:
    using Ring = std::vector<GDBVertex>;

    // oFile must outlive the object. Throws RequestException when text and request contradict each other or the file
    // cannot place such polygons.
    PolygonPlacer(const SourceFile& oFile, const MaskRequest& oRequest, const PolygonText& oText);

    // The polygon in continuous pixels: mostly one shape, none when it lies elsewhere, and several, whose union counts,
    // when it reaches the image at longitudes that are a turn apart. Throws krv::DataException for a vertex that cannot
    // be placed.
    std::vector<GGLShape> Place(const std::vector<Ring>& oRings);

private:
    struct Box
    {
        double low[2];
        double high[2];
    };

    void FindSurroundings();
    void CheckLatitudes(const Ring& oRing) const;
    static void ClipSide(Ring& oRing, double GDBVertex::*pAxis, double nLimit, double nSign);
    Ring Clip(Ring oRing, double nShift) const;
    GDBVertex ToPixel(const GDBVertex& oVertex) const;
    Ring Project(const Ring& oRing);
    void Split(const GDBVertex& oFrom, const GDBVertex& oTo, const GDBVertex& oPixelFrom, const GDBVertex& oPixelTo,
               unsigned int nDepth, Ring& oResult);

    const SourceFile& moFile;
    std::optional<krv::ogc::cs::GeocodingInfo> moGeocoding;
    std::optional<krv::ogc::cs::CoordinateTransformation> moTransformation;
    double mnSourceTurn = 0; // 360 degrees in the unit of the system, 0 for one without longitudes
    double mnTargetTurn = 0;
    double mnTargetCentre = 0; // x of the middle of the image
    std::optional<Box> moSurroundings;
    std::size_t mnAdded = 0;
};

} // namespace krv::operations::detail
