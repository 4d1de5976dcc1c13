#include "gobs/pct/pct.h"
#include "toolkit/exceptions/exceptions.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

using namespace krv;
using namespace krv::gobs;

namespace
{

using Colour8 = RGBTuple<unsigned char>;
using Colour16 = RGBTuple<std::uint16_t>;

constexpr double INF = std::numeric_limits<double>::infinity();

Colour16 Grey(unsigned int nLevel)
{
    const auto nPart = static_cast<std::uint16_t>(nLevel * 257);
    return {nPart, nPart, nPart};
}

// [10, 20) and [20, 30), then a gap, then [40, 50], added out of order.
PCT ThreeRanges()
{
    PCT oTable;
    oTable.Add({40, 50, Grey(200), 1000});
    oTable.Add({10, 20, Grey(50)});
    oTable.Add({20, 30, Grey(100)});
    oTable.SetBackground({1, 2, 3});
    return oTable;
}

} // namespace

TEST(PCTTest, ValuesTakeTheColourOfTheirRange)
{
    const PCT oTable = ThreeRanges();
    struct Case
    {
        double mnValue;
        int mnLevel;
    };
    for (const Case& o : {Case{10, 50},
                          {19.999, 50},
                          {20, 100},
                          {29, 100},
                          {30, 100},
                          {39, 100},
                          {40, 200},
                          {50, 200},
                          {51, 200},
                          {9, 50},
                          {-INF, 50},
                          {INF, 200}})
        EXPECT_EQ(oTable.GetValue(o.mnValue).green, o.mnLevel) << o.mnValue;
    EXPECT_EQ(oTable.GetValue(std::nan("")), (Colour8{1, 2, 3}));
    std::uint16_t nAlpha = 5;
    EXPECT_EQ(oTable.GetValue16(45, nAlpha), Grey(200));
    EXPECT_EQ(nAlpha, 1000);
    oTable.GetValue16(std::nan(""), nAlpha);
    EXPECT_EQ(nAlpha, 0);
    EXPECT_TRUE(oTable.HasAlpha());
    EXPECT_EQ(PCT().GetValue(5), Colour8());
}

TEST(PCTTest, InterpolatesBetweenCentres)
{
    PCT oTable = ThreeRanges();
    oTable.SetInterpolation(true);
    struct Case
    {
        double mnValue;
        int mnLevel;
    };
    for (const Case& o : {Case{5, 50}, {12, 50}, {15, 50}, {20, 75}, {25, 100}, {35, 150}, {45, 200}, {49, 200}})
        EXPECT_EQ(oTable.GetValue(o.mnValue).red, o.mnLevel) << o.mnValue;
    PCT oOpen;
    oOpen.Add({-INF, 0, Grey(10)});
    oOpen.Add({0, INF, Grey(20)});
    oOpen.SetInterpolation(true);
    EXPECT_EQ(oOpen.GetValue(-1).red, 10);
    EXPECT_EQ(oOpen.GetValue(1).red, 20);
}

TEST(PCTTest, ColourMapsOfFilesAreIndexedByValue)
{
    const PCT oTable = PCT::FromColours({{0, 0, 0}, {65535, 128, 129}, {257, 514, 65407}});
    EXPECT_EQ(oTable.GetValue(1), (Colour8{255, 0, 1}));
    EXPECT_EQ(oTable.GetValue(2), (Colour8{1, 2, 255}));
    EXPECT_EQ(oTable.GetValue(3), oTable.GetValue(2));
    EXPECT_FALSE(oTable.HasAlpha());
    EXPECT_EQ(oTable.GetEntries().size(), 3u);
}

TEST(PCTTest, RefusesBrokenRanges)
{
    PCT oTable = ThreeRanges();
    const PCT::Entry oBroken[] = {{5, 5, {}},   {6, 5, {}},   {std::nan(""), 5, {}}, {1, std::nan(""), {}}, {5, 11, {}},
                                  {12, 15, {}}, {29, 35, {}}, {35, 41, {}},          {-INF, INF, {}}};
    for (const PCT::Entry& oEntry : oBroken)
        EXPECT_THROW(oTable.Add(oEntry), ParameterException) << oEntry.low << " " << oEntry.high;
    EXPECT_EQ(oTable.GetEntries().size(), 3u);
    EXPECT_NO_THROW(oTable.Add({30, 40, {}}));
}
