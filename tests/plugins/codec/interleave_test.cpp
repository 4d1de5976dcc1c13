#include "plugins/support/codec/interleave.h"

#include "tests/plugins/codec/blocks.h"

#include <gtest/gtest.h>

#include <cstring>

namespace
{

using namespace krv::plugins::codec;
using krv::test::Bytes;
using krv::test::Exact;

// A random rectangle of one of the sample sizes, with pitches that leave gaps.
struct Shape
{
    std::mt19937 moRandom;
    PixelArea moArea;
    std::size_t mnChannels;
    std::size_t mnGap;
    std::string moText;

    explicit Shape(unsigned int nSeed) : moRandom(nSeed)
    {
        moArea.mnSampleBytes = std::size_t{1} << moRandom() % 5;
        moArea.mnWidth = moRandom() % 8 == 0 ? 500 + moRandom() % 3000 : 1 + moRandom() % 80;
        moArea.mnRows = 1 + moRandom() % 3;
        mnChannels = moRandom() % 4 == 0 ? 1 + moRandom() % 40 : 1 + moRandom() % 9;
        mnGap = moRandom() % 4;
        moText = "seed " + std::to_string(nSeed) + ": " + std::to_string(moArea.mnWidth) + " pixels of " +
                 std::to_string(mnChannels) + " x " + std::to_string(moArea.mnSampleBytes);
    }

    std::size_t GetPitch(std::size_t nChannels) const
    {
        return moArea.mnWidth * nChannels * moArea.mnSampleBytes + mnGap;
    }
    std::size_t GetBytes(std::size_t nChannels) const { return GetPitch(nChannels) * moArea.mnRows - mnGap; }
    Bytes MakeBlock(std::size_t nChannels) { return krv::test::RandomBytes(moRandom, GetBytes(nChannels)); }

    // Where channel nChannel of pixel x, y stands in a block of nChannels.
    std::size_t At(std::size_t x, std::size_t y, std::size_t nChannel, std::size_t nChannels) const
    {
        return y * GetPitch(nChannels) + (x * nChannels + nChannel) * moArea.mnSampleBytes;
    }

    // Moves one channel, sample by sample.
    void Move(const Bytes& oFrom, std::size_t nFrom, std::size_t nFromChannels, Bytes& oTo, std::size_t nTo,
              std::size_t nToChannels) const
    {
        for (std::size_t y = 0; y < moArea.mnRows; ++y)
            for (std::size_t x = 0; x < moArea.mnWidth; ++x)
                std::memcpy(&oTo[At(x, y, nTo, nToChannels)], &oFrom[At(x, y, nFrom, nFromChannels)],
                            moArea.mnSampleBytes);
    }
};

constexpr unsigned int CASES = 1500;

TEST(Interleave, ChannelsAreGatheredInAnyOrder)
{
    for (unsigned int nSeed = 0; nSeed < CASES; ++nSeed)
    {
        Shape oShape(nSeed);
        std::vector<std::size_t> oChannels(1 + oShape.moRandom() % 9);
        for (std::size_t i = 0; i < oChannels.size(); ++i)
            oChannels[i] = nSeed % 5 == 0 && i < oShape.mnChannels ? i : oShape.moRandom() % oShape.mnChannels;
        Exact oSource(oShape.MakeBlock(oShape.mnChannels)), oResult(oShape.MakeBlock(oChannels.size()));
        Bytes oExpected = oResult.ToBytes();
        for (std::size_t i = 0; i < oChannels.size(); ++i)
            oShape.Move(oSource.ToBytes(), oChannels[i], oShape.mnChannels, oExpected, i, oChannels.size());
        GatherChannels(oSource.data(), oShape.GetPitch(oShape.mnChannels), oShape.mnChannels, oResult.data(),
                       oShape.GetPitch(oChannels.size()), oChannels.data(), oChannels.size(), oShape.moArea);
        ASSERT_TRUE(oExpected == oResult.ToBytes()) << oShape.moText << " to " << oChannels.size();
    }
}

TEST(Interleave, OneChannelIsPlacedAndExtracted)
{
    for (unsigned int nSeed = 0; nSeed < CASES; ++nSeed)
    {
        Shape oShape(nSeed);
        const std::size_t n = oShape.mnChannels, k = oShape.moRandom() % n;
        Exact oPlane(oShape.MakeBlock(1)), oBlock(oShape.MakeBlock(n));
        Bytes oExpected = oBlock.ToBytes();
        oShape.Move(oPlane.ToBytes(), 0, 1, oExpected, k, n);
        PlaceChannel(oPlane.data(), oShape.GetPitch(1), oBlock.data(), oShape.GetPitch(n), k, n, oShape.moArea);
        ASSERT_TRUE(oExpected == oBlock.ToBytes()) << oShape.moText << ", placed";

        const Bytes oPlain = oPlane.ToBytes();
        std::fill_n(oPlane.data(), oPlane.size(), 0);
        ExtractChannel(oBlock.data(), oShape.GetPitch(n), k, n, oPlane.data(), oShape.GetPitch(1), oShape.moArea);
        for (std::size_t y = 0; y < oShape.moArea.mnRows; ++y)
            ASSERT_EQ(0, std::memcmp(&oPlain[oShape.At(0, y, 0, 1)], oPlane.data() + oShape.At(0, y, 0, 1),
                                     oShape.moArea.mnWidth * oShape.moArea.mnSampleBytes))
                << oShape.moText << ", extracted";
    }
}

TEST(Interleave, PlanesComeTogether)
{
    for (unsigned int nSeed = 0; nSeed < CASES; ++nSeed)
    {
        Shape oShape(nSeed);
        const std::size_t n = oShape.mnChannels;
        std::vector<Exact> oPlanes;
        std::vector<const unsigned char*> oPointers;
        Exact oBlock(oShape.MakeBlock(n));
        Bytes oExpected = oBlock.ToBytes();
        for (std::size_t k = 0; k < n; ++k)
        {
            const bool bAgain = k > 0 && oShape.moRandom() % 4 == 0; // a plane that stands in the list before
            oPlanes.emplace_back(oShape.MakeBlock(1));
            oPointers.push_back(bAgain ? oPointers.back() : oPlanes.back().data());
            const Bytes oPlane(oPointers.back(), oPointers.back() + oShape.GetBytes(1));
            oShape.Move(oPlane, 0, 1, oExpected, k, n);
        }
        InterleavePlanes(oPointers.data(), oShape.GetPitch(1), oBlock.data(), oShape.GetPitch(n), n, oShape.moArea);
        ASSERT_TRUE(oExpected == oBlock.ToBytes()) << oShape.moText;
    }
}

} // namespace
