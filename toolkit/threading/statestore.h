#pragma once

#include <condition_variable>
#include <functional>
#include <memory>
#include <mutex>
#include <utility>
#include <vector>

namespace krv::threading
{

// What a task needs for itself while it runs, such as a reader of its own: taken when it begins, made when none is
// free, given back at its end. There are never more than tasks that run at one time.
// Any thread may use a store. States are of one kind: which one a task gets does not matter.
// A task makes a Use of the store when it begins, and works by that: oUse->Run(...).
template <typename T>
class StateStore
{
public:
    // A new state, made without any lock; null: there can be no more, and who wants one waits for another to be free.
    // There is at least one then, added before. What it throws passes to the task.
    using Make = std::function<std::unique_ptr<T>()>;

    // Nothing is made here. oMake may be called by several threads at once.
    explicit StateStore(Make oMake) : moMake(std::move(oMake)) {}

    // A state that was made elsewhere, such as the one that the file was opened with. Not null.
    void Add(std::unique_ptr<T> poState) { Give(std::move(poState)); }

    // One state, for as long as this lives.
    // It is taken by the constructor, which may wait, and given back by the destructor. One thread at a time uses it.
    class Use
    {
    public:
        explicit Use(StateStore& oStore) : moStore(oStore), mpoState(oStore.Take()) {}
        ~Use() { moStore.Give(std::move(mpoState)); }
        Use(const Use&) = delete;
        Use& operator=(const Use&) = delete;

        // The state belongs to the store: nobody keeps a pointer to it beyond the life of this object.
        T& operator*() const { return *mpoState; }
        T* operator->() const { return mpoState.get(); }

    private:
        StateStore& moStore; // outlives the use
        std::unique_ptr<T> mpoState;
    };

private:
    std::unique_ptr<T> Take()
    {
        std::unique_lock oLock(moMutex);
        if (moFree.empty() && !mbComplete)
        {
            oLock.unlock();
            if (std::unique_ptr<T> poNew = moMake())
                return poNew;
            oLock.lock();
            mbComplete = true;
        }
        moGiven.wait(oLock, [this] { return !moFree.empty(); });
        std::unique_ptr<T> poState = std::move(moFree.back());
        moFree.pop_back();
        return poState;
    }

    void Give(std::unique_ptr<T> poState)
    {
        {
            const std::lock_guard oLock(moMutex);
            moFree.push_back(std::move(poState));
        }
        moGiven.notify_one();
    }

    Make moMake;                            // asked without the lock
    std::mutex moMutex;                     // guards what follows
    std::condition_variable moGiven;        // told when a state comes back
    std::vector<std::unique_ptr<T>> moFree; // the one given back last is taken first: its memory is warm
    bool mbComplete = false;                // moMake gave null once: it is not asked again by those who wait
};

} // namespace krv::threading
