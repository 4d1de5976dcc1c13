#include "tools/krv/errors.h"
#include "tools/krv/progress.h"
#include "tools/krv/verbs/verbs.h"

#include <gtest/gtest.h>

namespace krv::tool
{

namespace
{

TEST(Texts, NumbersProgressAndErrorsAreOneLine)
{
    EXPECT_EQ(ParseNumbers("3,1,12", "--x"), (std::vector<unsigned int>{3, 1, 12}));
    EXPECT_TRUE(ParseNumbers("", "--x").empty());
    for (const char* pText : {"1,", ",1", "1,,2", "a", "-1", "1 2", "4294967296"})
        EXPECT_THROW(ParseNumbers(pText, "--x"), UsageError) << pText;
    const std::string line = ProgressLine("checksum", 3ULL << 30U, 4ULL << 30U, 10.0);
    EXPECT_NE(line.find("75 %"), std::string::npos);
    EXPECT_NE(line.find("0:03 left"), std::string::npos);
    EXPECT_LT(ProgressLine(std::string(200, 'x'), 0, 0, 0).size(), 80U);
    EXPECT_EQ(OneLine("a\nb\x1b[31m\tc \xC3\xA4\xE9 \xC2\x9B\xE2\x80\xAE"),
              "a b\\x1b[31m c \xC3\xA4\\xe9 \\xc2\\x9b\\xe2\\x80\\xae");
    EXPECT_LT(OneLine("begin" + std::string(100000, '\xC3') + "end").size(), 2000U);
    EXPECT_TRUE(OneLine("begin" + std::string(100000, 'x') + "end").ends_with("xend"));
}

} // namespace

} // namespace krv::tool
