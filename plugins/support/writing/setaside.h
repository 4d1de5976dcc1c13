#pragma once

#include <string>
#include <vector>

namespace krv::plugins::support
{

// Old files out of the way of a new one: back in their places when this goes, unless they were dropped before.
// For files that belong to an image that is about to be replaced: levels, masks, tags beside it.
class SetAside
{
public:
    // Those of the names that there are. Throws IOException, with all of them in their places, for one that cannot be
    // moved.
    explicit SetAside(const std::vector<std::string>& oNames);
    ~SetAside();
    SetAside(const SetAside&) = delete;
    SetAside& operator=(const SetAside&) = delete;

    // Removes them.
    // To be called when the new file has its name.
    void Drop();

private:
    struct Moved
    {
        std::string moName;  // where it lay
        std::string moAside; // where it lies meanwhile, in the same folder
    };

    void PutBack() noexcept;

    std::vector<Moved> moMoved;
};

} // namespace krv::plugins::support
