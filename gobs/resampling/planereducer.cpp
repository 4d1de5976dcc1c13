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

// The target pixels that a tile's pixels go to.
struct Region
{
    unsigned int left = 0;
    unsigned int top = 0;
    unsigned int width = 0;
    unsigned int height = 0;
};

// One channel of them.
struct ChannelSums
{
    std::vector<double> sums;
    std::vector<unsigned int> counts; // of valid source pixels
};

// Sums one channel of a tile.
class ChannelReducer
{
public:
    virtual ~ChannelReducer() = default;

    // oColumns: the runs of the tile's columns.
    virtual ChannelSums Sum(const Raster& oTile, unsigned int nChannel, const std::vector<Run>& oColumns,
                            const Axis& oRows, const Region& oRegion) const = 0;
};

template <typename T>
class TypedReducer : public ChannelReducer
{
public:
    TypedReducer(const std::optional<SampleValue>& oNoData, bool bComplex) : moNoData(oNoData), mbComplex(bComplex) {}

    ChannelSums Sum(const Raster& oTile, unsigned int nChannel, const std::vector<Run>& oColumns, const Axis& oRows,
                    const Region& oRegion) const override
    {
        ChannelSums oSums;
        oSums.sums.resize(std::size_t{oRegion.width} * oRegion.height);
        oSums.counts.resize(oSums.sums.size());
        const unsigned int nParts = mbComplex ? 2 : 1, nStride = oTile.GetChansCount() * nParts;
        const T* pPixels = reinterpret_cast<const T*>(oTile.GetBuffer()) + nChannel * nParts;
        for (unsigned int r = 0; r < oTile.GetHeight(); ++r)
        {
            const unsigned int nRow = oRows.TargetOf(static_cast<unsigned int>(oTile.GetY()) + r);
            if (nRow - oRegion.top < oRegion.height)
                AddRow(pPixels + static_cast<std::size_t>(r) * oTile.GetWidth() * nStride, nStride, oColumns,
                       std::size_t{nRow - oRegion.top} * oRegion.width, oRegion.left, oSums);
        }
        return oSums;
    }

private:
    void AddRow(const T* pPixels, unsigned int nStride, const std::vector<Run>& oColumns, std::size_t nRowStart,
                unsigned int nLeft, ChannelSums& oSums) const
    {
        for (const Run& oRun : oColumns)
        {
            const T* const pRun = pPixels + static_cast<std::size_t>(oRun.first) * nStride;
            unsigned int nValid = oRun.count;
            const double nSum = std::is_integral_v<T> && !mbComplex && !moNoData.IsSet()
                                    ? SumAll(pRun, nStride, oRun.count)
                                    : SumValid(pRun, nStride, nValid);
            oSums.sums[nRowStart + (oRun.target - nLeft)] += nSum;
            oSums.counts[nRowStart + (oRun.target - nLeft)] += nValid;
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

std::unique_ptr<ChannelReducer> MakeReducer(const DataType& oType, const std::optional<SampleValue>& oNoData)
{
    return VisitPartType(oType,
                         [&]<class Part>(std::type_identity<Part>) -> std::unique_ptr<ChannelReducer>
                         { return std::make_unique<TypedReducer<Part>>(oNoData, oType.IsComplex()); });
}

// Adds the sums of one channel to its plane.
class PlaneBuilder
{
public:
    PlaneBuilder(unsigned int nWidth, unsigned int nHeight) : moPlane{nWidth, nHeight, {}, {}}
    {
        moPlane.values.resize(static_cast<std::size_t>(nWidth) * nHeight);
        moPlane.coverage.resize(moPlane.values.size());
    }

    void Add(const ChannelSums& oSums, const Region& oRegion)
    {
        for (unsigned int r = 0; r < oRegion.height; ++r)
        {
            const std::size_t nTo = RowStart(oRegion.top + r) + oRegion.left, nFrom = std::size_t{r} * oRegion.width;
            for (unsigned int x = 0; x < oRegion.width; ++x)
            {
                moSums[nTo + x] += oSums.sums[nFrom + x];
                moCounts[nTo + x] += oSums.counts[nFrom + x];
            }
        }
    }

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

private:
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

} // namespace

struct PlaneReducer::Sums
{
    Region region;
    std::vector<ChannelSums> channels;
    unsigned int right; // of the tile in the image, and its bottom
    unsigned int bottom;
};

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
        {
            moReducers.push_back(MakeReducer(oType, oValue));
            moBuilders.emplace_back(nWidth, nHeight);
        }
    }

    std::shared_ptr<const Sums> Sum(const Raster& oTile) const
    {
        const auto oColumns = moGrid.columns.RunsOf(static_cast<unsigned int>(oTile.GetX()), oTile.GetWidth());
        const auto oRows = moGrid.rows.RunsOf(static_cast<unsigned int>(oTile.GetY()), oTile.GetHeight());
        const auto poSums = std::make_shared<Sums>();
        poSums->right = static_cast<unsigned int>(oTile.GetX()) + oTile.GetWidth();
        poSums->bottom = static_cast<unsigned int>(oTile.GetY()) + oTile.GetHeight();
        if (oColumns.empty() || oRows.empty())
            return poSums;
        poSums->region = {oColumns.front().target, oRows.front().target,
                          oColumns.back().target - oColumns.front().target + 1,
                          oRows.back().target - oRows.front().target + 1};
        for (unsigned int c = 0; c < moReducers.size(); ++c)
            poSums->channels.push_back(moReducers[c]->Sum(oTile, c, oColumns, moGrid.rows, poSums->region));
        return poSums;
    }

    void Add(const Sums& oSums)
    {
        for (std::size_t c = 0; c < oSums.channels.size(); ++c)
            moBuilders[c].Add(oSums.channels[c], oSums.region);
        if (oSums.right < mnSourceWidth)
            return;
        unsigned int nReady = mnFinished;
        while (nReady < mnHeight && SourceStart(nReady + 1, mnSourceHeight, mnHeight) <= oSums.bottom)
            ++nReady;
        for (PlaneBuilder& oBuilder : moBuilders)
            oBuilder.Finish(mnFinished, nReady, moGrid);
        mnFinished = nReady;
    }

    std::vector<Plane> TakePlanes()
    {
        std::vector<Plane> oPlanes;
        oPlanes.reserve(moBuilders.size());
        for (PlaneBuilder& oBuilder : moBuilders)
            oPlanes.push_back(oBuilder.TakePlane());
        return oPlanes;
    }

private:
    unsigned int mnSourceWidth;
    unsigned int mnSourceHeight;
    unsigned int mnHeight;
    Grid moGrid;
    std::vector<std::unique_ptr<const ChannelReducer>> moReducers; // one per channel
    std::vector<PlaneBuilder> moBuilders;
    unsigned int mnFinished = 0; // rows of the planes
};

PlaneReducer::PlaneReducer(const DataType& oType, unsigned int nSourceWidth, unsigned int nSourceHeight,
                           unsigned int nWidth, unsigned int nHeight, const NoDataNumbers& oNumbers, Resampling eMethod)
    : mpoImplementation(
          std::make_unique<Implementation>(oType, nSourceWidth, nSourceHeight, nWidth, nHeight, oNumbers, eMethod))
{
}

PlaneReducer::~PlaneReducer() = default;

std::shared_ptr<const PlaneReducer::Sums> PlaneReducer::Sum(const Raster& oTile) const
{
    return mpoImplementation->Sum(oTile);
}

void PlaneReducer::Add(const Sums& oSums)
{
    mpoImplementation->Add(oSums);
}

std::vector<Plane> PlaneReducer::TakePlanes()
{
    return mpoImplementation->TakePlanes();
}

} // namespace krv::gobs
