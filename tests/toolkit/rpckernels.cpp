#include "toolkit/mathmodel/detail/rpckernels.h"

#include "toolkit/simd/processor.h"

#include <cmath>
#include <random>
#include <vector>

#include <gtest/gtest.h>

namespace krv::mathmodel::detail
{

// Whatever a processor can do, the model places points alike, to what the order of roundings changes.
TEST(RpcKernels, AgreeWithEachOther)
{
    std::vector<const RpcKernels*> oOthers;
#if defined(__x86_64__)
    if (simd::RunsAvx2())
        oOthers.push_back(&GetAvx2RpcKernels());
    if (simd::RunsAvx512())
        oOthers.push_back(&GetAvx512RpcKernels());
#endif
    std::mt19937 oRandom(11);
    std::uniform_real_distribution<double> oPart(-1, 1);
    for (int nModel = 0; nModel < 200; ++nModel)
    {
        RpcCoefficients oC;
        oC.lineScale = oC.sampleScale = 10000;
        for (auto* const poC : {&oC.lineNumerator, &oC.lineDenominator, &oC.sampleNumerator, &oC.sampleDenominator})
            for (double& nC : *poC)
                nC = 0.01 * oPart(oRandom);
        oC.lineNumerator[2] = oC.sampleNumerator[1] = oC.lineDenominator[0] = oC.sampleDenominator[0] = 1;
        double aFirst[RPC_BLOCK], aSecond[RPC_BLOCK], aHeight[RPC_BLOCK];
        for (std::size_t i = 0; i < RPC_BLOCK; ++i)
        {
            aFirst[i] = 1.6 * oPart(oRandom); // some are out of reach
            aSecond[i] = oPart(oRandom);
            aHeight[i] = oPart(oRandom);
        }
        const std::size_t nCount = 1 + static_cast<std::size_t>(nModel) % RPC_BLOCK;
        double aColumns[RPC_BLOCK], aRows[RPC_BLOCK], aLongitudes[RPC_BLOCK], aLatitudes[RPC_BLOCK];
        const RpcKernels& oPlain = GetBaselineRpcKernels();
        oPlain.mpToImage(oC, nCount, aFirst, aSecond, aHeight, aColumns, aRows);
        oPlain.mpToGround(oC, nCount, aColumns, aRows, aHeight, aLongitudes, aLatitudes);
        for (const RpcKernels* const poOther : oOthers)
        {
            double aX[RPC_BLOCK], aY[RPC_BLOCK];
            const auto ExpectSame = [&](const double* pX, const double* pY, double nError)
            {
                for (std::size_t i = 0; i < nCount; ++i)
                    ASSERT_TRUE((std::isnan(pX[i]) && std::isnan(aX[i])) ||
                                (std::fabs(pX[i] - aX[i]) < nError && std::fabs(pY[i] - aY[i]) < nError))
                        << nModel << " " << i;
            };
            poOther->mpToImage(oC, nCount, aFirst, aSecond, aHeight, aX, aY);
            ExpectSame(aColumns, aRows, 1e-7);
            poOther->mpToGround(oC, nCount, aColumns, aRows, aHeight, aX, aY);
            ExpectSame(aLongitudes, aLatitudes, 1e-11);
        }
        for (std::size_t i = 0; i < nCount; ++i)
            ASSERT_TRUE(std::fabs(aFirst[i]) > 1.49 || std::fabs(aLongitudes[i] - aFirst[i]) < 1e-11)
                << nModel << " " << i;
    }
}

} // namespace krv::mathmodel::detail
