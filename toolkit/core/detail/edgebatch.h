#pragma once

#include "toolkit/core/gdbvertex.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <limits>

namespace krv::core::detail
{

// Edges of an outline by the hundred, so that vectors do the arithmetic.
class EdgeBatch
{
public:
    static constexpr std::size_t SIZE = 256;

    // Only rows from nFirst to nLast count: as for GGLPolyRaster.
    EdgeBatch(std::int64_t nFirst, std::int64_t nLast)
        : mnLowest(static_cast<double>(nFirst)), mnHighest(static_cast<double>(nLast + 1))
    {
    }

    // The vertex from which the first edge comes.
    void Begin(const GDBVertex& oVertex) { FindRows(&oVertex, 1, &moRows[0]); }
    // Takes the edges to nCount vertices, SIZE at most, each from the one before it. Keeps those that cross a row.
    // oBefore: the vertex before the first.
    void Take(const GDBVertex& oBefore, const GDBVertex* poVertices, std::size_t nCount);
    // Whether all coordinates are numbers, and not so large that their differences are not; nothing else is known of
    // the batch when they are not.
    bool Compute();

    std::size_t GetCount() const { return mnCount; }
    int GetFirstRow(std::size_t i) const { return moFirstRows[i]; }
    int GetLastRow(std::size_t i) const { return moLastRows[i]; }
    // The crossing of the first row and the change of x per row.
    double GetX(std::size_t i) const { return moX[i]; }
    double GetSlope(std::size_t i) const { return moSlopes[i]; }
    // The least and greatest crossing of all batches.
    double GetLeft() const { return mnLeft; }
    double GetRight() const { return mnRight; }

private:
    void FindRows(const GDBVertex* poVertices, std::size_t nCount, std::int32_t* pnRows) const;

    using Values = std::array<double, SIZE>;
    using Rows = std::array<std::int32_t, SIZE>;

    double mnLowest;
    double mnHighest;
    std::array<std::int32_t, SIZE + 4> moRows;      // of the vertex before and of the vertices, with room for a vector
    std::array<std::uint32_t, SIZE + 4> moCrossing; // the edges that cross a row
    std::size_t mnCount = 0;
    // Downwards whatever the sense of the ring, so that neighbours agree on the edge between them.
    Values moUpperX, moUpperY, moLowerX, moLowerY, moX, moSlopes;
    Rows moFirstRows, moLastRows;
    double mnLeft = std::numeric_limits<double>::max();
    double mnRight = std::numeric_limits<double>::lowest();
};

} // namespace krv::core::detail
