#pragma once

#include "plugins/krvdsk/store/catalogue.h"
#include "plugins/support/writing/options.h"
#include "toolkit/exceptions/place.h"

#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::krvdsk
{

// How a new file is laid out.
struct CreateOptions
{
    Catalogue moDefaults;
    // The file whose pixels are to be seen through the new one, as it was named; none: the new one has its own.
    std::optional<std::string> moLinked;

    // options: KEY=VALUE, separated by blanks, in any letter case; FILENOCREATE= takes all that follows it, as it
    // stands. Throws DataException naming a key or a value that is not known.
    static CreateOptions Parse(const std::string& options, const Place& oPlace = Place::Current());
    // The keys as users are told of them.
    static std::vector<support::Options::Description> Describe();
};

} // namespace krv::plugins::krvdsk
