#pragma once

#include "plugins/support/file/file.h"

#include <cstdint>
#include <exception>
#include <memory>
#include <string>

#include <vips/vips.h>

namespace krv::plugins::gdball
{

// Owns an object of libvips.
struct Unref
{
    void operator()(void* pObject) const { g_object_unref(pObject); }
};
template <typename T>
using Owned = std::unique_ptr<T, Unref>;

// What a file, or a part of it with other bytes before, is to libvips: read by calls, never mapped, so that one that
// shrinks ends in an error. Keeps the file. oError: what reading threw, which libvips cannot pass on; it outlives the
// source.
Owned<VipsSource> MakeSource(std::shared_ptr<const support::File> poFile, const std::string& before,
                             std::uint64_t nSkipped, std::exception_ptr& oError);

// A file that libvips writes from its begin on.
Owned<VipsTarget> MakeTarget(support::File& oFile, std::exception_ptr& oError);

} // namespace krv::plugins::gdball
