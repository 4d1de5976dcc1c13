#include "plugins/support/writing/filewriter.h"

#include "tests/support/thrown.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <filesystem>

#include <sys/stat.h>

using krv::conformance::ReadFile;
using krv::test::Error;

namespace
{

// A file of one text.
class TextWriter : public krv::plugins::support::FileWriter
{
public:
    explicit TextWriter(const std::string& fileName) : FileWriter(fileName) {}

    void Write(const std::string& text)
    {
        if (!HasFile())
            MakeFile();
        moText = text;
    }
    void Remove() { RemoveFile(); }

    bool mbFails = false;

protected:
    void Store() override
    {
        GetFile()->Write(0, moText.data(), moText.size());
        if (mbFails)
            throw krv::IOException(GetFileName(), "no");
        moText.clear();
    }
    bool HoldsChanges() const override { return !moText.empty(); }

private:
    std::string moText;
};

} // namespace

// Whatever goes wrong, and wherever the writer ends, the name stands for the file that had it and nothing else is left.
TEST(FileWriter, ANewFileIsWholeOrAbsent)
{
    const krv::conformance::TempFolder oFolder;
    const std::string fileName = oFolder.Write("name", "old");
    const auto CountFiles = [&]
    {
        return std::distance(std::filesystem::directory_iterator(oFolder.GetPath()), {});
    };
    const std::function<void(TextWriter&)> ENDS[] = {
        [](TextWriter&) {}, [](TextWriter& oWriter) { oWriter.Discard(); },
        [](TextWriter& oWriter) { oWriter.Remove(); },
        [](TextWriter& oWriter)
        {
            oWriter.mbFails = true;
            EXPECT_EQ(Error([&] { oWriter.Synchronize(); }), "io: no");
            EXPECT_EQ(Error([&] { oWriter.Finish(); }), "io: no");
            EXPECT_TRUE(oWriter.HasUnsaved() && !oWriter.IsEnded());
        },
        [](TextWriter& oWriter)
        {
            oWriter.KeepExisting();
            EXPECT_NE(Error([&] { oWriter.Finish(); }).find("which is not replaced"), std::string::npos);
            EXPECT_FALSE(oWriter.IsNamed());
        }};
    for (const auto& oEnd : ENDS)
    {
        TextWriter oWriter(fileName);
        EXPECT_FALSE(oWriter.HasUnsaved());
        EXPECT_EQ(CountFiles(), 1);
        oWriter.Write("new");
        EXPECT_EQ(CountFiles(), 2);
        EXPECT_TRUE(oWriter.HasUnsaved());
        oEnd(oWriter);
        EXPECT_EQ(ReadFile(fileName), "old");
    }
    EXPECT_EQ(CountFiles(), 1);
    EXPECT_EQ(Error([&] { TextWriter(oFolder.GetPath() + "/none/name").Write("new"); }).substr(0, 6), "file: ");
    EXPECT_EQ(Error([&] { TextWriter(oFolder.GetPath()).Write("new"); }).substr(0, 4), "io: ");
}

TEST(FileWriter, AFileTakesItsNameOnceAndWhatTheOldOnePermitted)
{
    const krv::conformance::TempFolder oFolder;
    const std::string fileName = oFolder.Write("name", "old");
    ASSERT_EQ(::chmod(fileName.c_str(), 0640), 0);
    TextWriter oWriter(fileName);
    oWriter.Write("new");
    oWriter.Synchronize();
    EXPECT_EQ(ReadFile(fileName), "new");
    EXPECT_TRUE(oWriter.IsNamed() && !oWriter.HasUnsaved());
    oWriter.Write("more");
    EXPECT_TRUE(oWriter.HasUnsaved());
    oWriter.Finish();
    EXPECT_EQ(ReadFile(fileName), "more");
    EXPECT_EQ(Error([&] { oWriter.Synchronize(); }), "data: " + fileName + ": the dataset is closed");
    oWriter.Discard();
    struct stat oStatus = {};
    ASSERT_EQ(::stat(fileName.c_str(), &oStatus), 0);
    EXPECT_EQ(oStatus.st_mode & 07777u, 0640u);
}
