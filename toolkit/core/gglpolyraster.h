#pragma once

#include "toolkit/api.h"
#include "toolkit/core/gdbvertex.h"
#include "toolkit/exceptions/place.h"

#include <cstddef>
#include <cstdint>
#include <limits>
#include <vector>

class GGLShape;

namespace krv::core::detail
{
class EdgeBatch;
}

// A polygon ready for scan conversion: filled even-odd, row by row. Row r is the line y = r + 0.5 through the centres
// of the row's pixels; an edge belongs to the rows whose centres are at or below its upper end and above its lower one,
// so every row has an even number of crossings. Rows are signed 32-bit numbers; what lies beyond them, and on the
// largest of them, is left out. Vertices with a coordinate that is not a finite number are left out as if they had not
// been given. Memory is that of the edges, however many rows they cross. A plain value.
// Any number of threads may ask one object that nobody changes.
// Example: for each pair of GetScanline(r), pixels whose centre column c + 0.5 lies between both are inside.
class KRV_TOOLKIT_API GGLPolyRaster
{
public:
    // An edge with the rows whose centres it crosses.
    // A plain value. Edges that cross no row's centre are none.
    struct Edge
    {
        Edge() {} // not cleared: there are many
        Edge(int nFirstRow, int nLastRow, double nX, double nSlope)
            : firstRow(nFirstRow), lastRow(nLastRow), x(nX), slope(nSlope)
        {
        }

        int firstRow; // the row of its upper end
        int lastRow;  // at or below firstRow
        double x;     // on firstRow
        double slope; // x per row

        // The crossing of one of these rows. An edge of enormous extent may give an infinity, never NaN.
        // nRow: from firstRow to lastRow; other rows give a number without a meaning.
        double At(int nRow) const { return x + static_cast<double>(std::int64_t{nRow} - firstRow) * slope; }
    };

    // Only rows from nFirstRow to nFirstRow + nRows - 1 are kept; all of them when nRows is below 1.
    GGLPolyRaster(const GGLShape& oShape, int nFirstRow, int nRows);
    // pnRingStarts: the index of the first vertex of each ring, ascending; a ring ends where the next begins. Only rows
    // from 0 to nRows - 1 are kept; all of them when nRows is below 1. Throws krv::DataException for a negative count,
    // a missing array and starts that are out of order or outside the vertices.
    // The arrays are borrowed for the call alone.
    GGLPolyRaster(const GDBVertex* poVertices, int nVertices, const int* pnRingStarts, int nRings, int nRows);
    GGLPolyRaster(const GGLPolyRaster&);
    GGLPolyRaster(GGLPolyRaster&&) noexcept;
    GGLPolyRaster& operator=(const GGLPolyRaster&);
    GGLPolyRaster& operator=(GGLPolyRaster&&) noexcept;
    ~GGLPolyRaster();

    // Whether any row has a crossing.
    // False for a polygon between two lines of centres, which fills nothing.
    bool IsNonEmpty() const { return !moEdges.empty(); }
    // The first and last row with crossings; 0 and -1 without any.
    int GetFirstRow() const { return moExtent.firstRow; }
    int GetLastRow() const { return moExtent.lastRow; }
    // All crossings lie between these, rounding aside.
    // Columns, continuous; the largest and the lowest double for a polygon without crossings.
    double GetLeft() const { return moExtent.left; }
    double GetRight() const { return moExtent.right; }

    // The crossings of a row, ascending, in pairs that enclose what is inside; empty for a row without any. Takes time
    // in proportion to their number, but for the logarithms of search and sort.
    // Crossings are continuous columns: pixel c is inside when c + 0.5 lies from the first of a pair to the second.
    std::vector<double> GetScanline(int nRow) const;
    // The same into a vector that is used again.
    // What it held before is gone; its memory is kept, so that a loop over rows allocates nothing.
    void GetScanline(int nRow, std::vector<double>& oCrossings) const;

    // All edges, by their first row.
    const std::vector<Edge>& GetEdges() const { return moEdges; }
    // The number of edges that begin above a row.
    // With FindReaching the way to walk rows upwards from any row, without a search for each.
    std::size_t CountEdgesAbove(int nRow) const;
    // Replaces the list by those of the first nEdges edges that reach down to a row.
    // nEdges: as CountEdgesAbove gives it. The pointers are valid until this object changes.
    void FindReaching(int nRow, std::size_t nEdges, std::vector<const Edge*>& oEdges) const;

private:
    // The rows of interest, both ends among them.
    struct RowLimits
    {
        std::int64_t first = std::numeric_limits<int>::min();
        std::int64_t last = std::numeric_limits<int>::max() - 1; // so that a loop over rows can end
    };

    // Where the crossings are.
    struct Extent
    {
        int firstRow = std::numeric_limits<int>::max();
        int lastRow = std::numeric_limits<int>::min();
        double left = std::numeric_limits<double>::max();
        double right = std::numeric_limits<double>::lowest();
    };

    void AddRing(const GDBVertex* poFirst, const GDBVertex* poEnd, const RowLimits& oLimits);
    void AddBatch(const krv::core::detail::EdgeBatch& oBatch);
    void AddUnusual(const GDBVertex* poFirst, const GDBVertex* poEnd, const RowLimits& oLimits);
    void AddEdge(const GDBVertex& oUpper, const GDBVertex& oLower, const RowLimits& oRows);
    void Finish();
    void SortEdges();

    std::vector<Edge> moEdges; // by firstRow
    // For every bundle of edges the last row of them all; then for every bundle of these, and so on.
    std::vector<std::vector<int>> moLastRows;
    Extent moExtent; // of all edges together
};
