#include "toolkit/nspio/warning.h"

#include <cstdio>
#include <mutex>
#include <utility>

namespace krv::nspio
{

namespace
{

// Made on first use and never destroyed: warnings may still come while the process ends.
struct State
{
    std::mutex moMutex; // guards moSink
    Warning::Sink moSink;
};

State& GetState()
{
    static State* const poState = new State;
    return *poState;
}

} // namespace

void Warning::Warn(const std::string& message, const std::string& sourceFile, unsigned int nLine)
{
    Sink oSink;
    {
        const std::lock_guard oLock(GetState().moMutex);
        oSink = GetState().moSink;
    }
    if (oSink)
        oSink(message, sourceFile, nLine);
    else
        std::fprintf(stderr, "warning: %s (%s:%u)\n", message.c_str(), sourceFile.c_str(), nLine);
}

Warning::Sink Warning::SetSink(Sink oSink)
{
    const std::lock_guard oLock(GetState().moMutex);
    return std::exchange(GetState().moSink, std::move(oSink));
}

} // namespace krv::nspio
