#include "toolkit/exceptions/exceptions.h"
#include "toolkit/exceptions/place.h"

#include <gtest/gtest.h>

using krv::SourceFileText;

TEST(Place, SourceFilesAreNamedFromTheRootOfTheTreeWhereverItLies)
{
    for (const char* pFile :
         {"plugins/tif/page.cpp", "/src/plugins/tif/page.cpp", "/a/datasources/plugins/tif/page.cpp",
          "/plugins/toolkit/gobs/plugins/tif/page.cpp", "../../plugins/tif/page.cpp"})
        EXPECT_EQ(SourceFileText(pFile), "plugins/tif/page") << pFile;
    EXPECT_EQ(SourceFileText("plugins/tools/page.cpp"), "plugins/tools/page"); // a folder inside the tree
    EXPECT_EQ(SourceFileText("/a/plugins/tif/my-plugins/page.cpp"), "plugins/tif/my-plugins/page");
    EXPECT_EQ(SourceFileText("../../operations/copy/conversion.cpp"), "operations/copy/conversion");
    EXPECT_EQ(SourceFileText("/a/b/page.cpp"), "/a/b/page");
}

TEST(Exceptions, AreMadeFromTextsAsTheyAre)
{
    const krv::IOException oFailure("a.tif", "disk full", "void Peer::Write()", "/peer/write.cpp", 12);
    EXPECT_STREQ(oFailure.what(), "disk full");
    EXPECT_EQ(oFailure.GetFileName(), "a.tif");
    EXPECT_EQ(oFailure.GetFunction(), "void Peer::Write()");
    EXPECT_EQ(oFailure.GetSourceFile(), "/peer/write.cpp");
    EXPECT_EQ(oFailure.GetLine(), 12u);
    const krv::LibraryException oLibrary("x.so", krv::LibraryException::eVersionMismatch, "old", "", "", 0);
    EXPECT_EQ(oLibrary.GetType(), 3);
    EXPECT_EQ(oLibrary.GetLine(), 0u);
}
