#include "toolkit/threading/threadpool.h"

#include "toolkit/exceptions/exceptions.h"

#include <csignal>
#include <pthread.h>

#include <algorithm>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <system_error>
#include <thread>
#include <vector>

namespace krv::threading
{

namespace
{

// Threads inherit the mask of the one that makes them.
class BlockedSignals
{
public:
    BlockedSignals()
    {
        sigset_t oAll;
        sigfillset(&oAll);
        pthread_sigmask(SIG_SETMASK, &oAll, &moFormer);
    }
    ~BlockedSignals() { pthread_sigmask(SIG_SETMASK, &moFormer, nullptr); }
    BlockedSignals(const BlockedSignals&) = delete;
    BlockedSignals& operator=(const BlockedSignals&) = delete;

private:
    sigset_t moFormer;
};

} // namespace

class ThreadPool::Implementation
{
public:
    explicit Implementation(unsigned int nThreads)
    {
        const BlockedSignals oBlocked;
        try
        {
            for (unsigned int n = 0; n < nThreads; ++n)
                moThreads.emplace_back([this] { Serve(); });
        }
        catch (const std::system_error& oError)
        {
            End();
            throw krv::OSException(oError.code().value(), "Cannot start a thread");
        }
    }
    ~Implementation() { End(); }
    Implementation(const Implementation&) = delete;
    Implementation& operator=(const Implementation&) = delete;

    unsigned int GetThreadCount() const { return static_cast<unsigned int>(moThreads.size()); }

    void Run(std::function<void()> oTask)
    {
        {
            const std::lock_guard oLock(moMutex);
            moTasks.push_back(std::move(oTask));
        }
        moWork.notify_one();
    }

private:
    void Serve()
    {
        std::unique_lock oLock(moMutex);
        for (;;)
        {
            moWork.wait(oLock, [this] { return mbEnds || !moTasks.empty(); });
            if (mbEnds)
                return;
            const std::function<void()> oTask = std::move(moTasks.front());
            moTasks.pop_front();
            oLock.unlock();
            oTask();
            oLock.lock();
        }
    }

    void End()
    {
        {
            const std::lock_guard oLock(moMutex);
            mbEnds = true;
        }
        moWork.notify_all();
        for (std::thread& oThread : moThreads)
            oThread.join();
    }

    std::mutex moMutex; // guards the tasks and the end
    std::condition_variable moWork;
    std::deque<std::function<void()>> moTasks;
    bool mbEnds = false;
    std::vector<std::thread> moThreads;
};

ThreadPool::ThreadPool(unsigned int nThreads) : mpoImplementation(std::make_unique<Implementation>(nThreads)) {}

ThreadPool::~ThreadPool() = default;

unsigned int ThreadPool::CountProcessors()
{
    return std::max(std::thread::hardware_concurrency(), 1U);
}

unsigned int ThreadPool::GetThreadCount() const
{
    return mpoImplementation->GetThreadCount();
}

void ThreadPool::Run(std::function<void()> oTask)
{
    mpoImplementation->Run(std::move(oTask));
}

} // namespace krv::threading
