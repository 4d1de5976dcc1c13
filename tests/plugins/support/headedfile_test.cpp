#include "plugins/support/writing/headedfile.h"
#include "plugins/support/writing/recordtext.h"

#include "tests/support/thrown.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

using krv::conformance::ReadFile;
using krv::plugins::support::File;
using krv::plugins::support::HeadedFile;
using krv::plugins::support::RecordText;
using krv::test::Error;

namespace
{

const HeadedFile::FirstLines LINES{"whole file\n", "half  file\n"};

std::string Header(const HeadedFile& oFile)
{
    return oFile.ReadHeader().str();
}

} // namespace

// What the first line says at every moment is what a reader would meet if the machine stopped there.
TEST(HeadedFile, TheFirstLineWarnsWhileAnythingIsNotStored)
{
    const krv::conformance::TempFolder oFolder;
    const std::string name = oFolder.File("a");
    {
        HeadedFile oFile(name, LINES);
        oFile.Make("size=1\n", 100);
        EXPECT_FALSE(oFile.IsNamed());
        oFile.Synchronize();
        EXPECT_TRUE(ReadFile(name).starts_with(LINES.moFinished + "size=1\n"));
        EXPECT_EQ(ReadFile(name).size(), oFile.GetHeaderBytes() + 100);
        EXPECT_EQ(oFile.Append(10), oFile.GetHeaderBytes() + 100);
        EXPECT_TRUE(ReadFile(name).starts_with(LINES.moUnfinished));
        EXPECT_EQ(Error([&] { HeadedFile oOther(std::make_shared<File>(name, File::Mode::eRead), LINES); }),
                  "file: " + name + " was not written to its end");
        oFile.Synchronize();
    }
    {
        HeadedFile oFile(std::make_shared<File>(name, File::Mode::eUpdate), LINES);
        EXPECT_EQ(Header(oFile).substr(0, 7), "size=1\n");
        // A header without room for the text changes nothing.
        const std::string before = ReadFile(name);
        EXPECT_NE(Error([&] { oFile.SetHeader(std::string(oFile.GetHeaderBytes(), 'x')); }).find("more than the 65536"),
                  std::string::npos);
        EXPECT_FALSE(oFile.HasUnsaved());
        EXPECT_EQ(ReadFile(name), before);
        oFile.SetHeader("size=2\n");
        EXPECT_TRUE(oFile.HasUnsaved());
        oFile.Finish();
    }
    const HeadedFile oFile(std::make_shared<File>(name, File::Mode::eRead), LINES);
    EXPECT_EQ(Header(oFile).substr(0, 7), "size=2\n");
    for (const char* pText : {"", "whole file\n", "whole file\nsize=1\n", "other\n\n"})
        EXPECT_NE(
            Error([&]
                  { HeadedFile oBad(std::make_shared<File>(oFolder.Write("bad", pText), File::Mode::eRead), LINES); })
                .find("has no complete header"),
            std::string::npos)
            << pText;
}

// Every byte survives as key and as value; a text that is cut anywhere gives the record of what is left.
TEST(RecordText, KeysAndValuesAreBytes)
{
    RecordText oText;
    oText.moTags = krv::datasources::AuxiliaryData(2);
    std::string bytes;
    for (int n = 1; n < 256; ++n)
        bytes += static_cast<char>(n);
    oText.moTags.SetFileMetadataValue("[2]" + bytes, bytes + "%41");
    oText.moTags.SetFileMetadataValue("%3D", "a=b");
    oText.moTags.SetChanMetadataValue("=[1]", "[crs]=x", 2);
    oText.moTags.SetChannelDescription("line\nline", 1);
    oText.moLevels[4] = std::uint64_t{1} << 60;
    oText.SetGeocoding({500000.1, 0.3, 0, 1e-300, 0, -30});
    const std::string written = oText.Write();
    RecordText oRead;
    const auto Read = [&](const std::string& text)
    {
        oRead = RecordText();
        oRead.moTags = krv::datasources::AuxiliaryData(2);
        std::istringstream oLines(text);
        oRead.Read(oLines);
    };
    Read(written);
    EXPECT_EQ(oRead.moTags.GetFileMetadata(), oText.moTags.GetFileMetadata());
    EXPECT_EQ(oRead.moTags.GetChanMetadata(2), oText.moTags.GetChanMetadata(2));
    EXPECT_EQ(oRead.moTags.GetChannelDescription(1), "line\nline");
    EXPECT_EQ(oRead.moLevels, oText.moLevels);
    EXPECT_EQ(oRead.GetGeocoding().GetTerms(), oText.GetGeocoding().GetTerms());
    EXPECT_EQ(oRead.GetCRS(), nullptr);
    for (std::size_t n = 0; n <= written.size(); ++n)
    {
        Read(written.substr(0, n));
        EXPECT_LE(oRead.moTags.GetFileMetadata().size(), 2U) << n;
    }
    // Channels that are not there, levels that are none and a system that nobody knows.
    Read("[3]a=b\n[level 1]=5\n[level x]=5\n[level 2]=-5\n[geocoding]=1 2 3\n[crs]=nowhere\nno sign\n");
    EXPECT_TRUE(oRead.moLevels.empty() && oRead.moTags.GetFileMetadata().empty());
    EXPECT_EQ(oRead.GetGeocoding().GetTerms(), krv::ogc::cs::GeocodingInfo().GetTerms());
    EXPECT_TRUE(Error([&] { oRead.GetCRS(); }).starts_with("data: "));
}
