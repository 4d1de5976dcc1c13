#include "tools/krv/interrupt.h"

#include <csignal>

namespace krv::tool
{

namespace
{

volatile std::sig_atomic_t gnStopped = 0;

void NoteSignal(int)
{
    gnStopped = 1;
}

} // namespace

void WatchForInterrupt()
{
    struct sigaction oAction = {};
    oAction.sa_handler = &NoteSignal;
    oAction.sa_flags = static_cast<int>(SA_RESETHAND);
    sigaction(SIGINT, &oAction, nullptr);
    sigaction(SIGTERM, &oAction, nullptr);
}

bool WasInterrupted()
{
    return gnStopped != 0;
}

} // namespace krv::tool
