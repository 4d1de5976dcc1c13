#pragma once

#include "plugins/support/codec/status.h"

#include <cstddef>
#include <memory>
#include <optional>
#include <span>
#include <string_view>

namespace krv::plugins::codec
{

// What belongs to a codec's library, with the function that gives it back.
// Example: Handle<ZSTD_DCtx> poContext(ZSTD_createDCtx(), [](ZSTD_DCtx* p) { ZSTD_freeDCtx(p); });
template <typename T>
using Handle = std::unique_ptr<T, void (*)(T*)>;

// Turns the bytes of a block as a file holds them into what they stand for. An object keeps its working memory between
// blocks; one thread at a time.
// Input comes from files and may be anything: a decoder reads nothing behind nInput and writes nothing behind nOutput.
class BlockDecoder
{
public:
    virtual ~BlockDecoder();

    // Decodes one block into at most nOutput bytes.
    // Throws nothing: memory that cannot be had is a status.
    virtual Result Decode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                          std::size_t nOutput) = 0;
};

// The counterpart.
// An object keeps its working memory between blocks; one thread at a time. The same input gives the same bytes.
class BlockEncoder
{
public:
    virtual ~BlockEncoder();

    // Room that the code of nInput bytes takes at most.
    virtual std::size_t GetBound(std::size_t nInput) const = 0;
    // Encodes one block and returns its bytes; nOutput is at least GetBound(nInput). Throws std::bad_alloc.
    virtual std::size_t Encode(const unsigned char* input, std::size_t nInput, unsigned char* output,
                               std::size_t nOutput) = 0;

    // Codings of several editions, of which an image has one: how many bytes of a block tell which, and the begin of
    // such a block, none for an image without, that those to come are to be like.
    virtual std::size_t GetFormBytes() const { return 0; }
    // Blocks that are encoded from now on are of the edition that these bytes tell.
    virtual void TakeForm(std::span<const unsigned char>) {}
};

// A coding of blocks by the name that options of new files and descriptions of blocks have for it. "NONE" is no codec.
// A constant of the library. A codec that is added here is known to every format that asks by name.
struct BlockCodec
{
    std::string_view moName;
    int mnMaximumLevel; // levels count from 1; 0: the coding has none
    std::unique_ptr<BlockDecoder> (*mpMakeDecoder)();
    std::unique_ptr<BlockEncoder> (*mpMakeEncoder)(std::optional<int> oLevel); // null: it is only read
};

// Null for a name that is not known.
// Names are in capitals: "DEFLATE", "LZW", "ZSTD", "LZ4", "PACKBITS". Never to be freed.
const BlockCodec* FindBlockCodec(std::string_view name);

} // namespace krv::plugins::codec
