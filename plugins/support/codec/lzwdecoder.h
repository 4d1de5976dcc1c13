#pragma once

#include "plugins/support/codec/status.h"

#include <cstddef>
#include <cstdint>
#include <memory>

namespace krv::plugins::codec
{

// LZW as TIFF has it: codes of 9 to 12 bits, clear code 256, end code 257, most significant bit first, the width
// growing one code early; and its first edition, least significant bit first and without the early growth. An object
// keeps its table (32 KiB) between blocks; one thread at a time.
class LzwDecoder
{
public:
    LzwDecoder();
    ~LzwDecoder();
    LzwDecoder(LzwDecoder&&) noexcept;
    LzwDecoder& operator=(LzwDecoder&&) noexcept;

    // Decodes one block into exactly nOutput bytes. Either edition is recognised by itself.
    // A missing end code is no fault once the output is full.
    // Any input is safe: nothing outside of the two buffers is read or written.
    Result Decode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput);

    // True for a block of the first edition: it begins with a clear code that has its low bits first.
    static bool IsOldStyle(const unsigned char* input, std::size_t nInput);

private:
    struct Table;
    std::unique_ptr<Table> mpoTable;
};

} // namespace krv::plugins::codec
