#include "tests/support/thrown.h"
#include "toolkit/xml/limits.h"
#include "toolkit/xml/xmldocument.h"
#include "toolkit/xml/xmlerror.h"
#include "toolkit/xml/xmltree.h"
#include "toolkit/xml/xmlutil.h"
#include "tools/conformance/tempfolder.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <xalanc/DOMSupport/DOMSupport.hpp>
#include <xalanc/XPath/NodeRefList.hpp>
#include <xalanc/XPath/XPathEvaluator.hpp>
#include <xalanc/XalanDOM/XalanDocument.hpp>
#include <xercesc/sax/SAXParseException.hpp>

#include <optional>
#include <thread>

#include <sys/stat.h>

using krv::xml::Element;
using krv::xml::ParseTree;
using ::testing::HasSubstr;

namespace
{

std::string NestedXml(std::size_t nDepth)
{
    std::string text;
    for (std::size_t nAt = 0; nAt < nDepth; ++nAt)
        text += "<e>";
    for (std::size_t nAt = 0; nAt < nDepth; ++nAt)
        text += "</e>";
    return text;
}

std::size_t Count(const krv::xml::Document& oDocument, const char* xpath)
{
    xalanc::XPathEvaluator oEvaluator;
    xalanc::NodeRefList oNodes;
    oEvaluator.selectNodeList(oNodes, oDocument.GetSupport(), oDocument.Get(), XmlTranscode(xpath).c_str());
    return oNodes.getLength();
}

std::string ParseFileError(const std::string& fileName)
{
    try
    {
        krv::xml::ParseFile(fileName);
    }
    catch (const krv::xml::ParseError& oError)
    {
        return oError.what();
    }
    return "no exception";
}

std::string ParseTreeError(const std::string& text)
{
    return krv::test::Error([&] { ParseTree(text.data(), text.size(), "tag 42112"); });
}

Element Tree(const std::string& text)
{
    return ParseTree(text.data(), text.size());
}

} // namespace

TEST(XmlSupport, StartsAgainAfterTheLastEnd)
{
    for (int nRound = 0; nRound < 3; ++nRound)
    {
        KRV_XMLUtil::Initialize();
        KRV_XMLUtil::Initialize();
        KRV_XMLUtil::Terminate();
        EXPECT_EQ(Count(krv::xml::ParseMemory("<a><b/><b/></a>", 15, "text"), "/a/b"), 2U) << nRound;
        KRV_XMLUtil::Terminate();
    }
    KRV_XMLUtil::Terminate(); // one too many
    EXPECT_EQ(Tree("<a/>").name, "a");
}

TEST(XmlSupport, ServesThreadsThatStartAndEndItOnTheirOwn)
{
    std::vector<std::thread> oThreads;
    for (int nThread = 0; nThread < 4; ++nThread)
        oThreads.emplace_back(
            []
            {
                for (int nRound = 0; nRound < 20; ++nRound)
                    EXPECT_EQ(Count(krv::xml::ParseMemory("<a><b/></a>", 11, "text"), "//b"), 1U);
            });
    for (std::thread& oThread : oThreads)
        oThread.join();
}

TEST(XmlTranscode, CarriesEveryCharacterThroughWhateverTheLocale)
{
    const std::string text = "a \xC3\xA9 \xE2\x82\xAC \xF0\x9F\x9B\xB0";
    const std::basic_string<XMLCh> wide = XmlTranscode(text);
    EXPECT_EQ(wide, u"a \u00E9 \u20AC \U0001F6F0");
    EXPECT_EQ(XmlTranscode(wide.c_str()), text);
    EXPECT_EQ(XmlTranscode(static_cast<const XMLCh*>(nullptr)), "");
}

TEST(XmlTranscode, ReplacesWhatIsNotValid)
{
    EXPECT_EQ(XmlTranscode("a\xFFz"), u"a\uFFFDz");
    EXPECT_EQ(XmlTranscode("\xC0\xAF"), u"\uFFFD\uFFFD");           // a slash in two bytes
    EXPECT_EQ(XmlTranscode("\xED\xA0\x80"), u"\uFFFD\uFFFD\uFFFD"); // a surrogate
    EXPECT_EQ(XmlTranscode("\xF4\x90\x80\x80").front(), u'\uFFFD'); // beyond the last character
    EXPECT_EQ(XmlTranscode("\xE2\x82"), u"\uFFFD\uFFFD");           // cut short
    const XMLCh LONE[] = {0xD83D, 'x', 0xDEF0, 0};
    EXPECT_EQ(XmlTranscode(LONE), "\xEF\xBF\xBDx\xEF\xBF\xBD");
}

TEST(XmlDocument, FailsWithTheParsersExceptionAndPrintsNothing)
{
    const krv::conformance::TempFolder oFolder;
    ASSERT_EQ(::mkfifo(oFolder.File("pipe.xml").c_str(), 0600), 0);
    ::testing::internal::CaptureStderr();
    ::testing::internal::CaptureStdout();
    EXPECT_THAT(ParseFileError(oFolder.File("missing.xml")),
                HasSubstr("missing.xml: The XML file cannot be read: No such"));
    EXPECT_THAT(ParseFileError(oFolder.File("")), HasSubstr("not a regular file"));
    EXPECT_THAT(ParseFileError(oFolder.File("pipe.xml")), HasSubstr("not a regular file"));
    EXPECT_THAT(ParseFileError(oFolder.Write("bad.xml", "<a>\n<b></a>")), HasSubstr("bad.xml:2:"));
    EXPECT_THAT(ParseFileError(oFolder.Write("empty.xml", "")), HasSubstr("empty.xml"));
    EXPECT_THAT(ParseFileError(oFolder.Write("deep.xml", NestedXml(100000))), HasSubstr("nested"));
    EXPECT_THAT(
        ParseFileError(oFolder.Write("big.xml", "<a>" + std::string(krv::xml::MAX_DOCUMENT_BYTES, ' ') + "</a>")),
        HasSubstr("larger than"));
    EXPECT_EQ(::testing::internal::GetCapturedStdout(), "");
    EXPECT_EQ(::testing::internal::GetCapturedStderr(), "");
}

TEST(XmlDocument, ExceptionOutlivesXmlSupport)
{
    std::optional<xercesc::SAXParseException> oKept;
    try
    {
        krv::xml::ParseMemory("<a", 2, "text");
    }
    catch (const xercesc::SAXParseException& oException)
    {
        oKept = oException;
        const auto* const poStandard = dynamic_cast<const std::exception*>(&oException);
        ASSERT_NE(poStandard, nullptr);
        EXPECT_EQ(poStandard->what(), "text:1:3: " + XmlTranscode(oException.getMessage()));
    }
    ASSERT_TRUE(oKept.has_value());
    EXPECT_NE(XmlTranscode(oKept->getMessage()), "");
}

TEST(XmlDocument, ReadsNothingOutsideAndDefinesNoEntities)
{
    const krv::conformance::TempFolder oFolder;
    const std::string secret = oFolder.Write("secret.txt", "secret");
    const std::string external = "<!DOCTYPE a [<!ENTITY x SYSTEM \"" + secret + "\">]><a>&x;</a>";
    const std::string bomb = "<!DOCTYPE a [<!ENTITY b \"ha\"><!ENTITY c \"&b;&b;\">]><a>&c;</a>";
    const std::string dtd = "<!DOCTYPE a SYSTEM \"" + secret + "\"><a/>";
    for (const std::string& text : {external, bomb, dtd})
    {
        EXPECT_THAT(ParseFileError(oFolder.Write("x.xml", text)), HasSubstr("Document type declarations")) << text;
        EXPECT_THAT(ParseTreeError(text), HasSubstr("tag 42112: Document type declarations")) << text;
    }
    EXPECT_THAT(ParseTreeError("<a>&undefined;</a>"), ::testing::StartsWith("data: tag 42112:1:"));
}

TEST(XmlTree, KeepsNamesAttributesTextAndOrder)
{
    const std::string text = "<?xml version='1.0'?><!-- c --><G:Metadata xmlns:G='urn:g'>\n"
                             "  <Item name=\"caf\xC3\xA9\" sample='0'>1 &lt; 2<![CDATA[ & 3]]></Item>mid<Other/>end\n"
                             "  <Item/></G:Metadata>\n";
    const Element oRoot = ParseTree(text.c_str(), text.size() + 1); // with its terminator
    EXPECT_EQ(oRoot.name, "G:Metadata");
    ASSERT_EQ(oRoot.children.size(), 3U);
    EXPECT_EQ(oRoot.text, "\n  midend\n  ");
    const Element& oItem = oRoot.children[0];
    EXPECT_EQ(oItem.text, "1 < 2 & 3");
    EXPECT_THAT(oItem.attributes,
                ::testing::ElementsAre(::testing::Pair("name", "caf\xC3\xA9"), ::testing::Pair("sample", "0")));
    ASSERT_NE(oItem.FindAttribute("sample"), nullptr);
    EXPECT_EQ(oItem.FindAttribute("absent"), nullptr);
    EXPECT_EQ(oRoot.FindChild("Other"), &oRoot.children[1]);
    EXPECT_EQ(oRoot.FindChild("None"), nullptr);
}

TEST(XmlTree, RefusesWhatNobodyVouchesFor)
{
    const std::string texts[] = {"",
                                 " ",
                                 std::string(3, '\0'),
                                 "plain",
                                 "<a>",
                                 "<a></b>",
                                 "<a/><b/>",
                                 "<a>\xFF</a>",
                                 "<a>\xC3</a>",
                                 "<a b='1' b='2'/>",
                                 std::string("<a>\0</a>", 8),
                                 "<a>\x01</a>",
                                 "<?xml version='1.0' encoding='no-such-encoding'?><a/>",
                                 "<p:a/>",
                                 NestedXml(krv::xml::MAX_DOCUMENT_DEPTH + 1)};
    for (const std::string& text : texts)
        EXPECT_THAT(ParseTreeError(text), HasSubstr("tag 42112")) << text.substr(0, 40);
    std::string many = "<a>";
    for (std::size_t nAt = 0; nAt < krv::xml::MAX_DOCUMENT_NODES; ++nAt)
        many += "<b/>";
    EXPECT_THAT(ParseTreeError(many + "</a>"), HasSubstr("elements and attributes"));
    EXPECT_EQ(ParseTreeError(NestedXml(krv::xml::MAX_DOCUMENT_DEPTH)), "");
}

TEST(XmlTree, HonoursADeclaredEncoding)
{
    EXPECT_EQ(Tree("<?xml version='1.0' encoding='ISO-8859-1'?><a>\xE9</a>").text, "\xC3\xA9");
    EXPECT_EQ(Tree("<?xml version='1.0' encoding='windows-1252'?><a>\x80</a>").text, "\xE2\x82\xAC");
}
