// The inner loops of averages for every instruction set that this processor has, against the baseline of the same
// loops.

#include "gobs/resampling/detail/averagekernels.h"
#include "toolkit/simd/processor.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <random>
#include <vector>

namespace krv::test
{

namespace
{

using namespace krv::gobs::detail;
using Find = decltype(&FindBaselineLoop);

std::vector<std::pair<const char*, Find>> GetSets()
{
    std::vector<std::pair<const char*, Find>> oSets{{"baseline", FindBaselineLoop}, {"chosen", FindReduceLoop}};
#if defined(__x86_64__)
    if (krv::simd::RunsAvx2())
        oSets.emplace_back("AVX2", FindAvx2Loop);
#endif
    return oSets;
}

// Exactly as many bytes as there are samples: a checker sees what is read or written beyond.
template <typename In, typename Sum, typename Mean>
void Expect(krv::gobs::NativeDataTypeCode eType, unsigned int nShift)
{
    std::mt19937_64 oRandom(nShift);
    const double nMost = std::is_floating_point_v<In> ? 1e6
                                                      : std::ldexp(static_cast<double>(sizeof(Mean) == 1 ? 255 : 65535),
                                                                   static_cast<int>(nShift) - 2);
    for (unsigned int nSamples = 1; nSamples <= MOST_LOOP_SAMPLES; ++nSamples)
        for (std::size_t nWidth = 1; nWidth < 150; nWidth += 1 + nWidth / 13)
        {
            constexpr std::size_t HEIGHT = 3;
            const std::size_t nRow = nWidth * nSamples;
            std::vector<In> oSource(4 * nRow * HEIGHT);
            for (In& nValue : oSource)
                nValue = static_cast<In>(
                    oRandom() % 3 == 0 ? nMost : std::fmod(static_cast<double>(oRandom() % 999983), nMost));
            std::vector<Sum> oExpected;
            std::vector<Mean> oExpectedMeans;
            for (const auto& [pName, pFind] : GetSets())
            {
                const ReduceLoop pLoop = pFind(eType, nSamples, sizeof(In), sizeof(Sum));
                ASSERT_NE(pLoop, nullptr);
                std::vector<Sum> oSums(nRow * HEIGHT);
                std::vector<Mean> oMeans(nRow * HEIGHT);
                const auto* const pSource = reinterpret_cast<const unsigned char*>(oSource.data());
                const std::size_t nPitch = 2 * nRow * sizeof(In);
                const ReduceJob oJob{pSource,
                                     pSource + nPitch,
                                     2 * nPitch,
                                     nWidth,
                                     HEIGHT,
                                     reinterpret_cast<unsigned char*>(oSums.data()),
                                     nRow * sizeof(Sum),
                                     reinterpret_cast<unsigned char*>(oMeans.data()),
                                     nRow * sizeof(Mean),
                                     nShift,
                                     nWidth % 2 == 0};
                pLoop(oJob);
                if (oExpected.empty())
                {
                    oExpected = oSums;
                    oExpectedMeans = oMeans;
                }
                ASSERT_EQ(oSums, oExpected) << pName << ", " << nSamples << " samples, width " << nWidth;
                ASSERT_EQ(oMeans, oExpectedMeans) << pName << ", " << nSamples << " samples, width " << nWidth;
            }
        }
}

} // namespace

TEST(AverageKernelsTest, AllInstructionSetsSayTheSame)
{
    using namespace krv::gobs;
    Expect<std::uint8_t, std::uint16_t, std::uint8_t>(eDT_8U, 2);
    Expect<std::uint16_t, std::uint16_t, std::uint8_t>(eDT_8U, 8);
    Expect<std::uint16_t, std::uint32_t, std::uint8_t>(eDT_8U, 10);
    Expect<std::uint32_t, std::uint32_t, std::uint8_t>(eDT_8U, 24);
    Expect<std::uint32_t, std::uint64_t, std::uint8_t>(eDT_8U, 26);
    Expect<std::uint64_t, std::uint64_t, std::uint8_t>(eDT_8U, 30);
    Expect<std::uint16_t, std::uint32_t, std::uint16_t>(eDT_16U, 2);
    Expect<std::uint32_t, std::uint32_t, std::uint16_t>(eDT_16U, 16);
    Expect<std::uint32_t, std::uint64_t, std::uint16_t>(eDT_16U, 18);
    Expect<std::uint64_t, std::uint64_t, std::uint16_t>(eDT_16U, 30);
    Expect<float, double, float>(eDT_32R, 2);
    Expect<double, double, float>(eDT_32R, 8);
    EXPECT_EQ(FindReduceLoop(eDT_8U, 5, 1, 2), nullptr);
    EXPECT_EQ(FindReduceLoop(eDT_16S, 1, 2, 4), nullptr);
}

} // namespace krv::test
