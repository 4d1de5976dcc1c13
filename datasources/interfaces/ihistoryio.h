#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::datasources
{

// The processing history of a channel, oldest entry first. The order of the virtual operations is public and fixed.
class KRV_DATASOURCES_API IHistoryIO
{
public:
    virtual ~IHistoryIO();

    // Empty when there is none.
    virtual std::vector<std::string> ReadHistory() const = 0;
    // Adds an entry behind the others. Throws DataException for a dataset that is not open for updating; the history is
    // as before then.
    virtual void AppendHistory(const std::string& oEntry) = 0;
    // Takes all entries away. Throws the same.
    virtual void ClearHistory() = 0;
};

} // namespace krv::datasources
