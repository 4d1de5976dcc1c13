#pragma once

#include "toolkit/api.h"

#include <functional>

namespace krv::threading
{

// Threads that a program lends to the library, which starts none of its own. Whoever wants work on several cores hands
// it one of these; without one it is done by the thread that asks for it.
// A program with threads of its own makes a small class of it; others take ThreadPool. The order of the operations is
// public and fixed.
class KRV_TOOLKIT_API IExecutor
{
public:
    // After it no task begins any more.
    virtual ~IExecutor();

    // How many tasks may run at one time, beside what the thread that asks does itself. 0: none ever.
    virtual unsigned int GetThreadCount() const = 0;
    // Takes a task, which throws nothing, to be run once by any of the threads, soon or later, or never when the
    // executor ends before. Returns without waiting for it. Any thread may call.
    virtual void Run(std::function<void()> oTask) = 0;
};

} // namespace krv::threading
