#pragma once

#include "toolkit/exceptions/place.h"

#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <vector>

namespace krv::plugins::tif
{

// A piece of the file. The generation tells pieces taken since the last commit from those that the file as it stands
// on the disk may rely on.
struct Extent
{
    std::uint64_t mnOffset = 0;
    std::uint64_t mnBytes = 0;
    std::uint64_t mnGeneration = 0;
};

// Which parts of a file are free. What the committed state of the file uses is given back only with the next commit;
// what was there when the file was opened never: other programs may share values between directories.
class Space
{
public:
    // nEnd: where the file ends; what lies before stays untouched. nLimit: no piece ends behind it.
    Space(const std::string& fileName, std::uint64_t nEnd, std::uint64_t nLimit);

    // A piece before the end that is free from the start, for a new file that begins with a gap.
    void AddGap(std::uint64_t nOffset, std::uint64_t nBytes);

    // A piece of nBytes, at an even offset; a large one of whole pages, at the file's end, begins with one. nReserve:
    // bytes that must still fit in behind it. Throws IOException when the file would pass its limit.
    Extent Allocate(std::uint64_t nBytes, std::uint64_t nReserve = 0, const Place& oPlace = Place::Current());
    // The first part of a fresh piece stays in use when nKept is above 0.
    void Release(const Extent& oExtent, std::uint64_t nKept = 0);

    bool IsFresh(const Extent& oExtent) const { return oExtent.mnGeneration == mnGeneration; }
    std::uint64_t GetGeneration() const { return mnGeneration; }

    // From now on nothing taken so far counts as fresh.
    void Age() { ++mnGeneration; }
    // The file stands: what was given back before may be taken again.
    void Reuse();

private:
    void AddFree(std::uint64_t nOffset, std::uint64_t nBytes);
    void RemoveFree(std::map<std::uint64_t, std::uint64_t>::iterator oFree);

    std::string moFileName;
    std::uint64_t mnEnd;
    std::uint64_t mnForeignEnd;
    std::uint64_t mnLimit;
    std::uint64_t mnGeneration = 1;
    std::map<std::uint64_t, std::uint64_t> moFree; // offset, bytes
    std::set<std::pair<std::uint64_t, std::uint64_t>> moBySize;
    std::vector<Extent> moPending;
};

} // namespace krv::plugins::tif
