#include "gobs/resampling/planereducer.h"

#include "gobs/mask/samplematch.h"
#include "gobs/raster/pixelvalue.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <optional>
#include <type_traits>

namespace krv::gobs
{

namespace
{

// Neighbouring source pixels that go to one target pixel.
struct Run
{
    unsigned int target;
    unsigned int first;
    unsigned int count;
};

// How the pixels of one axis, columns or rows, map to those of the quick look.
class Axis
{
public:
    Axis(unsigned int nSource, unsigned int nTarget, Resampling eMethod)
        : mnSource(nSource), mnTarget(nTarget), meMethod(eMethod)
    {
    }

    // The target pixel that a source pixel belongs to; the number of target pixels when it belongs to none.
    unsigned int TargetOf(unsigned int nPixel) const
    {
        const auto nTarget = static_cast<unsigned int>(((nPixel + 1ULL) * mnTarget - 1) / mnSource);
        const unsigned int nFirst = SourceStart(nTarget, mnSource, mnTarget);
        const bool bCounts = meMethod == Resampling::eAverage ||
                             nPixel == nFirst + (SourceStart(nTarget + 1, mnSource, mnTarget) - nFirst) / 2;
        return bCounts ? nTarget : mnTarget;
    }

    // How many source pixels count for a target pixel.
    unsigned int CountOf(unsigned int nTarget) const
    {
        return meMethod == Resampling::eNearest
                   ? 1
                   : SourceStart(nTarget + 1, mnSource, mnTarget) - SourceStart(nTarget, mnSource, mnTarget);
    }

    // The runs of source pixels [nFirst, nFirst + nCount) that go to one target pixel each.
    std::vector<Run> RunsOf(unsigned int nFirst, unsigned int nCount) const
    {
        std::vector<Run> oRuns;
        for (unsigned int i = 0; i < nCount; ++i)
        {
            const unsigned int nTarget = TargetOf(nFirst + i);
            if (!oRuns.empty() && oRuns.back().target == nTarget)
                ++oRuns.back().count;
            else if (nTarget < mnTarget)
                oRuns.push_back({nTarget, i, 1});
        }
        return oRuns;
    }

private:
    unsigned int mnSource;
    unsigned int mnTarget;
    Resampling meMethod;
};

struct Grid
{
    Axis columns;
    Axis rows;
};

// Sums one channel of rasters into its plane.
class PlaneBuilder
{
public:
    PlaneBuilder(unsigned int nWidth, unsigned int nHeight)
        : moSums(nWidth), moCounts(nWidth), moPlane{nWidth, nHeight, {}, {}}
    {
        moPlane.values.resize(static_cast<std::size_t>(nWidth) * nHeight);
        moPlane.coverage.resize(moPlane.values.size());
    }
    virtual ~PlaneBuilder() = default;

    // oColumns: the runs of the tile's columns.
    virtual void AddTile(const Raster& oTile, unsigned int nChannel, const std::vector<Run>& oColumns,
                         const Axis& oRows) = 0;

    // Means and shares of the target rows [nFirst, nEnd), which are complete.
    void Finish(unsigned int nFirst, unsigned int nEnd, const Grid& oGrid)
    {
        for (unsigned int y = nFirst; y < nEnd; ++y)
        {
            const std::size_t nFrom = static_cast<std::size_t>(y - mnFirstRow) * moPlane.width;
            const std::size_t nTo = static_cast<std::size_t>(y) * moPlane.width;
            for (unsigned int x = 0; x < moPlane.width && nFrom + x < moCounts.size(); ++x)
            {
                const double nCount = moCounts[nFrom + x];
                moPlane.values[nTo + x] = nCount > 0 ? static_cast<float>(moSums[nFrom + x] / nCount) : 0.0F;
                moPlane.coverage[nTo + x] =
                    static_cast<float>(nCount / (1.0 * oGrid.columns.CountOf(x) * oGrid.rows.CountOf(y)));
            }
        }
        const auto nGone = static_cast<std::ptrdiff_t>(
            std::min(static_cast<std::size_t>(nEnd - mnFirstRow) * moPlane.width, moCounts.size()));
        moSums.erase(moSums.begin(), moSums.begin() + nGone);
        moCounts.erase(moCounts.begin(), moCounts.begin() + nGone);
        mnFirstRow = nEnd;
    }

    Plane TakePlane() { return std::move(moPlane); }

protected:
    // Room for a target row in the sums.
    std::size_t RowStart(unsigned int nRow)
    {
        const std::size_t nStart = static_cast<std::size_t>(nRow - mnFirstRow) * moPlane.width;
        if (moSums.size() < nStart + moPlane.width)
        {
            moSums.resize(nStart + moPlane.width);
            moCounts.resize(nStart + moPlane.width);
        }
        return nStart;
    }

    std::vector<double> moSums; // target rows from mnFirstRow on
    std::vector<unsigned int> moCounts;
    Plane moPlane;
    unsigned int mnFirstRow = 0;
};

template <typename T>
class TypedBuilder : public PlaneBuilder
{
public:
    TypedBuilder(unsigned int nWidth, unsigned int nHeight, const std::optional<SampleValue>& oNoData, bool bComplex)
        : PlaneBuilder(nWidth, nHeight), moNoData(oNoData), mbComplex(bComplex)
    {
    }

    void AddTile(const Raster& oTile, unsigned int nChannel, const std::vector<Run>& oColumns,
                 const Axis& oRows) override
    {
        const unsigned int nParts = mbComplex ? 2 : 1, nStride = oTile.GetChansCount() * nParts;
        const T* pPixels = reinterpret_cast<const T*>(oTile.GetBuffer()) + nChannel * nParts;
        for (unsigned int r = 0; r < oTile.GetHeight(); ++r)
        {
            const unsigned int nRow = oRows.TargetOf(static_cast<unsigned int>(oTile.GetY()) + r);
            if (nRow < moPlane.height)
                AddRow(pPixels + static_cast<std::size_t>(r) * oTile.GetWidth() * nStride, nStride, oColumns,
                       RowStart(nRow));
        }
    }

private:
    void AddRow(const T* pPixels, unsigned int nStride, const std::vector<Run>& oColumns, std::size_t nRowStart)
    {
        for (const Run& oRun : oColumns)
        {
            const T* const pRun = pPixels + static_cast<std::size_t>(oRun.first) * nStride;
            unsigned int nValid = oRun.count;
            const double nSum = std::is_integral_v<T> && !mbComplex && !moNoData.IsSet()
                                    ? SumAll(pRun, nStride, oRun.count)
                                    : SumValid(pRun, nStride, nValid);
            moSums[nRowStart + oRun.target] += nSum;
            moCounts[nRowStart + oRun.target] += nValid;
        }
    }

    static double SumAll(const T* pRun, unsigned int nStride, unsigned int nCount)
    {
        using Sum = std::conditional_t<std::is_integral_v<T> && sizeof(T) <= 4, std::int64_t, double>;
        Sum nSum = 0;
        for (unsigned int i = 0; i < nCount; ++i)
            nSum += static_cast<Sum>(pRun[static_cast<std::size_t>(i) * nStride]);
        return static_cast<double>(nSum);
    }

    // nCount: pixels of the run; afterwards the valid ones among them.
    double SumValid(const T* pRun, unsigned int nStride, unsigned int& nCount) const
    {
        double nSum = 0;
        unsigned int nValid = 0;
        for (unsigned int i = 0; i < nCount; ++i)
        {
            double nValue = 0;
            const bool bValid = GetValid(pRun + static_cast<std::size_t>(i) * nStride, nValue);
            nSum += bValid ? nValue : 0.0;
            nValid += bValid ? 1 : 0;
        }
        nCount = nValid;
        return nSum;
    }

    bool GetValid(const T* pPixel, double& nValue) const
    {
        if (mbComplex)
        {
            nValue = std::hypot(static_cast<double>(pPixel[0]), static_cast<double>(pPixel[1]));
            return std::isfinite(nValue) && !moNoData.Matches(pPixel[0], pPixel[1]);
        }
        nValue = static_cast<double>(*pPixel);
        if constexpr (std::is_floating_point_v<T>)
            return std::isfinite(nValue) && !moNoData.Matches(*pPixel);
        else
            return !moNoData.Matches(*pPixel);
    }

    SampleMatch<T> moNoData;
    bool mbComplex;
};

std::unique_ptr<PlaneBuilder> MakeBuilder(const DataType& oType, unsigned int nWidth, unsigned int nHeight,
                                          const std::optional<SampleValue>& oNoData)
{
    return VisitPartType(oType,
                         [&]<class Part>(std::type_identity<Part>) -> std::unique_ptr<PlaneBuilder>
                         { return std::make_unique<TypedBuilder<Part>>(nWidth, nHeight, oNoData, oType.IsComplex()); });
}

} // namespace

class PlaneReducer::Implementation
{
public:
    Implementation(const DataType& oType, unsigned int nSourceWidth, unsigned int nSourceHeight, unsigned int nWidth,
                   unsigned int nHeight, const NoDataNumbers& oNumbers, Resampling eMethod)
        : mnSourceWidth(nSourceWidth), mnSourceHeight(nSourceHeight),
          mnHeight(nHeight), moGrid{{nSourceWidth, nWidth, eMethod}, {nSourceHeight, nHeight, eMethod}}
    {
        if (eMethod != Resampling::eAverage && eMethod != Resampling::eNearest)
            throw krv::ParameterException("Planes are reduced by AVERAGE or NEAREST",
                                          krv::ParameterException::eInvalidValue, "eMethod");
        for (const std::optional<SampleValue>& oValue : oNumbers)
            moBuilders.push_back(MakeBuilder(oType, nWidth, nHeight, oValue));
    }

    void Add(const Raster& oTile)
    {
        const auto oColumns = moGrid.columns.RunsOf(static_cast<unsigned int>(oTile.GetX()), oTile.GetWidth());
        for (unsigned int c = 0; c < moBuilders.size(); ++c)
            moBuilders[c]->AddTile(oTile, c, oColumns, moGrid.rows);
        if (static_cast<unsigned int>(oTile.GetX()) + oTile.GetWidth() < mnSourceWidth)
            return;
        const unsigned int nEnd = static_cast<unsigned int>(oTile.GetY()) + oTile.GetHeight();
        unsigned int nReady = mnFinished;
        while (nReady < mnHeight && SourceStart(nReady + 1, mnSourceHeight, mnHeight) <= nEnd)
            ++nReady;
        for (const auto& poBuilder : moBuilders)
            poBuilder->Finish(mnFinished, nReady, moGrid);
        mnFinished = nReady;
    }

    std::vector<Plane> TakePlanes()
    {
        std::vector<Plane> oPlanes;
        oPlanes.reserve(moBuilders.size());
        for (const auto& poBuilder : moBuilders)
            oPlanes.push_back(poBuilder->TakePlane());
        return oPlanes;
    }

private:
    unsigned int mnSourceWidth;
    unsigned int mnSourceHeight;
    unsigned int mnHeight;
    Grid moGrid;
    std::vector<std::unique_ptr<PlaneBuilder>> moBuilders;
    unsigned int mnFinished = 0; // rows of the planes
};

PlaneReducer::PlaneReducer(const DataType& oType, unsigned int nSourceWidth, unsigned int nSourceHeight,
                           unsigned int nWidth, unsigned int nHeight, const NoDataNumbers& oNumbers, Resampling eMethod)
    : mpoImplementation(
          std::make_unique<Implementation>(oType, nSourceWidth, nSourceHeight, nWidth, nHeight, oNumbers, eMethod))
{
}

PlaneReducer::~PlaneReducer() = default;

void PlaneReducer::Add(const Raster& oTile)
{
    mpoImplementation->Add(oTile);
}

std::vector<Plane> PlaneReducer::TakePlanes()
{
    return mpoImplementation->TakePlanes();
}

} // namespace krv::gobs
