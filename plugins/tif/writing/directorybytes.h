#pragma once

#include "plugins/tif/reading/rawdirectory.h"
#include "plugins/tif/writing/pagemodel.h"

#include <cstdint>
#include <vector>

namespace krv::plugins::tif
{

// Bytes of a directory of so many entries, and of that of a page, without the values that lie elsewhere.
std::uint64_t GetDirectoryBytes(std::size_t nEntries, const FileHeader& oHeader);
std::uint64_t GetDirectoryBytes(const PageModel& oPage, const FileHeader& oHeader);

// The directory of a page as it stands in the file. Tags that do not fit their entries have their places already; so
// have the arrays of offsets and byte counts. nNext: the place of the directory behind it, or 0.
std::vector<unsigned char> MakeDirectory(const PageModel& oPage, const FileHeader& oHeader, std::uint64_t nOffsetArray,
                                         std::uint64_t nCountArray, std::uint64_t nNext);

// The values of such an array.
std::vector<unsigned char> MakeArray(const StrileList<std::uint64_t>& oValues, const FileHeader& oHeader);

} // namespace krv::plugins::tif
