#include "tools/krv/threads.h"

#include "toolkit/threading/threadpool.h"

#include <memory>

namespace krv::tool
{

namespace
{

using krv::threading::ThreadPool;

unsigned int gnThreads = 0;

} // namespace

void SetThreadCount(unsigned int nThreads)
{
    gnThreads = nThreads;
}

krv::threading::IExecutor* GetExecutor()
{
    const unsigned int nThreads = gnThreads != 0 ? gnThreads : ThreadPool::CountProcessors();
    if (nThreads == 1)
        return nullptr;
    static const auto poThreads = std::make_unique<ThreadPool>(nThreads - 1);
    return poThreads.get();
}

} // namespace krv::tool
