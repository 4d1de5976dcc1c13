#include "toolkit/raster/merger.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/detail/layout.h"

#include <algorithm>
#include <cstring>
#include <limits>
#include <numeric>
#include <string>

namespace krv::raster
{

namespace
{

constexpr std::size_t MAX_VECTOR = 64;
// What a block of pixels takes, results and all between: it stays in the first-level cache, of which many processors
// have 32 KiB. Half of it is slower, down to 0.76 (three channels of 8 bits and one of 16 to 32R); twice as much is 1.0
// to 1.3 times as fast where there are 48 KiB.
constexpr std::uint64_t BLOCK_BYTES = 20 * 1024;
// Conversions of a block leave no rest behind their vectors.
constexpr std::uint64_t BLOCK_STEP = 64;

// The smallest type that holds the values of all sources; the target's own unless that is larger. Parts are brought
// together in it, since small ones are moved in fewer steps, and then converted at once. Sources of one type meet in it
// where that is converted as it is stored: what is not placed is not converted.
std::size_t ChooseMeeting(const std::vector<std::size_t>& oParts, std::size_t nTargetPart)
{
    const auto bSame = [&](std::size_t nPart)
    {
        return nPart == oParts.front();
    };
    if (!oParts.empty() && std::all_of(oParts.begin(), oParts.end(), bSame) &&
        detail::GetKernels().GetMerge(oParts.front(), nTargetPart) != nullptr)
        return oParts.front();
    std::size_t nBest = nTargetPart;
    for (std::size_t nPart = 0; nPart < detail::PART_COUNT; ++nPart)
    {
        const auto bCovered = [nPart](std::size_t nSource)
        {
            return detail::PartCovers(nPart, nSource);
        };
        if (detail::PART_BYTES[nPart] < detail::PART_BYTES[nBest] &&
            std::all_of(oParts.begin(), oParts.end(), bCovered))
            nBest = nPart;
    }
    return nBest;
}

} // namespace

// A source, as parts of the meeting type, is a stream; one of shorter unsigned integers is so as it is, since what is
// missing of them is zeros. The bytes of the result follow a pattern that repeats every few pixels, a period: for each
// of its vectors there is a list of terms.
class Merger::Plan
{
public:
    Plan(const std::vector<MergeSource>& oSources, BufferType eTarget, const std::vector<MergeChannel>& oChannels);

    bool CountsChanges() const { return mpCount != nullptr; }
    std::uint64_t Run(const std::vector<const unsigned char*>& oSources, unsigned char* pTarget, std::uint64_t nPixels);

private:
    struct Stream
    {
        detail::Converter mpConvert = nullptr; // null when the source is the stream
        std::size_t mnSourceBytes = 0;         // of a pixel
        std::size_t mnParts = 0;
        std::size_t mnPartBytes = 0;
        std::size_t mnBytes = 0;            // of a pixel of the stream
        std::size_t mnReach = 0;            // bytes from the beginning of a period that its loads may touch
        unsigned char* mpScratch = nullptr; // of a block, for what is converted
        unsigned char* mpRest = nullptr;    // of a block, for pixels near whose end a load would reach too far
        const unsigned char* mpBlock = nullptr;
        std::uint64_t mnAvailable = 0; // bytes from mpBlock
    };

    struct Part
    {
        std::size_t mnStream = 0;
        std::size_t mnOffset = 0; // bytes in the stream's pixel
        std::size_t mnBytes = 0;  // 0: nothing is placed there
    };

    struct Term
    {
        std::size_t mnStream;
        std::size_t mnOffset;
        unsigned char moShuffle[MAX_VECTOR];
    };

    void AddStreams(const std::vector<MergeSource>& oSources, const std::vector<MergeChannel>& oChannels);
    void PlaceParts(const std::vector<MergeSource>& oSources, const std::vector<MergeChannel>& oChannels);
    void MakeVectors();
    void AddTerms(std::size_t nVector, std::size_t nStream);
    void MakeScratch();
    void PrepareStreams(const std::vector<const unsigned char*>& oSources, std::uint64_t nFirst, std::uint64_t nPixels,
                        std::size_t nCount);
    std::uint64_t MergeBlock(unsigned char* pTarget, std::size_t nPixels);
    std::uint64_t MergePeriods(detail::MergeLoop pMerge, unsigned char* pTarget, std::size_t nPixelBytes,
                               std::size_t nPixels, std::size_t& nDone);
    void MergeRest(detail::MergeLoop pMerge, std::size_t nFirst, std::size_t nPixels);
    void MergePixels(std::size_t nFirst, std::size_t nPixels);

    const detail::Kernels& moKernels = detail::GetKernels();
    const std::size_t mnVector = moKernels.mnVectorBytes;
    const std::size_t mnLoad = moKernels.mnLoadBytes;
    detail::Layout moTarget;
    std::size_t mnMeeting = 0;
    std::vector<Stream> moStreams;
    std::vector<Part> moParts; // of a pixel of the result
    bool mbIdentity = false;   // the result is the stream of the only source
    detail::ChangeCounter mpCount = nullptr;
    std::size_t mnMergedBytes = 0;
    std::size_t mnTargetBytes = 0;
    std::size_t mnPeriodPixels = 0;
    std::vector<Term> moTerms;
    std::vector<std::size_t> moFirstTerms; // of each vector, and the count of all at the end
    std::vector<detail::MergeTerm> moVectorTerms;
    std::uint64_t mnBlockPixels = 0;
    std::unique_ptr<unsigned char[]> mpoScratch;
    unsigned char* mpMerged = nullptr;
};

Merger::Plan::Plan(const std::vector<MergeSource>& oSources, BufferType eTarget,
                   const std::vector<MergeChannel>& oChannels)
    : moTarget(detail::LayoutOf(eTarget, "eTarget", Place::Current()))
{
    AddStreams(oSources, oChannels);
    PlaceParts(oSources, oChannels);
    mnTargetBytes = moParts.size() * moTarget.PartBytes();
    mnMergedBytes = moParts.size() * detail::PART_BYTES[mnMeeting];
    if (mbIdentity || moParts.empty())
        return;
    if (moKernels.GetMerge(mnMeeting, moTarget.mnPart) != nullptr && !detail::PartCovers(moTarget.mnPart, mnMeeting))
        mpCount = moKernels.GetCounter(mnMeeting, moTarget.mnPart);
    MakeVectors();
    MakeScratch();
}

void Merger::Plan::AddStreams(const std::vector<MergeSource>& oSources, const std::vector<MergeChannel>& oChannels)
{
    std::vector<std::size_t> oPartTypes;
    for (const MergeChannel& oChannel : oChannels)
    {
        if (oChannel.mnSource == MergeChannel::NOWHERE)
            continue;
        if (oChannel.mnSource >= oSources.size() || oChannel.mnChannel >= oSources[oChannel.mnSource].mnChannels)
            throw DataException("There is no channel " + std::to_string(oChannel.mnChannel) + " of source " +
                                std::to_string(oChannel.mnSource));
        oPartTypes.push_back(detail::LayoutOf(oSources[oChannel.mnSource].meType, "oSources", Place::Current()).mnPart);
    }
    mnMeeting = ChooseMeeting(oPartTypes, moTarget.mnPart);
    std::uint64_t nPixelBytes = std::uint64_t{16} * oChannels.size();
    for (const MergeSource& oSource : oSources)
    {
        const detail::Layout oLayout = detail::LayoutOf(oSource.meType, "oSources", Place::Current());
        nPixelBytes += std::uint64_t{16} * oSource.mnChannels;
        Stream oStream;
        oStream.mnParts = oSource.mnChannels * oLayout.mnParts;
        oStream.mnSourceBytes = oStream.mnParts * oLayout.PartBytes();
        const bool bAsIs = oLayout.mnPart == mnMeeting || detail::IsZeroExtended(mnMeeting, oLayout.mnPart);
        oStream.mnPartBytes = detail::PART_BYTES[bAsIs ? oLayout.mnPart : mnMeeting];
        oStream.mnBytes = oStream.mnParts * oStream.mnPartBytes;
        if (!bAsIs)
            oStream.mpConvert = moKernels.GetConverter(oLayout.mnPart, mnMeeting);
        moStreams.push_back(oStream);
        if (nPixelBytes > std::numeric_limits<std::int32_t>::max())
            throw DataException("A pixel is too large");
    }
}

void Merger::Plan::PlaceParts(const std::vector<MergeSource>& oSources, const std::vector<MergeChannel>& oChannels)
{
    for (const MergeChannel& oChannel : oChannels)
    {
        const bool bPlaced = oChannel.mnSource != MergeChannel::NOWHERE;
        const std::size_t nSourceParts =
            bPlaced ? moStreams[oChannel.mnSource].mnParts / oSources[oChannel.mnSource].mnChannels : 0;
        const std::size_t nBytes = bPlaced ? moStreams[oChannel.mnSource].mnPartBytes : 0;
        for (std::size_t nPart = 0; nPart < moTarget.mnParts; ++nPart)
            moParts.push_back({oChannel.mnSource, (oChannel.mnChannel * nSourceParts + nPart) * nBytes,
                               nPart < nSourceParts ? nBytes : 0});
    }
    mbIdentity = moStreams.size() == 1 && moStreams.front().mnParts == moParts.size();
    for (std::size_t nPart = 0; nPart < moParts.size() && mbIdentity; ++nPart)
        mbIdentity = moParts[nPart].mnBytes != 0 && moParts[nPart].mnOffset == nPart * moParts[nPart].mnBytes;
    if (mbIdentity)
        moStreams.front().mpConvert = moKernels.GetConverter(
            detail::LayoutOf(oSources.front().meType, "oSources", Place::Current()).mnPart, moTarget.mnPart);
}

void Merger::Plan::MakeVectors()
{
    mnPeriodPixels = mnVector / std::gcd(mnVector, mnMergedBytes);
    const std::size_t nVectors = mnMergedBytes * mnPeriodPixels / mnVector;
    const std::size_t nPartBytes = detail::PART_BYTES[mnMeeting];
    std::vector<std::size_t> oStreams;
    for (std::size_t nVector = 0; nVector < nVectors; ++nVector)
    {
        moFirstTerms.push_back(moTerms.size());
        oStreams.clear();
        for (std::size_t nByte = nVector * mnVector; nByte < (nVector + 1) * mnVector; nByte += nPartBytes)
        {
            const Part& oPart = moParts[nByte % mnMergedBytes / nPartBytes];
            if (oPart.mnBytes != 0 && std::find(oStreams.begin(), oStreams.end(), oPart.mnStream) == oStreams.end())
                oStreams.push_back(oPart.mnStream);
        }
        for (const std::size_t nStream : oStreams)
            AddTerms(nVector, nStream);
    }
    moFirstTerms.push_back(moTerms.size());
    moVectorTerms.reserve(moTerms.size());
    for (const Term& oTerm : moTerms)
    {
        Stream& oStream = moStreams[oTerm.mnStream];
        oStream.mnReach = std::max(oStream.mnReach, oTerm.mnOffset + mnLoad);
        moVectorTerms.push_back({nullptr, mnPeriodPixels * oStream.mnBytes, oTerm.moShuffle});
    }
}

// Bytes that one load gives lie no more than a load apart. Loads begin at multiples of their length where that takes no
// more of them, since a load across two lines of the cache costs two; otherwise at the first byte that is still
// missing.
void Merger::Plan::AddTerms(std::size_t nVector, std::size_t nStream)
{
    constexpr std::size_t NOWHERE = std::numeric_limits<std::size_t>::max();
    const std::size_t nPartBytes = detail::PART_BYTES[mnMeeting];
    std::size_t oFrom[MAX_VECTOR]; // for each byte its place in the stream
    for (std::size_t nByte = 0; nByte < mnVector; ++nByte)
    {
        const std::size_t nAt = nVector * mnVector + nByte;
        const Part& oPart = moParts[nAt % mnMergedBytes / nPartBytes];
        const bool bMine = oPart.mnStream == nStream && nAt % nPartBytes < oPart.mnBytes;
        oFrom[nByte] =
            bMine ? nAt / mnMergedBytes * moStreams[nStream].mnBytes + oPart.mnOffset + nAt % nPartBytes : NOWHERE;
    }
    const auto MakeTerms = [&](bool bAligned)
    {
        std::vector<Term> oTerms;
        std::size_t oLeft[MAX_VECTOR];
        std::copy_n(oFrom, mnVector, oLeft);
        for (std::size_t nFirst = 0; (nFirst = *std::min_element(oLeft, oLeft + mnVector)) != NOWHERE;)
        {
            const std::size_t nBegin = bAligned ? nFirst / mnLoad * mnLoad : nFirst;
            Term oTerm = {nStream, nBegin, {}};
            for (std::size_t nByte = 0; nByte < mnVector; ++nByte)
            {
                const bool bInside = oLeft[nByte] - nBegin < mnLoad;
                oTerm.moShuffle[nByte] = bInside ? static_cast<unsigned char>(oLeft[nByte] - nBegin) : 0x80;
                if (bInside)
                    oLeft[nByte] = NOWHERE;
            }
            oTerms.push_back(oTerm);
        }
        return oTerms;
    };
    const std::vector<Term> oAligned = MakeTerms(true);
    const std::vector<Term> oEarliest = MakeTerms(false);
    const std::vector<Term>& oTerms = oAligned.size() <= oEarliest.size() ? oAligned : oEarliest;
    moTerms.insert(moTerms.end(), oTerms.begin(), oTerms.end());
}

void Merger::Plan::MakeScratch()
{
    std::uint64_t nPixelBytes = mnTargetBytes + mnMergedBytes;
    for (const Stream& oStream : moStreams)
        nPixelBytes += oStream.mnBytes;
    mnBlockPixels = std::max<std::uint64_t>(BLOCK_BYTES / nPixelBytes / BLOCK_STEP * BLOCK_STEP, MAX_VECTOR);

    const auto nAligned = [this](std::size_t nBytes) // and room for a load at the last byte
    {
        return (mnBlockPixels * nBytes + mnLoad + 63) / 64 * 64;
    };
    std::uint64_t nBytes = nAligned(mnMergedBytes);
    for (const Stream& oStream : moStreams)
        nBytes += nAligned(oStream.mnBytes) * (oStream.mpConvert != nullptr ? 2 : 1);
    mpoScratch = std::make_unique_for_overwrite<unsigned char[]>(nBytes);
    mpMerged = mpoScratch.get();
    unsigned char* pNext = mpMerged + nAligned(mnMergedBytes);
    for (Stream& oStream : moStreams)
    {
        oStream.mpRest = pNext;
        pNext += nAligned(oStream.mnBytes);
        if (oStream.mpConvert == nullptr)
            continue;
        oStream.mpScratch = pNext;
        pNext += nAligned(oStream.mnBytes);
    }
}

std::uint64_t Merger::Plan::Run(const std::vector<const unsigned char*>& oSources, unsigned char* pTarget,
                                std::uint64_t nPixels)
{
    std::uint64_t nChanged = 0;
    if (nPixels == 0 || moParts.empty())
        return nChanged;
    if (mbIdentity)
    {
        moStreams.front().mpConvert(oSources.front(), pTarget, nPixels * moParts.size());
        return nChanged;
    }
    for (std::uint64_t nFirst = 0; nFirst < nPixels; nFirst += mnBlockPixels)
    {
        const auto nCount = static_cast<std::size_t>(std::min(mnBlockPixels, nPixels - nFirst));
        PrepareStreams(oSources, nFirst, nPixels, nCount);
        nChanged += MergeBlock(pTarget + nFirst * mnTargetBytes, nCount);
    }
    return nChanged;
}

std::uint64_t Merger::Plan::MergeBlock(unsigned char* pTarget, std::size_t nPixels)
{
    const detail::MergeLoop pDirect = moKernels.GetMerge(mnMeeting, moTarget.mnPart);
    const detail::MergeLoop pPlain = moKernels.GetMerge(mnMeeting, mnMeeting);
    std::size_t nDone = 0;
    std::size_t nMerged = 0;
    std::uint64_t nChanged = 0;
    if (pDirect != nullptr)
    {
        nChanged = MergePeriods(pDirect, pTarget, mnTargetBytes, nPixels, nDone);
        nMerged = nDone;
    }
    else if (pPlain != nullptr)
        MergePeriods(pPlain, mpMerged, mnMergedBytes, nPixels, nMerged);
    if (nDone == nPixels)
        return nChanged;
    if (pPlain != nullptr && nMerged < nPixels)
        MergeRest(pPlain, nMerged, nPixels);
    else
        MergePixels(nMerged, nPixels);
    const unsigned char* const pRest = mpMerged + nDone * mnMergedBytes;
    unsigned char* const pTargetRest = pTarget + nDone * mnTargetBytes;
    const std::size_t nRest = (nPixels - nDone) * moParts.size();
    moKernels.GetConverter(mnMeeting, moTarget.mnPart)(pRest, pTargetRest, nRest);
    return nChanged + (mpCount != nullptr ? mpCount(pRest, pTargetRest, nRest, 1) : 0);
}

void Merger::Plan::PrepareStreams(const std::vector<const unsigned char*>& oSources, std::uint64_t nFirst,
                                  std::uint64_t nPixels, std::size_t nCount)
{
    for (std::size_t nStream = 0; nStream < moStreams.size(); ++nStream)
    {
        Stream& oStream = moStreams[nStream];
        oStream.mpBlock = oSources[nStream] + nFirst * oStream.mnSourceBytes;
        oStream.mnAvailable = (nPixels - nFirst) * oStream.mnBytes;
        if (oStream.mpConvert == nullptr || oStream.mnReach == 0)
            continue;
        oStream.mpConvert(oStream.mpBlock, oStream.mpScratch, nCount * oStream.mnParts);
        oStream.mpBlock = oStream.mpScratch;
        oStream.mnAvailable = nCount * oStream.mnBytes + mnLoad;
    }
}

// The whole periods whose loads stay within the streams; nDone: their pixels.
std::uint64_t Merger::Plan::MergePeriods(detail::MergeLoop pMerge, unsigned char* pTarget, std::size_t nPixelBytes,
                                         std::size_t nPixels, std::size_t& nDone)
{
    std::uint64_t nPeriods = nPixels / mnPeriodPixels;
    for (const Stream& oStream : moStreams)
    {
        const std::uint64_t nStep = mnPeriodPixels * oStream.mnBytes;
        if (oStream.mnReach > oStream.mnAvailable)
            nPeriods = 0;
        else if (oStream.mnReach != 0)
            nPeriods = std::min(nPeriods, (oStream.mnAvailable - oStream.mnReach) / nStep + 1);
    }
    for (std::size_t nTerm = 0; nTerm < moTerms.size(); ++nTerm)
        moVectorTerms[nTerm].mpSource = moStreams[moTerms[nTerm].mnStream].mpBlock + moTerms[nTerm].mnOffset;
    const std::size_t nVectors = moFirstTerms.size() - 1;
    const std::size_t nPeriodBytes = mnPeriodPixels * nPixelBytes;
    std::uint64_t nChanged = 0;
    for (std::size_t nVector = 0; nVector < nVectors; ++nVector)
        nChanged +=
            pMerge(moVectorTerms.data() + moFirstTerms[nVector], moFirstTerms[nVector + 1] - moFirstTerms[nVector],
                   pTarget + nVector * (nPeriodBytes / nVectors), nPeriodBytes, static_cast<std::size_t>(nPeriods));
    nDone = static_cast<std::size_t>(nPeriods) * mnPeriodPixels;
    return nChanged;
}

// Copies what is left of the streams to where loads may reach beyond it, and merges whole periods of that.
void Merger::Plan::MergeRest(detail::MergeLoop pMerge, std::size_t nFirst, std::size_t nPixels)
{
    const std::size_t nPeriods = (nPixels - nFirst + mnPeriodPixels - 1) / mnPeriodPixels;
    for (Stream& oStream : moStreams)
    {
        if (oStream.mnReach == 0)
            continue;
        std::memcpy(oStream.mpRest, oStream.mpBlock + nFirst * oStream.mnBytes, (nPixels - nFirst) * oStream.mnBytes);
        oStream.mpBlock = oStream.mpRest;
        oStream.mnAvailable = mnBlockPixels * oStream.mnBytes + mnLoad;
    }
    std::size_t nDone = 0;
    MergePeriods(pMerge, mpMerged + nFirst * mnMergedBytes, mnMergedBytes, nPeriods * mnPeriodPixels, nDone);
}

void Merger::Plan::MergePixels(std::size_t nFirst, std::size_t nPixels)
{
    const std::size_t nPartBytes = detail::PART_BYTES[mnMeeting];
    for (std::size_t nPixel = nFirst; nPixel < nPixels; ++nPixel)
        for (std::size_t nPart = 0; nPart < moParts.size(); ++nPart)
        {
            const Part& oPart = moParts[nPart];
            unsigned char* const pTo = mpMerged + nPixel * mnMergedBytes + nPart * nPartBytes;
            std::memset(pTo, 0, nPartBytes);
            if (oPart.mnBytes != 0)
                std::memcpy(pTo,
                            moStreams[oPart.mnStream].mpBlock + nPixel * moStreams[oPart.mnStream].mnBytes +
                                oPart.mnOffset,
                            oPart.mnBytes);
        }
}

Merger::Merger(const std::vector<MergeSource>& oSources, BufferType eTarget, const std::vector<MergeChannel>& oChannels)
    : mpoPlan(std::make_unique<Plan>(oSources, eTarget, oChannels))
{
}

Merger::~Merger() = default;

bool Merger::CountsChanges() const
{
    return mpoPlan->CountsChanges();
}

std::uint64_t Merger::Run(const std::vector<const unsigned char*>& oSources, unsigned char* pTarget,
                          std::uint64_t nPixels)
{
    return mpoPlan->Run(oSources, pTarget, nPixels);
}

} // namespace krv::raster
