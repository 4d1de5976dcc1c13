#include "plugins/support/codec/predictor.h"

#include "tests/plugins/codec/blocks.h"

#include <gtest/gtest.h>

#include <cstring>

namespace
{

using namespace krv::plugins::codec;
using krv::test::Bytes;
using krv::test::Exact;

std::uint64_t Get(const unsigned char* at, std::size_t nBytes)
{
    std::uint64_t nValue = 0;
    std::memcpy(&nValue, at, nBytes); // little endian
    return nValue;
}

// The differences of samples, one by one.
Bytes Difference(const Bytes& oRow, std::size_t nChannels, std::size_t nSampleBytes)
{
    Bytes oResult = oRow;
    for (std::size_t i = nChannels * nSampleBytes; i < oRow.size(); i += nSampleBytes)
    {
        const std::uint64_t nDifference =
            Get(&oRow[i], nSampleBytes) - Get(&oRow[i - nChannels * nSampleBytes], nSampleBytes);
        std::memcpy(&oResult[i], &nDifference, nSampleBytes);
    }
    return oResult;
}

Bytes SwapSamples(Bytes oRow, std::size_t nSampleBytes)
{
    for (std::size_t i = 0; i < oRow.size(); i += nSampleBytes)
        std::reverse(oRow.begin() + static_cast<std::ptrdiff_t>(i),
                     oRow.begin() + static_cast<std::ptrdiff_t>(i + nSampleBytes));
    return oRow;
}

// Planes of bytes, the most significant first, and their differences.
Bytes SpreadAndDifference(const Bytes& oRow, std::size_t nChannels, std::size_t nSampleBytes)
{
    const std::size_t nSamples = oRow.size() / nSampleBytes;
    Bytes oPlanes(oRow.size());
    for (std::size_t i = 0; i < oRow.size(); ++i)
        oPlanes[(nSampleBytes - 1 - i % nSampleBytes) * nSamples + i / nSampleBytes] = oRow[i];
    return Difference(oPlanes, nChannels, 1);
}

using Coding = Bytes (*)(const Bytes& oRow, std::size_t nChannels, std::size_t nSampleBytes);

// Rows with gaps between them that must stay as they are.
struct Rows
{
    std::size_t mnPitch;
    Bytes moBytes;

    Rows(const std::vector<Bytes>& oRows, std::size_t nGap) : mnPitch(oRows[0].size() + nGap)
    {
        for (const Bytes& oRow : oRows)
        {
            moBytes.insert(moBytes.end(), oRow.begin(), oRow.end());
            if (&oRow != &oRows.back())
                moBytes.insert(moBytes.end(), nGap, 0xEE);
        }
    }
};

struct Case
{
    std::vector<Bytes> moPlain;
    std::vector<Bytes> moCoded;
    BlockShape moShape;
    std::string moText;
};

// A random shape with random content, coded by the plain functions above.
Case MakeCase(unsigned int nSeed, const std::vector<std::size_t>& oSampleBytes, Coding oCoding)
{
    std::mt19937 oRandom(nSeed);
    Case oCase;
    BlockShape& oShape = oCase.moShape;
    oShape.mnSampleBytes = oSampleBytes[oRandom() % oSampleBytes.size()];
    oShape.mnChannels = oRandom() % 3 == 0 ? 1 + oRandom() % 150 : 1 + oRandom() % 6;
    oShape.mnWidth = 1 + oRandom() % 70;
    oShape.mnRows = 1 + oRandom() % 3;
    for (std::size_t i = 0; i < oShape.mnRows; ++i)
    {
        oCase.moPlain.push_back(krv::test::RandomBytes(oRandom, oShape.GetRowBytes()));
        oCase.moCoded.push_back(oCoding(oCase.moPlain.back(), oShape.mnChannels, oShape.mnSampleBytes));
    }
    oCase.moText = "seed " + std::to_string(nSeed);
    return oCase;
}

// Runs oWork out of place with different gaps, then in place, and expects the same rows both times.
template <typename Work>
void ExpectRows(const std::vector<Bytes>& oFrom, const std::vector<Bytes>& oTo, const std::string& text, Work oWork)
{
    const Rows oSource(oFrom, 5), oExpected(oTo, 9), oExpectedInPlace(oTo, 5);
    Exact oStored(oSource.moBytes), oApart(oExpected.moBytes.size());
    std::fill_n(oApart.data(), oApart.size(), 0xEE);
    oWork(oStored.data(), oSource.mnPitch, oApart.data(), oExpected.mnPitch);
    ASSERT_TRUE(oExpected.moBytes == oApart.ToBytes()) << text;
    oWork(oStored.data(), oSource.mnPitch, oStored.data(), oSource.mnPitch);
    ASSERT_TRUE(oExpectedInPlace.moBytes == oStored.ToBytes()) << text << ", in place";
}

constexpr unsigned int CASES = 1500;

TEST(Predictor, HorizontalDifferencesComeAndGo)
{
    for (unsigned int nSeed = 0; nSeed < CASES; ++nSeed)
    {
        Case oCase = MakeCase(nSeed, {1, 2, 4, 8}, &Difference);
        const SampleOrder oOrder = nSeed % 2 == 0 ? SampleOrder::eNative : SampleOrder::eSwapped;
        if (oOrder == SampleOrder::eSwapped)
            for (Bytes& oRow : oCase.moCoded)
                oRow = SwapSamples(oRow, oCase.moShape.mnSampleBytes);
        ExpectRows(oCase.moCoded, oCase.moPlain, oCase.moText + ", undo",
                   [&](auto... oPlaces) { UndoHorizontal(oPlaces..., oCase.moShape, oOrder); });
        ExpectRows(oCase.moPlain, oCase.moCoded, oCase.moText + ", apply",
                   [&](auto... oPlaces) { ApplyHorizontal(oPlaces..., oCase.moShape, oOrder); });
        if (HasFatalFailure())
            return;
    }
}

TEST(Predictor, FloatingPointPlanesComeAndGo)
{
    std::vector<unsigned char> oScratch;
    for (unsigned int nSeed = 0; nSeed < CASES; ++nSeed)
    {
        const Case oCase = MakeCase(nSeed, {2, 3, 4, 8}, &SpreadAndDifference);
        ExpectRows(oCase.moCoded, oCase.moPlain, oCase.moText + ", undo",
                   [&](auto... oPlaces) { UndoFloatingPoint(oPlaces..., oCase.moShape, oScratch); });
        ExpectRows(oCase.moPlain, oCase.moCoded, oCase.moText + ", apply",
                   [&](auto... oPlaces) { ApplyFloatingPoint(oPlaces..., oCase.moShape, oScratch); });
        if (HasFatalFailure())
            return;
    }
}

} // namespace
