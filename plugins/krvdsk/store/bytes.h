#pragma once

#include "plugins/krvdsk/store/entry.h"

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace krv::plugins::krvdsk
{

// The records of a file, as bytes: numbers little-endian, texts and lists with their lengths before them, and items: a
// name of four letters, the length of what follows, and that. An item whose name begins with a capital must be
// understood by whoever reads the file, others may be passed over, and so may what follows the part of an item that is
// known.
class BytesWriter
{
public:
    std::vector<unsigned char>& GetBytes() { return moBytes; }

    // nBytes: 1, 2, 4 or 8.
    void AddNumber(std::uint64_t nValue, std::size_t nBytes);
    void AddReal(double nValue);
    void AddText(const std::string& text);
    void AddEntry(const Entry& oEntry);
    // Throws krv::DataException for an item of more than 4 GiB.
    void AddItem(std::string_view name, const std::vector<unsigned char>& oBytes);

private:
    std::vector<unsigned char> moBytes;
};

class BytesReader
{
public:
    // The bytes stay the caller's. what: the record, in a file, for messages such as "f.krv: the directory".
    BytesReader(std::span<const unsigned char> oBytes, const std::string& fileName, const std::string& what);

    // These throw FileFormatException when the bytes end before.
    std::uint64_t ReadNumber(std::size_t nBytes);
    std::uint32_t ReadCount() { return static_cast<std::uint32_t>(ReadNumber(4)); }
    double ReadReal();
    std::string ReadText();
    Entry ReadEntry();
    std::span<const unsigned char> ReadBytes(std::size_t nBytes);
    // The next item. name: set to its name.
    BytesReader ReadItem(std::string& name);

    std::size_t GetLeft() const { return moLeft.size(); }
    // Throws the FileFormatException of a record that contradicts itself.
    [[noreturn]] void Fail(const std::string& cause) const;

private:
    std::span<const unsigned char> moLeft;
    std::string moFileName;
    std::string moWhat;
};

} // namespace krv::plugins::krvdsk
