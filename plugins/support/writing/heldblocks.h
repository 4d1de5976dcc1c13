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
// In any order.
PixelRect Intersect(const PixelRect& oFirst, const PixelRect& oSecond);

// The pixels of blocks that were written in part, for formats that store whole blocks alone: held back, bounded in
// bytes, until all are stored or those used longest ago have to make room. Blocks are known by numbers.
// One thread at a time. Blocks that come whole need not pass through here.
class HeldBlocks
{
public:
    // A plain value.
    struct Block
    {
        std::uint64_t mnNumber = 0; // any number that stands for one block alone
        PixelRect moRect;           // of the image
    };

    // Writes the pixels of a block, rows without gaps, into the file.
    using StoreBlock = std::function<void(const Block& oBlock, const unsigned char* pPixels)>;
    // Fills in what the file has of it; the memory holds 0.
    using ReadBlock = std::function<void(unsigned char* pPixels, std::size_t nPitch)>;

    // Makes pixels in a row what they read as when they are stored, where a file does not hold every value.
    using SettlePixels = std::function<void(unsigned char* pPixels, std::size_t nBytes)>;
    // Of single bits, a byte each: any byte but 0 is one that is set, and reads as 1.
    static void SettleBits(unsigned char* pPixels, std::size_t nBytes);

    // nBound: bytes of pixels. oStore and oSettle are called by Write and StoreAll; what they throw passes.
    HeldBlocks(std::size_t nBound, std::size_t nPixelBytes, StoreBlock oStore, SettlePixels oSettle = nullptr);

    bool IsEmpty() const { return moHeld.empty(); }
    // Takes a part of a block, as a rectangle of the image.
    // oRead: called when the block is not held yet and the part is not all of it.
    void Write(const Block& oBlock, const PixelRect& oPart, const unsigned char* pSource, std::size_t nPitch,
               const ReadBlock& oRead);
    // Lays what is held of a block over a rectangle of the image.
    // So that pixels are read back as they were written before they are in the file. Nothing happens for a block not
    // held.
    void Overlay(std::uint64_t nBlock, const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) const;
    // Drops a block that came whole meanwhile.
    // A block that is not held is no error.
    void Forget(std::uint64_t nBlock);

    // Those used longest ago first.
    void StoreAll();

    // Drops all, stored or not.
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

    std::size_t mnBound;      // bytes that may be held
    std::size_t mnPixelBytes; // of all channels
    SettlePixels moSettle;    // may be empty
    StoreBlock moStore;
    std::size_t mnHeldBytes = 0; // of all blocks that are held
    std::list<Held> moHeld;      // the one used last first
    std::unordered_map<std::uint64_t, std::list<Held>::iterator> moIndex;
};

} // namespace krv::plugins::support
