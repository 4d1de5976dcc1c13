#pragma once

#include <cstddef>
#include <memory>

namespace krv::plugins::support
{

// Working memory that grows on demand, is kept for the next use and never zeroed.
// One thread at a time. Not for memory whose size a file says and nobody checked.
class Scratch
{
public:
    // At least nBytes bytes; what an earlier call gave is lost when the memory has to grow.
    // Throws std::bad_alloc. Valid until the next call of either operation.
    unsigned char* Get(std::size_t nBytes)
    {
        if (nBytes > mnBytes)
        {
            mpoBytes.reset();
            mnBytes = 0;
            mpoBytes = std::make_unique_for_overwrite<unsigned char[]>(nBytes);
            mnBytes = nBytes;
        }
        return mpoBytes.get();
    }

    // Gives memory above a limit back, so that one large block does not stay for good.
    // nLimit: bytes. Memory at or below it stays.
    void Shrink(std::size_t nLimit)
    {
        if (mnBytes > nLimit)
        {
            mpoBytes.reset();
            mnBytes = 0;
        }
    }

private:
    std::unique_ptr<unsigned char[]> mpoBytes; // not cleared
    std::size_t mnBytes = 0;                   // that there are
};

} // namespace krv::plugins::support
