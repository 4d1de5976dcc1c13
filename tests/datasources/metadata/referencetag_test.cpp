#include "datasources/metadata/referencetag.h"

#include <gtest/gtest.h>

namespace krv::datasources
{

namespace
{

struct ParseCase
{
    std::string moTag;
    bool mbParsed;
    std::string moFile, moLayer;
    unsigned int mnNumber;
};

} // namespace

TEST(ReferenceTag, NamesAFileOrASegment)
{
    EXPECT_EQ(BuildRefMetadataTag("scene.dat", "", 0), "gdb:scene.dat");
    EXPECT_EQ(BuildRefMetadataTag("scene.dat", "LUT", 3), "gdb:scene.dat/{LUT:3}");
    EXPECT_EQ(BuildRefMetadataTag("scene.dat", "LUT", 0), "gdb:scene.dat/{LUT:0}");
    EXPECT_EQ(BuildRefMetadataTag("scene.dat", "", 3), "gdb:scene.dat/{:3}");
    EXPECT_EQ(BuildRefMetadataTag("", "L", 4294967295u), "gdb:/{L:-1}");
    const std::string LONG(1 << 20, 'x');
    EXPECT_EQ(BuildRefMetadataTag(LONG, LONG, 2147483648u), "gdb:" + LONG + "/{" + LONG + ":-2147483648}");
}

TEST(ReferenceTag, ParsesFromTheLastBraces)
{
    // Results that a case does not reach keep "f", "l" and 9.
    const ParseCase CASES[] = {
        {"gdb:scene.dat/{LUT:3}", true, "scene.dat", "LUT", 3},
        {"gdb:scene.dat", true, "scene.dat", "", 0},
        {"gdb:", true, "", "", 0},
        {"gdb:a{b", true, "a{b", "", 0},
        {"gdb:a}b", true, "a}b", "", 0},
        {"GDB:scene.dat", false, "f", "l", 9},
        {"", false, "f", "l", 9},
        {"gdb:dir/{x}/{LUT:7}", true, "dir/{x}", "LUT", 7},
        {"gdb:a//{LUT:7}", true, "a/", "LUT", 7},
        {"gdb:{LUT:7}", true, "", "LUT", 7},
        {"gdb:a/{LUT:7}tail", true, "a", "LUT", 7},
        {"gdb:a/{LUT:LUT:7}", false, "a", "LUT", 9}, // the first colon counts
        {"gdb:a/{LUT}", false, "a", "l", 9},
        {"gdb:a/{}", false, "a", "l", 9},
        {"gdb:a}/{LUT:1", false, "a}", "l", 9}, // closed before it is opened
        {"gdb:scene.dat/{:3}", false, "scene.dat", "", 9},
        {"gdb:a/{LUT:}", false, "a", "LUT", 9},
        {"gdb:a/{LUT: 3}", false, "a", "LUT", 9},
        {"gdb:a/{LUT:+}", false, "a", "LUT", 9},
        {"gdb:a/{LUT:+-3}", false, "a", "LUT", 9},
        {"gdb:a/{LUT:+3}", true, "a", "LUT", 3},
        {"gdb:a/{LUT:-4294967295}", true, "a", "LUT", 1},
        {"gdb:a/{LUT:-4294967296}", false, "a", "LUT", 9},
        {"gdb:a/{LUT:4294967295}", true, "a", "LUT", 4294967295u},
        {std::string("gdb:a\0b/{L\0:5}", 14), true, std::string("a\0b", 3), std::string("L\0", 2), 5},
        {std::string("gdb:a/{L:5\0}", 12), false, "a", "L", 9},
    };
    for (const ParseCase& oCase : CASES)
    {
        SCOPED_TRACE(oCase.moTag);
        std::string sFile = "f";
        std::string sLayer = "l";
        unsigned int nNumber = 9;
        EXPECT_EQ(ParseRefMetadataTag(oCase.moTag, sFile, sLayer, nNumber), oCase.mbParsed);
        EXPECT_EQ(sFile, oCase.moFile);
        EXPECT_EQ(sLayer, oCase.moLayer);
        EXPECT_EQ(nNumber, oCase.mnNumber);
    }
}

TEST(ReferenceTag, SurvivesARoundTripAndMayBeItsOwnResult)
{
    for (const unsigned int nNumber : {1u, 2147483647u, 2147483648u, 4294967295u})
    {
        std::string sTag = BuildRefMetadataTag("dir/scene.dat", "PCT", nNumber);
        std::string sLayer;
        unsigned int nParsed = 0;
        ASSERT_TRUE(ParseRefMetadataTag(sTag, sTag, sLayer, nParsed));
        EXPECT_EQ(sTag + " " + sLayer, "dir/scene.dat PCT");
        EXPECT_EQ(nParsed, nNumber);
    }
}

} // namespace krv::datasources
