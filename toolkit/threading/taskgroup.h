#pragma once

#include "toolkit/api.h"
#include "toolkit/threading/executor.h"

#include <cstddef>
#include <deque>
#include <functional>
#include <memory>

namespace krv::threading
{

class TaskLine;

// The tasks of one job, run by an executor's threads and by the thread that owns the group, which never waits for a
// task that nobody has begun: an executor that is busy with something else costs time alone.
class KRV_TOOLKIT_API TaskGroup
{
public:
    // poExecutor: borrowed; null: the owning thread does everything, each task when its result is taken.
    // oIdle: called by the owning thread after each task that it runs, and every 50 ms while it waits for others; what
    // it throws ends the waiting.
    explicit TaskGroup(IExecutor* poExecutor, std::function<void()> oIdle = {});
    // The lines are gone by then.
    ~TaskGroup();
    TaskGroup(const TaskGroup&) = delete;
    TaskGroup& operator=(const TaskGroup&) = delete;

    // The owning thread among them.
    unsigned int GetThreadCount() const { return mnThreads + 1; }
    // How many tasks of a line keep all threads busy.
    std::size_t GetAhead() const { return mnThreads == 0 ? 1 : 2 * (std::size_t{mnThreads} + 1); }

private:
    friend class TaskLine;
    struct Task;
    struct State;

    IExecutor* mpoExecutor; // borrowed
    unsigned int mnThreads;
    std::function<void()> moIdle;
    std::shared_ptr<State> mpoState;
};

enum class TaskOrder
{
    eAsAdded,
    eAsDone
};

// Tasks whose results are taken one after the other by the thread that owns the group, whatever thread runs which and
// when. A group may have several lines. A line is made after whatever its tasks use.
class KRV_TOOLKIT_API TaskLine
{
public:
    explicit TaskLine(TaskGroup& oGroup, TaskOrder eOrder = TaskOrder::eAsAdded) : moGroup(oGroup), meOrder(eOrder) {}
    // Drops the tasks that have not begun and waits for those that run.
    ~TaskLine();
    TaskLine(const TaskLine&) = delete;
    TaskLine& operator=(const TaskLine&) = delete;

    // oWork: run by any thread. oTake: run by the owning thread afterwards; may be empty.
    void Add(std::function<void()> oWork, std::function<void()> oTake);
    // Tasks that have not been taken.
    std::size_t GetCount() const { return moEntries.size(); }
    // Waits for the next one in the line's order and takes it, or throws what it threw. There is one.
    void TakeNext();
    void TakeAll();

private:
    struct Entry
    {
        std::shared_ptr<TaskGroup::Task> mpoTask;
        std::function<void()> moTake;
    };
    using Entries = std::deque<Entry>;

    Entries::iterator FindDone();
    Entries::iterator WaitForNext();

    TaskGroup& moGroup;
    TaskOrder meOrder;
    Entries moEntries;
};

} // namespace krv::threading
