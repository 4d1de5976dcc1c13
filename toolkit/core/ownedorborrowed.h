#pragma once

#include <memory>

namespace krv
{

// Deletes what is owned and leaves alone what is only borrowed. Borrowing is the default.
template <typename T, typename Deleter = std::default_delete<T>>
struct DeleteIfOwned
{
    void operator()(T* poObject) const
    {
        if (mbOwned)
            Deleter()(poObject);
    }

    bool mbOwned = false;
};

// A pointer to an object that goes with it, or stays the caller's and outlives it: {pointer, {owned or not}}.
template <typename T, typename Deleter = std::default_delete<T>>
using OwnedOrBorrowed = std::unique_ptr<T, DeleteIfOwned<T, Deleter>>;

} // namespace krv
