#pragma once

#include "toolkit/exceptions/place.h"

#include <cstdint>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

namespace krv::plugins::support
{

// A piece of a file. The generation tells in which state it was taken: 0 for what was there before the file was opened,
// n for what the n-th state since then brings.
struct Extent
{
    std::uint64_t mnOffset = 0; // from the beginning of the file
    std::uint64_t mnBytes = 0;  // its length
    std::uint64_t mnGeneration = 0;

    std::uint64_t GetEnd() const { return mnOffset + mnBytes; }
};

// Which parts of a file are free, for formats that never overwrite what the file as it stands on the disk may rely on:
// a change is written beside it, and one small write, of where the root lies, makes the new state the file's. What a
// new state gives up may be taken again when no reader holds a state that needs it; states are known by their roots,
// which are places in the file or other numbers that no two states have at one time.
// Book-keeping in memory alone: nothing is read or written here. One thread at a time.
class Space
{
public:
    // nEnd: where the file ends; what lies before is in use. nLimit: no piece ends behind it; limitText says so to a
    // user.
    Space(const std::string& fileName, std::uint64_t nEnd, std::uint64_t nLimit, const std::string& limitText);

    // A piece of a new file that is free from the start.
    void AddGap(std::uint64_t nOffset, std::uint64_t nBytes);
    // A piece that was given up before the file was opened; a reader of a state that is not known may need it.
    void AddUnused(std::uint64_t nOffset, std::uint64_t nBytes);
    // The same for all that lies between pieces, given in any order, up to nEnd.
    void AddUnusedBetween(std::vector<Extent> oPieces, std::uint64_t nEnd);
    // A piece that others may rely on: giving it up does not make it free.
    void Keep(std::uint64_t nOffset, std::uint64_t nBytes);

    // A piece of nBytes, at an even offset; a large one of whole pages, at the file's end, begins with one. nReserve:
    // bytes that must still fit in behind it. Throws IOException when the file would pass its limit.
    Extent Allocate(std::uint64_t nBytes, std::uint64_t nReserve = 0, const Place& oPlace = Place::Current());
    // The same in free room before nEnd alone; no value when there is none.
    std::optional<Extent> AllocateBefore(std::uint64_t nBytes, std::uint64_t nEnd);
    // The first part of a fresh piece stays in use when nKept is above 0.
    // oExtent: as Allocate gave it, or a part of the file as it was opened.
    void Release(const Extent& oExtent, std::uint64_t nKept = 0);

    // An operation of several steps: what it gives up stays taken until it is adopted; when it is undone, what it took
    // is free again and what it gave up is not.
    void Begin() { mbOperation = true; }

    // What the operation did counts; what it gave up is given up.
    void Adopt();
    void Undo();

    // Whether no state that anybody could read has the piece: it may be overwritten.
    bool IsFresh(const Extent& oExtent) const { return oExtent.mnGeneration == mnGeneration; }

    // To be called before the file gets a new root, and for the one that it is opened with: from now on nothing taken
    // so far is fresh.
    void Age(std::uint64_t nRoot);
    // The state of the last call of Age stands: what was given up may be taken again, if it is not needed by a state
    // whose root is among those held. No value: who reads what is not known, and nothing becomes free.
    using Roots = std::optional<std::vector<std::uint64_t>>;
    void Reuse(const Roots& oHeld);

    // Bytes that are free or were given up.
    // In bytes: what IStorageDataset tells.
    std::uint64_t CountUnused() const;
    // Bytes before nEnd that may be taken.
    std::uint64_t CountFree(std::uint64_t nEnd) const;
    // Where the last piece ends that is in use.
    std::uint64_t FindUsedEnd() const;
    // What is free at the end is no longer part of the file, which ends where this says.
    std::uint64_t CutEnd();

private:
    struct GivenUp
    {
        Extent moExtent;
        std::uint64_t mnSince = 0; // the first state without it; 0 while that is not written
    };

    Extent Take(std::uint64_t nBytes, std::uint64_t nReserve, const Place& oPlace);
    void AddFree(std::uint64_t nOffset, std::uint64_t nBytes);
    void RemoveFree(std::map<std::uint64_t, std::uint64_t>::iterator oFree);

    std::string moFileName;
    std::string moLimitText;
    std::uint64_t mnEnd;
    std::uint64_t mnLimit;
    std::uint64_t mnGeneration = 1;                // of the state that is being made
    std::map<std::uint64_t, std::uint64_t> moFree; // offset, bytes
    std::set<std::pair<std::uint64_t, std::uint64_t>> moBySize;
    std::map<std::uint64_t, std::uint64_t> moKept;  // offset, end
    std::map<std::uint64_t, std::uint64_t> moRoots; // of states that may be held: root, generation
    std::vector<GivenUp> moGivenUp;
    bool mbOperation = false;                                 // between Begin and Adopt or Undo
    std::vector<Extent> moTaken;                              // by the operation
    std::vector<std::pair<Extent, std::uint64_t>> moReleased; // by it, with what is kept of each
};

} // namespace krv::plugins::support
