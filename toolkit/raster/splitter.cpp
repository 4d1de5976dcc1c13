#include "toolkit/raster/splitter.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/detail/layout.h"
#include "toolkit/raster/merger.h"

#include <algorithm>
#include <string>

namespace krv::raster
{

namespace
{

// What a block of pixels takes, source and results: the passes over it find it in the first-level cache.
constexpr std::uint64_t BLOCK_BYTES = 32 * 1024;
constexpr std::uint64_t BLOCK_STEP = 64; // conversions of a block leave no rest behind their vectors

} // namespace

// One target. Its parts are brought together in the source's type, since only those of its own channels are then
// converted: at once where the processor can, else in a pass of its own.
class Splitter::Part
{
public:
    Part(BufferType eSource, unsigned int nSourceChannels, const SplitTarget& oTarget);

    std::uint64_t GetPixelBytes() const { return mnParts * moTarget.PartBytes(); }
    std::size_t GetChannels() const { return mnChannels; }
    void Prepare(std::uint64_t nBlockPixels);
    void Run(const unsigned char* pSource, unsigned char* pTarget, std::size_t nPixels, std::uint64_t* pChanged);

private:
    using Numbers = std::vector<MergeChannel>;

    std::unique_ptr<Merger> MakeMerger(const Numbers& oNumbers, std::size_t nPart) const;
    void RunDirect(unsigned char* pTarget, std::size_t nPixels, std::uint64_t* pChanged);
    void Count(const unsigned char* pSource, const unsigned char* pGathered, const unsigned char* pTarget,
               std::size_t nPixels, std::uint64_t* pChanged);
    void CountEach(const unsigned char* pGathered, const unsigned char* pTarget, std::size_t nPixels,
                   std::uint64_t* pChanged) const;

    detail::Layout moSource;
    detail::Layout moTarget;
    std::size_t mnSourceParts; // of a pixel
    std::size_t mnChannels;
    std::size_t mnParts; // of a pixel of the target
    detail::Converter mpConvert = nullptr;
    detail::ChangeCounter mpCount = nullptr;     // null when nothing can change
    detail::ChangeCounter mpCountAny = nullptr;  // of what is not 0, for the parts that are dropped
    std::unique_ptr<Merger> mpDirect;            // to the target; null when that leaves changes uncounted
    std::unique_ptr<Merger> mpGather;            // null when the source lies as the target wants it
    std::unique_ptr<Merger> mpGatherDropped;     // the imaginary parts that a real target has no place for
    std::vector<const unsigned char*> moSources; // for the mergers
    std::vector<unsigned char> moGathered;
    std::vector<unsigned char> moDropped;
    std::vector<unsigned char> moZeros;
};

Splitter::Part::Part(BufferType eSource, unsigned int nSourceChannels, const SplitTarget& oTarget)
    : moSource(detail::LayoutOf(eSource, "eSource", Place::Current())),
      moTarget(detail::LayoutOf(oTarget.meType, "oTargets", Place::Current())),
      mnSourceParts(std::size_t{nSourceChannels} * moSource.mnParts), mnChannels(oTarget.moChannels.size()),
      mnParts(mnChannels * moTarget.mnParts), moSources(1)
{
    Numbers oTaken, oDropped;
    for (const unsigned int nChannel : oTarget.moChannels)
    {
        if (nChannel >= nSourceChannels)
            throw DataException("There is no channel " + std::to_string(nChannel) + " of the source");
        const auto nFirst = static_cast<unsigned int>(nChannel * moSource.mnParts);
        for (unsigned int nPart = 0; nPart < moTarget.mnParts; ++nPart)
            oTaken.push_back(nPart < moSource.mnParts ? MergeChannel{0, nFirst + nPart} : MergeChannel());
        oDropped.push_back({0, nFirst + 1});
    }
    const detail::Kernels& oKernels = detail::GetKernels();
    mpConvert = oKernels.GetConverter(moSource.mnPart, moTarget.mnPart);
    if (!detail::PartCovers(moTarget.mnPart, moSource.mnPart))
        mpCount = oKernels.GetCounter(moSource.mnPart, moTarget.mnPart);
    bool bStraight = oTaken.size() == mnSourceParts;
    for (unsigned int n = 0; n < oTaken.size(); ++n)
        bStraight = bStraight && oTaken[n].mnSource == 0 && oTaken[n].mnChannel == n;
    if (!bStraight)
        mpGather = MakeMerger(oTaken, moSource.mnPart);
    if (!bStraight && moSource.mnParts <= moTarget.mnParts)
        mpDirect = MakeMerger(oTaken, moTarget.mnPart);
    if (mpDirect != nullptr && mpCount != nullptr && !mpDirect->CountsChanges())
        mpDirect = nullptr;
    if (moSource.mnParts > moTarget.mnParts)
    {
        mpGatherDropped = MakeMerger(oDropped, moSource.mnPart);
        mpCountAny = oKernels.GetCounter(moSource.mnPart, 0);
    }
}

std::unique_ptr<Merger> Splitter::Part::MakeMerger(const Numbers& oNumbers, std::size_t nPart) const
{
    const auto ePart = static_cast<BufferType>(moSource.mnPart); // buffer types begin with the types of parts
    return std::make_unique<Merger>(std::vector<MergeSource>{{ePart, static_cast<unsigned int>(mnSourceParts)}},
                                    static_cast<BufferType>(nPart), oNumbers);
}

void Splitter::Part::Prepare(std::uint64_t nBlockPixels)
{
    const auto nPixels = static_cast<std::size_t>(nBlockPixels);
    if (mpGather != nullptr && moSource.mnPart != moTarget.mnPart)
        moGathered.resize(nPixels * mnParts * moSource.PartBytes());
    if (mpGatherDropped == nullptr)
        return;
    moDropped.resize(nPixels * mnChannels * moSource.PartBytes());
    moZeros.resize(nPixels * mnChannels);
}

void Splitter::Part::Run(const unsigned char* pSource, unsigned char* pTarget, std::size_t nPixels,
                         std::uint64_t* pChanged)
{
    const unsigned char* pGathered = pSource;
    moSources.front() = pSource;
    if (mpDirect != nullptr)
        return RunDirect(pTarget, nPixels, pChanged);
    if (mpGather != nullptr && moSource.mnPart == moTarget.mnPart)
    {
        mpGather->Run(moSources, pTarget, nPixels);
        pGathered = pTarget;
    }
    else
    {
        if (mpGather != nullptr)
        {
            mpGather->Run(moSources, moGathered.data(), nPixels);
            pGathered = moGathered.data();
        }
        mpConvert(pGathered, pTarget, nPixels * mnParts);
    }
    if (pChanged != nullptr)
        Count(pSource, pGathered, pTarget, nPixels, pChanged);
}

void Splitter::Part::RunDirect(unsigned char* pTarget, std::size_t nPixels, std::uint64_t* pChanged)
{
    const std::uint64_t nChanged = mpDirect->Run(moSources, pTarget, nPixels);
    if (pChanged == nullptr || nChanged == 0)
        return;
    if (mnParts == 1)
    {
        *pChanged += nChanged;
        return;
    }
    mpGather->Run(moSources, moGathered.data(), nPixels);
    CountEach(moGathered.data(), pTarget, nPixels, pChanged);
}

// As a rule nothing changed, which one look at all channels tells.
void Splitter::Part::Count(const unsigned char* pSource, const unsigned char* pGathered, const unsigned char* pTarget,
                           std::size_t nPixels, std::uint64_t* pChanged)
{
    const std::size_t nChanged = mpCount != nullptr ? mpCount(pGathered, pTarget, nPixels * mnParts, 1) : 0;
    std::size_t nDropped = 0;
    if (mpGatherDropped != nullptr)
    {
        moSources.front() = pSource;
        mpGatherDropped->Run(moSources, moDropped.data(), nPixels);
        nDropped = mpCountAny(moDropped.data(), moZeros.data(), nPixels * mnChannels, 1);
    }
    if (nDropped == 0 && mnParts == 1)
        *pChanged += nChanged;
    else if (nDropped != 0 || nChanged != 0)
        CountEach(pGathered, pTarget, nPixels, pChanged);
}

void Splitter::Part::CountEach(const unsigned char* pGathered, const unsigned char* pTarget, std::size_t nPixels,
                               std::uint64_t* pChanged) const
{
    const std::size_t nFrom = moSource.PartBytes(), nTo = moTarget.PartBytes();
    for (std::size_t nChannel = 0; nChannel < mnChannels; ++nChannel)
    {
        const std::size_t nFirst = nChannel * moTarget.mnParts;
        if (moTarget.mnParts == 1 && mpGatherDropped == nullptr)
        {
            pChanged[nChannel] += mpCount(pGathered + nFirst * nFrom, pTarget + nFirst * nTo, nPixels, mnParts);
            continue;
        }
        // Either part of a complex value may have changed.
        for (std::size_t nPixel = 0; nPixel < nPixels; ++nPixel)
        {
            const std::size_t nAt = nPixel * mnParts + nFirst;
            bool bChanged =
                mpCount != nullptr && mpCount(pGathered + nAt * nFrom, pTarget + nAt * nTo, moTarget.mnParts, 1) != 0;
            if (mpGatherDropped != nullptr && !bChanged)
                bChanged =
                    mpCountAny(moDropped.data() + (nPixel * mnChannels + nChannel) * nFrom, moZeros.data(), 1, 1) != 0;
            pChanged[nChannel] += bChanged ? 1 : 0;
        }
    }
}

Splitter::Splitter(BufferType eSource, unsigned int nSourceChannels, const std::vector<SplitTarget>& oTargets)
{
    mnSourceBytes = BufferDataSize(eSource, nSourceChannels);
    std::uint64_t nBytes = mnSourceBytes;
    for (const SplitTarget& oTarget : oTargets)
    {
        moParts.push_back(std::make_unique<Part>(eSource, nSourceChannels, oTarget));
        nBytes += moParts.back()->GetPixelBytes();
    }
    mnBlockPixels = std::max(BLOCK_BYTES / std::max<std::uint64_t>(nBytes, 1) / BLOCK_STEP * BLOCK_STEP, BLOCK_STEP);
    for (const auto& oPart : moParts)
        oPart->Prepare(mnBlockPixels);
}

Splitter::~Splitter() = default;

void Splitter::Run(const unsigned char* pSource, const std::vector<unsigned char*>& oTargets, std::uint64_t nPixels,
                   std::uint64_t* pChanged)
{
    for (std::uint64_t nFirst = 0; nFirst < nPixels; nFirst += mnBlockPixels)
    {
        const auto nCount = static_cast<std::size_t>(std::min(mnBlockPixels, nPixels - nFirst));
        std::uint64_t* pOwn = pChanged;
        for (std::size_t nPart = 0; nPart < moParts.size(); ++nPart)
        {
            Part& oPart = *moParts[nPart];
            if (oPart.GetChannels() == 0)
                continue;
            oPart.Run(pSource + nFirst * mnSourceBytes, oTargets[nPart] + nFirst * oPart.GetPixelBytes(), nCount, pOwn);
            pOwn += pOwn != nullptr ? oPart.GetChannels() : 0;
        }
    }
}

} // namespace krv::raster
