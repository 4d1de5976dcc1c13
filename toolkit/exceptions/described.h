#pragma once

#include <string>
#include <utility>

namespace krv
{

// An exception of a kind whose message is fixed by contract and says too little by itself: an empty text, or one that
// does not name the file. what() gives a description in its place, for programs that show no more than that;
// GetMessage() stays the message. Caught as the kind.
// Example: throw Described<DataException>("a.tif: The dataset already exists", "The dataset already exists");
template <typename Kind>
class Described : public Kind
{
public:
    // oArguments: those of the kind's constructor.
    template <typename... Arguments>
    explicit Described(std::string description, Arguments&&... oArguments)
        : Kind(std::forward<Arguments>(oArguments)...), moDescription(std::move(description))
    {
    }

    // Valid as long as the exception. The place is that of the kind's constructor, which takes it as its last argument.
    const char* what() const noexcept override { return moDescription.c_str(); }

private:
    std::string moDescription;
};

} // namespace krv
