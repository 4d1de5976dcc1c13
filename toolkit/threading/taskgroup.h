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
// One thread makes it, adds to its lines and takes from them: the owner. Only the tasks run elsewhere.
class KRV_TOOLKIT_API TaskGroup
{
public:
    // poExecutor: borrowed; null: the owning thread does everything, each task when its result is taken.
    // oIdle: called by the owning thread after each task that it runs, and every 50 ms while it waits for others; what
    // it throws ends the waiting.
    explicit TaskGroup(IExecutor* poExecutor, std::function<void()> oIdle = {});
    // The lines are gone by then.
    // Tasks that run belong to lines, which waited for them.
    ~TaskGroup();
    TaskGroup(const TaskGroup&) = delete;
    TaskGroup& operator=(const TaskGroup&) = delete;

    // The owning thread among them.
    // 1 without an executor, or with one that lends no threads.
    unsigned int GetThreadCount() const { return mnThreads + 1; }
    // How many tasks of a line keep all threads busy.
    // Adding more does no harm but to memory: nothing bounds a line by itself.
    std::size_t GetAhead() const { return mnThreads == 0 ? 1 : 2 * (std::size_t{mnThreads} + 1); }

private:
    friend class TaskLine;
    struct Task;
    struct State;

    IExecutor* mpoExecutor; // borrowed
    unsigned int mnThreads;
    std::function<void()> moIdle;
    std::shared_ptr<State> mpoState; // shared with tasks that executors hold on to
};

// Whether results are taken in the order in which their tasks were added, or as soon as any is done.
enum class TaskOrder
{
    eAsAdded, // the result does not depend on the number of threads
    eAsDone   // for work whose order does not matter
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
    // Never waits. What oWork throws is kept and thrown by TakeNext; oTake is not called then.
    void Add(std::function<void()> oWork, std::function<void()> oTake);
    // Tasks that have not been taken.
    // Those that run or are done count too.
    std::size_t GetCount() const { return moEntries.size(); }
    // Waits for the next one in the line's order and takes it, or throws what it threw. There is one.
    // Runs tasks of the group itself while the next one is not done. Calling it without a task left is an error of the
    // caller.
    void TakeNext();

    // As TakeNext until none is left. An exception leaves the others in the line, to be dropped with it.
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
    Entries moEntries; // in the order of Add
};

} // namespace krv::threading
