#include "gobs/raster/pixelvalue.h"
#include "gobs/resampling/detail/reducers.h"
#include "gobs/resampling/detail/samplemath.h"
#include "gobs/resampling/leveltarget.h"
#include "toolkit/raster/convertvalue.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <map>

namespace krv::gobs::detail
{

namespace
{

// The weight of a pixel nDistance / (2 * nFactor) boxes away from the centre.
// Only ratios of weights count: those of bilinear and cubic are whole numbers,
// so that halves are met exactly.
double WeightOf(Resampling eMethod, double nDistance, double nFactor)
{
    const double nBox = 2 * nFactor;
    if (eMethod == Resampling::eBilinear)
        return nBox - nDistance;
    if (eMethod == Resampling::eCubic)
        return nDistance <= nBox
                   ? 3 * nDistance * nDistance * nDistance - 5 * nDistance * nDistance * nBox + 2 * nBox * nBox * nBox
                   : -nDistance * nDistance * nDistance + 5 * nDistance * nDistance * nBox -
                         8 * nDistance * nBox * nBox + 4 * nBox * nBox * nBox;
    constexpr double PI = 3.14159265358979323846;
    const double nAngle = PI * nDistance / nBox;
    return nAngle == 0 ? 1 : 3 * std::sin(nAngle) * std::sin(nAngle / 3) / (nAngle * nAngle);
}

// The pixels of an axis that a pixel of the level is made from. All have the
// same weights but for what the image's edges cut off.
class Taps
{
public:
    Taps(Resampling eMethod, unsigned int nFactor, unsigned int nSize) : mnFactor(nFactor), mnSize(nSize)
    {
        // Twice the centre is (2 * pixel + 1) * factor - 1, and the kernel ends
        // before radius * factor.
        const std::int64_t nReach = std::int64_t{2} * nFactor * GetKernelRadius(eMethod);
        const std::int64_t nCentre = std::int64_t{nFactor} - 1;
        mnBegin = -((nReach - 1 - nCentre) / 2);
        for (std::int64_t n = mnBegin; 2 * n - nCentre < nReach; ++n)
            moWeights.push_back(WeightOf(eMethod, std::abs(static_cast<double>(2 * n - nCentre)), nFactor));
    }

    // First pixel of the image, and the one after the last.
    unsigned int GetFirst(unsigned int nPixel) const
    {
        return static_cast<unsigned int>(std::max<std::int64_t>(0, std::int64_t{nPixel} * mnFactor + mnBegin));
    }
    unsigned int GetEnd(unsigned int nPixel) const
    {
        const std::int64_t nEnd =
            std::int64_t{nPixel} * mnFactor + mnBegin + static_cast<std::int64_t>(moWeights.size());
        return static_cast<unsigned int>(std::min<std::int64_t>(mnSize, nEnd));
    }
    double GetWeight(unsigned int nPixel, unsigned int nAt) const
    {
        return moWeights[static_cast<std::size_t>(nAt - (std::int64_t{nPixel} * mnFactor + mnBegin))];
    }
    double GetTotal(unsigned int nPixel) const
    {
        double nTotal = 0;
        for (unsigned int n = GetFirst(nPixel); n < GetEnd(nPixel); ++n)
            nTotal += GetWeight(nPixel, n);
        return nTotal;
    }

private:
    std::int64_t mnFactor;
    std::int64_t mnSize;
    std::int64_t mnBegin;
    std::vector<double> moWeights;
};

// Row by row the weighted sums along the row, which then go with the weights of
// the row to the rows of the level that the kernel reaches. The order of
// additions is the same whatever part of a level is made.
template <typename T>
class KernelReducer : public ILevelReducer
{
public:
    KernelReducer(const SourceForm& oForm, const LevelTask& oTask, Resampling eMethod)
        : moForm(oForm), moTask(oTask), mbClamp(eMethod != Resampling::eBilinear),
          moColumns(eMethod, oTask.mnFactor, oForm.mnWidth), moRows(eMethod, oTask.mnFactor, oForm.mnHeight),
          mnSamples(oForm.GetSamples()), mnParts(oForm.moType.GetParts()), mnNextRow(oTask.moBounds.mnTop)
    {
        for (unsigned int nX = oTask.moBounds.mnLeft; nX < oTask.moBounds.mnRight; ++nX)
            moTotals.push_back(moColumns.GetTotal(nX));
    }

    void Add(const SourceWindow& oWindow) override
    {
        for (unsigned int nY = oWindow.moBounds.mnTop; nY < oWindow.moBounds.mnBottom; ++nY)
        {
            bool bSummed = false;
            for (unsigned int nRow = mnNextRow; nRow < moTask.moBounds.mnBottom && moRows.GetFirst(nRow) <= nY; ++nRow)
            {
                if (!bSummed)
                    SumRow(oWindow, nY);
                bSummed = true;
                AddRow(moOpen[nRow], moRows.GetWeight(nRow, nY));
            }
            while (mnNextRow < moTask.moBounds.mnBottom && moRows.GetEnd(mnNextRow) == nY + 1)
                PutRow(mnNextRow++);
        }
    }

private:
    using Real = RealOf<T>;

    struct Row
    {
        std::vector<Real> moSums;
        std::vector<Real> moWeights; // of valid pixels
        std::vector<T> moLowest;
        std::vector<T> moHighest;

        void Resize(std::size_t nSize, bool bWeights, bool bRange)
        {
            moSums.assign(nSize, 0);
            moWeights.assign(bWeights ? nSize : 0, 0);
            moLowest.assign(bRange ? nSize : 0, std::numeric_limits<T>::max());
            moHighest.assign(bRange ? nSize : 0, std::numeric_limits<T>::lowest());
        }
        void Widen(std::size_t nAt, T nLowest, T nHighest)
        {
            moLowest[nAt] = std::min(moLowest[nAt], nLowest);
            moHighest[nAt] = std::max(moHighest[nAt], nHighest);
        }
    };

    std::size_t GetSize() const { return std::size_t{moTask.moBounds.GetWidth()} * mnSamples; }

    void SumRow(const SourceWindow& oWindow, unsigned int nY)
    {
        moSum.Resize(GetSize(), moForm.mbValidity, mbClamp);
        const PixelBounds& oBounds = oWindow.moBounds;
        const std::size_t nFirst = std::size_t{nY - oBounds.mnTop} * oBounds.GetWidth();
        for (unsigned int nX = moTask.moBounds.mnLeft; nX < moTask.moBounds.mnRight; ++nX)
        {
            const std::size_t nTo = std::size_t{nX - moTask.moBounds.mnLeft} * mnSamples;
            const unsigned int nEnd = moColumns.GetEnd(nX);
            for (unsigned int n = moColumns.GetFirst(nX); n < nEnd; ++n)
                AddPixel(oWindow, nFirst + (n - oBounds.mnLeft), nTo, moColumns.GetWeight(nX, n));
        }
    }

    void AddPixel(const SourceWindow& oWindow, std::size_t nPixel, std::size_t nTo, double nWeight)
    {
        for (std::size_t n = 0; n < mnSamples; ++n)
        {
            const std::size_t nFrom = nPixel * mnSamples + n;
            T nSample;
            std::memcpy(&nSample, oWindow.mpPixels + nFrom * sizeof(T), sizeof(T));
            if (oWindow.mpValid != nullptr && oWindow.mpValid[nFrom / mnParts] == 0)
                continue;
            if (moForm.mbValidity)
                moSum.moWeights[nTo + n] += nWeight;
            moSum.moSums[nTo + n] += static_cast<Real>(nSample) * nWeight;
            if (mbClamp)
                moSum.Widen(nTo + n, nSample, nSample);
        }
    }

    void AddRow(Row& oRow, double nWeight)
    {
        if (oRow.moSums.empty())
            oRow.Resize(moSum.moSums.size(), !moSum.moWeights.empty(), mbClamp);
        for (std::size_t n = 0; n < moSum.moSums.size(); ++n)
            oRow.moSums[n] += moSum.moSums[n] * nWeight;
        for (std::size_t n = 0; n < moSum.moWeights.size(); ++n)
            oRow.moWeights[n] += moSum.moWeights[n] * nWeight;
        for (std::size_t n = 0; n < moSum.moLowest.size(); ++n)
            oRow.Widen(n, moSum.moLowest[n], moSum.moHighest[n]);
    }

    void PutRow(unsigned int nY)
    {
        const Row oRow = std::move(moOpen[nY]);
        moOpen.erase(nY);
        const PixelBounds& oBounds = moTask.moBounds;
        const double nRowTotal = moRows.GetTotal(nY);
        moValid.assign(GetSize() / mnParts, 1);
        unsigned char* const pPixels = moTask.mpoTarget->Begin(oBounds.mnLeft, nY, oBounds.GetWidth());
        for (std::size_t n = 0; n < GetSize(); ++n)
        {
            const Real nTotal = static_cast<Real>(moTotals[n / mnSamples]) * nRowTotal;
            const Real nWeight = oRow.moWeights.empty() ? nTotal : oRow.moWeights[n];
            T nSample{};
            if (nWeight > 0 && 2 * nWeight >= nTotal)
                nSample = Limit(oRow, n, oRow.moSums[n] / nWeight);
            else
                moValid[n / mnParts] = 0;
            std::memcpy(pPixels + n * sizeof(T), &nSample, sizeof(T));
        }
        moTask.mpoTarget->End(moForm.mbValidity ? moValid.data() : nullptr);
    }

    // NaN stays what it is.
    T Limit(const Row& oRow, std::size_t nAt, Real nValue) const
    {
        const T nSample = krv::raster::ConvertValue<T>(nValue);
        if (!mbClamp || nSample != nSample)
            return nSample;
        return std::max(std::min(nSample, oRow.moHighest[nAt]), oRow.moLowest[nAt]);
    }

    SourceForm moForm;
    LevelTask moTask;
    bool mbClamp;
    Taps moColumns;
    Taps moRows;
    std::size_t mnSamples;
    std::size_t mnParts;
    unsigned int mnNextRow;
    std::vector<double> moTotals; // of the weights of each column
    Row moSum;
    std::map<unsigned int, Row> moOpen;
    std::vector<unsigned char> moValid;
};

} // namespace

std::unique_ptr<ILevelReducer> MakeKernelReducer(const SourceForm& oForm, const LevelTask& oTask, Resampling eMethod)
{
    const auto Make = [&]<class T>(std::type_identity<T>) -> std::unique_ptr<ILevelReducer>
    {
        return std::make_unique<KernelReducer<T>>(oForm, oTask, eMethod);
    };
    return VisitPartType(oForm.moType, Make);
}

} // namespace krv::gobs::detail
