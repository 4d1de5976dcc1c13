#pragma once

#include "plugins/support/file/numbers.h"
#include "plugins/tif/reading/peekreader.h"
#include "toolkit/exceptions/place.h"

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::tif
{

// The first bytes of a TIFF file: byte order, classic or big, and where the first directory lies.
struct FileHeader
{
    static constexpr std::size_t BYTES = 16;

    bool mbBigEndian = false;
    bool mbBigTiff = false;
    std::uint64_t mnFirstDirectory = 0;

    // No value for bytes that no TIFF file begins with: magic, version, sizes of BigTIFF and an offset that lies behind
    // the header.
    static std::optional<FileHeader> Parse(const unsigned char* pBytes, std::size_t nBytes);

    // Writes a header that names another first directory.
    void Write(unsigned char* pBytes, std::uint64_t nFirstDirectory) const;
    std::size_t GetBytes() const { return mbBigTiff ? 16 : 8; }
};

using support::ReadNumber;

// Throws FileFormatException for a file that is none.
FileHeader ReadHeader(PeekReader& oReader);

// Throws FileFormatException "<file>: <what>; the file is damaged".
[[noreturn]] void ThrowDamaged(const std::string& fileName, const std::string& what, const Place& oPlace);

// Whether a tag is one of those that say where strips or tiles lie and how long they are.
bool IsStrileTag(std::uint16_t nTag);

// Bytes of one value of a tag's type; 0 for a type that is not known.
std::size_t GetTypeBytes(std::uint16_t nType);

// Whether the type is one of unsigned whole numbers or offsets: what geometry and roles are taken from.
bool IsWholeType(std::uint16_t nType);

struct DirectoryEntry
{
    std::uint16_t mnTag = 0;
    std::uint16_t mnType = 0;
    std::uint64_t mnCount = 0;
    std::uint64_t mnOffset = 0; // where its values begin in the file, in the entry itself or elsewhere

    // All ones when the product does not fit.
    std::uint64_t GetBytes() const;
};

// A directory as it stands in the file, nothing interpreted.
class RawDirectory
{
public:
    // More entries than any sound file has are refused.
    static constexpr std::uint64_t MAXIMUM_ENTRIES = 4096;

    // Throws FileFormatException naming file and cause when there is no sound directory at the offset.
    RawDirectory(PeekReader& oReader, const FileHeader& oHeader, std::uint64_t nOffset);

    std::uint64_t GetOffset() const { return mnOffset; }
    // 0 after the last one.
    std::uint64_t GetNext() const { return mnNext; }
    const std::vector<DirectoryEntry>& GetEntries() const { return moEntries; }
    // Null when there is no such entry.
    const DirectoryEntry* Find(std::uint16_t nTag) const;

    // The first value of a tag of whole numbers; nDefault when it is absent, not whole or out of reach.
    std::uint64_t GetNumber(PeekReader& oReader, std::uint16_t nTag, std::uint64_t nDefault) const;
    // The values of such a tag, at most nLimit of them.
    std::vector<std::uint64_t> GetNumbers(PeekReader& oReader, std::uint16_t nTag, std::size_t nLimit) const;

private:
    FileHeader moHeader;
    std::uint64_t mnOffset;
    std::uint64_t mnNext = 0;
    std::vector<DirectoryEntry> moEntries;
};

} // namespace krv::plugins::tif
