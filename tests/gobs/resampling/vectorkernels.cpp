// The inner loops of power and of interpolation give the same for every instruction set.

#include "gobs/power/detail/powerkernels.h"
#include "gobs/resampling/detail/plainkernels.h"
#include "toolkit/simd/processor.h"

#include <gtest/gtest.h>

#include <cstring>
#include <random>
#include <vector>

namespace krv::gobs::detail
{

namespace
{

using Bytes = std::vector<unsigned char>;

// Random bytes; reals are whole numbers of them.
Bytes MakeSamples(NativeDataTypeCode eType, std::size_t nSamples)
{
    std::mt19937 oRandom(9);
    Bytes oBytes(nSamples * 8);
    for (unsigned char& nByte : oBytes)
        nByte = static_cast<unsigned char>(oRandom());
    for (std::size_t n = 0; n < nSamples; ++n)
    {
        const float nReal = static_cast<float>(static_cast<int>(oRandom() % 2000) - 1000) / 7;
        const double nDouble = nReal;
        if (eType == eDT_32R)
            std::memcpy(&oBytes[n * 4], &nReal, 4);
        if (eType == eDT_64R)
            std::memcpy(&oBytes[n * 8], &nDouble, 8);
    }
    return oBytes;
}

} // namespace

TEST(VectorKernels, PowerIsTheSameForEveryProcessor)
{
    constexpr std::size_t PIXELS = 203;
    for (int nCode = eDT_8U; nCode <= eDT_64R; ++nCode)
    {
        const auto eType = static_cast<NativeDataTypeCode>(nCode);
        const Bytes oPixels = MakeSamples(eType, PIXELS * 9);
        for (std::size_t nSamples = 1; nSamples <= 9; ++nSamples)
        {
            const std::vector<double> oSquares(nSamples, 0.5), oValues(nSamples, 3);
            for (const PowerForm eForm : {PowerForm::eSquares, PowerForm::eValues, PowerForm::eWeighted})
            {
                const auto Run = [&](PowerLoop pLoop)
                {
                    Bytes oPower(PIXELS * 8 + 8, 77);
                    pLoop({oPixels.data(), PIXELS, nSamples, oSquares.data(), oValues.data(), eForm, oPower.data()});
                    return oPower;
                };
                const Bytes oExpected = Run(FindBaselinePowerLoop(eType));
                EXPECT_EQ(Run(FindPowerLoop(eType)), oExpected);
#if defined(__x86_64__)
                if (krv::simd::RunsAvx2())
                {
                    EXPECT_EQ(Run(FindAvx2PowerLoop(eType)), oExpected) << nCode << " " << nSamples;
                }
#endif
            }
        }
    }
}

TEST(VectorKernels, InterpolationIsTheSameForEveryProcessor)
{
    constexpr std::size_t SIDE = 40, PLACES = 500;
    std::mt19937 oRandom(4);
    std::vector<double> oX, oY;
    for (std::size_t n = 0; n < PLACES; ++n)
    {
        // Some in the middle of pixels.
        oX.push_back(2 + static_cast<double>(oRandom() % 3500) / (n % 5 == 0 ? 100 : 100.3));
        oY.push_back(n % 7 == 0 ? 5.5 : 2 + static_cast<double>(oRandom() % 3500) / 100.7);
    }
    for (const Resampling eMethod : {Resampling::eBilinear, Resampling::eCubic})
    {
        for (const NativeDataTypeCode eType : {eDT_8U, eDT_16U, eDT_16S, eDT_32R})
        {
            for (std::size_t nSamples = 1; nSamples <= MOST_PLAIN_SAMPLES; ++nSamples)
            {
                const Bytes oPixels = MakeSamples(eType, SIDE * SIDE * nSamples + 64);
                const auto Run = [&](PlainLoop pLoop)
                {
                    const std::size_t nBytes = PLACES * nSamples * (eType == eDT_8U ? 1 : (eType == eDT_32R ? 4 : 2));
                    Bytes oResult(nBytes + 16, 77);
                    pLoop({oPixels.data(), SIDE * nSamples, 0.5, 0.5, oX.data(), oY.data(), PLACES, oResult.data(),
                           true});
                    EXPECT_EQ(oResult[nBytes], 77);
                    return oResult;
                };
                const Bytes oExpected = Run(FindBaselinePlainLoop(eMethod, eType, nSamples));
                EXPECT_EQ(Run(FindPlainLoop(eMethod, eType, nSamples)), oExpected);
#if defined(__x86_64__)
                if (krv::simd::RunsAvx2())
                {
                    EXPECT_EQ(Run(FindAvx2PlainLoop(eMethod, eType, nSamples)), oExpected) << eType << nSamples;
                }
#endif
            }
        }
    }
    EXPECT_EQ(FindPlainLoop(Resampling::eLanczos, eDT_8U, 1), nullptr);
    EXPECT_EQ(FindPlainLoop(Resampling::eCubic, eDT_64R, 1), nullptr);
}

} // namespace krv::gobs::detail
