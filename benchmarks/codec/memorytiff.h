#pragma once

#include <tiffio.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <memory>
#include <vector>

namespace krv::benchmarks
{

// A TIFF file in memory, for what is about the coding of blocks alone.
class MemoryTiff
{
public:
    using File = std::unique_ptr<TIFF, void (*)(TIFF*)>;

    File Open(const char* mode)
    {
        mnPosition = 0;
        return {TIFFClientOpen("memory", mode, this, &Read, &Write, &Seek, &Close, &Size, nullptr, nullptr),
                &TIFFClose};
    }

private:
    static MemoryTiff& Self(thandle_t handle) { return *static_cast<MemoryTiff*>(handle); }

    static tmsize_t Read(thandle_t handle, void* buffer, tmsize_t nSize)
    {
        MemoryTiff& oSelf = Self(handle);
        if (oSelf.mnPosition >= oSelf.moBytes.size())
            return 0;
        const auto nBytes =
            std::min<std::size_t>(static_cast<std::size_t>(nSize), oSelf.moBytes.size() - oSelf.mnPosition);
        std::memcpy(buffer, oSelf.moBytes.data() + oSelf.mnPosition, nBytes);
        oSelf.mnPosition += nBytes;
        return static_cast<tmsize_t>(nBytes);
    }

    static tmsize_t Write(thandle_t handle, void* buffer, tmsize_t nSize)
    {
        MemoryTiff& oSelf = Self(handle);
        const auto nBytes = static_cast<std::size_t>(nSize);
        if (oSelf.moBytes.size() < oSelf.mnPosition + nBytes)
            oSelf.moBytes.resize(oSelf.mnPosition + nBytes);
        std::memcpy(oSelf.moBytes.data() + oSelf.mnPosition, buffer, nBytes);
        oSelf.mnPosition += nBytes;
        return nSize;
    }

    static toff_t Seek(thandle_t handle, toff_t nOffset, int nWhence)
    {
        MemoryTiff& oSelf = Self(handle);
        const toff_t nBase = nWhence == SEEK_SET ? 0 : nWhence == SEEK_CUR ? oSelf.mnPosition : oSelf.moBytes.size();
        oSelf.mnPosition = nBase + nOffset;
        return oSelf.mnPosition;
    }

    static int Close(thandle_t) { return 0; }
    static toff_t Size(thandle_t handle) { return Self(handle).moBytes.size(); }

    std::vector<unsigned char> moBytes;
    std::size_t mnPosition = 0;
};

} // namespace krv::benchmarks
