#pragma once

#include "plugins/support/image/imagelayout.h"

#include <cstddef>
#include <cstdint>
#include <functional>
#include <list>
#include <unordered_map>
#include <vector>

namespace krv::plugins::support
{

// What two rectangles of an image share; nothing: of size 0.
PixelRect Intersect(const PixelRect& oFirst, const PixelRect& oSecond);

// The pixels of blocks that were written in part, for formats that store whole blocks alone: held back, bounded in
// bytes, until all are stored or those used longest ago have to make room. Blocks are known by numbers.
class HeldBlocks
{
public:
    struct Block
    {
        std::uint64_t mnNumber = 0;
        PixelRect moRect; // of the image
    };

    // Writes the pixels of a block, rows without gaps, into the file.
    using StoreBlock = std::function<void(const Block& oBlock, const unsigned char* pPixels)>;
    // Fills in what the file has of it; the memory holds 0.
    using ReadBlock = std::function<void(unsigned char* pPixels, std::size_t nPitch)>;

    // Makes pixels in a row what they read as when they are stored, where a file does not hold every value.
    using SettlePixels = std::function<void(unsigned char* pPixels, std::size_t nBytes)>;
    // Of single bits, a byte each: any byte but 0 is one that is set, and reads as 1.
    static void SettleBits(unsigned char* pPixels, std::size_t nBytes);

    HeldBlocks(std::size_t nBound, std::size_t nPixelBytes, StoreBlock oStore, SettlePixels oSettle = nullptr);

    bool IsEmpty() const { return moHeld.empty(); }
    // Takes a part of a block, as a rectangle of the image.
    void Write(const Block& oBlock, const PixelRect& oPart, const unsigned char* pSource, std::size_t nPitch,
               const ReadBlock& oRead);
    // Lays what is held of a block over a rectangle of the image.
    void Overlay(std::uint64_t nBlock, const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) const;
    // Drops a block that came whole meanwhile.
    void Forget(std::uint64_t nBlock);
    void StoreAll();
    void Clear();

private:
    struct Held
    {
        Block moBlock;
        std::vector<unsigned char> moPixels;
    };

    std::size_t GetPitch(const Block& oBlock) const { return oBlock.moRect.mnWidth * mnPixelBytes; }
    Held& Hold(const Block& oBlock, const ReadBlock& oRead);
    void StoreOldest();

    std::size_t mnBound;
    std::size_t mnPixelBytes;
    SettlePixels moSettle; // may be empty
    StoreBlock moStore;
    std::size_t mnHeldBytes = 0;
    std::list<Held> moHeld; // the one used last first
    std::unordered_map<std::uint64_t, std::list<Held>::iterator> moIndex;
};

} // namespace krv::plugins::support
