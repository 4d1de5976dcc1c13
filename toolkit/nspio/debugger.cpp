#include "toolkit/nspio/debugger.h"

#include <atomic>
#include <cstdio>
#include <mutex>
#include <utility>

namespace krv::nspio
{

namespace
{

constinit std::atomic<int> snLevel{0};

// Made on first use and never destroyed: messages may still come while the process ends.
struct State
{
    std::mutex moMutex; // guards moSink
    Debugger::Sink moSink;
};

State& GetState()
{
    static State* const poState = new State;
    return *poState;
}

} // namespace

int Debugger::GetLevel()
{
    return snLevel.load(std::memory_order_relaxed);
}

void Debugger::SetLevel(int nLevel)
{
    snLevel.store(nLevel, std::memory_order_relaxed);
}

void Debugger::Debug(int nLevel, const std::string& module, const std::string& message, const std::string& sourceFile,
                     unsigned int nLine)
{
    if (nLevel > GetLevel())
        return;
    Sink oSink;
    {
        const std::lock_guard oLock(GetState().moMutex);
        oSink = GetState().moSink;
    }
    if (oSink)
        oSink(nLevel, module, message, sourceFile, nLine);
    else
        std::fprintf(stderr, "debug %d: %s: %s (%s:%u)\n", nLevel, module.c_str(), message.c_str(), sourceFile.c_str(),
                     nLine);
}

Debugger::Sink Debugger::SetSink(Sink oSink)
{
    const std::lock_guard oLock(GetState().moMutex);
    return std::exchange(GetState().moSink, std::move(oSink));
}

} // namespace krv::nspio
