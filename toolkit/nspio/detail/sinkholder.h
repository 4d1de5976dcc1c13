#pragma once

#include <mutex>
#include <utility>

namespace krv::nspio::detail
{

// Where messages of a kind go, for all threads. Made on first use and never destroyed: messages may still come while
// the process ends.
template <class Kind>
class SinkHolder
{
public:
    using Sink = typename Kind::Sink;

    static Sink Get()
    {
        const std::lock_guard oLock(Instance().moMutex);
        return Instance().moSink;
    }

    // Returns the one before.
    static Sink Set(Sink oSink)
    {
        const std::lock_guard oLock(Instance().moMutex);
        return std::exchange(Instance().moSink, std::move(oSink));
    }

private:
    static SinkHolder& Instance()
    {
        static SinkHolder* const poHolder = new SinkHolder;
        return *poHolder;
    }

    std::mutex moMutex; // guards moSink
    Sink moSink;
};

} // namespace krv::nspio::detail
