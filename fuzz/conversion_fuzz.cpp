// Values of every type as every other: CopyData, Merger and Splitter of any shape beside a conversion value by value.
#include "fuzz/support/choices.h"
#include "tests/support/conversionmodel.h"
#include "toolkit/raster/copydata.h"
#include "toolkit/raster/merger.h"
#include "toolkit/raster/splitter.h"

#include <memory>

namespace
{

using namespace krv::raster;
using krv::fuzz::Check;
using krv::fuzz::Choices;
using krv::test::Type;

// Exactly the bytes that are used, at an odd place when asked, so that a sanitizer sees each one too many.
class Buffer
{
public:
    Buffer(std::size_t nBytes, std::size_t nOffset)
        : mnOffset(nOffset), mnBytes(nBytes), mpBytes(new unsigned char[nOffset + nBytes])
    {
        std::fill_n(mpBytes.get(), nOffset + nBytes, static_cast<unsigned char>(0xAA));
    }
    unsigned char* Get() const { return mpBytes.get() + mnOffset; }
    std::size_t GetSize() const { return mnBytes; }

private:
    std::size_t mnOffset;
    std::size_t mnBytes;
    std::unique_ptr<unsigned char[]> mpBytes;
};

// Values where conversions differ, small ones, or any bytes.
void FillValues(const Buffer& oBuffer, const Type& oType, Choices& oChoices)
{
    const unsigned int nKind = oChoices.Below(3);
    std::mt19937 oRandom = oChoices.Random();
    const auto nPart = static_cast<std::size_t>(oType.mpoPart->mnBytes);
    const std::vector<unsigned char> oValues = krv::test::BoundaryValues(*oType.mpoPart);
    for (std::size_t i = 0; i < oBuffer.GetSize(); i += nPart)
    {
        if (nKind == 0)
            std::memcpy(oBuffer.Get() + i, &oValues[oRandom() % (oValues.size() / nPart) * nPart], nPart);
        else if (nKind == 1)
            oType.mpoPart->Store(oBuffer.Get() + i,
                                 krv::test::ModelPart(static_cast<int>(oRandom() % 600) - 300, *oType.mpoPart));
        else
            for (std::size_t nByte = 0; nByte < nPart; ++nByte)
                oBuffer.Get()[i + nByte] = static_cast<unsigned char>(oRandom() >> 8);
    }
}

void CheckBuffer(const Buffer& oGot, const Buffer& oExpected, const Type& oType, const std::string& what)
{
    for (std::size_t i = 0; i < oGot.GetSize(); i += static_cast<std::size_t>(oType.mpoPart->mnBytes))
        if (!krv::test::Same(oGot.Get() + i, oExpected.Get() + i, *oType.mpoPart))
            Check(false, what + ", byte " + std::to_string(i));
}

std::size_t ChoosePixels(Choices& oChoices)
{
    return oChoices.OneIn(8) ? oChoices.Below(5000) : oChoices.Below(80);
}

void TryCopy(Choices& oChoices)
{
    const auto eFrom = static_cast<BufferType>(oChoices.Below(15)), eTo = static_cast<BufferType>(oChoices.Below(15));
    const Type oFrom(eFrom), oTo(eTo);
    const std::size_t nPixels = ChoosePixels(oChoices);
    const unsigned int nChannels = oChoices.OneIn(16) ? oChoices.Below(1200) : 1 + oChoices.Below(6);
    const std::size_t nFromStride = oChoices.OneIn(8) ? 0 : nChannels + oChoices.Below(2) * oChoices.Below(4);
    const std::size_t nToStride = nChannels + oChoices.Below(2) * oChoices.Below(4);
    if (nPixels * nToStride > 200000)
        return;
    const auto SizeOf = [&](std::size_t nStride, const Type& oType)
    {
        return nPixels == 0 ? 0 : ((nPixels - 1) * nStride + nChannels) * oType.Bytes();
    };
    const Buffer oSource(SizeOf(nFromStride, oFrom), oChoices.Below(16));
    const Buffer oTarget(SizeOf(nToStride, oTo), oChoices.Below(16)), oExpected(oTarget.GetSize(), 0);
    FillValues(oSource, oFrom, oChoices);
    for (std::size_t i = 0; i < nPixels * nChannels; ++i)
        krv::test::ModelValue(oSource.Get() + (i / nChannels * nFromStride + i % nChannels) * oFrom.Bytes(), oFrom,
                              oExpected.Get() + (i / nChannels * nToStride + i % nChannels) * oTo.Bytes(), oTo);
    CopyData(oSource.Get(), eFrom, nFromStride, oTarget.Get(), eTo, nToStride, nPixels, nChannels);
    CheckBuffer(oTarget, oExpected, oTo, "copy of type " + std::to_string(eFrom) + " to " + std::to_string(eTo));
}

void TryMerge(Choices& oChoices)
{
    // Small unsigned integers and reals alone meet in a smaller type.
    constexpr BufferType SMALL[] = {eBT_8U, eBT_16U, eBT_16S, eBT_32R};
    const auto eTo = static_cast<BufferType>(oChoices.Below(15));
    const Type oTo(eTo);
    const std::size_t nPixels = ChoosePixels(oChoices);
    const bool bSmall = oChoices.OneIn(2), bInOrder = oChoices.OneIn(3);
    std::vector<MergeSource> oSources(1 + oChoices.Below(4));
    std::vector<Buffer> oBuffers;
    std::vector<const unsigned char*> oPointers;
    for (MergeSource& oSource : oSources)
    {
        oSource = {bSmall ? oChoices.Of(SMALL) : static_cast<BufferType>(oChoices.Below(15)), oChoices.Below(6)};
        const Type oFrom(oSource.meType);
        oBuffers.emplace_back(nPixels * oSource.mnChannels * oFrom.Bytes(), oChoices.Below(16));
        FillValues(oBuffers.back(), oFrom, oChoices);
        oPointers.push_back(oBuffers.back().Get());
    }
    std::vector<MergeChannel> oChannels(1 + oChoices.Below(12));
    for (unsigned int i = 0; i < oChannels.size(); ++i)
    {
        const unsigned int nSource = bInOrder ? 0 : oChoices.Below(oSources.size());
        const unsigned int nCount = oSources[nSource].mnChannels;
        if (nCount != 0 && !oChoices.OneIn(8))
            oChannels[i] = {nSource, bInOrder ? i % nCount : oChoices.Below(nCount)};
    }
    const Buffer oTarget(nPixels * oChannels.size() * oTo.Bytes(), oChoices.Below(16)), oExpected(oTarget.GetSize(), 0);
    std::fill_n(oExpected.Get(), oExpected.GetSize(), static_cast<unsigned char>(0));
    for (std::size_t i = 0; i < nPixels * oChannels.size(); ++i)
    {
        const MergeChannel& oChannel = oChannels[i % oChannels.size()];
        if (oChannel.mnSource == MergeChannel::NOWHERE)
            continue;
        const MergeSource& oSource = oSources[oChannel.mnSource];
        const Type oFrom(oSource.meType);
        const std::size_t nValue = i / oChannels.size() * oSource.mnChannels + oChannel.mnChannel;
        krv::test::ModelValue(oPointers[oChannel.mnSource] + nValue * oFrom.Bytes(), oFrom,
                              oExpected.Get() + i * oTo.Bytes(), oTo);
    }
    Merger(oSources, eTo, oChannels).Run(oPointers, oTarget.Get(), nPixels);
    CheckBuffer(oTarget, oExpected, oTo, "merge to type " + std::to_string(eTo));
}

void TrySplit(Choices& oChoices)
{
    const auto eFrom = static_cast<BufferType>(oChoices.Below(15));
    const Type oFrom(eFrom);
    const std::size_t nPixels = ChoosePixels(oChoices);
    const unsigned int nSourceChannels = 1 + oChoices.Below(8);
    const Buffer oSource(nPixels * nSourceChannels * oFrom.Bytes(), oChoices.Below(16));
    FillValues(oSource, oFrom, oChoices);
    std::vector<SplitTarget> oTargets(1 + oChoices.Below(4));
    std::vector<Buffer> oBuffers, oExpected;
    std::vector<unsigned char*> oPointers;
    std::vector<std::uint64_t> oCounts, oExpectedCounts;
    for (SplitTarget& oTarget : oTargets)
    {
        oTarget.meType = static_cast<BufferType>(oChoices.Below(15));
        const Type oTo(oTarget.meType);
        const bool bInOrder = oChoices.OneIn(3);
        oTarget.moChannels.resize(bInOrder ? nSourceChannels : oChoices.Below(6));
        for (unsigned int i = 0; i < oTarget.moChannels.size(); ++i)
            oTarget.moChannels[i] = bInOrder ? i : oChoices.Below(nSourceChannels);
        const std::size_t nBytes = nPixels * oTarget.moChannels.size() * oTo.Bytes();
        oBuffers.emplace_back(nBytes, oChoices.Below(16));
        oExpected.emplace_back(nBytes, 0);
        oPointers.push_back(oBuffers.back().Get());
        const std::size_t nFirst = oExpectedCounts.size();
        oExpectedCounts.resize(nFirst + oTarget.moChannels.size());
        for (std::size_t i = 0; i < nPixels * oTarget.moChannels.size(); ++i)
        {
            const std::size_t nChannel = i % oTarget.moChannels.size();
            const unsigned char* const pFrom =
                oSource.Get() +
                (i / oTarget.moChannels.size() * nSourceChannels + oTarget.moChannels[nChannel]) * oFrom.Bytes();
            unsigned char* const pTo = oExpected.back().Get() + i * oTo.Bytes();
            krv::test::ModelValue(pFrom, oFrom, pTo, oTo);
            bool bChanged = false;
            for (int nPart = 0; nPart < oFrom.mnParts; ++nPart)
            {
                const long double nWas = oFrom.mpoPart->Load(pFrom + nPart * oFrom.mpoPart->mnBytes);
                const long double nIs = nPart < oTo.mnParts ? oTo.mpoPart->Load(pTo + nPart * oTo.mpoPart->mnBytes) : 0;
                bChanged = bChanged || !(nWas == nIs || (std::isnan(nWas) && std::isnan(nIs)));
            }
            oExpectedCounts[nFirst + nChannel] += bChanged ? 1 : 0;
        }
    }
    oCounts.resize(oExpectedCounts.size());
    const bool bCount = !oChoices.OneIn(4);
    Splitter(eFrom, nSourceChannels, oTargets)
        .Run(oSource.Get(), oPointers, nPixels, bCount ? oCounts.data() : nullptr);
    for (std::size_t i = 0; i < oTargets.size(); ++i)
        CheckBuffer(oBuffers[i], oExpected[i], Type(oTargets[i].meType),
                    "split of type " + std::to_string(eFrom) + " to " + std::to_string(oTargets[i].meType));
    Check(!bCount || oCounts == oExpectedCounts, "changed values of type " + std::to_string(eFrom));
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* poBytes, std::size_t nBytes)
{
    Choices oChoices(poBytes, nBytes);
    const unsigned int nKind = oChoices.Below(3);
    if (nKind == 1)
        TryMerge(oChoices);
    else if (nKind == 2)
        TrySplit(oChoices);
    else
        TryCopy(oChoices);
    return 0;
}
