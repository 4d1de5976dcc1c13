#pragma once

#include "plugins/support/codec/blockcodec.h"

#include <cstddef>
#include <cstdint>
#include <memory>

namespace krv::plugins::codec
{

// LZW as TIFF has it: codes of 9 to 12 bits, clear code 256, end code 257, most significant bit first, the width
// growing one code early; and its first edition, least significant bit first and without the early growth.
// TIFF's compression 5. GIF has another form, which is not served here.
class LzwDecoder : public BlockDecoder
{
public:
    // Throws std::bad_alloc. The table is made once and used for all blocks.
    LzwDecoder();
    ~LzwDecoder() override;

    // Decodes one block into exactly nOutput bytes. Either edition is recognised by itself.
    // A missing end code is no fault once the output is full.
    // Any input is safe: nothing outside of the two buffers is read or written.
    Result Decode(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput) override;

    // True for a block of the first edition: it begins with a clear code that has its low bits first.
    static bool IsOldStyle(const unsigned char* input, std::size_t nInput);

private:
    struct Table;
    std::unique_ptr<Table> mpoTable; // of codes, used again for each block
};

// The newer edition unless TakeForm is told the older one.
class LzwEncoder : public BlockEncoder
{
public:
    LzwEncoder();
    ~LzwEncoder() override;

    std::size_t GetBound(std::size_t nInput) const override;
    std::size_t Encode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                       std::size_t nOutput) override;
    // An image has the first edition of the coding in all of its blocks or in none: readers take what the first one is
    // for all.
    std::size_t GetFormBytes() const override { return 2; }

    // oLike: GetFormBytes bytes of a block of the image; none for the newer edition.
    void TakeForm(std::span<const unsigned char> oLike) override;

private:
    template <bool bOld>
    std::size_t Run(const unsigned char* input, std::size_t nInput, unsigned char* output);

    struct Table;
    std::unique_ptr<Table> mpoTable;
    bool mbOld = false; // the first edition is written
};

} // namespace krv::plugins::codec
