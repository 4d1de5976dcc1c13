#include "plugins/support/writing/filewriter.h"

#include "tests/support/thrown.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

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

protected:
    void Store() override
    {
        GetFile()->Write(0, moText.data(), moText.size());
        moText.clear();
    }
    bool HoldsChanges() const override { return !moText.empty(); }

private:
    std::string moText;
};

} // namespace

// What goes wrong is asked of every format that stands on it.
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
