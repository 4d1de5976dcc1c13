// Jobs give the same with any number of threads, over real files when the folder with them is there.
#include "operations/checksum/checksums.h"
#include "operations/picture/quicklook.h"
#include "operations/statistics/statistics.h"
#include "tests/support/facts.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/threading/threadpool.h"

#include <gtest/gtest.h>

#include <sstream>

namespace krv::operations
{

namespace
{

using krv::threading::IExecutor;
using krv::threading::ThreadPool;

// What all jobs say of a file, exactly; the reason when one fails.
std::string SayAll(const std::string& file, IExecutor* poExecutor)
{
    std::ostringstream oText;
    oText << std::hexfloat;
    const auto Try = [&oText](const auto& oJob)
    {
        try
        {
            oJob();
        }
        catch (const std::exception& oError)
        {
            oText << oError.what() << '\n';
        }
    };
    Try(
        [&]
        {
            const SourceFile oFile(file);
            Try(
                [&]
                {
                    for (const auto& oSum : ComputeChecksums(oFile, {}, 1, {}, poExecutor).channels)
                        oText << oSum.crc32 << '\n';
                });
            Try(
                [&]
                {
                    for (const auto& oChannel : ComputeStatistics(oFile, {}, {}, poExecutor))
                    {
                        oText << oChannel.valid << ' ' << oChannel.noData << ' ' << oChannel.masked << ' '
                              << oChannel.nan << ' ' << oChannel.infinite << ' ';
                        for (const auto& oExtreme : {oChannel.minimum, oChannel.maximum})
                            if (oExtreme)
                                std::visit([&oText](auto nValue) { oText << nValue << ' '; }, *oExtreme);
                        oText << oChannel.mean.value_or(0) << ' ' << oChannel.deviation.value_or(0) << '\n';
                    }
                });
            Try(
                [&]
                {
                    QuickLookOptions oOptions;
                    oOptions.size = 200;
                    const Picture oPicture = MakeQuickLook(oFile, oOptions, {}, poExecutor).picture;
                    oText.write(reinterpret_cast<const char*>(oPicture.pixels.data()),
                                static_cast<std::streamsize>(oPicture.pixels.size()));
                });
        });
    return oText.str();
}

} // namespace

TEST(JobThreads, RealFilesGiveTheSame)
{
    if (krv::test::GetFacts().empty())
        GTEST_SKIP() << "no folder of real files";
    const auto oFormer = krv::nspio::Warning::SetSink([](const std::string&, const std::string&, unsigned int) {});
    ThreadPool oOne(1), oTwo(2), oSeven(7);
    for (const krv::test::Facts& oFacts : krv::test::GetFacts())
    {
        const std::string alone = SayAll(oFacts.GetPath(), nullptr);
        for (IExecutor* const poExecutor : {&oOne, &oTwo, &oSeven})
            EXPECT_TRUE(SayAll(oFacts.GetPath(), poExecutor) == alone)
                << oFacts.GetPath() << " with " << poExecutor->GetThreadCount() + 1 << " threads";
    }
    krv::nspio::Warning::SetSink(oFormer);
}

} // namespace krv::operations
