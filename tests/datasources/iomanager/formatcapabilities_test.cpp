#include "datasources/iomanager/formatcapabilities.h"

#include "tests/support/outputcapture.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

using namespace krv::datasources;

namespace
{

constexpr unsigned long long NO_LIMIT = 18446744073709551615ull;

constexpr char DESCRIPTION[] = R"(<?xml version="1.0"?>
<Format>
  <Object>
     name of it
  </Object>
  <Capabilities>
    <Dataset><SupportsCreate>no</SupportsCreate><SupportsGeoreferecing/></Dataset>
    <Limits><A> 42
      </A><B>18446744073709551614</B><C>18446744073709551616</C><D>-1</D><E>many</E><F/><G>7 8</G></Limits>
  </Capabilities>
</Format>)";

} // namespace

TEST(FormatCapabilities, PresenceAloneCounts)
{
    const krv::conformance::TempFolder oFolder;
    const FormatCapabilities oCapabilities(oFolder.Write("format.xml", DESCRIPTION));
    EXPECT_TRUE(oCapabilities.IsSupported(CAPABILITY_CREATE)); // although it says no
    EXPECT_TRUE(oCapabilities.IsSupported(CAPABILITY_GEOREFERENCING));
    EXPECT_TRUE(oCapabilities.IsSupported("/Format/Capabilities/Dataset/SupportsGeoreferecing")); // as it is spelt
    EXPECT_FALSE(oCapabilities.IsSupported(CAPABILITY_METADATA));
    EXPECT_FALSE(oCapabilities.IsSupported(CAPABILITY_BITMAP_CREATE));

    // The file is read for every question.
    oFolder.Write("format.xml", "<Format><Capabilities><Bitmap><CanCreate/></Bitmap></Capabilities></Format>");
    EXPECT_FALSE(oCapabilities.IsSupported(CAPABILITY_CREATE));
    EXPECT_TRUE(oCapabilities.IsSupported(CAPABILITY_BITMAP_CREATE));
}

TEST(FormatCapabilities, Limits)
{
    const krv::conformance::TempFolder oFolder;
    const FormatCapabilities oCapabilities(oFolder.Write("format.xml", DESCRIPTION));
    const std::pair<const char*, unsigned long long> LIMITS[] = {{"A", 42},       {"B", 18446744073709551614ull},
                                                                 {"C", NO_LIMIT}, {"D", NO_LIMIT},
                                                                 {"E", NO_LIMIT}, {"F", NO_LIMIT},
                                                                 {"G", NO_LIMIT}, {"Absent", NO_LIMIT}};
    for (const auto& [pName, nLimit] : LIMITS)
        EXPECT_EQ(oCapabilities.GetLimit(std::string("/Format/Capabilities/Limits/") + pName), nLimit) << pName;
}

// What a plain XPath finds without the XML libraries is what they find by one that says the same in other words.
TEST(FormatCapabilities, PlainQuestionsAreAnsweredAsAllAre)
{
    const krv::conformance::TempFolder oFolder;
    const char* const DOCUMENTS[] = {
        "<F><L>1</L><L>2</L></F>",
        "<F><C/><C><D/><L>3</L></C><C><L>4</L></C><L/></F>",
        "<F xmlns='urn:a'><L>5</L></F>",
        "<F><x:L xmlns:x='urn:a'>6</x:L></F>",
        "<F><x:L>7</x:L></F>",
        "<F><C><L> <!-- 8 -->9<![CDATA[0]]>&#49;\t\n</L></C><L>1<D>2</D></L></F>",
        "<!DOCTYPE F [<!ENTITY e '10'>]><F><L>&e;</L></F>",
        "<F><L a='1' a='2'>11</L></F>",
        "<G><F><L>12</L></F></G>",
    };
    for (const char* const pDocument : DOCUMENTS)
    {
        const FormatCapabilities oCapabilities(oFolder.Write("format.xml", pDocument));
        for (const std::string path : {"/F", "/F/L", "/F/C", "/F/C/L", "/F/C/D", "/F/M", "/G/F/L"})
        {
            EXPECT_EQ(oCapabilities.IsSupported(path), oCapabilities.IsSupported(path + "[true()]"))
                << pDocument << path;
            EXPECT_EQ(oCapabilities.GetLimit(path), oCapabilities.GetLimit(path + "[true()]")) << pDocument << path;
        }
    }
}

TEST(FormatCapabilities, FailuresAreDebugOutputAndNo)
{
    const krv::conformance::TempFolder oFolder;
    const std::string good = oFolder.Write("format.xml", DESCRIPTION);
    const std::string broken = oFolder.Write("broken.xml", "<Format><Capabilities>");
    const std::pair<std::string, std::string> FAILING[] = {
        {oFolder.File("missing.xml"), CAPABILITY_CREATE}, {broken, CAPABILITY_CREATE}, {good, "///["}};
    testing::internal::CaptureStderr(); // the XML library is not to tell the terminal
    for (const int nLevel : {0, 1})
    {
        for (const auto& [path, xpath] : FAILING)
        {
            krv::test::OutputCapture oOutput(nLevel);
            EXPECT_FALSE(FormatCapabilities(path).IsSupported(xpath));
            EXPECT_EQ(FormatCapabilities(path).GetLimit(xpath), NO_LIMIT);
            ASSERT_EQ(oOutput.moDebug.size(), nLevel == 0 ? 0u : 2u) << path << xpath;
            for (const auto& oLine : oOutput.moDebug)
            {
                EXPECT_EQ(oLine.mnLevel, 1);
                EXPECT_EQ(oLine.moModule, "qrframework");
                EXPECT_EQ(oLine.moSourceFile, "datasources/iomanager/formatcapabilities");
                EXPECT_NE(oLine.mnLine, 0u);
                EXPECT_FALSE(oLine.moMessage.empty());
                // The XML parser's exception is of neither kind that carries its message.
                EXPECT_EQ(oLine.moMessage == "An unknown error occur during the XPath evaluation", path != good);
            }
        }
    }
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
}
