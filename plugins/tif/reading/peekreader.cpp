#include "plugins/tif/reading/peekreader.h"

#include <algorithm>
#include <cstring>

namespace krv::plugins::tif
{

std::size_t PeekReader::Read(std::uint64_t nOffset, void* pTarget, std::size_t nBytes)
{
    if (nBytes == 0)
        return 0;
    for (const Window& oWindow : moWindows)
        if (oWindow.Holds(nOffset, nBytes))
        {
            std::memcpy(pTarget, oWindow.moBytes.data() + (nOffset - oWindow.mnOffset), nBytes);
            return nBytes;
        }
    if (nBytes > WINDOW_BYTES / 2)
        return moFile.ReadUpTo(nOffset, pTarget, nBytes);
    Window& oWindow = moWindows[mnNext];
    mnNext = 1 - mnNext;
    oWindow.mnBytes = 0;
    oWindow.mnOffset = nOffset - nOffset % (WINDOW_BYTES / 4);
    const std::size_t nSkip = nOffset - oWindow.mnOffset;
    // What seems to lie behind the end is asked for only when it is wanted: a call to the system would tell the end.
    const std::uint64_t nLeft = moFile.GetSize() - std::min(moFile.GetSize(), oWindow.mnOffset);
    const auto nWanted = std::min<std::uint64_t>(WINDOW_BYTES, std::max<std::uint64_t>(nLeft, nSkip + nBytes));
    oWindow.mnBytes = moFile.ReadUpTo(oWindow.mnOffset, oWindow.moBytes.data(), nWanted);
    const std::size_t nGot = std::min(nBytes, oWindow.mnBytes > nSkip ? oWindow.mnBytes - nSkip : 0);
    std::memcpy(pTarget, oWindow.moBytes.data() + nSkip, nGot);
    return nGot;
}

} // namespace krv::plugins::tif
