#pragma once

#include "plugins/krvdsk/store/entry.h"
#include "plugins/support/file/file.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace krv::plugins::krvdsk
{

// Changes of the first number are not understood by programs before them. Files with a later second number are read,
// not updated.
constexpr std::uint16_t FORMAT_VERSION = 1;
constexpr std::uint16_t FORMAT_REVISION = 0;

// The first bytes of every file.
constexpr std::string_view SIGNATURE("\x8BKRVDSK\r\n\x1A\n\0", 12);

// A state of a file: which one, how long the file is with all that it names, and where its directory lies. Two slots
// are written in turn, so that the state before stays whatever happens to the writing of the next.
struct Root
{
    static constexpr std::uint64_t BYTES = 512; // the least that a disk writes as a whole
    static constexpr std::uint64_t FIRST_SLOT = 4096;
    static constexpr std::uint64_t SECOND_SLOT = 8192;
    // Nothing else lies before the end of the second slot. Large pieces begin at 16 KiB, not at multiples of their own
    // size, which systems are slow with.
    static constexpr std::uint64_t FIRST_PIECE = SECOND_SLOT + 4096;
    static constexpr std::uint64_t FIRST_TILE = 16384;

    std::uint64_t mnGeneration = 0;
    std::uint64_t mnFileBytes = 0;
    Entry moDirectory;
    std::uint16_t mnVersion = FORMAT_VERSION;
    std::uint16_t mnRevision = FORMAT_REVISION;

    std::uint64_t GetSlot() const { return mnGeneration % 2 == 0 ? FIRST_SLOT : SECOND_SLOT; }
    std::vector<unsigned char> Make() const;
    // No value when the bytes, of which there are BYTES, are no root.
    static std::optional<Root> Parse(const unsigned char* pBytes);
    // The newest state of a file. Throws FileFormatException when there is none, or it is of a later version.
    static Root Read(const support::File& oFile);
};

// The pieces of a file in one of its states. One thread at a time.
class StoreFile
{
public:
    // Larger records than this are neither read nor written.
    static constexpr std::uint64_t LARGEST_RECORD = std::uint64_t{64} << 20;

    // A file that is read: its newest state is held against writers.
    static std::shared_ptr<StoreFile> Open(const std::shared_ptr<support::File>& poFile);
    // In a state that is known.
    StoreFile(std::shared_ptr<support::File> poFile, const Root& oRoot);

    const std::string& GetName() const { return mpoFile->GetName(); }
    support::File& GetFile() const { return *mpoFile; }
    const std::shared_ptr<support::File>& ShareFile() const { return mpoFile; }
    const Root& GetRoot() const { return moRoot; }
    void SetRoot(const Root& oRoot) { moRoot = oRoot; }
    // The end of all pieces; grows while the file is written.
    std::uint64_t GetEnd() const { return mnEnd; }
    void SetEnd(std::uint64_t nEnd) { mnEnd = nEnd; }

    // Throws FileFormatException unless the piece lies where pieces may.
    void CheckPlace(const Entry& oEntry, const std::string& what) const;
    // The bytes of a record, with their checks.
    std::vector<unsigned char> Read(const Entry& oEntry, const std::string& what) const;
    // what: a place in the file and what is wrong there.
    [[noreturn]] void Fail(const std::string& what) const;

private:
    std::shared_ptr<support::File> mpoFile;
    Root moRoot;
    std::uint64_t mnEnd;
};

} // namespace krv::plugins::krvdsk
