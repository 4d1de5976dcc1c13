#include "gobs/raster/pixelvalue.h"
#include "gobs/resampling/detail/averagekernels.h"
#include "gobs/resampling/detail/samplemath.h"
#include "gobs/resampling/detail/samplevectors.h"
#include "gobs/resampling/levelreducer.h"
#include "gobs/resampling/leveltarget.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstring>

namespace krv::gobs
{

namespace
{

using namespace detail;

// Sums of boxes, or samples of the image, and for each how many samples are in
// it: bytes for the image; null without validity.
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

// Two short rows at a time are no pattern that processors fetch ahead of by themselves; of long ones each is.
constexpr std::size_t LONGEST_FETCHED_ROW = 4096;
// A block of the image and the sums of its first stage stay in the nearest cache.
constexpr std::size_t BLOCK_BYTES = 32768;
constexpr unsigned int BLOCK_STAGES = 5;

// The steps of a cascade: stage k holds sums of 2^k by 2^k pixels.
class IAverageSteps
{
public:
    virtual ~IAverageSteps() = default;
    // Bytes of a sum and of a count.
    virtual std::size_t GetSumBytes(unsigned int nStage) const = 0;
    virtual std::size_t GetCountBytes(unsigned int nStage) const = 0;
    // Sums of stage nStage from two rows of nPixels pixels of the stage below; a
    // row beyond the image is zeros. May write the means of the first boxes too,
    // as if they were whole, to pPixels unless that is null; gives their number.
    virtual std::size_t Sum(unsigned int nStage, const SumRow& oFirst, const SumRow& oSecond, std::size_t nPixels,
                            const SumRow& oSums, unsigned char* pPixels) const = 0;
    // Does the same for blocks of whole boxes; null where only Sum can.
    virtual ReduceLoop GetLoop(unsigned int) const { return nullptr; }
    // Counts of whole boxes without anything that is not valid.
    virtual void FillCounts(unsigned int, unsigned char*, std::size_t) const {}
    // Pixels of a level from box nFirst on, and with counts the validity of their
    // values; true when all are valid, which need not be written then.
    virtual bool Finish(unsigned int nStage, const SumRow& oSums, const BoxRow& oBoxes, std::size_t nFirst,
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
    std::size_t GetCountBytes(unsigned int nStage) const override { return nStage == 0 ? 1 : sizeof(std::uint32_t); }

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

    bool Finish(unsigned int, const SumRow& oSums, const BoxRow& oBoxes, std::size_t nFirst, unsigned char* pPixels,
                unsigned char* pValid) const override
    {
        bool bAll = true;
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
                bAll = bAll && bValid;
            }
        return bAll;
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

// By vector instructions, without validity, in sums as narrow as a stage allows.
template <typename T>
class VectorSteps : public IAverageSteps
{
public:
    explicit VectorSteps(const SourceForm& oForm) : meType(oForm.moType.GetNativeCode()), mnSamples(oForm.GetSamples())
    {
    }

    std::size_t GetSumBytes(unsigned int nStage) const override
    {
        if (nStage == 0)
            return sizeof(T);
        const std::size_t nBits = 8 * sizeof(T) + 2 * nStage;
        return std::is_floating_point_v<T> || nBits > 32 ? 8 : nBits > 16 ? 4 : 2;
    }
    std::size_t GetCountBytes(unsigned int) const override { return 0; }

    ReduceLoop GetLoop(unsigned int nStage) const override
    {
        return FindReduceLoop(meType, mnSamples, GetSumBytes(nStage - 1), GetSumBytes(nStage));
    }

    std::size_t Sum(unsigned int nStage, const SumRow& oFirst, const SumRow& oSecond, std::size_t nPixels,
                    const SumRow& oSums, unsigned char* pPixels) const override
    {
        GetLoop(nStage)(
            {oFirst.mpSums, oSecond.mpSums, 0, nPixels / 2, 1, oSums.mpSums, 0, pPixels, 0, 2 * nStage, false});
        for (std::size_t n = 0; n < mnSamples && nPixels % 2 != 0; ++n)
        {
            const std::size_t nAt = (nPixels - 1) * mnSamples + n;
            const SumOf<T> nSum = Get(oFirst, nStage - 1, nAt) + Get(oSecond, nStage - 1, nAt);
            Set(oSums, nStage, nPixels / 2 * mnSamples + n, nSum);
        }
        return nPixels / 2;
    }

    bool Finish(unsigned int nStage, const SumRow& oSums, const BoxRow& oBoxes, std::size_t nFirst,
                unsigned char* pPixels, unsigned char*) const override
    {
        for (std::size_t nBox = nFirst; nBox < oBoxes.mnBoxes; ++nBox)
            for (std::size_t n = nBox * mnSamples; n < (nBox + 1) * mnSamples; ++n)
            {
                const T nMean = MeanOf<T>(Get(oSums, nStage, n), oBoxes.GetSize(nBox));
                std::memcpy(pPixels + n * sizeof(T), &nMean, sizeof(T));
            }
        return true;
    }

    // Calls oAction with a value of the type that a stage's sums have.
    template <typename Action>
    auto As(unsigned int nStage, const Action& oAction) const
    {
        if (nStage == 0)
            return oAction(T());
        if constexpr (std::is_floating_point_v<T>)
            return oAction(SumOf<T>());
        const std::size_t nBytes = GetSumBytes(nStage);
        return nBytes == 2   ? oAction(std::uint16_t())
               : nBytes == 4 ? oAction(std::uint32_t())
                             : oAction(std::uint64_t());
    }
    SumOf<T> Get(const SumRow& oRow, unsigned int nStage, std::size_t nAt) const
    {
        return As(nStage,
                  [&](auto nSum)
                  {
                      std::memcpy(&nSum, oRow.mpSums + nAt * sizeof nSum, sizeof nSum);
                      return static_cast<SumOf<T>>(nSum);
                  });
    }

private:
    void Set(const SumRow& oRow, unsigned int nStage, std::size_t nAt, SumOf<T> nValue) const
    {
        As(nStage,
           [&](auto nSum)
           {
               nSum = static_cast<decltype(nSum)>(nValue);
               std::memcpy(oRow.mpSums + nAt * sizeof nSum, &nSum, sizeof nSum);
           });
    }

    NativeDataTypeCode meType;
    unsigned int mnSamples;
};

// By the same loops with validity: samples that are not valid are made zero, and those that are valid are counted as
// bytes of ones.
template <typename T>
class MaskedSteps : public IAverageSteps
{
public:
    MaskedSteps(const SourceForm& oForm, bool bHalfValid)
        : moSums(oForm), moCounts({oForm.mnWidth, oForm.mnHeight, oForm.mnChannels, eDT_8U, false}),
          mnSamples(oForm.mnChannels), mbHalfValid(bHalfValid)
    {
    }

    std::size_t GetSumBytes(unsigned int nStage) const override { return moSums.GetSumBytes(nStage); }
    std::size_t GetCountBytes(unsigned int nStage) const override { return moCounts.GetSumBytes(nStage); }
    ReduceLoop GetLoop(unsigned int nStage) const override { return moSums.GetLoop(nStage); }

    // The means are those of boxes that are valid as a whole; Finish puts the others right.
    std::size_t Sum(unsigned int nStage, const SumRow& oFirst, const SumRow& oSecond, std::size_t nPixels,
                    const SumRow& oSums, unsigned char* pPixels) const override
    {
        if (nStage == 1)
            moSums.Sum(nStage, Cleared(oFirst, nPixels, moFirst), Cleared(oSecond, nPixels, moSecond), nPixels, oSums,
                       pPixels);
        else
            moSums.Sum(nStage, oFirst, oSecond, nPixels, oSums, pPixels);
        moCounts.Sum(nStage, CountsOf(oFirst), CountsOf(oSecond), nPixels, CountsOf(oSums), nullptr);
        return 0;
    }

    void FillCounts(unsigned int nStage, unsigned char* pCounts, std::size_t nPixels) const override
    {
        moCounts.As(nStage,
                    [&](auto nCount)
                    {
                        nCount = static_cast<decltype(nCount)>(std::uint64_t{1} << 2 * nStage);
                        for (std::size_t n = 0; n < nPixels * mnSamples; ++n)
                            std::memcpy(pCounts + n * sizeof nCount, &nCount, sizeof nCount);
                    });
    }

    bool Finish(unsigned int nStage, const SumRow& oSums, const BoxRow& oBoxes, std::size_t, unsigned char* pPixels,
                unsigned char* pValid) const override
    {
        return moCounts.As(nStage, [&](auto nCount)
                           { return FinishBy<decltype(nCount)>(nStage, oSums, oBoxes, pPixels, pValid); });
    }

private:
    static SumRow CountsOf(const SumRow& oRow) { return {oRow.mpCounts, nullptr}; }

    template <typename Count>
    bool FinishBy(unsigned int nStage, const SumRow& oSums, const BoxRow& oBoxes, unsigned char* pPixels,
                  unsigned char* pValid) const
    {
        const std::uint64_t nWhole = std::uint64_t{1} << 2 * nStage;
        const auto* const pCounts = reinterpret_cast<const Count*>(oSums.mpCounts);
        const std::size_t nValues = oBoxes.mnBoxes * mnSamples;
        std::memset(pValid, 1, nValues);
        using Vectors = VectorsOf<Count>;
        const typename Vectors::Samples oNone{};
        const auto oWhole = oNone + static_cast<Count>(nWhole);
        bool bAll = true;
        for (std::size_t n = 0; n < nValues;)
        {
            // Most are whole or empty, many in a row.
            const bool bMany = n + Vectors::LANES <= nValues;
            if (bMany && std::memcmp(pCounts + n, &oWhole, sizeof oWhole) == 0)
            {
                n += Vectors::LANES;
                continue;
            }
            if (bMany && std::memcmp(pCounts + n, &oNone, sizeof oNone) == 0)
            {
                std::memset(pPixels + n * sizeof(T), 0, Vectors::LANES * sizeof(T));
                std::memset(pValid + n, 0, Vectors::LANES);
                bAll = false;
                n += Vectors::LANES;
                continue;
            }
            for (const std::size_t nEnd = std::min(n + Vectors::LANES, nValues); n < nEnd; ++n)
                if (pCounts[n] != nWhole)
                    bAll = FinishValue(nStage, oSums, n, pCounts[n], oBoxes.GetSize(n / mnSamples), pPixels, pValid) &&
                           bAll;
        }
        return bAll;
    }

    bool FinishValue(unsigned int nStage, const SumRow& oSums, std::size_t nAt, std::uint64_t nCount,
                     std::uint64_t nSize, unsigned char* pPixels, unsigned char* pValid) const
    {
        const bool bValid = nCount != 0 && (!mbHalfValid || 2 * nCount >= nSize);
        const T nMean = bValid ? MeanOf<T>(moSums.Get(oSums, nStage, nAt), nCount) : T(0);
        std::memcpy(pPixels + nAt * sizeof(T), &nMean, sizeof(T));
        pValid[nAt] = bValid;
        return bValid;
    }

    SumRow Cleared(const SumRow& oRow, std::size_t nPixels, std::vector<T>& oSamples) const
    {
        using Vectors = VectorsOf<T>;
        const std::size_t nCount = nPixels * mnSamples;
        oSamples.resize(nCount);
        auto* const pTo = reinterpret_cast<unsigned char*>(oSamples.data());
        std::size_t n = 0;
        for (; n + Vectors::LANES <= nCount; n += Vectors::LANES)
        {
            const auto oValid = simd::Convert<BitsOf<T>>(simd::Load<typename Vectors::Valid>(oRow.mpCounts + n));
            const auto oKept =
                simd::Load<typename Vectors::Bits>(oRow.mpSums + n * sizeof(T)) & (typename Vectors::Bits{} - oValid);
            std::memcpy(pTo + n * sizeof(T), &oKept, sizeof oKept);
        }
        for (; n < nCount; ++n)
        {
            std::memcpy(&oSamples[n], oRow.mpSums + n * sizeof(T), sizeof(T));
            oSamples[n] = oRow.mpCounts[n] != 0 ? oSamples[n] : T(0);
        }
        return {pTo, nullptr};
    }

    VectorSteps<T> moSums;
    VectorSteps<std::uint8_t> moCounts;
    std::size_t mnSamples;
    bool mbHalfValid;
    mutable std::vector<T> moFirst;
    mutable std::vector<T> moSecond;
};

template <typename T>
std::unique_ptr<IAverageSteps> MakeVectorSteps(const SourceForm& oForm, bool bHalfValid)
{
    if (oForm.mbValidity)
        return std::make_unique<MaskedSteps<T>>(oForm, bHalfValid);
    return std::make_unique<VectorSteps<T>>(oForm);
}

std::unique_ptr<IAverageSteps> MakeSteps(const SourceForm& oForm, bool bHalfValid)
{
    const bool bVectors = oForm.GetSamples() <= MOST_LOOP_SAMPLES;
    const auto eType = oForm.moType.GetNativeCode();
    if (bVectors && eType == eDT_8U)
        return MakeVectorSteps<std::uint8_t>(oForm, bHalfValid);
    if (bVectors && eType == eDT_16U)
        return MakeVectorSteps<std::uint16_t>(oForm, bHalfValid);
    if (bVectors && eType == eDT_32R)
        return MakeVectorSteps<float>(oForm, bHalfValid);
    const auto Make = [&]<class T>(std::type_identity<T>) -> std::unique_ptr<IAverageSteps>
    {
        return std::make_unique<AnySteps<T>>(oForm, bHalfValid);
    };
    return VisitPartType(oForm.moType, Make);
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
        ReduceLoop mpLoop = nullptr;
        std::size_t mnSumBytes = 0; // of a pixel
        std::size_t mnCountBytes = 0;
        std::vector<unsigned char> moSums[2]; // of an even row and of an odd one
        std::vector<unsigned char> moCounts[2];
    };

    SumRow At(unsigned int nStage, unsigned int nX, unsigned int nY);
    SumRow Zeros() { return {moZeros.data(), mbCounts ? moZeros.data() : nullptr}; }
    unsigned int GetBlockStages(std::size_t nPitch, unsigned int nRows) const;
    void AddBlock(const SourceWindow& oWindow, unsigned int nY, unsigned int nPixels, unsigned int nRows,
                  unsigned int nStages);
    void AddRow(const SourceWindow& oWindow, unsigned int nX, unsigned int nY);
    void AddRows(const SumRow& oFirst, const SumRow& oSecond, unsigned int nX, unsigned int nY, unsigned int nPixels);
    void GoOn(unsigned int nStage, unsigned int nX, unsigned int nY, unsigned int nPixels);
    void MakeRow(unsigned int nStage, const SumRow& oFirst, const SumRow& oSecond, unsigned int nX, unsigned int nY,
                 unsigned int nPixels);
    void PutRow(unsigned int nStage, const SumRow& oSums, unsigned int nX, unsigned int nY, unsigned int nPixels,
                std::size_t nRounded, unsigned char* pPixels);

    SourceForm moForm;
    PixelBounds moBounds;
    bool mbCounts;
    std::vector<Stage> moStages; // the image, then factors 2, 4, ...
    std::unique_ptr<IAverageSteps> mpoSteps;
    std::vector<unsigned char> moZeros;
    std::vector<unsigned char> moOnes;     // the validity of rows of windows without any
    std::vector<unsigned char> moBlock[2]; // sums of one stage of a block and of the next
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
    mpoSteps = MakeSteps(oForm, bHalfValid);
    for (unsigned int nStage = 0; nStage < moStages.size(); ++nStage)
    {
        Stage& oStage = moStages[nStage];
        oStage.mnWidth = ((oForm.mnWidth - 1) >> nStage) + 1;
        oStage.mnHeight = ((oForm.mnHeight - 1) >> nStage) + 1;
        oStage.mpLoop = nStage == 0 ? nullptr : mpoSteps->GetLoop(nStage);
        oStage.mnSumBytes = mpoSteps->GetSumBytes(nStage) * oForm.GetSamples();
        oStage.mnCountBytes = !mbCounts ? 0 : oForm.mnChannels * mpoSteps->GetCountBytes(nStage);
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

// As much as whole blocks take goes block by block, the rest row by row; both leave the same rows waiting.
void AverageCascade::Add(const SourceWindow& oWindow)
{
    const PixelBounds& oBounds = oWindow.moBounds;
    const std::size_t nPitch = oBounds.GetWidth() * moStages.front().mnSumBytes;
    const unsigned int nStages = GetBlockStages(nPitch, oBounds.GetHeight());
    const unsigned int nUnit = 1u << nStages;
    const bool bAll = nStages + 1 == moStages.size();
    const unsigned int nMostRows = bAll ? std::max(nUnit, static_cast<unsigned int>(BLOCK_BYTES / nPitch)) : nUnit;
    // Where blocks do not take all columns, they end with a box of the last stage.
    const unsigned int nColumns = oBounds.GetWidth() % nUnit == 0 ? nUnit : 1u << (moStages.size() - 1);
    const unsigned int nWhole = nStages == 0 ? 0 : oBounds.GetWidth() / nColumns * nColumns;
    for (unsigned int nY = oBounds.mnTop; nY < oBounds.mnBottom;)
    {
        unsigned int nRows = std::min(nMostRows, oBounds.mnBottom - nY) / nUnit * nUnit;
        if (!oWindow.AreValid(nY - oBounds.mnTop, nRows))
            nRows = nUnit;
        const bool bBlock = nWhole != 0 && nY % nUnit == 0 && nRows != 0 && oWindow.AreValid(nY - oBounds.mnTop, nRows);
        if (bBlock)
            AddBlock(oWindow, nY, nWhole, nRows, nStages);
        const unsigned int nX = oBounds.mnLeft + (bBlock ? nWhole : 0);
        for (const unsigned int nEnd = nY + (bBlock ? nRows : 1); nY < nEnd; ++nY)
            if (nX < oBounds.mnRight)
                AddRow(oWindow, nX, nY);
    }
}

// How many stages blocks of some of nRows rows of nPitch bytes go through at once.
unsigned int AverageCascade::GetBlockStages(std::size_t nPitch, unsigned int nRows) const
{
    if (moStages.back().mpLoop == nullptr)
        return 0;
    unsigned int nStages = std::min(BLOCK_STAGES, static_cast<unsigned int>(moStages.size()) - 1);
    while (nStages > 1 && (nPitch << nStages > BLOCK_BYTES || 1u << nStages > nRows))
        --nStages;
    return nStages;
}

// Rows from the left edge of a window on. The last one of nStages leaves a row of sums for the next; when there is
// none, the rows may be more than those of one box.
void AverageCascade::AddBlock(const SourceWindow& oWindow, unsigned int nY, unsigned int nPixels, unsigned int nRows,
                              unsigned int nStages)
{
    const PixelBounds& oBounds = oWindow.moBounds;
    unsigned int nX = oBounds.mnLeft;
    ReduceJob oJob{};
    const unsigned char* pSource = oWindow.mpPixels;
    std::size_t nPitch = oBounds.GetWidth() * moStages.front().mnSumBytes;
    pSource += (nY - oBounds.mnTop) * nPitch;
    oJob.mbFetch = nPitch <= LONGEST_FETCHED_ROW;
    for (unsigned int nStage = 1; nStage <= nStages; ++nStage)
    {
        const Stage& oStage = moStages[nStage];
        nX /= 2;
        nY /= 2;
        nPixels /= 2;
        nRows /= 2;
        oJob.mpFirst = pSource;
        oJob.mpSecond = pSource + nPitch;
        oJob.mnPairPitch = 2 * nPitch;
        oJob.mnWidth = nPixels;
        oJob.mnHeight = nRows;
        oJob.mnShift = 2 * nStage;
        oJob.mnSumPitch = nPixels * oStage.mnSumBytes;
        std::vector<unsigned char>& oSums = moBlock[nStage % 2];
        if (nStage + 1 == moStages.size())
            oJob.mpSums = nullptr;
        else if (nStage == nStages)
        {
            const SumRow oWaiting = At(nStage, nX, nY);
            oJob.mpSums = oWaiting.mpSums;
            if (mbCounts)
                mpoSteps->FillCounts(nStage, oWaiting.mpCounts, nPixels);
        }
        else
        {
            oSums.resize(std::max(oSums.size(), nRows * oJob.mnSumPitch));
            oJob.mpSums = oSums.data();
        }
        oJob.mpMeans = oStage.mpoTarget != nullptr ? oStage.mpoTarget->Begin(nX, nY, nPixels, nRows) : nullptr;
        oJob.mnMeanPitch = oStage.mpoTarget != nullptr ? oStage.mpoTarget->GetPitch() : 0;
        oStage.mpLoop(oJob);
        if (oStage.mpoTarget != nullptr)
            oStage.mpoTarget->End(nullptr);
        pSource = oJob.mpSums;
        nPitch = oJob.mnSumPitch;
    }
    GoOn(nStages, nX, nY, nPixels);
}

// One row of the image from column nX on.
void AverageCascade::AddRow(const SourceWindow& oWindow, unsigned int nX, unsigned int nY)
{
    const PixelBounds& oBounds = oWindow.moBounds;
    const Stage& oImage = moStages.front();
    const unsigned int nPixels = oBounds.mnRight - nX;
    const auto Row = [&](unsigned int nRow)
    {
        const std::size_t nPixel = std::size_t{nRow - oBounds.mnTop} * oBounds.GetWidth() + (nX - oBounds.mnLeft);
        SumRow oRow{const_cast<unsigned char*>(oWindow.mpPixels) + nPixel * oImage.mnSumBytes, nullptr};
        if (mbCounts)
            oRow.mpCounts = oWindow.mpValid != nullptr
                                ? const_cast<unsigned char*>(oWindow.mpValid) + nPixel * oImage.mnCountBytes
                                : moOnes.data();
        return oRow;
    };
    if (mbCounts && oWindow.mpValid == nullptr)
        moOnes.resize(std::max(moOnes.size(), nPixels * oImage.mnCountBytes), 1);
    if (nY % 2 != 0)
        AddRows(nY > oBounds.mnTop ? Row(nY - 1) : At(0, nX, nY - 1), Row(nY), nX, nY / 2, nPixels);
    else if (nY + 1 == oImage.mnHeight)
        AddRows(Row(nY), Zeros(), nX, nY / 2, nPixels);
    else if (nY + 1 == oBounds.mnBottom)
    {
        const SumRow oHeld = At(0, nX, nY);
        std::memcpy(oHeld.mpSums, Row(nY).mpSums, nPixels * oImage.mnSumBytes);
        if (mbCounts)
            std::memcpy(oHeld.mpCounts, Row(nY).mpCounts, nPixels * oImage.mnCountBytes);
    }
}

// Two rows of the image make a row of the first stage.
void AverageCascade::AddRows(const SumRow& oFirst, const SumRow& oSecond, unsigned int nX, unsigned int nY,
                             unsigned int nPixels)
{
    MakeRow(1, oFirst, oSecond, nX / 2, nY, nPixels);
    GoOn(1, nX / 2, nY, (nPixels + 1) / 2);
}

// Whenever a row of a stage has its pair, or has none, the next stage goes on.
void AverageCascade::GoOn(unsigned int nStage, unsigned int nX, unsigned int nY, unsigned int nPixels)
{
    for (; nStage + 1 < moStages.size(); ++nStage)
    {
        const bool bLast = nY + 1 == moStages[nStage].mnHeight;
        if (nY % 2 == 0 && !bLast)
            return;
        const SumRow oAbove = At(nStage, nX, nY - nY % 2);
        const SumRow oBelow = nY % 2 != 0 ? At(nStage, nX, nY) : Zeros();
        nX /= 2;
        nY /= 2;
        MakeRow(nStage + 1, oAbove, oBelow, nX, nY, nPixels);
        nPixels = (nPixels + 1) / 2;
    }
}

// A row of a stage from two rows of nPixels pixels of the one below.
void AverageCascade::MakeRow(unsigned int nStage, const SumRow& oFirst, const SumRow& oSecond, unsigned int nX,
                             unsigned int nY, unsigned int nPixels)
{
    const Stage& oStage = moStages[nStage];
    const SumRow oSums = At(nStage, nX, nY);
    unsigned char* const pPixels =
        oStage.mpoTarget != nullptr ? oStage.mpoTarget->Begin(nX, nY, (nPixels + 1) / 2) : nullptr;
    const std::size_t nRounded = mpoSteps->Sum(nStage, oFirst, oSecond, nPixels, oSums, pPixels);
    if (pPixels != nullptr)
        PutRow(nStage, oSums, nX, nY, (nPixels + 1) / 2, nRounded, pPixels);
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
    const std::size_t nWhole = oBoxes.mnLastColumns == nFactor ? nPixels : nPixels - 1;
    const std::size_t nFirst = oBoxes.mnRows == nFactor ? std::min(nRounded, nWhole) : 0;
    bool bAll = true;
    if (nFirst < nPixels)
        bAll = mpoSteps->Finish(nStage, oSums, oBoxes, nFirst, pPixels, mbCounts ? moValid.data() : nullptr);
    oStage.mpoTarget->End(bAll ? nullptr : moValid.data());
}

} // namespace

std::unique_ptr<ILevelReducer> MakeAverageCascade(const SourceForm& oForm, const std::vector<LevelTask>& oTasks,
                                                  const PixelBounds& oBounds, bool bHalfValid)
{
    return std::make_unique<AverageCascade>(oForm, oTasks, oBounds, bHalfValid);
}

} // namespace krv::gobs
