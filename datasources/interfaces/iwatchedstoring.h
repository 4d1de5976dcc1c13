#pragma once

#include "datasources/api.h"

#include <cstdint>
#include <functional>

namespace krv::datasources
{

// A dataset that can be stopped while Synchronize and Close bring what was written to the disk, which can take as long
// as writing it did. The order of the virtual operations is public and fixed.
class KRV_DATASOURCES_API IWatchedStoring
{
public:
    virtual ~IWatchedStoring();

    // Bytes that are where they belong, and all of them; a call may have several parts, each of which begins at 0.
    using Watch = std::function<void(std::uint64_t nDone, std::uint64_t nTotal)>;

    // Called from now on by the thread that stores, about every 10 MiB; an empty function: nobody is asked. What it
    // throws passes through Synchronize or Close, which leave the file as a failure to write does: an existing one as
    // it was, a new one without its name. It is not called any more once the file is the new one.
    virtual void WatchStoring(Watch oWatch) = 0;
};

} // namespace krv::datasources
