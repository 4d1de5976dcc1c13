#include "plugins/support/writing/options.h"

#include "tests/support/thrown.h"

#include <gtest/gtest.h>

#include <optional>

using krv::plugins::support::Options;

TEST(Options, TakeWhatTheyAreDescribedToTakeAndNothingElse)
{
    bool bFlag = false;
    int nChoice = 1;
    std::optional<int> oNumber;
    std::string text = "usual";
    const auto Parse = [&](const std::string& options)
    {
        Options oOptions;
        oOptions.AddFlag("FLAG", bFlag);
        oOptions.AddChoice("CHOICE", nChoice, {{"ONE", 1}, {"TWO", 2}}, "SAME");
        oOptions.AddNumber("NUMBER", oNumber, 5, 7);
        oOptions.AddText("TEXT", text);
        for (const auto& [key, takes] : oOptions.Describe())
            EXPECT_FALSE(oOptions.IsGiven(key)) << takes;
        return krv::test::Error([&] { oOptions.Parse(options); });
    };
    EXPECT_EQ(Parse(""), "");
    EXPECT_EQ(text, "usual");
    EXPECT_EQ(Parse(" flag=Yes number=6\tCHOICE=two  Text=a=B "), "");
    EXPECT_TRUE(bFlag && nChoice == 2 && oNumber == 6 && text == "a=B") << text;
    EXPECT_EQ(Parse("CHOICE=SAME"), "");
    EXPECT_EQ(nChoice, 2);

    const std::pair<std::string, std::string> FAULTS[] = {
        {"FLAG=NO TEXT", "The option \"TEXT\" is not of the form KEY=VALUE"},
        {"=1", "The option \"=1\" is not of the form KEY=VALUE"},
        {"flags=1", "The option FLAGS is not known; there are FLAG, CHOICE, NUMBER, TEXT"},
        {"FLAG=1", "The option FLAG does not take \"1\"; it takes YES, NO"},
        {"Choice=three", "The option CHOICE does not take \"three\"; it takes ONE, TWO"},
        {"NUMBER=8", "The option NUMBER does not take \"8\"; it takes a number from 5 to 7"},
        {"NUMBER=6x", "The option NUMBER does not take \"6x\"; it takes a number from 5 to 7"},
        {"NUMBER=4294967302", "The option NUMBER does not take \"4294967302\"; it takes a number from 5 to 7"},
        {"NUMBER=", "The option NUMBER does not take \"\"; it takes a number from 5 to 7"},
        {"TEXT=a text=b", "The option TEXT is given twice"}};
    for (const auto& [options, error] : FAULTS)
        EXPECT_EQ(Parse(options), "data: " + error) << options;
}
