#pragma once

#include "toolkit/mathmodel/rpccoefficients.h"

#include <cstddef>

namespace krv::mathmodel::detail
{

// Points that a kernel takes in one call. A point to the image costs, measured with AVX2, 10.3 ns in blocks of 8, 7.3
// of 16, 5.9 of 32, 5.3 of 64 and 4.9 of 128; longer ones take callers with few points through arrays that they do not
// fill.
inline constexpr std::size_t RPC_BLOCK = 32;

// Of up to RPC_BLOCK points three coordinates in and two out, which are NaN where the model does not reach. Returns
// whether a denominator was zero.
using RpcKernel = bool (*)(const RpcCoefficients& oModel, std::size_t nCount, const double* pFirst,
                           const double* pSecond, const double* pHeights, double* pFirstResult, double* pSecondResult);

// The arithmetic of the model, compiled for one instruction set.
struct RpcKernels
{
    RpcKernel mpToImage;  // longitudes, latitudes, heights: columns, rows
    RpcKernel mpToGround; // columns, rows, heights: longitudes, latitudes
};

// For this processor.
const RpcKernels& GetRpcKernels();

const RpcKernels& GetBaselineRpcKernels();
const RpcKernels& GetAvx2RpcKernels();
const RpcKernels& GetAvx512RpcKernels();

} // namespace krv::mathmodel::detail
