#pragma once

#include "toolkit/api.h"

#include <cstddef>

// Memory for raster buffers: 64-byte aligned, contents undefined. Large blocks that are freed are kept for reuse, so
// that a loop of new raster, use, delete does not pay for fresh pages each time; what is kept is bounded by the peak of
// live bytes and by 512 MiB, and counts into the budget of krv::cache::TileStore. Any thread may free what another
// allocated; threads do not wait for each other here. Under a sanitizer nothing is kept.

// Throws std::bad_alloc. A size of 0 gives a block that may be freed.
KRV_TOOLKIT_API void* HMalloc(std::size_t nBytes);

// Null is allowed.
// pBlock: of HMalloc; it may not be used afterwards.
KRV_TOOLKIT_API void HFree(void* pBlock) noexcept;

// Gives all kept blocks back to the system; the peak is counted anew from what is live.
// For programs that wait long after a job. What is in use stays.
KRV_TOOLKIT_API void HTrim() noexcept;

// Bytes kept for reuse at this moment.
// For logs and tests; other threads may change it at once.
KRV_TOOLKIT_API std::size_t HKeptBytes() noexcept;
