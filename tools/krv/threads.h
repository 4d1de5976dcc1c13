#pragma once

namespace krv::threading
{
class IExecutor;
}

namespace krv::tool
{

// How many threads work at one time: 0 for one on each processor.
void SetThreadCount(unsigned int nThreads);

// The threads that jobs get beside the one that calls them, started when they are first asked for; null for none. They
// end with the process.
krv::threading::IExecutor* GetExecutor();

} // namespace krv::tool
