#pragma once

#include "datasources/api.h"
#include "gobs/mask/imaskbuilder.h"
#include "toolkit/core/gdbvertex.h"
#include "toolkit/core/gglpolyraster.h"
#include "toolkit/core/ggltintrect.h"

#include <vector>

class GGLShape;

namespace krv::datasources
{

namespace detail
{
class MaskRows;
}

// Makes masks from polygons in pixel coordinates of the file: a set bit lies in at least one of them. A row of a
// polygon is filled between its crossings: the pair (s, e) sets the columns from trunc(s + 0.5) to trunc(e - 0.5),
// those whose centres lie between the two, and always the first of them, intended: thin parts do not vanish. Every
// polygon is filled even-odd by itself. The arguments of the polygons are those of GGLPolyRaster and mean what they
// mean there.
// Polygons are scan converted when they are added; a mask then costs time by its rows and their crossings. Copies are
// apart from each other. Masks may be built by several threads at once as long as nobody adds or clips.
class KRV_DATASOURCES_API PolygonMaskBuilder : public krv::gobs::IMaskBuilder
{
public:
    // The shape, or the vertices, are borrowed for the call alone.
    PolygonMaskBuilder(const GGLShape& oShape, int nFirstRow, int nRows);
    PolygonMaskBuilder(const GDBVertex* poVertices, int nVertices, const int* pnRingStarts, int nRings, int nRows);
    PolygonMaskBuilder(const PolygonMaskBuilder&);
    PolygonMaskBuilder& operator=(const PolygonMaskBuilder&);
    ~PolygonMaskBuilder() override;

    // Another one beside those that there are.
    void AddPolygon(const GGLShape& oShape, int nFirstRow, int nRows);
    void AddPolygon(const GDBVertex* poVertices, int nVertices, const int* pnRingStarts, int nRings, int nRows);

    // Only bits inside the rectangle of file pixels are set from now on. Four zeros clip nothing; a rectangle that is
    // empty otherwise leaves nothing.
    void SetClipRect(const GGLTIntRect<int>& oRect);

    // Only size, position and margins of the raster count. Bits stand as Mask lays them out, margins included.
    krv::gobs::Mask* BuildMask(const krv::gobs::Raster& oRaster) const override;

protected:
    // Sets the bits of one polygon and clears none.
    void ApplyPolygon(krv::gobs::Mask& oMask, const GGLPolyRaster& oPolygon) const;

private:
    void Apply(detail::MaskRows& oRows, const GGLPolyRaster& oPolygon) const;

    GGLTIntRect<int> moClip;
    std::vector<GGLPolyRaster> moPolygons;
};

} // namespace krv::datasources
