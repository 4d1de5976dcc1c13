#pragma once

#include "operations/api.h"

#include <cstdint>
#include <functional>

namespace krv::datasources
{
class IDataset;
class IWatchedStoring;
} // namespace krv::datasources

namespace krv::operations
{

// How far a job is. A job has one part or several, one after the other, each of which counts from 0 to its own total.
// Parts of a job are told in their order; each ends with done equal to total.
struct Amount
{
    const char* part = "";   // a word for programs, such as "mask"
    std::uint64_t done = 0;  // in the unit of the total
    std::uint64_t total = 0; // bytes of pixels, as near as is known before
};

// Called when a part begins, between pieces of work and while the job waits for its threads, by the thread that called
// it. False stops the job, which throws StoppedException then and leaves files as if it had failed. May throw. An empty
// function: nobody asks. Example: [](const Amount& oAmount) { return !bStop; }
using Progress = std::function<bool(const Amount&)>;

// For those who write jobs: says how far it is. Throws StoppedException when the function says to stop.
KRV_OPERATIONS_API void Report(const Progress& oProgress, const Amount& oAmount);

// Has a dataset tell so, as the part "store", while it brings to the disk what was written. Goes before the dataset.
class KRV_OPERATIONS_API StoringProgress
{
public:
    StoringProgress(krv::datasources::IDataset& oDataset, const Progress& oProgress);
    ~StoringProgress();
    StoringProgress(const StoringProgress&) = delete;
    StoringProgress& operator=(const StoringProgress&) = delete;

private:
    krv::datasources::IWatchedStoring* mpoWatched; // null where nobody is told
};

// Reports, counting one part. Of one thread, the one that called the job.
class KRV_OPERATIONS_API ProgressCounter
{
public:
    ProgressCounter(Progress oProgress, const char* pPart, std::uint64_t nTotal);

    // nMore: bytes that are done since the last call. Throws StoppedException when the function says to stop.
    void Advance(std::uint64_t nMore);
    // Says the same again, so that who wants the job stopped is heard while it waits.
    void Repeat() const { Report(moProgress, moAmount); }

private:
    Progress moProgress;
    Amount moAmount;
};

} // namespace krv::operations
