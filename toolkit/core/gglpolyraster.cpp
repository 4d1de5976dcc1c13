#include "toolkit/core/gglpolyraster.h"

#include "toolkit/core/detail/edgebatch.h"
#include "toolkit/core/gglshape.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <iterator>
#include <limits>

using krv::core::detail::EdgeBatch;

namespace
{

constexpr std::size_t BUNDLE = 16;
constexpr double GREATEST = std::numeric_limits<double>::max();

bool IsUsable(const GDBVertex& oVertex)
{
    return std::isfinite(oVertex.x) && std::isfinite(oVertex.y);
}

// The change of x per row. Differences of enormous coordinates leave the range of a double: their halves do not.
double Slope(const GDBVertex& oUpper, const GDBVertex& oLower)
{
    double nX = oLower.x - oUpper.x;
    double nY = oLower.y - oUpper.y;
    if (!std::isfinite(nX) || !std::isfinite(nY))
    {
        nX = oLower.x / 2 - oUpper.x / 2;
        nY = oLower.y / 2 - oUpper.y / 2;
    }
    return std::clamp(nX / nY, -GREATEST, GREATEST);
}

// How many bundles hold n edges, or n bundles.
std::size_t BundleCount(std::size_t n)
{
    return (n + BUNDLE - 1) / BUNDLE;
}

} // namespace

GGLPolyRaster::GGLPolyRaster(const GGLShape& oShape, int nFirstRow, int nRows)
{
    RowLimits oLimits;
    if (nRows > 0)
        oLimits = {nFirstRow, std::min(oLimits.last, std::int64_t{nFirstRow} + nRows - 1)};
    const auto& oVertices = oShape.GetVertices();
    const auto& oStarts = oShape.GetRingStarts();
    for (std::size_t i = 0; i < oStarts.size(); ++i)
    {
        const std::size_t nEnd = i + 1 < oStarts.size() ? oStarts[i + 1] : oVertices.size();
        AddRing(oVertices.data() + oStarts[i], oVertices.data() + nEnd, oLimits);
    }
    Finish();
}

GGLPolyRaster::GGLPolyRaster(const GDBVertex* poVertices, int nVertices, const int* pnRingStarts, int nRings, int nRows)
{
    const krv::Place oPlace = krv::Place::Current();
    if (nVertices < 0 || nRings < 0)
        throw krv::DataException("A polygon cannot have a negative number of vertices or rings", oPlace);
    if ((poVertices == nullptr && nVertices > 0) || (pnRingStarts == nullptr && nRings > 0))
        throw krv::DataException("The vertices or the ring starts of the polygon are NULL", oPlace);
    RowLimits oLimits;
    if (nRows > 0)
        oLimits = {0, std::min(oLimits.last, std::int64_t{nRows} - 1)};
    for (int i = 0; i < nRings; ++i)
    {
        const int nStart = pnRingStarts[i];
        const int nEnd = i + 1 < nRings ? pnRingStarts[i + 1] : nVertices;
        if (nStart < 0 || nStart > nEnd || nEnd > nVertices)
            throw krv::DataException("The ring starts of the polygon are out of order or outside its vertices", oPlace);
        AddRing(poVertices + nStart, poVertices + nEnd, oLimits);
    }
    Finish();
}

GGLPolyRaster::GGLPolyRaster(const GGLPolyRaster&) = default;
GGLPolyRaster::GGLPolyRaster(GGLPolyRaster&&) noexcept = default;
GGLPolyRaster& GGLPolyRaster::operator=(const GGLPolyRaster&) = default;
GGLPolyRaster& GGLPolyRaster::operator=(GGLPolyRaster&&) noexcept = default;
GGLPolyRaster::~GGLPolyRaster() = default;

void GGLPolyRaster::AddRing(const GDBVertex* poFirst, const GDBVertex* poEnd, const RowLimits& oLimits)
{
    if (poEnd - poFirst < 2)
        return;
    const std::size_t nEdges = moEdges.size();
    EdgeBatch oBatch(oLimits.first, oLimits.last);
    const GDBVertex* poBefore = poEnd - 1;
    oBatch.Begin(*poBefore);
    for (const GDBVertex* poVertex = poFirst; poVertex != poEnd;)
    {
        const auto nCount = std::min<std::ptrdiff_t>(EdgeBatch::SIZE, poEnd - poVertex);
        oBatch.Take(*poBefore, poVertex, static_cast<std::size_t>(nCount));
        if (!oBatch.Compute())
        {
            moEdges.resize(nEdges);
            return AddUnusual(poFirst, poEnd, oLimits);
        }
        AddBatch(oBatch);
        poVertex += nCount;
        poBefore = poVertex - 1;
    }
}

void GGLPolyRaster::AddBatch(const EdgeBatch& oBatch)
{
    const std::size_t nBegin = moEdges.size(), nCount = oBatch.GetCount();
    moEdges.resize(nBegin + nCount);
    int nFirstRow = moExtent.firstRow, nLastRow = moExtent.lastRow;
    for (std::size_t i = 0; i < nCount; ++i)
    {
        const int nFirst = oBatch.GetFirstRow(i), nLast = oBatch.GetLastRow(i);
        moEdges[nBegin + i] = {nFirst, nLast, oBatch.GetX(i), oBatch.GetSlope(i)};
        nFirstRow = std::min(nFirstRow, nFirst);
        nLastRow = std::max(nLastRow, nLast);
    }
    moExtent.firstRow = nFirstRow;
    moExtent.lastRow = nLastRow;
    moExtent.left = std::min(moExtent.left, oBatch.GetLeft());
    moExtent.right = std::max(moExtent.right, oBatch.GetRight());
}

// A ring with vertices that are not usable, which are left out, or with enormous coordinates: edge by edge.
void GGLPolyRaster::AddUnusual(const GDBVertex* poFirst, const GDBVertex* poEnd, const RowLimits& oLimits)
{
    std::vector<GDBVertex> oUsable;
    std::copy_if(poFirst, poEnd, std::back_inserter(oUsable), IsUsable);
    const auto nLowest = static_cast<double>(oLimits.first);
    const auto nHighest = static_cast<double>(oLimits.last + 1);
    for (std::size_t i = 0; i < oUsable.size(); ++i)
    {
        const GDBVertex& oFrom = oUsable[i == 0 ? oUsable.size() - 1 : i - 1];
        const GDBVertex& oTo = oUsable[i];
        const auto nFrom = static_cast<std::int64_t>(std::clamp(std::ceil(oFrom.y - 0.5), nLowest, nHighest));
        const auto nTo = static_cast<std::int64_t>(std::clamp(std::ceil(oTo.y - 0.5), nLowest, nHighest));
        if (nFrom < nTo)
            AddEdge(oFrom, oTo, {nFrom, nTo - 1});
        else if (nTo < nFrom)
            AddEdge(oTo, oFrom, {nTo, nFrom - 1});
    }
}

void GGLPolyRaster::AddEdge(const GDBVertex& oUpper, const GDBVertex& oLower, const RowLimits& oRows)
{
    const double nSlope = Slope(oUpper, oLower);
    const double nX = oUpper.x + (static_cast<double>(oRows.first) + 0.5 - oUpper.y) * nSlope;
    const auto [nLow, nHigh] = std::minmax({oUpper.x, oLower.x});
    const Edge oEdge(static_cast<int>(oRows.first), static_cast<int>(oRows.last), std::clamp(nX, nLow, nHigh), nSlope);
    const double nEnd = oEdge.At(oEdge.lastRow);
    moExtent.left = std::min({moExtent.left, oEdge.x, nEnd});
    moExtent.right = std::max({moExtent.right, oEdge.x, nEnd});
    moExtent.firstRow = std::min(moExtent.firstRow, oEdge.firstRow);
    moExtent.lastRow = std::max(moExtent.lastRow, oEdge.lastRow);
    moEdges.push_back(oEdge);
}

void GGLPolyRaster::Finish()
{
    if (moEdges.empty())
    {
        moExtent = {0, -1, 0, 0};
        return;
    }
    moExtent.left = std::max(moExtent.left, -GREATEST);
    moExtent.right = std::min(moExtent.right, GREATEST);
    SortEdges();
    moLastRows.emplace_back(BundleCount(moEdges.size()), std::numeric_limits<int>::min());
    for (std::size_t i = 0; i < moEdges.size(); i += BUNDLE)
    {
        int nLast = moEdges[i].lastRow;
        for (std::size_t k = i + 1; k < std::min(i + BUNDLE, moEdges.size()); ++k)
            nLast = std::max(nLast, moEdges[k].lastRow);
        moLastRows[0][i / BUNDLE] = nLast;
    }
    while (moLastRows.back().size() > 1)
    {
        const std::vector<int>& oBelow = moLastRows.back();
        std::vector<int> oAbove(BundleCount(oBelow.size()), std::numeric_limits<int>::min());
        for (std::size_t i = 0; i < oBelow.size(); ++i)
            oAbove[i / BUNDLE] = std::max(oAbove[i / BUNDLE], oBelow[i]);
        moLastRows.push_back(std::move(oAbove));
    }
}

// By counting where the rows are not many more than the edges, which is the rule.
void GGLPolyRaster::SortEdges()
{
    const auto nRows = static_cast<std::uint64_t>(std::int64_t{moExtent.lastRow} - moExtent.firstRow + 1);
    if (nRows / 8 > moEdges.size() + 128)
    {
        std::sort(moEdges.begin(), moEdges.end(), [](const Edge& a, const Edge& b) { return a.firstRow < b.firstRow; });
        return;
    }
    const auto RowOf = [this](const Edge& oEdge)
    {
        return static_cast<std::size_t>(std::int64_t{oEdge.firstRow} - moExtent.firstRow);
    };
    std::vector<std::size_t> oPlaces(static_cast<std::size_t>(nRows) + 1, 0);
    for (const Edge& oEdge : moEdges)
        ++oPlaces[RowOf(oEdge) + 1];
    for (std::size_t i = 1; i < oPlaces.size(); ++i)
        oPlaces[i] += oPlaces[i - 1];
    std::vector<Edge> oSorted(moEdges.size());
    for (const Edge& oEdge : moEdges)
        oSorted[oPlaces[RowOf(oEdge)]++] = oEdge;
    moEdges.swap(oSorted);
}

std::size_t GGLPolyRaster::CountEdgesAbove(int nRow) const
{
    const auto oEnd = std::lower_bound(moEdges.begin(), moEdges.end(), nRow,
                                       [](const Edge& oEdge, int nValue) { return oEdge.firstRow < nValue; });
    return static_cast<std::size_t>(oEnd - moEdges.begin());
}

void GGLPolyRaster::FindReaching(int nRow, std::size_t nEdges, std::vector<const Edge*>& oEdges) const
{
    oEdges.clear();
    // Depth first over the bundles that reach down to the row; the number of a bundle's first member is its own times
    // the size of a bundle.
    const auto Visit = [&](const auto& oSelf, std::size_t nLevel, std::size_t nBundle) -> void
    {
        if (moLastRows[nLevel][nBundle] < nRow)
            return;
        const std::size_t nFirst = nBundle * BUNDLE;
        if (nLevel == 0)
        {
            for (std::size_t i = nFirst; i < std::min(nFirst + BUNDLE, nEdges); ++i)
            {
                if (moEdges[i].lastRow >= nRow)
                    oEdges.push_back(&moEdges[i]);
            }
            return;
        }
        std::size_t nMembers = nEdges;
        for (std::size_t i = 0; i < nLevel; ++i)
            nMembers = BundleCount(nMembers);
        for (std::size_t i = nFirst; i < std::min(nFirst + BUNDLE, nMembers); ++i)
            oSelf(oSelf, nLevel - 1, i);
    };
    if (nEdges > 0)
        Visit(Visit, moLastRows.size() - 1, 0);
}

std::vector<double> GGLPolyRaster::GetScanline(int nRow) const
{
    std::vector<double> oCrossings;
    GetScanline(nRow, oCrossings);
    return oCrossings;
}

void GGLPolyRaster::GetScanline(int nRow, std::vector<double>& oCrossings) const
{
    oCrossings.clear();
    if (nRow > moExtent.lastRow)
        return;
    std::vector<const Edge*> oEdges;
    FindReaching(nRow, CountEdgesAbove(nRow + 1), oEdges);
    for (const Edge* poEdge : oEdges)
        oCrossings.push_back(poEdge->At(nRow));
    std::sort(oCrossings.begin(), oCrossings.end());
}
