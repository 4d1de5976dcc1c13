#include "operations/job/progress.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/iwatchedstoring.h"
#include "operations/job/exceptions.h"

#include <utility>

namespace krv::operations
{

void Report(const Progress& oProgress, const Amount& oAmount)
{
    if (oProgress && !oProgress(oAmount))
        throw StoppedException();
}

StoringProgress::StoringProgress(krv::datasources::IDataset& oDataset, const Progress& oProgress)
    : mpoWatched(oProgress ? dynamic_cast<krv::datasources::IWatchedStoring*>(&oDataset) : nullptr)
{
    if (mpoWatched != nullptr)
        mpoWatched->WatchStoring(
            [oProgress](std::uint64_t nDone, std::uint64_t nTotal) {
                Report(oProgress, {"store", nDone, nTotal});
            });
}

StoringProgress::~StoringProgress()
{
    if (mpoWatched != nullptr)
        mpoWatched->WatchStoring({});
}

ProgressCounter::ProgressCounter(Progress oProgress, const char* pPart, std::uint64_t nTotal)
    : moProgress(std::move(oProgress)), moAmount{pPart, 0, nTotal}
{
    Report(moProgress, moAmount);
}

void ProgressCounter::Advance(std::uint64_t nMore)
{
    moAmount.done += nMore;
    Report(moProgress, moAmount);
}

} // namespace krv::operations
