#pragma once

#include "toolkit/core/hmalloc.h"

#include <memory>

namespace krv
{

struct HBlockDeleter
{
    void operator()(void* pBlock) const noexcept { HFree(pBlock); }
};

// Owns a block of HMalloc.
using HBlock = std::unique_ptr<unsigned char, HBlockDeleter>;

} // namespace krv
