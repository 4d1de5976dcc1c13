#pragma once

#include <memory>

namespace krv
{

// Deletes what is owned and leaves alone what is only borrowed. Borrowing is the default.
// The flag stands with the deleter, so that a pointer of either sort has one type.
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
// Example: OwnedOrBorrowed<IDataset>(poDataset, {true}) deletes it in the end; with {false} it only points.
// Made of a pointer alone it borrows. Moving keeps what it was.
template <typename T, typename Deleter = std::default_delete<T>>
using OwnedOrBorrowed = std::unique_ptr<T, DeleteIfOwned<T, Deleter>>;

} // namespace krv
