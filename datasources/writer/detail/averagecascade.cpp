#include "datasources/writer/detail/averagekernels.h"
#include "datasources/writer/detail/levelreducer.h"
#include "datasources/writer/detail/leveltarget.h"
#include "datasources/writer/detail/samplemath.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstring>

namespace krv::datasources::detail
{

namespace
{

// Sums of boxes, or samples of the image, and for each how many samples are in
// it: bytes for the image, 32-bit numbers above; null without validity.
struct SumRow
{
    unsigned char* mpSums = nullptr;
    unsigned char* mpCounts = nullptr;
};

// A row of boxes as far as the image reaches: its last one may have fewer
// columns.
struct BoxRow
{
    std::size_t mnBoxes;
    std::uint64_t mnRows;
    std::uint64_t mnColumns;
    std::uint64_t mnLastColumns;

    std::uint64_t GetSize(std::size_t nBox) const { return mnRows * (nBox + 1 == mnBoxes ? mnLastColumns : mnColumns); }
};

// Two short rows at a time are no pattern that processors fetch ahead of by
// themselves; of long ones each is.
constexpr std::size_t LONGEST_FETCHED_ROW = 4096;
constexpr std::size_t FETCHED_AHEAD = 4096;
constexpr std::size_t FETCHED_LINE = 64;

void Fetch(const unsigned char* pBytes, std::size_t nBytes)
{
    for (std::size_t n = 0; n < nBytes; n += FETCHED_LINE)
        __builtin_prefetch(pBytes + n);
}

// The steps of a cascade: stage k holds sums of 2^k by 2^k pixels.
class IAverageSteps
{
public:
    virtual ~IAverageSteps() = default;
    // Bytes of a sum and of a count.
    virtual std::size_t GetSumBytes(unsigned int nStage) const = 0;
    // Sums of stage nStage from two rows of nPixels pixels of the stage below; a
    // row beyond the image is zeros. May write the means of the first boxes too,
    // as if they were whole, to pPixels unless that is null; gives their number.
    virtual std::size_t Sum(unsigned int nStage, const SumRow& oFirst, const SumRow& oSecond, std::size_t nPixels,
                            const SumRow& oSums, unsigned char* pPixels) const = 0;
    // Pixels of a level from box nFirst on, and with counts the validity of their
    // values.
    virtual void Finish(unsigned int nStage, const SumRow& oSums, const BoxRow& oBoxes, std::size_t nFirst,
                        unsigned char* pPixels, unsigned char* pValid) const = 0;
};

template <typename T>
class AnySteps : public IAverageSteps
{
public:
    AnySteps(const SourceForm& oForm, bool bHalfValid)
        : mnSamples(oForm.GetSamples()), mnParts(oForm.moType.GetParts()), mbHalfValid(bHalfValid)
    {
    }

    std::size_t GetSumBytes(unsigned int nStage) const override { return nStage == 0 ? sizeof(T) : sizeof(SumOf<T>); }

    std::size_t Sum(unsigned int nStage, const SumRow& oFirst, const SumRow& oSecond, std::size_t nPixels,
                    const SumRow& oSums, unsigned char*) const override
    {
        if (nStage > 1)
            Add<SumOf<T>, std::uint32_t>(oFirst, oSecond, nPixels, oSums);
        else if (oFirst.mpCounts != nullptr)
            Add<T, unsigned char>(Cleared(oFirst, nPixels, moFirst), Cleared(oSecond, nPixels, moSecond), nPixels,
                                  oSums);
        else
            Add<T, unsigned char>(oFirst, oSecond, nPixels, oSums);
        return 0;
    }

    void Finish(unsigned int, const SumRow& oSums, const BoxRow& oBoxes, std::size_t nFirst, unsigned char* pPixels,
                unsigned char* pValid) const override
    {
        const auto* const pSums = reinterpret_cast<const SumOf<T>*>(oSums.mpSums);
        const auto* const pCounts = reinterpret_cast<const std::uint32_t*>(oSums.mpCounts);
        for (std::size_t nBox = nFirst; nBox < oBoxes.mnBoxes; ++nBox)
            for (unsigned int n = 0; n < mnSamples; ++n)
            {
                const std::size_t nAt = nBox * mnSamples + n;
                const std::size_t nValue = nAt / mnParts;
                const std::uint64_t nSize = oBoxes.GetSize(nBox);
                const std::uint64_t nCount = pCounts != nullptr ? pCounts[nValue] : nSize;
                const bool bValid = nCount != 0 && (!mbHalfValid || 2 * nCount >= nSize);
                const T nMean = bValid ? MeanOf<T>(pSums[nAt], nCount) : T(0);
                std::memcpy(pPixels + nAt * sizeof(T), &nMean, sizeof(T));
                if (pValid != nullptr)
                    pValid[nValue] = bValid;
            }
    }

private:
    // Samples with those that are not valid made zero, so that they can be added
    // without a look at the counts.
    SumRow Cleared(const SumRow& oRow, std::size_t nPixels, std::vector<T>& oSamples) const
    {
        oSamples.resize(nPixels * mnSamples);
        std::memcpy(oSamples.data(), oRow.mpSums, oSamples.size() * sizeof(T));
        for (std::size_t n = 0; n < oSamples.size(); ++n)
            oSamples[n] = oRow.mpCounts[n / mnParts] != 0 ? oSamples[n] : T(0);
        return {reinterpret_cast<unsigned char*>(oSamples.data()), oRow.mpCounts};
    }

    template <typename In, typename Count>
    void Add(const SumRow& oFirst, const SumRow& oSecond, std::size_t nPixels, const SumRow& oSums) const
    {
        AddPairs<In, SumOf<T>>(oFirst.mpSums, oSecond.mpSums, nPixels, mnSamples, oSums.mpSums);
        if (oFirst.mpCounts != nullptr)
            AddPairs<Count, std::uint32_t>(oFirst.mpCounts, oSecond.mpCounts, nPixels, mnSamples / mnParts,
                                           oSums.mpCounts);
    }

    template <typename In, typename Out>
    static void AddPairs(const unsigned char* pFirstRow, const unsigned char* pSecondRow, std::size_t nPixels,
                         std::size_t nSamples, unsigned char* pSums)
    {
        const In* __restrict pFirst = reinterpret_cast<const In*>(pFirstRow);
        const In* __restrict pSecond = reinterpret_cast<const In*>(pSecondRow);
        Out* __restrict pOut = reinterpret_cast<Out*>(pSums);
        for (std::size_t nPair = 0; nPair < nPixels / 2; ++nPair)
            for (std::size_t n = 0; n < nSamples; ++n)
            {
                const std::size_t nLeft = 2 * nPair * nSamples + n;
                pOut[nPair * nSamples + n] = (Out(pFirst[nLeft]) + Out(pSecond[nLeft])) +
                                             (Out(pFirst[nLeft + nSamples]) + Out(pSecond[nLeft + nSamples]));
            }
        for (std::size_t n = 0; n < nSamples && nPixels % 2 != 0; ++n)
            pOut[nPixels / 2 * nSamples + n] =
                Out(pFirst[(nPixels - 1) * nSamples + n]) + Out(pSecond[(nPixels - 1) * nSamples + n]);
    }

    std::size_t mnSamples;
    std::size_t mnParts;
    bool mbHalfValid;
    mutable std::vector<T> moFirst;
    mutable std::vector<T> moSecond;
};

#if defined(KRV_VECTOR_AVERAGES)
// By vector instructions, without validity. Wide: the sums from the fifth stage
// on, where they outgrow the narrow ones.
template <typename T, typename Narrow, typename Wide>
class VectorSteps : public IAverageSteps
{
public:
    static constexpr unsigned int NARROW_STAGES = 4;
    static constexpr unsigned int MOST_STAGES = 8;

    explicit VectorSteps(const SourceForm& oForm) : mnSamples(oForm.GetSamples()) {}

    std::size_t GetSumBytes(unsigned int nStage) const override
    {
        return nStage == 0 ? sizeof(T) : nStage <= NARROW_STAGES ? sizeof(Narrow) : sizeof(Wide);
    }

    std::size_t Sum(unsigned int nStage, const SumRow& oFirst, const SumRow& oSecond, std::size_t nPixels,
                    const SumRow& oSums, [[maybe_unused]] unsigned char* pPixels) const override
    {
        if (nStage == 1)
            return Add<T, Narrow>(oFirst, oSecond, nPixels, oSums, pPixels);
        if (nStage <= NARROW_STAGES)
            return Add<Narrow, Narrow>(oFirst, oSecond, nPixels, oSums);
        if (nStage == NARROW_STAGES + 1)
            return Add<Narrow, Wide>(oFirst, oSecond, nPixels, oSums);
        return Add<Wide, Wide>(oFirst, oSecond, nPixels, oSums);
    }

    void Finish(unsigned int nStage, const SumRow& oSums, const BoxRow& oBoxes, std::size_t nFirst,
                unsigned char* pPixels, unsigned char*) const override
    {
        if (nStage <= NARROW_STAGES)
            Round<Narrow>(nStage, oSums, oBoxes, nFirst, reinterpret_cast<T*>(pPixels));
        else
            Round<Wide>(nStage, oSums, oBoxes, nFirst, reinterpret_cast<T*>(pPixels));
    }

private:
    template <typename In, typename Out>
    std::size_t Add(const SumRow& oFirst, const SumRow& oSecond, std::size_t nPixels, const SumRow& oSums,
                    [[maybe_unused]] unsigned char* pPixels = nullptr) const
    {
        const auto* const pFirst = reinterpret_cast<const In*>(oFirst.mpSums);
        const auto* const pSecond = reinterpret_cast<const In*>(oSecond.mpSums);
        auto* const pSums = reinterpret_cast<Out*>(oSums.mpSums);
        std::size_t nRounded = 0;
        if constexpr (sizeof(In) == 1)
        {
            SumAndRoundPairs(pFirst, pSecond, nPixels / 2, mnSamples, pSums, pPixels);
            nRounded = pPixels != nullptr ? nPixels / 2 : 0;
        }
        else
            SumPairs(pFirst, pSecond, nPixels / 2, mnSamples, pSums);
        for (std::size_t n = 0; n < mnSamples && nPixels % 2 != 0; ++n)
        {
            const std::size_t nAt = (nPixels - 1) * mnSamples + n;
            pSums[nPixels / 2 * mnSamples + n] = static_cast<Out>(Out(pFirst[nAt]) + Out(pSecond[nAt]));
        }
        return nRounded;
    }

    template <typename Sum>
    void Round(unsigned int nStage, const SumRow& oSums, const BoxRow& oBoxes, std::size_t nFirst, T* pPixels) const
    {
        const auto* const pSums = reinterpret_cast<const Sum*>(oSums.mpSums);
        const bool bLastWhole = oBoxes.mnLastColumns == oBoxes.mnColumns;
        const std::size_t nWhole = oBoxes.mnRows == oBoxes.mnColumns ? oBoxes.mnBoxes - (bLastWhole ? 0 : 1) : 0;
        if (nFirst < nWhole)
            RoundSums(pSums + nFirst * mnSamples, (nWhole - nFirst) * mnSamples, 2 * nStage,
                      pPixels + nFirst * mnSamples);
        for (std::size_t nBox = std::max(nFirst, nWhole); nBox < oBoxes.mnBoxes; ++nBox)
            for (std::size_t n = nBox * mnSamples; n < (nBox + 1) * mnSamples; ++n)
                pPixels[n] = MeanOf<T>(static_cast<SumOf<T>>(pSums[n]), oBoxes.GetSize(nBox));
    }

    unsigned int mnSamples;
};
#endif

std::unique_ptr<IAverageSteps> MakeSteps(const SourceForm& oForm, [[maybe_unused]] unsigned int nStages,
                                         bool bHalfValid)
{
#if defined(KRV_VECTOR_AVERAGES)
    const unsigned int nSamples = oForm.GetSamples();
    const bool bVectors = !oForm.mbValidity && (nSamples == 1 || nSamples == 3 || nSamples == 4) &&
                          nStages <= VectorSteps<float, double, double>::MOST_STAGES;
    const auto eType = oForm.moType.GetNativeCode();
    if (bVectors && eType == krv::gobs::eDT_8U)
        return std::make_unique<VectorSteps<std::uint8_t, std::uint16_t, std::uint32_t>>(oForm);
    if (bVectors && eType == krv::gobs::eDT_16U)
        return std::make_unique<VectorSteps<std::uint16_t, std::uint32_t, std::uint32_t>>(oForm);
    if (bVectors && eType == krv::gobs::eDT_32R)
        return std::make_unique<VectorSteps<float, double, double>>(oForm);
#endif
    return ForSampleType(oForm.moType,
                         [&](auto nSample) -> std::unique_ptr<IAverageSteps>
                         { return std::make_unique<AnySteps<decltype(nSample)>>(oForm, bHalfValid); });
}

// Rows of a stage wait for the one below them in a slot of their own; the slots
// cover all columns.
class AverageCascade : public ILevelReducer
{
public:
    AverageCascade(const SourceForm& oForm, const std::vector<LevelTask>& oTasks, const PixelBounds& oBounds,
                   bool bHalfValid);

    void Add(const SourceWindow& oWindow) override;

private:
    struct Stage
    {
        unsigned int mnWidth; // of the level
        unsigned int mnHeight;
        LevelTarget* mpoTarget = nullptr;
        std::size_t mnSumBytes = 0; // of a pixel
        std::size_t mnCountBytes = 0;
        std::vector<unsigned char> moSums[2]; // of an even row and of an odd one
        std::vector<unsigned char> moCounts[2];
    };

    SumRow At(unsigned int nStage, unsigned int nX, unsigned int nY);
    SumRow Zeros() { return {moZeros.data(), mbCounts ? moZeros.data() : nullptr}; }
    void AddRows(const SumRow& oFirst, const SumRow& oSecond, unsigned int nX, unsigned int nY, unsigned int nPixels);
    void PutRow(unsigned int nStage, const SumRow& oSums, unsigned int nX, unsigned int nY, unsigned int nPixels,
                std::size_t nRounded, unsigned char* pPixels);

    SourceForm moForm;
    PixelBounds moBounds;
    bool mbCounts;
    std::vector<Stage> moStages; // the image, then factors 2, 4, ...
    std::unique_ptr<IAverageSteps> mpoSteps;
    std::vector<unsigned char> moZeros;
    std::vector<unsigned char> moValid;
};

AverageCascade::AverageCascade(const SourceForm& oForm, const std::vector<LevelTask>& oTasks,
                               const PixelBounds& oBounds, bool bHalfValid)
    : moForm(oForm), moBounds(oBounds), mbCounts(oForm.mbValidity)
{
    for (const LevelTask& oTask : oTasks)
    {
        const auto nStage = static_cast<unsigned int>(std::countr_zero(oTask.mnFactor));
        moStages.resize(std::max<std::size_t>(moStages.size(), nStage + 1));
        moStages[nStage].mpoTarget = oTask.mpoTarget;
    }
    mpoSteps = MakeSteps(oForm, static_cast<unsigned int>(moStages.size()) - 1, bHalfValid);
    for (unsigned int nStage = 0; nStage < moStages.size(); ++nStage)
    {
        Stage& oStage = moStages[nStage];
        oStage.mnWidth = ((oForm.mnWidth - 1) >> nStage) + 1;
        oStage.mnHeight = ((oForm.mnHeight - 1) >> nStage) + 1;
        oStage.mnSumBytes = mpoSteps->GetSumBytes(nStage) * oForm.GetSamples();
        oStage.mnCountBytes = !mbCounts ? 0 : oForm.mnChannels * (nStage == 0 ? 1 : sizeof(std::uint32_t));
        const std::size_t nPixels = (oBounds.GetWidth() >> nStage) + 1;
        for (unsigned int nSlot = 0; nSlot < 2; ++nSlot)
        {
            oStage.moSums[nSlot].resize(nPixels * oStage.mnSumBytes);
            oStage.moCounts[nSlot].resize(nPixels * oStage.mnCountBytes);
        }
        moZeros.resize(std::max(moZeros.size(), nPixels * std::max(oStage.mnSumBytes, oStage.mnCountBytes)));
    }
}

SumRow AverageCascade::At(unsigned int nStage, unsigned int nX, unsigned int nY)
{
    Stage& oStage = moStages[nStage];
    const std::size_t nPixel = nX - (moBounds.mnLeft >> nStage);
    return {oStage.moSums[nY % 2].data() + nPixel * oStage.mnSumBytes,
            mbCounts ? oStage.moCounts[nY % 2].data() + nPixel * oStage.mnCountBytes : nullptr};
}

void AverageCascade::Add(const SourceWindow& oWindow)
{
    const PixelBounds& oBounds = oWindow.moBounds;
    const Stage& oImage = moStages.front();
    const std::size_t nPitch = oBounds.GetWidth() * oImage.mnSumBytes;
    const std::size_t nCountPitch = oBounds.GetWidth() * oImage.mnCountBytes;
    const auto Row = [&](unsigned int nY)
    {
        return SumRow{const_cast<unsigned char*>(oWindow.mpPixels) + (nY - oBounds.mnTop) * nPitch,
                      mbCounts ? const_cast<unsigned char*>(oWindow.mpValid) + (nY - oBounds.mnTop) * nCountPitch
                               : nullptr};
    };
    for (unsigned int nY = oBounds.mnTop; nY < oBounds.mnBottom; ++nY)
    {
        if (nPitch <= LONGEST_FETCHED_ROW)
            Fetch(Row(nY).mpSums + FETCHED_AHEAD, nPitch);
        const bool bLast = nY + 1 == oImage.mnHeight;
        if (nY % 2 != 0)
            AddRows(nY > oBounds.mnTop ? Row(nY - 1) : At(0, oBounds.mnLeft, nY - 1), Row(nY), oBounds.mnLeft, nY / 2,
                    oBounds.GetWidth());
        else if (bLast)
            AddRows(Row(nY), Zeros(), oBounds.mnLeft, nY / 2, oBounds.GetWidth());
        else if (nY + 1 == oBounds.mnBottom)
        {
            const SumRow oHeld = At(0, oBounds.mnLeft, nY);
            std::memcpy(oHeld.mpSums, Row(nY).mpSums, nPitch);
            if (mbCounts)
                std::memcpy(oHeld.mpCounts, Row(nY).mpCounts, nCountPitch);
        }
    }
}

// Two rows of the image make a row of the first stage; whenever a row has its
// pair, or has none, the next stage goes on.
void AverageCascade::AddRows(const SumRow& oFirst, const SumRow& oSecond, unsigned int nX, unsigned int nY,
                             unsigned int nPixels)
{
    SumRow oAbove = oFirst;
    SumRow oBelow = oSecond;
    for (unsigned int nStage = 1; nStage < moStages.size(); ++nStage)
    {
        nX /= 2;
        const SumRow oSums = At(nStage, nX, nY);
        const Stage& oStage = moStages[nStage];
        unsigned char* const pPixels =
            oStage.mpoTarget != nullptr ? oStage.mpoTarget->Begin(nX, nY, (nPixels + 1) / 2) : nullptr;
        const std::size_t nRounded = mpoSteps->Sum(nStage, oAbove, oBelow, nPixels, oSums, pPixels);
        nPixels = (nPixels + 1) / 2;
        const bool bDone = nRounded == nPixels && (std::uint64_t{nY} + 1) << nStage <= moForm.mnHeight;
        if (pPixels != nullptr && bDone)
            oStage.mpoTarget->End(nullptr);
        else if (pPixels != nullptr)
            PutRow(nStage, oSums, nX, nY, nPixels, nRounded, pPixels);
        const bool bLast = nY + 1 == oStage.mnHeight;
        if (nY % 2 == 0 && !bLast)
            return;
        oAbove = At(nStage, nX, nY - nY % 2);
        oBelow = nY % 2 != 0 ? oSums : Zeros();
        nY /= 2;
    }
}

void AverageCascade::PutRow(unsigned int nStage, const SumRow& oSums, unsigned int nX, unsigned int nY,
                            unsigned int nPixels, std::size_t nRounded, unsigned char* pPixels)
{
    const Stage& oStage = moStages[nStage];
    const std::uint64_t nFactor = std::uint64_t{1} << nStage;
    const bool bLastColumn = nX + nPixels == oStage.mnWidth;
    const BoxRow oBoxes{nPixels, std::min<std::uint64_t>(nFactor, moForm.mnHeight - nY * nFactor), nFactor,
                        bLastColumn ? moForm.mnWidth - (oStage.mnWidth - 1) * nFactor : nFactor};
    if (mbCounts)
        moValid.resize(std::max(moValid.size(), std::size_t{nPixels} * moForm.mnChannels));
    const std::size_t nFirst = oBoxes.mnRows == nFactor ? nRounded : 0;
    if (nFirst < nPixels)
        mpoSteps->Finish(nStage, oSums, oBoxes, nFirst, pPixels, mbCounts ? moValid.data() : nullptr);
    oStage.mpoTarget->End(mbCounts ? moValid.data() : nullptr);
}

} // namespace

std::unique_ptr<ILevelReducer> MakeAverageCascade(const SourceForm& oForm, const std::vector<LevelTask>& oTasks,
                                                  const PixelBounds& oBounds, bool bHalfValid)
{
    return std::make_unique<AverageCascade>(oForm, oTasks, oBounds, bHalfValid);
}

} // namespace krv::datasources::detail
