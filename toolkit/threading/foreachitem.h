#pragma once

#include "toolkit/threading/taskgroup.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <type_traits>
#include <utility>

namespace krv::threading
{

// Makes a result of each of the items 0 to nItems - 1 by oWork(nItem), on any threads of the group, and hands it to
// oTake(result), in the thread that owns the group. Results that wait are bounded by GetAhead and nMostAhead. The first
// exception in the order of taking ends all and passes, so that in the order of the items it is the same one for any
// number of threads; work that has not begun is dropped, nothing runs any more when this returns.
// oWork: called once for each item, by several threads at once, in any order. Its result is moved to oTake.
// oTake: called by one thread alone, in the order of the items with eAsAdded, as they come with eAsDone.
// Memory: as many results as are ahead, at least one. Everything that both use outlives the call.
// Example: sums of tiles, the same for any number of threads:
//   ForEachItem(oGroup, nTiles, [&](std::uint64_t i) { return SumOf(i); }, [&](double nSum) { nTotal += nSum; });
template <typename Work, typename Take>
void ForEachItem(TaskGroup& oGroup, std::uint64_t nItems, Work oWork, Take oTake,
                 TaskOrder eOrder = TaskOrder::eAsAdded, std::size_t nMostAhead = SIZE_MAX)
{
    using Result = std::optional<std::invoke_result_t<Work&, std::uint64_t>>;
    TaskLine oLine(oGroup, eOrder);
    const std::size_t nAhead = std::max<std::size_t>(std::min(oGroup.GetAhead(), nMostAhead), 1);
    std::uint64_t nNext = 0;
    for (std::uint64_t nTaken = 0; nTaken < nItems; ++nTaken)
    {
        for (; nNext < nItems && oLine.GetCount() < nAhead; ++nNext)
        {
            const auto poResult = std::make_shared<Result>();
            oLine.Add([&oWork, poResult, nNext] { poResult->emplace(oWork(nNext)); },
                      [&oTake, poResult] { oTake(*std::move(*poResult)); });
        }
        oLine.TakeNext();
    }
}

} // namespace krv::threading
