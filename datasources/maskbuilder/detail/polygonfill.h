#pragma once

#include "datasources/maskbuilder/detail/maskrows.h"
#include "toolkit/core/gglpolyraster.h"

#include <cstdint>
#include <vector>

namespace krv::datasources::detail
{

// Sets the bits of polygons in an area of a mask by the rule for spans: the crossings (s, e) of a pair set the columns
// from trunc(s + 0.5) to trunc(e - 0.5), at least the first of them.
//
// Rows with few crossings are filled span by span, those of up to eight in vectors of rows. For rows with many the
// crossings are not even sorted. From column 0 on truncation is floor: a pair fills from the bit floor(s + 0.5) to the
// one before floor(e + 0.5), which is the running exclusive-or of a plane in which every crossing flips that bit; where
// both are one bit the span is that bit alone, which is a second plane of the bits hit more than once. Pairs left of
// the area set nothing. Rows with crossings below 0 that reach the area are always filled span by span.
class PolygonFill
{
public:
    // The area lies in the mask.
    PolygonFill(MaskRows& oRows, const PixelArea& oArea);

    void Fill(const GGLPolyRaster& oPolygon);

    // 64 columns, the first in the highest bit.
    struct Planes
    {
        std::uint64_t odd;
        std::uint64_t again;
    };

private:
    using Edge = GGLPolyRaster::Edge;

    void FillRows(const GGLPolyRaster& oPolygon, int nFirstRow, int nLastRow);
    void FillBlock(const GGLPolyRaster& oPolygon, int nFirstRow, int nLastRow, std::int64_t nCrossings);
    bool FillFew(int nFirstRow, int nLastRow);
    void FillSparse(int nFirstRow, int nLastRow);
    void FillDense(const GGLPolyRaster& oPolygon, int nFirstRow, int nLastRow);
    void FillRow(int nRow, double* pCrossings, std::size_t nCount);
    bool Flip(int nFirstRow, int nLastRow);
    void TakeRow(int nRow, Planes* pRow);

    MaskRows& moRows;
    PixelArea moArea; // narrowed to the polygon while one is filled
    // The edges of a block: those that began above it, and those that begin in it, by their first row.
    std::vector<const Edge*> moActive;
    const Edge* mpNew = nullptr;
    const Edge* mpNewEnd = nullptr;
    std::vector<const Edge*> moReaching; // a row from above
    std::vector<double> moCrossings;
    std::vector<Planes> moPlanes; // rows of mnRowWords, the first word for what lies left of the area
    std::size_t mnRowWords = 0;
    std::vector<std::uint64_t> moWords;
    std::vector<bool> moSpanRows;
};

} // namespace krv::datasources::detail
