#pragma once

#include "toolkit/api.h"

#include <pthread.h>

namespace krv::threading
{

// A mutex that its holder may lock again. Needs no construction at run time, so that a static one is ready before main.
// As many unlocks as locks free it. A mutex that never meets its holder again is better a std::mutex.
class KRV_TOOLKIT_API Mutex
{
public:
    constexpr Mutex() noexcept : moHandle(PTHREAD_RECURSIVE_MUTEX_INITIALIZER_NP) {}
    Mutex(const Mutex&) = delete;
    Mutex& operator=(const Mutex&) = delete;

    // The names of the standard library's lockables, so that std::lock_guard works.
    // lock waits; try_lock gives false at once when another thread holds it; unlock is for the holder alone.
    void lock();
    bool try_lock();
    void unlock();

private:
    pthread_mutex_t moHandle;
};

} // namespace krv::threading
