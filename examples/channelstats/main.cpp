// Statistics of every channel of a file, by the library of whole jobs: pixels without data, masked and transparent ones
// take no part.
#include "operations/statistics/statistics.h"

#include <exception>
#include <iostream>

int main(int nArguments, char** pArguments)
try
{
    const krv::operations::SourceFile oFile(nArguments > 1 ? pArguments[1] : "scene.tif");
    // Called between pieces of work; false would stop the job, which throws StoppedException then.
    const auto Tell = [](const krv::operations::Amount& oAmount)
    {
        std::cerr << "\r" << oAmount.done << " of " << oAmount.total << " bytes" << std::flush;
        return true;
    };
    const auto oChannels = krv::operations::ComputeStatistics(oFile, {}, Tell);
    std::cerr << "\n";
    for (const krv::operations::ChannelStatistics& oChannel : oChannels)
        std::cout << "channel " << oChannel.number << " (" << oChannel.type.Describe() << "): mean "
                  << oChannel.mean.value_or(0) << " of " << oChannel.valid << " valid pixels\n";
}
catch (const std::exception& oError)
{
    std::cerr << "channelstats: " << oError.what() << "\n";
    return 1;
}
