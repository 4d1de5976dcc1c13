#include "datasources/maskbuilder/polygonmaskbuilder.h"

#include "datasources/maskbuilder/detail/polygonfill.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"

#include <algorithm>
#include <memory>

namespace krv::datasources
{

PolygonMaskBuilder::PolygonMaskBuilder(const GGLShape& oShape, int nFirstRow, int nRows)
{
    AddPolygon(oShape, nFirstRow, nRows);
}

PolygonMaskBuilder::PolygonMaskBuilder(const GDBVertex* poVertices, int nVertices, const int* pnRingStarts, int nRings,
                                       int nRows)
{
    AddPolygon(poVertices, nVertices, pnRingStarts, nRings, nRows);
}

PolygonMaskBuilder::PolygonMaskBuilder(const PolygonMaskBuilder&) = default;
PolygonMaskBuilder& PolygonMaskBuilder::operator=(const PolygonMaskBuilder&) = default;
PolygonMaskBuilder::~PolygonMaskBuilder() = default;

void PolygonMaskBuilder::AddPolygon(const GGLShape& oShape, int nFirstRow, int nRows)
{
    moPolygons.emplace_back(oShape, nFirstRow, nRows);
}

void PolygonMaskBuilder::AddPolygon(const GDBVertex* poVertices, int nVertices, const int* pnRingStarts, int nRings,
                                    int nRows)
{
    moPolygons.emplace_back(poVertices, nVertices, pnRingStarts, nRings, nRows);
}

void PolygonMaskBuilder::SetClipRect(const GGLTIntRect<int>& oRect)
{
    moClip = oRect;
}

krv::gobs::Mask* PolygonMaskBuilder::BuildMask(const krv::gobs::Raster& oRaster) const
{
    auto oMask =
        std::make_unique<krv::gobs::Mask>(oRaster.GetInfo(), oRaster.GetContext(), krv::gobs::Mask::NotCleared());
    detail::MaskRows oRows(*oMask, false);
    for (const GGLPolyRaster& oPolygon : moPolygons)
        Apply(oRows, oPolygon);
    oRows.ClearRest();
    return oMask.release();
}

void PolygonMaskBuilder::ApplyPolygon(krv::gobs::Mask& oMask, const GGLPolyRaster& oPolygon) const
{
    detail::MaskRows oRows(oMask, true);
    Apply(oRows, oPolygon);
}

void PolygonMaskBuilder::Apply(detail::MaskRows& oRows, const GGLPolyRaster& oPolygon) const
{
    if (!oPolygon.IsNonEmpty())
        return;
    detail::PixelArea oArea = oRows.GetArea();
    if (moClip.x != 0 || moClip.y != 0 || moClip.width != 0 || moClip.height != 0)
    {
        oArea.firstColumn = std::max<std::int64_t>(oArea.firstColumn, moClip.x);
        oArea.lastColumn = std::min(oArea.lastColumn, std::int64_t{moClip.x} + moClip.width - 1);
        oArea.firstRow = std::max<std::int64_t>(oArea.firstRow, moClip.y);
        oArea.lastRow = std::min(oArea.lastRow, std::int64_t{moClip.y} + moClip.height - 1);
    }
    if (!oArea.IsEmpty())
        detail::PolygonFill(oRows, oArea).Fill(oPolygon);
}

} // namespace krv::datasources
