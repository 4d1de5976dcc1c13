#include "gobs/resampling/gridrows.h"

#include "gobs/raster/pixelvalue.h"
#include "gobs/resampling/detail/interpolationtaps.h"
#include "gobs/resampling/detail/plainkernels.h"
#include "gobs/resampling/detail/samplemath.h"

#include <algorithm>
#include <cstring>
#include <limits>
#include <type_traits>
#include <vector>

namespace krv::gobs
{

namespace
{

using detail::Taps;

// Kernels whose taps are too many for their sums in 32R, and boxes too large for those in whole numbers, go the other
// way.
constexpr long long MOST_TAPS = 4096;

class AxisPlan
{
public:
    // nAside: the step of a box along the other axis.
    AxisPlan(const InterpolationRule& oRule, double nStretch, double nStep, double nAside)
        : meMethod(oRule.meMethod), mnStretch(nStretch), mnStep(nStep), mnAside(nAside)
    {
    }

    // Adds a place. False when it cannot be made of taps here.
    bool Add(double nPlace)
    {
        Taps oTaps;
        oTaps.mnWeights = moWeights.size();
        const bool bNear = std::fabs(nPlace) < 1e15;
        const bool bMade = bNear && (meMethod == Resampling::eAverage ? FindBox(nPlace, oTaps) : Weigh(nPlace, oTaps));
        if (!bMade)
            oTaps.mnEnd = oTaps.mnFirst;
        moTaps.push_back(oTaps);
        return bMade;
    }
    void Clear()
    {
        moTaps.clear();
        moWeights.clear();
    }
    const Taps& operator[](std::size_t n) const { return moTaps[n]; }
    const float* GetWeights() const { return moWeights.data(); }

private:
    bool Weigh(double nPlace, Taps& oTaps)
    {
        const detail::TapRange oRange(meMethod, nPlace, mnStretch);
        oTaps.mnFirst = oRange.mnFirst;
        oTaps.mnEnd = oRange.mnEnd;
        if (oTaps.mnEnd - oTaps.mnFirst > MOST_TAPS)
            return false;
        moScratch.clear();
        double nTotal = 0;
        for (long long n = oTaps.mnFirst; n < oTaps.mnEnd; ++n)
        {
            moScratch.push_back(detail::KernelAt(meMethod, (static_cast<double>(n) + 0.5 - nPlace) / mnStretch));
            nTotal += moScratch.back();
        }
        for (const double nWeight : moScratch)
            moWeights.push_back(static_cast<float>(nWeight / nTotal));
        return !moScratch.empty();
    }

    // The pixels whose centres lie in the box, rounded as the interpolator does it.
    bool FindBox(double nPlace, Taps& oTaps) const
    {
        const auto IsWithin = [&](long long n)
        {
            return detail::IsInFootprint(mnAside * (static_cast<double>(n) + 0.5 - nPlace) / (mnStep * mnAside));
        };
        const double nHalf = std::fabs(mnStep) / 2;
        if (nHalf > static_cast<double>(MOST_TAPS) / 2)
            return false;
        oTaps.mnFirst = static_cast<long long>(std::floor(nPlace - nHalf - 1));
        oTaps.mnEnd = static_cast<long long>(std::ceil(nPlace + nHalf + 1));
        while (oTaps.mnFirst < oTaps.mnEnd && !IsWithin(oTaps.mnFirst))
            ++oTaps.mnFirst;
        while (oTaps.mnEnd > oTaps.mnFirst && !IsWithin(oTaps.mnEnd - 1))
            --oTaps.mnEnd;
        return oTaps.mnFirst < oTaps.mnEnd;
    }

    Resampling meMethod;
    double mnStretch;
    double mnStep; // of a box
    double mnAside;
    std::vector<Taps> moTaps;
    std::vector<float> moWeights;
    std::vector<double> moScratch;
};

// What all ways have in common: which pixels of a row lie at the border or beside something that is not valid, and are
// the interpolator's.
class GridRows : public IGridRows
{
public:
    GridRows(const IInterpolator& oInterpolator, unsigned int nChannels, std::size_t nPixelBytes, const double* pX,
             std::size_t nCount)
        : moInterpolator(oInterpolator), mnChannels(nChannels), mnPixelBytes(nPixelBytes), moX(pX, pX + nCount),
          moY(nCount), moPlain(nCount)
    {
    }

    bool Run(const InterpolationWindow& oWindow, double nY, unsigned char* pPixels, unsigned char* pValid) override
    {
        std::fill(moY.begin(), moY.end(), nY);
        if (!Prepare(oWindow, nY, moPlain))
            return moInterpolator.Run(oWindow, moX.data(), moY.data(), moX.size(), pPixels, pValid);
        bool bAll = true, bMarked = false;
        for (std::size_t n = 0; n < moX.size();)
        {
            std::size_t nEnd = n;
            while (nEnd < moX.size() && moPlain[nEnd] == moPlain[n])
                ++nEnd;
            if (moPlain[n] != 0)
                Make(oWindow, n, nEnd, pPixels + n * mnPixelBytes);
            else
            {
                if (!bMarked)
                    std::memset(pValid, 1, moX.size() * mnChannels);
                bMarked = true;
                bAll = moInterpolator.Run(oWindow, &moX[n], &moY[n], nEnd - n, pPixels + n * mnPixelBytes,
                                          pValid + n * mnChannels) &&
                       bAll;
            }
            n = nEnd;
        }
        return bAll;
    }

protected:
    std::size_t GetCount() const { return moX.size(); }
    double GetX(std::size_t n) const { return moX[n]; }

    // Says which pixels of the row Make makes; false when none.
    virtual bool Prepare(const InterpolationWindow& oWindow, double nY, std::vector<unsigned char>& oPlain) = 0;
    virtual void Make(const InterpolationWindow& oWindow, std::size_t nBegin, std::size_t nEnd,
                      unsigned char* pPixels) = 0;

    // For each column of the window how many before it have something that is not valid in the rows; empty when none.
    void CountInvalid(const InterpolationWindow& oWindow, const Taps& oRows)
    {
        moInvalid.clear();
        if (oWindow.mpValid == nullptr)
            return;
        const std::size_t nRowBytes = oWindow.mnWidth * mnChannels;
        const unsigned char* p = oWindow.mpValid + static_cast<std::size_t>(oRows.mnFirst - oWindow.mnY) * nRowBytes;
        moAll.assign(p, p + nRowBytes);
        for (long long nRow = oRows.mnFirst + 1; nRow < oRows.mnEnd; ++nRow)
        {
            p += nRowBytes;
            for (std::size_t n = 0; n < nRowBytes; ++n)
                moAll[n] &= p[n];
        }
        if (std::memchr(moAll.data(), 0, nRowBytes) == nullptr)
            return;
        moInvalid.assign(oWindow.mnWidth + 1, 0);
        for (std::size_t n = 0; n < oWindow.mnWidth; ++n)
            moInvalid[n + 1] = moInvalid[n] + (std::memchr(&moAll[n * mnChannels], 0, mnChannels) != nullptr ? 1u : 0u);
    }
    bool IsPlain(const InterpolationWindow& oWindow, const Taps& oTaps) const
    {
        if (oTaps.mnFirst >= oTaps.mnEnd || oTaps.mnFirst < oWindow.mnX ||
            oTaps.mnEnd > oWindow.mnX + static_cast<long long>(oWindow.mnWidth))
            return false;
        return moInvalid.empty() || moInvalid[static_cast<std::size_t>(oTaps.mnEnd - oWindow.mnX)] ==
                                        moInvalid[static_cast<std::size_t>(oTaps.mnFirst - oWindow.mnX)];
    }
    static bool HasRows(const InterpolationWindow& oWindow, const Taps& oRows)
    {
        return oRows.mnFirst < oRows.mnEnd && oRows.mnFirst >= oWindow.mnY &&
               oRows.mnEnd <= oWindow.mnY + static_cast<long long>(oWindow.mnHeight);
    }

private:
    const IInterpolator& moInterpolator;
    unsigned int mnChannels;
    std::size_t mnPixelBytes;
    std::vector<double> moX;
    std::vector<double> moY;
    std::vector<unsigned char> moPlain;
    std::vector<unsigned char> moAll;
    std::vector<std::uint32_t> moInvalid;
};

// Single pixels: neighbours are copied together.
class NearestRows : public GridRows
{
public:
    NearestRows(const IInterpolator& oInterpolator, unsigned int nChannels, std::size_t nPixelBytes, const double* pX,
                std::size_t nCount)
        : GridRows(oInterpolator, nChannels, nPixelBytes, pX, nCount), mnPixelBytes(nPixelBytes)
    {
        for (std::size_t n = 0; n < nCount; ++n)
            moColumns.push_back(PixelAt(pX[n]));
        mbAside = true;
        for (std::size_t n = 1; n < nCount; ++n)
            mbAside = mbAside && moColumns[n].mnFirst == moColumns[n - 1].mnFirst + 1;
    }

private:
    static Taps PixelAt(double nPlace)
    {
        if (!(std::fabs(nPlace) < 1e15))
            return {};
        const auto nPixel = static_cast<long long>(std::floor(nPlace));
        return {nPixel, nPixel + 1, 0};
    }

    bool Prepare(const InterpolationWindow& oWindow, double nY, std::vector<unsigned char>& oPlain) override
    {
        moRow = PixelAt(nY);
        if (!HasRows(oWindow, moRow))
            return false;
        CountInvalid(oWindow, moRow);
        for (std::size_t n = 0; n < oPlain.size(); ++n)
            oPlain[n] = IsPlain(oWindow, moColumns[n]) ? 1 : 0;
        return true;
    }

    void Make(const InterpolationWindow& oWindow, std::size_t nBegin, std::size_t nEnd, unsigned char* pPixels) override
    {
        const unsigned char* const pRow =
            oWindow.mpPixels + static_cast<std::size_t>(moRow.mnFirst - oWindow.mnY) * oWindow.mnWidth * mnPixelBytes;
        const auto At = [&](std::size_t n)
        {
            return static_cast<std::size_t>(moColumns[n].mnFirst - oWindow.mnX);
        };
        if (mbAside)
            std::memcpy(pPixels, pRow + At(nBegin) * mnPixelBytes, (nEnd - nBegin) * mnPixelBytes);
        else if (mnPixelBytes == 1)
            Take<1>(pRow, At, nBegin, nEnd, pPixels);
        else if (mnPixelBytes == 2)
            Take<2>(pRow, At, nBegin, nEnd, pPixels);
        else if (mnPixelBytes == 3)
            Take<3>(pRow, At, nBegin, nEnd, pPixels);
        else if (mnPixelBytes == 4)
            Take<4>(pRow, At, nBegin, nEnd, pPixels);
        else if (mnPixelBytes == 8)
            Take<8>(pRow, At, nBegin, nEnd, pPixels);
        else
            Take<0>(pRow, At, nBegin, nEnd, pPixels);
    }

    template <std::size_t BYTES, class At>
    void Take(const unsigned char* pRow, const At& oAt, std::size_t nBegin, std::size_t nEnd,
              unsigned char* pPixels) const
    {
        const std::size_t nBytes = BYTES != 0 ? BYTES : mnPixelBytes;
        for (std::size_t n = nBegin; n < nEnd; ++n, pPixels += nBytes)
            std::memcpy(pPixels, pRow + oAt(n) * nBytes, nBytes);
    }

    std::size_t mnPixelBytes;
    bool mbAside; // every pixel is the right neighbour of the one before
    std::vector<Taps> moColumns;
    Taps moRow;
};

// Sums over taps: along the columns first, for all samples of the row that are needed, and then along the row.
class SumRows : public GridRows
{
public:
    SumRows(const IInterpolator& oInterpolator, unsigned int nChannels, std::size_t nSamples, std::size_t nSampleBytes,
            const InterpolationRule& oRule, const double* pX, std::size_t nCount)
        : GridRows(oInterpolator, nChannels, nSamples * nSampleBytes, pX, nCount), mnSampleBytes(nSampleBytes),
          moColumns(oRule, oRule.mnXStretch, oRule.moFootprint[0], oRule.moFootprint[3]),
          moRows(oRule, oRule.mnYStretch, oRule.moFootprint[3], oRule.moFootprint[0])
    {
        moJob.mnSamples = nSamples;
        for (std::size_t n = 0; n < nCount; ++n)
            moColumns.Add(pX[n]);
        moJob.mpWeights = moColumns.GetWeights();
    }

protected:
    // Fills in the rows; the job says which samples.
    virtual void Add(detail::RowJob& oJob) = 0;
    virtual void MakePixels(const detail::RowJob& oJob) = 0;

private:
    bool Prepare(const InterpolationWindow& oWindow, double nY, std::vector<unsigned char>& oPlain) override
    {
        moRows.Clear();
        if (!moRows.Add(nY) || !HasRows(oWindow, moRows[0]))
            return false;
        const Taps& oRows = moRows[0];
        CountInvalid(oWindow, oRows);
        long long nFirst = std::numeric_limits<long long>::max(), nEnd = 0;
        for (std::size_t n = 0; n < oPlain.size(); ++n)
        {
            oPlain[n] = IsPlain(oWindow, moColumns[n]) ? 1 : 0;
            nFirst = oPlain[n] != 0 ? std::min(nFirst, moColumns[n].mnFirst) : nFirst;
            nEnd = oPlain[n] != 0 ? std::max(nEnd, moColumns[n].mnEnd) : nEnd;
        }
        if (nFirst >= nEnd)
            return false;
        moJob.mnFirst = nFirst;
        moJob.mnSums = static_cast<std::size_t>(nEnd - nFirst) * moJob.mnSamples;
        moJob.mnRowSamples = oWindow.mnWidth * moJob.mnSamples;
        moJob.mnRows = static_cast<std::size_t>(oRows.mnEnd - oRows.mnFirst);
        moJob.mpRowWeights = moRows.GetWeights();
        moJob.mpPixels =
            oWindow.mpPixels + (static_cast<std::size_t>(oRows.mnFirst - oWindow.mnY) * moJob.mnRowSamples +
                                static_cast<std::size_t>(nFirst - oWindow.mnX) * moJob.mnSamples) *
                                   mnSampleBytes;
        Add(moJob);
        return true;
    }

    void Make(const InterpolationWindow&, std::size_t nBegin, std::size_t nEnd, unsigned char* pPixels) override
    {
        moJob.mpTaps = &moColumns[nBegin];
        moJob.mnCount = nEnd - nBegin;
        moJob.mpResult = pPixels;
        MakePixels(moJob);
    }

    std::size_t mnSampleBytes;
    AxisPlan moColumns;
    AxisPlan moRows; // of the row that is made
    detail::RowJob moJob;
};

class KernelRows : public SumRows
{
public:
    KernelRows(const detail::RowLoops& oLoops, const IInterpolator& oInterpolator, unsigned int nChannels,
               std::size_t nSamples, std::size_t nSampleBytes, const InterpolationRule& oRule, const double* pX,
               std::size_t nCount)
        : SumRows(oInterpolator, nChannels, nSamples, nSampleBytes, oRule, pX, nCount), moLoops(oLoops),
          mbClamp(oRule.mbClamp && oRule.meMethod != Resampling::eBilinear)
    {
    }

private:
    void Add(detail::RowJob& oJob) override
    {
        const std::size_t nSums = oJob.mnSums + detail::SUM_PADDING;
        moSums.resize(std::max(moSums.size(), nSums * (mbClamp ? 3 : 1)));
        oJob.mpSums = moSums.data();
        oJob.mpLowest = mbClamp ? oJob.mpSums + nSums : nullptr;
        oJob.mpHighest = mbClamp ? oJob.mpLowest + nSums : nullptr;
        moLoops.mpAddRows(oJob);
    }
    void MakePixels(const detail::RowJob& oJob) override { moLoops.mpMakePixels(oJob); }

    detail::RowLoops moLoops;
    bool mbClamp;
    std::vector<float> moSums;
};

template <class T>
class BoxRows : public SumRows
{
public:
    using SumRows::SumRows;

private:
    // Whole numbers of two bytes at most.
    using BoxSum = std::conditional_t<std::is_floating_point_v<T>, double, std::int32_t>;

    void Add(detail::RowJob& oJob) override
    {
        moBoxes.assign(oJob.mnSums, 0);
        BoxSum* const pSums = moBoxes.data();
        const T* p = reinterpret_cast<const T*>(oJob.mpPixels);
        for (std::size_t nRow = 0; nRow < oJob.mnRows; ++nRow, p += oJob.mnRowSamples)
            for (std::size_t n = 0; n < oJob.mnSums; ++n)
                pSums[n] += p[n];
    }

    void MakePixels(const detail::RowJob& oJob) override
    {
        const std::size_t nSamples = oJob.mnSamples;
        T* pResult = reinterpret_cast<T*>(oJob.mpResult);
        for (std::size_t n = 0; n < oJob.mnCount; ++n)
        {
            const auto nTaps = static_cast<std::size_t>(oJob.mpTaps[n].mnEnd - oJob.mpTaps[n].mnFirst);
            const BoxSum* p =
                moBoxes.data() + static_cast<std::size_t>(oJob.mpTaps[n].mnFirst - oJob.mnFirst) * nSamples;
            for (std::size_t c = 0; c < nSamples; ++c, ++p)
            {
                detail::SumOf<T> nSum = 0;
                for (std::size_t k = 0; k < nTaps; ++k)
                    nSum += p[k * nSamples];
                *pResult++ = detail::MeanOf<T>(nSum, oJob.mnRows * nTaps);
            }
        }
    }

    std::vector<BoxSum> moBoxes;
};

} // namespace

IGridRows::~IGridRows() = default;

std::unique_ptr<IGridRows> MakeGridRows(const DataType& oType, unsigned int nChannels, const InterpolationRule& oRule,
                                        const IInterpolator& oInterpolator, const double* pX, std::size_t nCount)
{
    if (oRule.meMethod == Resampling::eNearest)
        return std::make_unique<NearestRows>(oInterpolator, nChannels, oType.GetValueBits() / 8 * nChannels, pX,
                                             nCount);
    if (oRule.meMethod == Resampling::eMode || oRule.moFootprint[1] != 0 || oRule.moFootprint[2] != 0)
        return nullptr;
    const auto Make = [&]<class Value>(std::type_identity<Value>) -> std::unique_ptr<IGridRows>
    {
        using T = PartOf<Value>;
        const std::size_t nSamples = std::size_t{nChannels} * PARTS_OF<Value>;
        const detail::RowLoops oLoops = detail::FindRowLoops(PIXEL_TYPE_OF<T>);
        if (oRule.meMethod != Resampling::eAverage && oLoops.mpAddRows != nullptr)
            return std::make_unique<KernelRows>(oLoops, oInterpolator, nChannels, nSamples, sizeof(T), oRule, pX,
                                                nCount);
        if constexpr (sizeof(T) <= 2 || std::is_same_v<T, float>)
        {
            if (oRule.meMethod == Resampling::eAverage)
                return std::make_unique<BoxRows<T>>(oInterpolator, nChannels, nSamples, sizeof(T), oRule, pX, nCount);
        }
        return nullptr;
    };
    return VisitPixelType(oType, Make);
}

} // namespace krv::gobs
