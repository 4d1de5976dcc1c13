#include "toolkit/threading/taskgroup.h"

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <exception>
#include <mutex>
#include <utility>

namespace krv::threading
{

namespace
{

constexpr auto LONGEST_WAIT = std::chrono::milliseconds(50);

} // namespace

struct TaskGroup::Task
{
    std::function<void()> moWork;
    std::exception_ptr moFailure;
    bool mbRunning = false;
    bool mbDone = false;
};

// Shared with the executor's tasks, which may come when the group is gone.
struct TaskGroup::State
{
    using Waiting = std::deque<std::shared_ptr<Task>>;

    std::mutex moMutex; // guards everything here, and of each task all but its work while it runs
    std::condition_variable moDone;
    Waiting moWaiting;
    unsigned int mnServing = 0; // tasks of the executor that are to come or run

    // The lock is held before and after.
    void Run(const Waiting::iterator& oPlace, std::unique_lock<std::mutex>& oLock)
    {
        const std::shared_ptr<Task> poTask = *oPlace;
        moWaiting.erase(oPlace);
        poTask->mbRunning = true;
        oLock.unlock();
        std::exception_ptr oFailure;
        try
        {
            poTask->moWork();
        }
        catch (...)
        {
            oFailure = std::current_exception();
        }
        poTask->moWork = nullptr;
        oLock.lock();
        poTask->moFailure = std::move(oFailure);
        poTask->mbRunning = false;
        poTask->mbDone = true;
        moDone.notify_all();
    }

    // What a thread of the executor does, as long as there is something.
    void Serve()
    {
        std::unique_lock oLock(moMutex);
        while (!moWaiting.empty())
            Run(moWaiting.begin(), oLock);
        --mnServing;
    }
};

TaskGroup::TaskGroup(IExecutor* poExecutor, std::function<void()> oIdle)
    : mpoExecutor(poExecutor), mnThreads(poExecutor != nullptr ? poExecutor->GetThreadCount() : 0),
      moIdle(std::move(oIdle)), mpoState(std::make_shared<State>())
{
}

TaskGroup::~TaskGroup() = default;

TaskLine::~TaskLine()
{
    TaskGroup::State& oState = *moGroup.mpoState;
    std::unique_lock oLock(oState.moMutex);
    for (const Entry& oEntry : moEntries)
    {
        std::erase(oState.moWaiting, oEntry.mpoTask);
        oState.moDone.wait(oLock, [&oEntry] { return !oEntry.mpoTask->mbRunning; });
    }
}

void TaskLine::Add(std::function<void()> oWork, std::function<void()> oTake)
{
    const auto poTask = std::make_shared<TaskGroup::Task>();
    poTask->moWork = std::move(oWork);
    moEntries.push_back({poTask, std::move(oTake)});
    const auto poState = moGroup.mpoState;
    {
        const std::lock_guard oLock(poState->moMutex);
        poState->moWaiting.push_back(poTask);
        if (poState->mnServing >= moGroup.mnThreads)
            return;
        ++poState->mnServing;
    }
    moGroup.mpoExecutor->Run([poState] { poState->Serve(); });
}

// The one that is next and done; the end when there is none yet.
TaskLine::Entries::iterator TaskLine::FindDone()
{
    if (meOrder == TaskOrder::eAsAdded)
        return moEntries.front().mpoTask->mbDone ? moEntries.begin() : moEntries.end();
    return std::find_if(moEntries.begin(), moEntries.end(), [](const Entry& oEntry) { return oEntry.mpoTask->mbDone; });
}

// While others run the task that is waited for, this thread runs one that nobody has begun.
TaskLine::Entries::iterator TaskLine::WaitForNext()
{
    TaskGroup::State& oState = *moGroup.mpoState;
    std::unique_lock oLock(oState.moMutex);
    for (;;)
    {
        if (const auto oDone = FindDone(); oDone != moEntries.end())
            return oDone;
        auto& oWaiting = oState.moWaiting;
        const auto oFirst = std::find(oWaiting.begin(), oWaiting.end(), moEntries.front().mpoTask);
        if (!oWaiting.empty())
            oState.Run(oFirst != oWaiting.end() ? oFirst : oWaiting.begin(), oLock);
        else
            oState.moDone.wait_for(oLock, LONGEST_WAIT);
        if (moGroup.moIdle)
        {
            oLock.unlock();
            moGroup.moIdle();
            oLock.lock();
        }
    }
}

void TaskLine::TakeNext()
{
    const auto oNext = WaitForNext();
    const Entry oEntry = std::move(*oNext);
    moEntries.erase(oNext);
    if (oEntry.mpoTask->moFailure)
        std::rethrow_exception(oEntry.mpoTask->moFailure);
    if (oEntry.moTake)
        oEntry.moTake();
}

void TaskLine::TakeAll()
{
    while (!moEntries.empty())
        TakeNext();
}

} // namespace krv::threading
