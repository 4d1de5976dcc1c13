#pragma once

#include "toolkit/core/hmalloc.h"

#include <memory>

namespace krv
{

// For smart pointers alone: what goes to HFree came from HMalloc.
// Null is allowed, as with HFree.
struct HBlockDeleter
{
    void operator()(void* pBlock) const noexcept { HFree(pBlock); }
};

// Owns a block of HMalloc.
// Bytes, 64-byte aligned. Example: HBlock poBlock(static_cast<unsigned char*>(HMalloc(nBytes)));
// The size is not kept: who owns the block knows it. release() hands it to a Raster that takes ownership.
using HBlock = std::unique_ptr<unsigned char, HBlockDeleter>;

} // namespace krv
