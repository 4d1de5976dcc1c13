#pragma once

#include <cstddef>
#include <memory>

namespace krv::plugins::codec
{

// LZW as TIFF has it (see LzwDecoder). An object keeps its table between blocks; one thread at a time.
class LzwEncoder
{
public:
    LzwEncoder();
    ~LzwEncoder();
    LzwEncoder(LzwEncoder&&) noexcept;
    LzwEncoder& operator=(LzwEncoder&&) noexcept;

    // Room that the code of nInput bytes takes at most.
    static std::size_t GetBound(std::size_t nInput);

    // Encodes one block and returns its bytes; the output holds at least GetBound(nInput). bOld: in the first edition
    // of the coding, which a page has in all of its blocks or in none: readers take what the first one is for all.
    std::size_t Encode(const unsigned char* input, std::size_t nInput, unsigned char* output, bool bOld = false);

private:
    template <bool bOld>
    std::size_t Run(const unsigned char* input, std::size_t nInput, unsigned char* output);

    struct Table;
    std::unique_ptr<Table> mpoTable;
};

} // namespace krv::plugins::codec
