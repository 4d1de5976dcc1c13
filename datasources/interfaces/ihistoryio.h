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

    virtual std::vector<std::string> ReadHistory() const = 0;
    virtual void AppendHistory(const std::string& oEntry) = 0;
    virtual void ClearHistory() = 0;
};

} // namespace krv::datasources
