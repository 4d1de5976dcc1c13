// Jobs give the same with any number of threads, over real files when the folder with them is there.
#include "datasources/utils/open.h"
#include "datasources/writer/irasterwriter.h"
#include "gobs/raster/raster.h"
#include "operations/checksum/checksums.h"
#include "operations/copy/conversion.h"
#include "operations/job/exceptions.h"
#include "operations/picture/quicklook.h"
#include "operations/statistics/statistics.h"
#include "tests/support/facts.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/threading/threadpool.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <filesystem>
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

// Says stop in the middle of a part, and notes that it was there.
Progress StopWithin(const std::string& part, bool& bReached)
{
    return [part, &bReached](const Amount& oAmount)
    {
        bReached = bReached || (oAmount.part == part && oAmount.done > 0 && oAmount.done < oAmount.total);
        return !bReached;
    };
}

} // namespace

// What comes after the last tile can take as long as all before it.
TEST(JobThreads, WhatIsDoneIsStoppedOnItsWayToTheDisk)
{
    const krv::conformance::TempFolder oFolder;
    const std::string source = oFolder.File("source.tif");
    {
        krv::gobs::Raster oPixels({3200, 3200, 1, krv::gobs::eDT_8U}, {0, 0, 0, 0});
        for (std::uint64_t i = 0; i < oPixels.GetBufferSize(); ++i)
            oPixels.GetBuffer()[i] = static_cast<unsigned char>(i % 251 + 1);
        const auto poWriter = krv::CreateWriter(source, oPixels.GetInfo());
        poWriter->WriteRaster(&oPixels);
        poWriter->Synchronize();
    }
    const auto CountFiles = [&oFolder]
    {
        return std::distance(std::filesystem::directory_iterator(oFolder.GetPath()), {});
    };
    for (const auto& [name, options] :
         {std::pair("a.tif", "BLOCKXSIZE=512 BLOCKYSIZE=512"), {"b.tif", "LAYOUT=COG"}, {"c.krv", ""}, {"d.bsq", ""}})
    {
        bool bReached = false;
        EXPECT_THROW(Convert({{source}, {}, {}, {}}, {oFolder.File(name), "", options}, StopWithin("store", bReached)),
                     StoppedException)
            << name;
        EXPECT_TRUE(bReached && CountFiles() == 1) << name;
    }
    Picture oPicture{3000, 20, 3, {}};
    oPicture.pixels.resize(std::size_t{3000} * 20 * 3);
    for (const char* const pName : {"e.png", "f.jpg"})
    {
        bool bReached = false;
        EXPECT_THROW(WritePicture(oPicture, oFolder.File(pName), StopWithin("picture", bReached)), StoppedException);
        EXPECT_TRUE(bReached && CountFiles() == 1) << pName;
    }
}

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
