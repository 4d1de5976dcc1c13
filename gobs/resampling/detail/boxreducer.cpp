#include "gobs/raster/pixelvalue.h"
#include "gobs/resampling/detail/modeof.h"
#include "gobs/resampling/detail/reducers.h"
#include "gobs/resampling/detail/samplemath.h"
#include "gobs/resampling/leveltarget.h"
#include "toolkit/raster/convertvalue.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstring>

namespace krv::gobs::detail
{

namespace
{

// A value of P parts.
template <typename T, unsigned int P>
using Value = std::array<T, P>;

template <typename T>
bool IsNotANumber(T nSample)
{
    if constexpr (std::floating_point<T>)
        return std::isnan(nSample);
    else
        return false;
}

// By part, NaN above all others.
template <typename T, unsigned int P>
bool IsLess(const Value<T, P>& oFirst, const Value<T, P>& oSecond)
{
    for (unsigned int n = 0; n < P; ++n)
    {
        const bool bFirstNaN = IsNotANumber(oFirst[n]);
        const bool bSecondNaN = IsNotANumber(oSecond[n]);
        if (bFirstNaN != bSecondNaN)
            return bSecondNaN;
        if (!bFirstNaN && oFirst[n] != oSecond[n])
            return oFirst[n] < oSecond[n];
    }
    return false;
}

// What an extreme is looked for in: the value, or the power of a complex one.
template <typename T, unsigned int P>
auto RankOf(const Value<T, P>& oValue)
{
    if constexpr (P == 1)
        return oValue[0];
    else
        return static_cast<long double>(oValue[0]) * oValue[0] + static_cast<long double>(oValue[1]) * oValue[1];
}

// The boxes take one valid value after the other, row by row from the left, and
// give the value of the level.

template <typename T, unsigned int P>
struct AverageBox
{
    void Add(const Value<T, P>& oValue)
    {
        for (unsigned int n = 0; n < P; ++n)
            moSums[n] += oValue[n];
        ++mnCount;
    }
    Value<T, P> Get() const
    {
        Value<T, P> oMean;
        for (unsigned int n = 0; n < P; ++n)
            oMean[n] = MeanOf<T>(moSums[n], mnCount);
        return oMean;
    }
    std::uint64_t mnCount = 0;

private:
    std::array<SumOf<T>, P> moSums{};
};

// The root of the mean power. Squares of up to 32 bits are added up exactly.
template <typename T, unsigned int P>
struct PowerBox
{
    using Squares = std::conditional_t<std::integral<T> && sizeof(T) <= 4, Integer128, long double>;

    void Add(const Value<T, P>& oValue)
    {
        for (unsigned int n = 0; n < P; ++n)
        {
            mnPower += static_cast<Squares>(oValue[n]) * static_cast<Squares>(oValue[n]);
            moSums[n] += oValue[n];
        }
        ++mnCount;
    }
    Value<T, P> Get() const
    {
        const long double nRoot = std::sqrt(static_cast<long double>(mnPower) / static_cast<long double>(mnCount));
        if constexpr (P == 1)
            return {krv::raster::ConvertValue<T>(nRoot)};
        const auto nReal = static_cast<long double>(moSums[0]);
        const auto nImaginary = static_cast<long double>(moSums[P - 1]);
        const long double nLength = std::hypot(nReal, nImaginary);
        Value<T, P> oResult{};
        oResult[0] = krv::raster::ConvertValue<T>(nLength > 0 ? nRoot * nReal / nLength : nRoot);
        oResult[P - 1] = krv::raster::ConvertValue<T>(nLength > 0 ? nRoot * nImaginary / nLength : 0.0L);
        return oResult;
    }
    std::uint64_t mnCount = 0;

private:
    Squares mnPower = 0;
    std::array<SumOf<T>, P> moSums{};
};

template <typename T, unsigned int P, bool LARGEST>
struct ExtremeBox
{
    void Add(const Value<T, P>& oValue)
    {
        if (mnCount++ == 0 || IsBetter(oValue))
            moBest = oValue;
    }
    Value<T, P> Get() const { return moBest; }
    std::uint64_t mnCount = 0;

private:
    bool IsBetter(const Value<T, P>& oValue) const
    {
        const auto nBest = RankOf<T, P>(moBest);
        const auto nRank = RankOf<T, P>(oValue);
        if (IsNotANumber(nBest) || IsNotANumber(nRank))
            return IsNotANumber(nBest) && !IsNotANumber(nRank);
        if (nRank != nBest)
            return LARGEST ? nRank > nBest : nRank < nBest;
        return IsLess<T, P>(oValue, moBest);
    }

    Value<T, P> moBest{};
};

// Counts of different values; they are brought together now and then, so that
// no more than about twice as many are held as there are different ones.
template <typename T, unsigned int P>
struct ModeBox
{
    void Add(const Value<T, P>& oValue)
    {
        Value<T, P> oPlain = oValue;
        for (T& nPart : oPlain)
            nPart = static_cast<T>(nPart + T(0)); // -0 is 0
        ++mnCount;
        if (!moCounts.empty() && !Differ(moCounts.back().first, oPlain))
        {
            ++moCounts.back().second;
            return;
        }
        if (moCounts.size() >= mnLimit)
        {
            Gather();
            mnLimit = 2 * moCounts.size() + FIRST_LIMIT;
        }
        moCounts.emplace_back(oPlain, 1);
    }
    Value<T, P> Get()
    {
        Gather();
        const auto oBest =
            std::max_element(moCounts.begin(), moCounts.end(),
                             [](const Entry& oFirst, const Entry& oSecond) { return oFirst.second < oSecond.second; });
        return oBest->first;
    }
    // Keeps its memory.
    void Clear()
    {
        moCounts.clear();
        mnCount = 0;
    }
    std::uint64_t mnCount = 0;

private:
    using Entry = std::pair<Value<T, P>, std::uint64_t>;
    static constexpr std::size_t FIRST_LIMIT = 64;

    static bool Differ(const Value<T, P>& oFirst, const Value<T, P>& oSecond)
    {
        return IsLess<T, P>(oFirst, oSecond) || IsLess<T, P>(oSecond, oFirst);
    }
    void Gather()
    {
        std::sort(moCounts.begin(), moCounts.end(),
                  [](const Entry& oFirst, const Entry& oSecond) { return IsLess<T, P>(oFirst.first, oSecond.first); });
        std::size_t nKept = 0;
        for (std::size_t n = 1; n < moCounts.size(); ++n)
            if (Differ(moCounts[nKept].first, moCounts[n].first))
                moCounts[++nKept] = moCounts[n];
            else
                moCounts[nKept].second += moCounts[n].second;
        moCounts.resize(moCounts.empty() ? 0 : nKept + 1);
    }

    std::vector<Entry> moCounts;
    std::size_t mnLimit = FIRST_LIMIT;
};

std::size_t GetBoxSize(unsigned int nBox, unsigned int nFactor, unsigned int nSize)
{
    return static_cast<std::size_t>(std::min<std::uint64_t>(nFactor, nSize - std::uint64_t{nBox} * nFactor));
}

// One row of boxes at a time.
template <typename T, unsigned int P, typename Box>
class BoxReducer : public ILevelReducer
{
public:
    BoxReducer(const SourceForm& oForm, const LevelTask& oTask, bool bHalfValid)
        : moForm(oForm), moTask(oTask), mbHalfValid(bHalfValid),
          moBoxes(std::size_t{oTask.moBounds.GetWidth()} * oForm.mnChannels)
    {
    }

    void Add(const SourceWindow& oWindow) override
    {
        const std::uint64_t nFactor = moTask.mnFactor;
        const std::uint64_t nEnd = moTask.moBounds.mnBottom * nFactor;
        for (unsigned int nY = oWindow.moBounds.mnTop; nY < oWindow.moBounds.mnBottom; ++nY)
        {
            if (nY < moTask.moBounds.mnTop * nFactor || nY >= nEnd)
                continue;
            if constexpr (MODE)
            {
                const auto nRows =
                    static_cast<unsigned int>(GetBoxSize(nY / moTask.mnFactor, moTask.mnFactor, moForm.mnHeight));
                if (nY % nFactor == 0 && nFactor <= MOST_WHOLE_FACTOR && nRows <= oWindow.moBounds.mnBottom - nY)
                {
                    PutWhole(oWindow, nY, nRows);
                    nY += nRows - 1;
                    continue;
                }
            }
            AddRow(oWindow, nY);
            if ((nY + 1) % nFactor == 0 || nY + 1 == moForm.mnHeight)
                PutRow(static_cast<unsigned int>(nY / nFactor));
        }
    }

private:
    // Modes of boxes that lie in one window are found box by box.
    static constexpr bool MODE = std::is_same_v<Box, ModeBox<T, P>> && P == 1;
    static constexpr unsigned int MOST_WHOLE_FACTOR = 64;

    void PutWhole(const SourceWindow& oWindow, unsigned int nY, unsigned int nRows)
    {
        const PixelBounds& oTo = moTask.moBounds;
        const std::size_t nRowValues = std::size_t{oWindow.moBounds.GetWidth()} * moForm.mnChannels;
        const unsigned int nFirstRow = nY - oWindow.moBounds.mnTop;
        const bool bAll = oWindow.AreValid(nFirstRow, nRows);
        moValid.assign(moBoxes.size(), 1);
        moValues.resize(std::size_t{moTask.mnFactor} * moTask.mnFactor);
        unsigned char* const pRow = moTask.mpoTarget->Begin(oTo.mnLeft, nY / moTask.mnFactor, oTo.GetWidth());
        const std::size_t nChannels = moForm.mnChannels;
        std::size_t nFirst =
            nFirstRow * nRowValues + (std::size_t{oTo.mnLeft} * moTask.mnFactor - oWindow.moBounds.mnLeft) * nChannels;
        std::size_t nTo = 0;
        for (unsigned int nX = oTo.mnLeft; nX < oTo.mnRight; ++nX, nFirst += moTask.mnFactor * nChannels)
        {
            const std::size_t nColumns = GetBoxSize(nX, moTask.mnFactor, moForm.mnWidth);
            for (std::size_t nChannel = 0; nChannel < nChannels; ++nChannel, ++nTo)
            {
                const unsigned char* const pSamples = oWindow.mpPixels + (nFirst + nChannel) * sizeof(T);
                const std::size_t nCount =
                    bAll ? TakeAll(pSamples, nColumns, nRows, nRowValues)
                         : TakeValid(pSamples, oWindow.mpValid + nFirst + nChannel, nColumns, nRows, nRowValues);
                moValid[nTo] = nCount != 0 && (!mbHalfValid || 2 * nCount >= nColumns * nRows);
                const T nMode = moValid[nTo] != 0 ? ModeOf(moValues.data(), nCount) : T(0);
                std::memcpy(pRow + nTo * sizeof(T), &nMode, sizeof(T));
            }
        }
        moTask.mpoTarget->End(bAll ? nullptr : moValid.data());
    }

    // One channel of a box, the samples from pSamples on.
    std::size_t TakeAll(const unsigned char* pSamples, std::size_t nColumns, std::size_t nRows, std::size_t nRowValues)
    {
        const std::size_t nStep = moForm.mnChannels * sizeof(T), nPitch = nRowValues * sizeof(T);
        if (nColumns == 2 && nRows == 2)
            return TakeSquare<2>(pSamples, nStep, nPitch);
        if (nColumns == 4 && nRows == 4)
            return TakeSquare<4>(pSamples, nStep, nPitch);
        T* pTo = moValues.data();
        for (std::size_t nRow = 0; nRow < nRows; ++nRow, pSamples += nPitch)
            for (std::size_t n = 0; n < nColumns; ++n)
                std::memcpy(pTo++, pSamples + n * nStep, sizeof(T));
        return nColumns * nRows;
    }
    template <std::size_t SIDE>
    std::size_t TakeSquare(const unsigned char* pSamples, std::size_t nStep, std::size_t nPitch)
    {
        T* const pTo = moValues.data();
        for (std::size_t nRow = 0; nRow < SIDE; ++nRow)
            for (std::size_t n = 0; n < SIDE; ++n)
                std::memcpy(pTo + nRow * SIDE + n, pSamples + nRow * nPitch + n * nStep, sizeof(T));
        return SIDE * SIDE;
    }
    std::size_t TakeValid(const unsigned char* pSamples, const unsigned char* pValid, std::size_t nColumns,
                          std::size_t nRows, std::size_t nRowValues)
    {
        std::size_t nTaken = 0;
        const std::size_t nStep = moForm.mnChannels;
        for (std::size_t nRow = 0; nRow < nRows; ++nRow, pSamples += nRowValues * sizeof(T), pValid += nRowValues)
            for (std::size_t n = 0; n < nColumns; ++n)
            {
                // Never beyond the box: what is not valid is written over.
                std::memcpy(&moValues[nTaken], pSamples + n * nStep * sizeof(T), sizeof(T));
                nTaken += pValid[n * nStep];
            }
        return nTaken;
    }

    void AddRow(const SourceWindow& oWindow, unsigned int nY)
    {
        const unsigned int nChannels = moForm.mnChannels;
        const PixelBounds& oBounds = oWindow.moBounds;
        const std::size_t nRow = std::size_t{nY - oBounds.mnTop} * oBounds.GetWidth();
        for (unsigned int nBox = moTask.moBounds.mnLeft; nBox < moTask.moBounds.mnRight; ++nBox)
        {
            Box* const pBoxes = moBoxes.data() + std::size_t{nBox - moTask.moBounds.mnLeft} * nChannels;
            const std::size_t nFirst = nRow + (std::size_t{nBox} * moTask.mnFactor - oBounds.mnLeft);
            const std::size_t nEnd = nFirst + GetBoxSize(nBox, moTask.mnFactor, moForm.mnWidth);
            for (std::size_t n = nFirst * nChannels; n < nEnd * nChannels; n += nChannels)
                for (unsigned int nChannel = 0; nChannel < nChannels; ++nChannel)
                {
                    if (oWindow.mpValid != nullptr && oWindow.mpValid[n + nChannel] == 0)
                        continue;
                    Value<T, P> oValue;
                    std::memcpy(oValue.data(), oWindow.mpPixels + (n + nChannel) * sizeof oValue, sizeof oValue);
                    pBoxes[nChannel].Add(oValue);
                }
        }
    }

    void PutRow(unsigned int nY)
    {
        const PixelBounds& oBounds = moTask.moBounds;
        moValid.resize(moBoxes.size());
        unsigned char* const pRow = moTask.mpoTarget->Begin(oBounds.mnLeft, nY, oBounds.GetWidth());
        const std::size_t nRows = GetBoxSize(nY, moTask.mnFactor, moForm.mnHeight);
        for (std::size_t n = 0; n < moBoxes.size(); ++n)
        {
            const auto nX = oBounds.mnLeft + static_cast<unsigned int>(n / moForm.mnChannels);
            const std::uint64_t nSize = nRows * GetBoxSize(nX, moTask.mnFactor, moForm.mnWidth);
            Box& oBox = moBoxes[n];
            moValid[n] = oBox.mnCount != 0 && (!mbHalfValid || 2 * oBox.mnCount >= nSize);
            const Value<T, P> oValue = moValid[n] != 0 ? oBox.Get() : Value<T, P>{};
            std::memcpy(pRow + n * sizeof oValue, oValue.data(), sizeof oValue);
            if constexpr (requires { oBox.Clear(); })
                oBox.Clear();
            else
                oBox = Box();
        }
        moTask.mpoTarget->End(moForm.mbValidity ? moValid.data() : nullptr);
    }

    SourceForm moForm;
    LevelTask moTask;
    bool mbHalfValid;
    std::vector<Box> moBoxes;
    std::vector<unsigned char> moValid;
    std::vector<T> moValues; // of one box
};

// Copies whole pixels.
class NearestReducer : public ILevelReducer
{
public:
    NearestReducer(const SourceForm& oForm, const LevelTask& oTask) : moForm(oForm), moTask(oTask) {}

    void Add(const SourceWindow& oWindow) override
    {
        for (unsigned int nRow = moTask.moBounds.mnTop; nRow < moTask.moBounds.mnBottom; ++nRow)
        {
            const unsigned int nY = Centre(nRow, moForm.mnHeight);
            if (nY >= oWindow.moBounds.mnTop && nY < oWindow.moBounds.mnBottom)
                PutRow(oWindow, nRow, nY);
        }
    }

private:
    unsigned int Centre(unsigned int nPixel, unsigned int nSize) const
    {
        const std::uint64_t nCentre = (2 * std::uint64_t{nPixel} + 1) * moTask.mnFactor / 2;
        return static_cast<unsigned int>(std::min<std::uint64_t>(nCentre, nSize - 1));
    }

    void PutRow(const SourceWindow& oWindow, unsigned int nRow, unsigned int nY)
    {
        const PixelBounds& oBounds = moTask.moBounds;
        const std::size_t nPixelBytes = moForm.GetPixelBytes();
        const std::size_t nFirst = std::size_t{nY - oWindow.moBounds.mnTop} * oWindow.moBounds.GetWidth();
        unsigned char* pPixel = moTask.mpoTarget->Begin(oBounds.mnLeft, nRow, oBounds.GetWidth());
        moValid.clear();
        for (unsigned int nX = oBounds.mnLeft; nX < oBounds.mnRight; ++nX, pPixel += nPixelBytes)
        {
            const std::size_t nAt = nFirst + (Centre(nX, moForm.mnWidth) - oWindow.moBounds.mnLeft);
            std::memcpy(pPixel, oWindow.mpPixels + nAt * nPixelBytes, nPixelBytes);
            if (oWindow.mpValid != nullptr)
                moValid.insert(moValid.end(), oWindow.mpValid + nAt * moForm.mnChannels,
                               oWindow.mpValid + (nAt + 1) * moForm.mnChannels);
        }
        moTask.mpoTarget->End(oWindow.mpValid != nullptr ? moValid.data() : nullptr);
    }

    SourceForm moForm;
    LevelTask moTask;
    std::vector<unsigned char> moValid;
};

template <typename T, unsigned int P>
std::unique_ptr<ILevelReducer> MakeFor(const SourceForm& oForm, const LevelTask& oTask, const ReductionRule& oRule)
{
    const bool bHalf = oRule.mbHalfValid;
    switch (oRule.meMethod)
    {
    case Resampling::eRms:
        return std::make_unique<BoxReducer<T, P, PowerBox<T, P>>>(oForm, oTask, bHalf);
    case Resampling::eMin:
        return std::make_unique<BoxReducer<T, P, ExtremeBox<T, P, false>>>(oForm, oTask, bHalf);
    case Resampling::eMax:
        return std::make_unique<BoxReducer<T, P, ExtremeBox<T, P, true>>>(oForm, oTask, bHalf);
    case Resampling::eMode:
        return std::make_unique<BoxReducer<T, P, ModeBox<T, P>>>(oForm, oTask, bHalf);
    default:
        if (P == 2 && oRule.mbPower)
            return std::make_unique<BoxReducer<T, P, PowerBox<T, P>>>(oForm, oTask, bHalf);
        return std::make_unique<BoxReducer<T, P, AverageBox<T, P>>>(oForm, oTask, bHalf);
    }
}

} // namespace

std::unique_ptr<ILevelReducer> MakeBoxReducer(const SourceForm& oForm, const LevelTask& oTask,
                                              const ReductionRule& oRule)
{
    if (oRule.meMethod == Resampling::eNearest)
        return std::make_unique<NearestReducer>(oForm, oTask);
    const auto Make = [&]<class Value>(std::type_identity<Value>)
    {
        return MakeFor<PartOf<Value>, PARTS_OF<Value>>(oForm, oTask, oRule);
    };
    return VisitPixelType(oForm.moType, Make);
}

} // namespace krv::gobs::detail
