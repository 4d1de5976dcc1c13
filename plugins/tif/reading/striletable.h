#pragma once

#include "plugins/support/file/file.h"
#include "plugins/tif/reading/rawdirectory.h"

#include <cstdint>
#include <memory>
#include <span>
#include <vector>

namespace krv::plugins::tif
{

// One of the two arrays that say where strips or tiles lie, read from the file in pages when they are asked for: a
// sparse file may have millions of tiles. One thread at a time.
class StrileArray
{
public:
    // No entry: every value is 0.
    StrileArray() = default;
    // Throws FileFormatException for a type of tag that holds no whole numbers.
    StrileArray(const support::File& oFile, const DirectoryEntry& oEntry, bool bBigEndian);

    std::uint64_t GetCount() const { return mnCount; }
    // nIndex: below GetCount. Throws FileFormatException when the array is cut off by the end of the file.
    std::uint64_t Get(const support::File& oFile, std::uint64_t nIndex);

private:
    static constexpr std::size_t PAGE_VALUES = 4096;
    static constexpr std::size_t PAGES = 8;

    struct Page
    {
        std::uint64_t mnNumber = UINT64_MAX;
        std::vector<std::uint64_t> moValues;
    };

    const Page& GetPage(const support::File& oFile, std::uint64_t nNumber);

    std::uint64_t mnCount = 0;
    std::uint64_t mnOffset = 0;
    std::size_t mnValueBytes = 0;
    bool mbBigEndian = false;
    std::vector<Page> moPages;
};

// A stored strip or tile.
struct Strile
{
    std::uint64_t mnOffset = 0;
    std::uint64_t mnBytes = 0;
    bool mbBytesKnown = true; // false when the file does not say

    // What is not stored has neither a place nor bytes, and reads as 0.
    bool IsStored() const { return mnOffset != 0 || mnBytes != 0 || !mbBytesKnown; }
};

// The entries of a directory that list the strips or tiles; those of tiles count first. Null where there is none.
struct StrileEntries
{
    const DirectoryEntry* mpOffsets = nullptr;
    const DirectoryEntry* mpByteCounts = nullptr;

    explicit StrileEntries(const RawDirectory& oDirectory);
};

// What of a page's form tells how long its strips or tiles are.
struct StrileShape
{
    static constexpr std::uint64_t MOST_ONLY_STRIPS = 1024;

    std::uint64_t mnCount = 0;
    bool mbOnlyStrips = false;      // every plane is a single strip, and there are not very many
    std::uint64_t mnPlainBytes = 0; // of such a strip without compression; 0 with one
};

// How long a single strip is. Writers got the byte counts of such files wrong: where there is none, or, without
// compression, one too small for its rows, it reaches up to what the file is known to hold next.
// oOffsets: of the strips of all planes.
std::uint64_t FindOnlyStripBytes(const Strile& oStrip, const StrileShape& oShape, const RawDirectory& oDirectory,
                                 std::span<const std::uint64_t> oOffsets, std::uint64_t nFileBytes);

// Where strips and tiles lie while a file is being written: known in memory before it stands in the file.
class IStrileIndex
{
public:
    virtual ~IStrileIndex();
    virtual Strile Get(std::uint64_t nIndex) const = 0;
};

// Where the strips or tiles of a page lie.
class StrileTable
{
public:
    // The directory outlives it. Throws FileFormatException when the page has no offsets.
    StrileTable(const support::File& oFile, const RawDirectory& oDirectory, bool bBigEndian, const StrileShape& oShape);

    // Throws FileFormatException for a strile that the file does not list, and for one with a place and no bytes: what
    // it holds is not known.
    Strile Get(std::uint64_t nIndex);

    // From now on the index answers in place of the file.
    void Use(std::shared_ptr<const IStrileIndex> poIndex) { mpoIndex = std::move(poIndex); }

private:
    Strile Read(std::uint64_t nIndex);

    const support::File& moFile;
    const RawDirectory& moDirectory;
    StrileShape moShape;
    std::shared_ptr<const IStrileIndex> mpoIndex;
    StrileArray moOffsets;
    StrileArray moByteCounts;
    bool mbByteCounts = false;
};

} // namespace krv::plugins::tif
