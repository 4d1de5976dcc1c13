#pragma once

#include "plugins/support/file/file.h"

#include <array>
#include <cstddef>
#include <cstdint>

namespace krv::plugins::tif
{

// Reads the small pieces that directories are made of, with few calls to the system: two windows of the file are kept.
// One thread at a time.
class PeekReader
{
public:
    explicit PeekReader(const support::File& oFile) : moFile(oFile) {}
    PeekReader(const PeekReader&) = delete;
    PeekReader& operator=(const PeekReader&) = delete;

    const support::File& GetFile() const { return moFile; }

    // Returns how many bytes there were: fewer only at the end of the file. Throws IOException.
    std::size_t Read(std::uint64_t nOffset, void* pTarget, std::size_t nBytes);

    // What is read from now on is read from the file anew.
    void Forget() { moWindows[0].mnBytes = moWindows[1].mnBytes = 0; }

private:
    static constexpr std::size_t WINDOW_BYTES = 4096;

    struct Window
    {
        std::uint64_t mnOffset = 0;
        std::size_t mnBytes = 0;
        std::array<unsigned char, WINDOW_BYTES> moBytes;

        bool Holds(std::uint64_t nOffset, std::size_t nBytes) const
        {
            return nOffset >= mnOffset && nOffset - mnOffset <= mnBytes && nBytes <= mnBytes - (nOffset - mnOffset);
        }
    };

    const support::File& moFile;
    Window moWindows[2];
    unsigned int mnNext = 0;
};

} // namespace krv::plugins::tif
