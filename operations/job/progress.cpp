#include "operations/job/progress.h"

#include "operations/job/exceptions.h"

#include <utility>

namespace krv::operations
{

void Report(const Progress& oProgress, const Amount& oAmount)
{
    if (oProgress && !oProgress(oAmount))
        throw StoppedException();
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
