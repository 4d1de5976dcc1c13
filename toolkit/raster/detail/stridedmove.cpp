#include "toolkit/raster/detail/stridedmove.h"

#include "toolkit/simd/vectors.h"

#include <cstring>

namespace krv::raster::detail
{

namespace
{

// A run size known to the compiler makes every copy one or two moves; 0 stands for any other.
template <std::size_t N>
void Move(const unsigned char* pSource, std::size_t nSourceStride, unsigned char* pTarget, std::size_t nTargetStride,
          std::size_t nRunBytes, std::size_t nRuns)
{
    const std::size_t nBytes = N != 0 ? N : nRunBytes;
    const auto One = [&](std::size_t nRun)
    {
        std::memcpy(pTarget + nRun * nTargetStride, pSource + nRun * nSourceStride, nBytes);
    };
    std::size_t i = 0;
    for (; i + 4 <= nRuns; i += 4)
    {
        One(i);
        One(i + 1);
        One(i + 2);
        One(i + 3);
    }
    for (; i < nRuns; ++i)
        One(i);
}

#if defined(KRV_VECTORS)

constexpr unsigned char NOTHING = 0x80; // for a byte shuffle: 0 here

// Takes every STEP-th value of N bytes out of a row: a full vector of them lies in STEP vectors of the source, each of
// which gives its part by a byte shuffle. For N = 4 and STEP = 3:
//     source   a0 b0 c0 a1 | b1 c1 a2 b2 | c2 a3 b3 c3
//     parts    a0 a1 .  .  | .  .  a2 .  | .  .  .  a3     or     a0 a1 a2 a3
template <std::size_t N, std::size_t STEP>
class Gatherer
{
public:
    Gatherer()
    {
        alignas(16) unsigned char oShuffles[STEP][16];
        std::memset(oShuffles, NOTHING, sizeof oShuffles);
        for (std::size_t nByte = 0; nByte < 16; ++nByte)
        {
            const std::size_t nFrom = nByte / N * N * STEP + nByte % N;
            oShuffles[nFrom / 16][nByte] = static_cast<unsigned char>(nFrom % 16);
        }
        for (std::size_t i = 0; i < STEP; ++i)
            moShuffles[i] = simd::Load<simd::Block>(oShuffles[i]);
    }

    // Returns how many runs it moved. The last ones are left: their vectors could reach beyond the end of the source.
    std::size_t Run(const unsigned char* pSource, unsigned char* pTarget, std::size_t nRuns) const
    {
        constexpr std::size_t LANES = 16 / N;
        std::size_t i = 0;
        for (; i + LANES < nRuns; i += LANES)
        {
            const unsigned char* const pFrom = pSource + i * N * STEP;
            auto oResult = simd::PickBytes(simd::Load<simd::Block>(pFrom), moShuffles[0]);
            for (std::size_t n = 1; n < STEP; ++n)
                oResult |= simd::PickBytes(simd::Load<simd::Block>(pFrom + 16 * n), moShuffles[n]);
            simd::Store(pTarget + i * N, oResult);
        }
        return i;
    }

private:
    simd::Block moShuffles[STEP];
};

template <std::size_t N>
std::size_t GatherValues(const unsigned char* pSource, std::size_t nStep, unsigned char* pTarget, std::size_t nRuns)
{
    switch (nStep)
    {
    case 2:
        return Gatherer<N, 2>().Run(pSource, pTarget, nRuns);
    case 3:
        return Gatherer<N, 3>().Run(pSource, pTarget, nRuns);
    case 4:
        return Gatherer<N, 4>().Run(pSource, pTarget, nRuns);
    default:
        return 0;
    }
}

// The part of a gathering move that vectors can do; returns the number of runs done.
std::size_t GatherRuns(const unsigned char* pSource, std::size_t nSourceStride, unsigned char* pTarget,
                       std::size_t nRunBytes, std::size_t nRuns)
{
    if (nSourceStride % nRunBytes != 0)
        return 0;
    const std::size_t nStep = nSourceStride / nRunBytes;
    switch (nRunBytes)
    {
    case 1:
        return GatherValues<1>(pSource, nStep, pTarget, nRuns);
    case 2:
        return GatherValues<2>(pSource, nStep, pTarget, nRuns);
    case 4:
        return GatherValues<4>(pSource, nStep, pTarget, nRuns);
    default:
        return 0;
    }
}

#else

std::size_t GatherRuns(const unsigned char*, std::size_t, unsigned char*, std::size_t, std::size_t)
{
    return 0;
}

#endif

} // namespace

void MoveRuns(const unsigned char* pSource, std::size_t nSourceStride, unsigned char* pTarget,
              std::size_t nTargetStride, std::size_t nRunBytes, std::size_t nRuns)
{
    if (nTargetStride == nRunBytes)
    {
        const std::size_t nDone = GatherRuns(pSource, nSourceStride, pTarget, nRunBytes, nRuns);
        pSource += nDone * nSourceStride;
        pTarget += nDone * nTargetStride;
        nRuns -= nDone;
    }
    const auto Run = [&](auto Mover)
    {
        Mover(pSource, nSourceStride, pTarget, nTargetStride, nRunBytes, nRuns);
    };
    switch (nRunBytes)
    {
    case 1:
        return Run(Move<1>);
    case 2:
        return Run(Move<2>);
    case 3:
        return Run(Move<3>);
    case 4:
        return Run(Move<4>);
    case 6:
        return Run(Move<6>);
    case 8:
        return Run(Move<8>);
    case 12:
        return Run(Move<12>);
    case 16:
        return Run(Move<16>);
    case 24:
        return Run(Move<24>);
    case 32:
        return Run(Move<32>);
    default:
        return Run(Move<0>);
    }
}

} // namespace krv::raster::detail
