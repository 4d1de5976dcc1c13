#include "gobs/resampling/interpolator.h"

#include "gobs/raster/pixelvalue.h"
#include "gobs/resampling/detail/interpolationtaps.h"
#include "gobs/resampling/detail/modeof.h"
#include "gobs/resampling/detail/plainkernels.h"
#include "gobs/resampling/detail/samplemath.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/convertvalue.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <limits>
#include <type_traits>
#include <vector>

namespace krv::gobs
{

namespace
{

using detail::TapRange;

bool IsKernel(Resampling eMethod)
{
    return eMethod == Resampling::eBilinear || eMethod == Resampling::eCubic || eMethod == Resampling::eLanczos;
}

bool IsFootprint(Resampling eMethod)
{
    return eMethod == Resampling::eAverage || eMethod == Resampling::eMode;
}

void CheckRule(const InterpolationRule& oRule)
{
    const auto IsStretch = [](double n)
    {
        return std::isfinite(n) && n >= 1;
    };
    if (oRule.meMethod != Resampling::eNearest && !IsKernel(oRule.meMethod) && !IsFootprint(oRule.meMethod))
        throw krv::ParameterException("No interpolation goes by " + GetResamplingName(oRule.meMethod),
                                      krv::ParameterException::eInvalidValue, "oRule");
    if (!IsStretch(oRule.mnXStretch) || !IsStretch(oRule.mnYStretch) ||
        !std::all_of(oRule.moFootprint.begin(), oRule.moFootprint.end(), [](double n) { return std::isfinite(n); }))
        throw krv::ParameterException("Kernels are stretched by numbers from 1 on, and footprints are finite",
                                      krv::ParameterException::eInvalidValue, "oRule");
}

// Everything with values of which each part is a T, P of them.
template <class T, unsigned int P>
class Interpolator : public IInterpolator
{
public:
    Interpolator(unsigned int nChannels, const InterpolationRule& oRule)
        : mnChannels(nChannels), mnSamples(std::size_t{nChannels} * P), moRule(oRule), moReach(GetReach(oRule)),
          mpPlainLoop(FindLoop(mnSamples, oRule))
    {
    }

    bool Run(const InterpolationWindow& oWindow, const double* pX, const double* pY, std::size_t nCount,
             unsigned char* pPixels, unsigned char* pValid) const override
    {
        if (IsKernel(moRule.meMethod))
            return RunKernel(oWindow, pX, pY, nCount, pPixels, pValid);
        bool bAll = true, bMarked = false;
        for (std::size_t n = 0; n < nCount; ++n)
        {
            if (moRule.meMethod == Resampling::eNearest && oWindow.mpValid == nullptr)
                n += TakePlain(oWindow, pX + n, pY + n, nCount - n, pPixels + n * GetPixelBytes());
            if (n == nCount)
                break;
            if (!bMarked)
                std::memset(pValid, 1, nCount * mnChannels);
            bMarked = true;
            bAll = MakePixel(oWindow, pX[n], pY[n], pPixels + n * GetPixelBytes(), pValid + n * mnChannels) && bAll;
        }
        return bAll;
    }

private:
    using Real = detail::RealOf<T>;

    static detail::PlainLoop FindLoop(std::size_t nSamples, const InterpolationRule& oRule)
    {
        const bool bStretched = oRule.mnXStretch > 1 || oRule.mnYStretch > 1;
        return bStretched ? nullptr : detail::FindPlainLoop(oRule.meMethod, PIXEL_TYPE_OF<T>, nSamples);
    }

    std::size_t GetPixelBytes() const { return mnSamples * sizeof(T); }

    // The pixel of the window that has the number, without the bounds checked.
    const T* PixelAt(const InterpolationWindow& oWindow, long long nX, long long nY) const
    {
        return reinterpret_cast<const T*>(oWindow.mpPixels) + IndexOf(oWindow, nX, nY) * mnSamples;
    }
    static std::size_t IndexOf(const InterpolationWindow& oWindow, long long nX, long long nY)
    {
        return static_cast<std::size_t>(nY - oWindow.mnY) * oWindow.mnWidth +
               static_cast<std::size_t>(nX - oWindow.mnX);
    }
    bool IsValid(const InterpolationWindow& oWindow, std::size_t nPixel, unsigned int nChannel) const
    {
        return oWindow.mpValid == nullptr || oWindow.mpValid[nPixel * mnChannels + nChannel] != 0;
    }

    // Whether a place is so near to the window that a number of a pixel can be made of it.
    bool IsNear(const InterpolationWindow& oWindow, double nX, double nY) const
    {
        const auto nLeft = static_cast<double>(oWindow.mnX), nTop = static_cast<double>(oWindow.mnY);
        return nX >= nLeft - moReach[0] - 1 && nX <= nLeft + static_cast<double>(oWindow.mnWidth) + moReach[0] + 1 &&
               nY >= nTop - moReach[1] - 1 && nY <= nTop + static_cast<double>(oWindow.mnHeight) + moReach[1] + 1;
    }

    bool RunKernel(const InterpolationWindow& oWindow, const double* pX, const double* pY, std::size_t nCount,
                   unsigned char* pPixels, unsigned char* pValid) const
    {
        bool bAll = true, bMarked = false;
        for (std::size_t n = 0; n < nCount;)
        {
            std::size_t nEnd = n;
            while (mpPlainLoop != nullptr && nEnd < nCount && IsPlain(oWindow, pX[nEnd], pY[nEnd]))
                ++nEnd;
            if (nEnd > n)
                mpPlainLoop({oWindow.mpPixels, oWindow.mnWidth * mnSamples, static_cast<double>(oWindow.mnX) + 0.5,
                             static_cast<double>(oWindow.mnY) + 0.5, pX + n, pY + n, nEnd - n,
                             pPixels + n * GetPixelBytes(), moRule.mbClamp});
            n = nEnd;
            if (n == nCount)
                break;
            if (!bMarked)
                std::memset(pValid, 1, nCount * mnChannels);
            bMarked = true;
            bAll = MakePixel(oWindow, pX[n], pY[n], pPixels + n * GetPixelBytes(), pValid + n * mnChannels) && bAll;
            ++n;
        }
        return bAll;
    }

    // Whether all pixels around a place are at hand and valid.
    bool IsPlain(const InterpolationWindow& oWindow, double nX, double nY) const
    {
        const double nRadius = moReach[0];
        const double nColumn = nX - static_cast<double>(oWindow.mnX) - 0.5,
                     nRow = nY - static_cast<double>(oWindow.mnY) - 0.5;
        if (!(nColumn >= nRadius - 1 && nColumn < static_cast<double>(oWindow.mnWidth) - nRadius &&
              nRow >= nRadius - 1 && nRow < static_cast<double>(oWindow.mnHeight) - nRadius))
            return false;
        if (oWindow.mpValid == nullptr)
            return true;
        const auto nTaps = static_cast<std::size_t>(2 * nRadius);
        const std::size_t nLeft = static_cast<std::size_t>(nColumn) + 1 - nTaps / 2;
        const std::size_t nTop = static_cast<std::size_t>(nRow) + 1 - nTaps / 2;
        for (std::size_t y = 0; y < nTaps; ++y)
        {
            const unsigned char* const p = oWindow.mpValid + ((nTop + y) * oWindow.mnWidth + nLeft) * mnChannels;
            if (std::memchr(p, 0, nTaps * mnChannels) != nullptr)
                return false;
        }
        return true;
    }

    // One pixel in any case; true when all of its values are valid.
    bool MakePixel(const InterpolationWindow& oWindow, double nX, double nY, unsigned char* pPixel,
                   unsigned char* pValid) const
    {
        if (!IsNear(oWindow, nX, nY))
        {
            std::memset(pPixel, 0, GetPixelBytes());
            std::memset(pValid, 0, mnChannels);
            return false;
        }
        if (IsKernel(moRule.meMethod))
            return WeighPixel(oWindow, nX, nY, reinterpret_cast<T*>(pPixel), pValid);
        if (IsFootprint(moRule.meMethod))
            return GatherPixel(oWindow, nX, nY, reinterpret_cast<T*>(pPixel), pValid);
        return TakePixel(oWindow, nX, nY, reinterpret_cast<T*>(pPixel), pValid);
    }

    // The pixel that holds a place on one axis; a place at the edge belongs to the pixel inside.
    static long long PixelOf(double nPlace, long long nFirst, std::size_t nSize)
    {
        constexpr double EDGE = 1e-9;
        const auto nEnd = static_cast<double>(nFirst) + static_cast<double>(nSize);
        if (nPlace >= nEnd && nPlace <= nEnd + EDGE)
            return nFirst + static_cast<long long>(nSize) - 1;
        if (nPlace < static_cast<double>(nFirst) && nPlace >= static_cast<double>(nFirst) - EDGE)
            return nFirst;
        return static_cast<long long>(std::floor(nPlace));
    }

    bool TakePixel(const InterpolationWindow& oWindow, double nX, double nY, T* pPixel, unsigned char* pValid) const
    {
        const long long nColumn = PixelOf(nX, oWindow.mnX, oWindow.mnWidth);
        const long long nRow = PixelOf(nY, oWindow.mnY, oWindow.mnHeight);
        if (!IsInside(oWindow, nColumn, nRow))
        {
            std::memset(pPixel, 0, GetPixelBytes());
            std::memset(pValid, 0, mnChannels);
            return false;
        }
        std::memcpy(pPixel, PixelAt(oWindow, nColumn, nRow), GetPixelBytes());
        if (oWindow.mpValid == nullptr)
            return true;
        std::memcpy(pValid, oWindow.mpValid + IndexOf(oWindow, nColumn, nRow) * mnChannels, mnChannels);
        return std::memchr(pValid, 0, mnChannels) == nullptr;
    }

    // Takes the pixels at places inside the window up to the first that is not, and says how many.
    std::size_t TakePlain(const InterpolationWindow& oWindow, const double* pX, const double* pY, std::size_t nCount,
                          unsigned char* pPixels) const
    {
        switch (GetPixelBytes())
        {
        case 1:
            return TakeBytes<1>(oWindow, pX, pY, nCount, pPixels);
        case 2:
            return TakeBytes<2>(oWindow, pX, pY, nCount, pPixels);
        case 3:
            return TakeBytes<3>(oWindow, pX, pY, nCount, pPixels);
        case 4:
            return TakeBytes<4>(oWindow, pX, pY, nCount, pPixels);
        case 6:
            return TakeBytes<6>(oWindow, pX, pY, nCount, pPixels);
        case 8:
            return TakeBytes<8>(oWindow, pX, pY, nCount, pPixels);
        default:
            return TakeBytes<0>(oWindow, pX, pY, nCount, pPixels);
        }
    }

    template <std::size_t BYTES>
    std::size_t TakeBytes(const InterpolationWindow& oWindow, const double* pX, const double* pY, std::size_t nCount,
                          unsigned char* pPixels) const
    {
        const std::size_t nBytes = BYTES != 0 ? BYTES : GetPixelBytes();
        const auto nLeft = static_cast<double>(oWindow.mnX), nTop = static_cast<double>(oWindow.mnY);
        const auto nWidth = static_cast<double>(oWindow.mnWidth), nHeight = static_cast<double>(oWindow.mnHeight);
        for (std::size_t n = 0; n < nCount; ++n, pPixels += nBytes)
        {
            const double nX = pX[n] - nLeft, nY = pY[n] - nTop;
            if (!(nX >= 0 && nX < nWidth && nY >= 0 && nY < nHeight))
                return n;
            const std::size_t nPixel = static_cast<std::size_t>(static_cast<std::int64_t>(nY)) * oWindow.mnWidth +
                                       static_cast<std::size_t>(static_cast<std::int64_t>(nX));
            std::memcpy(pPixels, oWindow.mpPixels + nPixel * nBytes, nBytes);
        }
        return nCount;
    }

    static bool IsInside(const InterpolationWindow& oWindow, long long nX, long long nY)
    {
        return nX >= oWindow.mnX && nX < oWindow.mnX + static_cast<long long>(oWindow.mnWidth) && nY >= oWindow.mnY &&
               nY < oWindow.mnY + static_cast<long long>(oWindow.mnHeight);
    }

    // The weights of one axis, and those of them whose pixels are at hand.
    struct Weights
    {
        Weights(Resampling eMethod, double nPlace, double nStretch, long long nBegin, std::size_t nSize)
        {
            const TapRange oRange(eMethod, nPlace, nStretch);
            const long long nEnd = nBegin + static_cast<long long>(nSize);
            const auto At = [&](double nPixel)
            {
                return detail::KernelAt(eMethod, (nPixel + 0.5 - nPlace) / nStretch);
            };
            mnFirst = std::clamp(oRange.mnFirst, nBegin, nEnd);
            for (long long n = mnFirst; n < std::clamp(oRange.mnEnd, nBegin, nEnd); ++n)
                moWeights.push_back(At(static_cast<double>(n)));
            // The sum of very many weights is taken from samples of them.
            const long long nTaps = oRange.mnEnd - oRange.mnFirst;
            const double nStep = std::max(1.0, static_cast<double>(nTaps) / MOST_TAPS);
            for (double n = 0; n < static_cast<double>(nTaps); n += nStep)
                mnTotal += nStep * At(static_cast<double>(oRange.mnFirst) + n);
        }

        static constexpr double MOST_TAPS = 4096;

        long long mnFirst;
        double mnTotal = 0;
        std::vector<double> moWeights;
    };

    struct Sum
    {
        Real moSums[P] = {};
        Real mnWeight = 0;
        T moLowest[P];
        T moHighest[P];

        Sum()
        {
            std::fill_n(moLowest, P, std::numeric_limits<T>::max());
            std::fill_n(moHighest, P, std::numeric_limits<T>::lowest());
        }
        void Add(const T* pValue, Real nWeight)
        {
            mnWeight += nWeight;
            for (unsigned int n = 0; n < P; ++n)
            {
                if (nWeight != 0)
                    moSums[n] += nWeight * static_cast<Real>(pValue[n]);
                moLowest[n] = std::min(moLowest[n], pValue[n]);
                moHighest[n] = std::max(moHighest[n], pValue[n]);
            }
        }
        T Get(unsigned int n, bool bClamp) const
        {
            const T nValue = krv::raster::ConvertValue<T>(moSums[n] / mnWeight);
            return bClamp && nValue == nValue ? std::max(std::min(nValue, moHighest[n]), moLowest[n]) : nValue;
        }
    };

    bool WeighPixel(const InterpolationWindow& oWindow, double nX, double nY, T* pPixel, unsigned char* pValid) const
    {
        const Weights oX(moRule.meMethod, nX, moRule.mnXStretch, oWindow.mnX, oWindow.mnWidth);
        const Weights oY(moRule.meMethod, nY, moRule.mnYStretch, oWindow.mnY, oWindow.mnHeight);
        const Real nTotal = static_cast<Real>(oX.mnTotal) * static_cast<Real>(oY.mnTotal);
        const bool bClamp = moRule.mbClamp && moRule.meMethod != Resampling::eBilinear;
        bool bAll = true;
        for (unsigned int nChannel = 0; nChannel < mnChannels; ++nChannel, pPixel += P)
        {
            Sum oSum;
            for (std::size_t y = 0; y < oY.moWeights.size(); ++y)
            {
                for (std::size_t x = 0; x < oX.moWeights.size(); ++x)
                {
                    const std::size_t nPixel = IndexOf(oWindow, oX.mnFirst + static_cast<long long>(x),
                                                       oY.mnFirst + static_cast<long long>(y));
                    const Real nWeight = static_cast<Real>(oX.moWeights[x]) * static_cast<Real>(oY.moWeights[y]);
                    if (IsValid(oWindow, nPixel, nChannel))
                        oSum.Add(reinterpret_cast<const T*>(oWindow.mpPixels) + nPixel * mnSamples + nChannel * P,
                                 nWeight);
                }
            }
            // Halves that rounding keeps from being met are halves.
            constexpr Real ALMOST = 1 - 10 * Real(detail::ROUNDING);
            const bool bValid = oSum.mnWeight > 0 && 2 * oSum.mnWeight >= nTotal * ALMOST;
            pValid[nChannel] = bValid ? 1 : 0;
            bAll = bAll && bValid;
            for (unsigned int n = 0; n < P; ++n)
                pPixel[n] = bValid ? oSum.Get(n, bClamp) : T(0);
        }
        return bAll;
    }

    // The pixels whose centres lie in the footprint around a place.
    void FindFootprint(const InterpolationWindow& oWindow, double nX, double nY,
                       std::vector<std::size_t>& oPixels) const
    {
        const auto& [a, b, c, d] = moRule.moFootprint;
        const double nDeterminant = a * d - b * c;
        const auto Begin = [](double nPlace, double nReach, long long nFirst, std::size_t nSize)
        {
            return std::clamp(static_cast<long long>(std::floor(nPlace - nReach - 1)), nFirst,
                              nFirst + static_cast<long long>(nSize));
        };
        const auto End = [](double nPlace, double nReach, long long nFirst, std::size_t nSize)
        {
            return std::clamp(static_cast<long long>(std::ceil(nPlace + nReach + 1)), nFirst,
                              nFirst + static_cast<long long>(nSize));
        };
        oPixels.clear();
        if (nDeterminant == 0)
            return;
        const long long nRight = End(nX, moReach[0], oWindow.mnX, oWindow.mnWidth);
        const long long nBottom = End(nY, moReach[1], oWindow.mnY, oWindow.mnHeight);
        for (long long y = Begin(nY, moReach[1], oWindow.mnY, oWindow.mnHeight); y < nBottom; ++y)
        {
            const double nDown = static_cast<double>(y) + 0.5 - nY;
            for (long long x = Begin(nX, moReach[0], oWindow.mnX, oWindow.mnWidth); x < nRight; ++x)
            {
                const double nAcross = static_cast<double>(x) + 0.5 - nX;
                if (detail::IsInFootprint((d * nAcross - c * nDown) / nDeterminant) &&
                    detail::IsInFootprint((a * nDown - b * nAcross) / nDeterminant))
                    oPixels.push_back(IndexOf(oWindow, x, y));
            }
        }
    }

    bool GatherPixel(const InterpolationWindow& oWindow, double nX, double nY, T* pPixel, unsigned char* pValid) const
    {
        std::vector<std::size_t> oPixels;
        FindFootprint(oWindow, nX, nY, oPixels);
        if (oPixels.empty())
            return TakePixel(oWindow, nX, nY, pPixel, pValid);
        bool bAll = true;
        std::vector<const T*> oValues;
        for (unsigned int nChannel = 0; nChannel < mnChannels; ++nChannel, pPixel += P)
        {
            oValues.clear();
            for (const std::size_t nPixel : oPixels)
            {
                if (IsValid(oWindow, nPixel, nChannel))
                    oValues.push_back(reinterpret_cast<const T*>(oWindow.mpPixels) + nPixel * mnSamples + nChannel * P);
            }
            pValid[nChannel] = oValues.empty() ? 0 : 1;
            bAll = bAll && !oValues.empty();
            if (oValues.empty())
                std::fill_n(pPixel, P, T(0));
            else if (moRule.meMethod == Resampling::eAverage)
                Average(oValues, pPixel);
            else
                MostFrequent(oValues, pPixel);
        }
        return bAll;
    }

    static void Average(const std::vector<const T*>& oValues, T* pValue)
    {
        for (unsigned int n = 0; n < P; ++n)
        {
            detail::SumOf<T> nSum = 0;
            for (const T* const p : oValues)
                nSum += p[n];
            pValue[n] = detail::MeanOf<T>(nSum, oValues.size());
        }
    }

    // Complex values count as a pair, in the order of real and imaginary parts.
    static void MostFrequent(const std::vector<const T*>& oValues, T* pValue)
    {
        if constexpr (P == 1)
        {
            std::vector<T> oSamples;
            for (const T* const p : oValues)
                oSamples.push_back(*p);
            *pValue = detail::ModeOf(oSamples.data(), oSamples.size());
        }
        else
        {
            std::vector<std::array<T, P>> oSorted;
            for (const T* const p : oValues)
                oSorted.push_back({p[0], p[1]});
            std::sort(oSorted.begin(), oSorted.end());
            std::size_t nMost = 0;
            for (std::size_t n = 0; n < oSorted.size();)
            {
                std::size_t nEnd = n + 1;
                while (nEnd < oSorted.size() && !(oSorted[n] < oSorted[nEnd]))
                    ++nEnd;
                if (nEnd - n > nMost)
                    std::copy_n(oSorted[n].data(), P, pValue);
                nMost = std::max(nMost, nEnd - n);
                n = nEnd;
            }
        }
    }

    unsigned int mnChannels;
    std::size_t mnSamples;
    InterpolationRule moRule;
    std::array<double, 2> moReach;
    detail::PlainLoop mpPlainLoop; // for places all of whose pixels are valid, or null
};

} // namespace

IInterpolator::~IInterpolator() = default;

std::array<double, 2> GetReach(const InterpolationRule& oRule)
{
    if (IsKernel(oRule.meMethod))
        return {detail::RadiusOf(oRule.meMethod) * oRule.mnXStretch,
                detail::RadiusOf(oRule.meMethod) * oRule.mnYStretch};
    if (!IsFootprint(oRule.meMethod))
        return {0, 0};
    const auto& [a, b, c, d] = oRule.moFootprint;
    return {(std::fabs(a) + std::fabs(c)) / 2, (std::fabs(b) + std::fabs(d)) / 2};
}

std::unique_ptr<IInterpolator> MakeInterpolator(const DataType& oType, unsigned int nChannels,
                                                const InterpolationRule& oRule)
{
    CheckRule(oRule);
    const auto Make = [&]<class Value>(std::type_identity<Value>) -> std::unique_ptr<IInterpolator>
    {
        return std::make_unique<Interpolator<PartOf<Value>, PARTS_OF<Value>>>(nChannels, oRule);
    };
    return VisitPixelType(oType, Make);
}

} // namespace krv::gobs
