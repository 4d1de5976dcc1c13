#pragma once

#include <string>
#include <vector>

namespace krv::plugins::support
{

// Old files out of the way of a new one: back in their places when this goes, unless they were dropped before.
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
    void Drop();

private:
    struct Moved
    {
        std::string moName;
        std::string moAside;
    };

    void PutBack() noexcept;

    std::vector<Moved> moMoved;
};

} // namespace krv::plugins::support
