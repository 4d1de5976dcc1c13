#pragma once

#include "plugins/support/file/file.h"

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace krv::plugins::jp2
{

// The four letters of a box as a number.
constexpr std::uint32_t BoxType(std::string_view letters)
{
    std::uint32_t nType = 0;
    for (const char nLetter : letters)
        nType = nType << 8 | static_cast<unsigned char>(nLetter);
    return nType;
}

// A box of a JP2 file: what it holds, without its header.
struct Box
{
    std::uint32_t mnType = 0;
    std::uint64_t mnOffset = 0;
    std::uint64_t mnBytes = 0;
    bool mbWhole = true; // false when the file ends before it does
};

// The boxes of a stretch of a file, one after the other. Where one makes no sense the list ends, and pTrouble says why.
std::vector<Box> ListBoxes(const support::File& oFile, std::uint64_t nBegin, std::uint64_t nEnd,
                           std::string* pTrouble = nullptr);

// What a box holds. Throws FileFormatException above nMost bytes, and when it is not whole.
std::vector<unsigned char> ReadBox(const support::File& oFile, const Box& oBox, std::uint64_t nMost);

// Whether the first bytes of a file are those of one of the formats here; of a codestream; of a file with boxes that
// has a still image, and is not one for films or documents.
bool IsCodestream(const unsigned char* pBytes, std::size_t nBytes);
bool IsBoxed(const unsigned char* pBytes, std::size_t nBytes);

} // namespace krv::plugins::jp2
