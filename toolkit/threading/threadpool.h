#pragma once

#include "toolkit/threading/executor.h"

#include <memory>

namespace krv::threading
{

// A ready-made executor for programs: it is the program that starts these threads, by making the object; the library
// makes none. They block all signals, which stay with the program's other threads.
// Example: krv::threading::ThreadPool oPool; then &oPool is the executor that readers, writers and jobs ask for.
// Several jobs may share one pool. It outlives all of them.
class KRV_TOOLKIT_API ThreadPool : public IExecutor
{
public:
    // nThreads: beside the thread that asks for work, which takes part in it. Throws OSException when the system has no
    // thread to give.
    explicit ThreadPool(unsigned int nThreads = CountProcessors() - 1);
    // Waits for the tasks that run; those that have not begun are dropped.
    ~ThreadPool() override;
    ThreadPool(const ThreadPool&) = delete;
    ThreadPool& operator=(const ThreadPool&) = delete;

    // How many processors this process may use, at least 1.
    static unsigned int CountProcessors();

    unsigned int GetThreadCount() const override;

    // Tasks begin in the order in which they came. Any thread.
    void Run(std::function<void()> oTask) override;

private:
    class Implementation;
    std::unique_ptr<Implementation> mpoImplementation;
};

} // namespace krv::threading
