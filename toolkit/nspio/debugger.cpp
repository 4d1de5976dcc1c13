#include "toolkit/nspio/debugger.h"

#include "toolkit/nspio/detail/sinkholder.h"

#include <atomic>
#include <cstdio>
#include <utility>

namespace krv::nspio
{

namespace
{

constinit std::atomic<int> snLevel{0};

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
    const Sink oSink = detail::SinkHolder<Debugger>::Get();
    if (oSink)
        oSink(nLevel, module, message, sourceFile, nLine);
    else
        std::fprintf(stderr, "debug %d: %s: %s (%s:%u)\n", nLevel, module.c_str(), message.c_str(), sourceFile.c_str(),
                     nLine);
}

Debugger::Sink Debugger::SetSink(Sink oSink)
{
    return detail::SinkHolder<Debugger>::Set(std::move(oSink));
}

} // namespace krv::nspio
