#include "datasources/maskbuilder/polygonmaskbuilder.h"

#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "toolkit/core/gglshape.h"
#include "toolkit/exceptions/exceptions.h"

#include <gtest/gtest.h>

#include <limits>
#include <memory>
#include <random>
#include <string>
#include <vector>

namespace krv::datasources
{

namespace
{

using krv::gobs::Mask;
using krv::gobs::Raster;
using Ring = std::vector<GDBVertex>;

GGLShape ShapeOf(const std::vector<Ring>& oRings)
{
    GGLShape oShape;
    for (const Ring& oRing : oRings)
        oShape.AddRing(oRing);
    return oShape;
}

std::unique_ptr<Mask> Build(const PolygonMaskBuilder& oBuilder, unsigned int nWidth, unsigned int nHeight,
                            const krv::gobs::RasterContext& oContext = {})
{
    const Raster oRaster({nWidth, nHeight, 1, krv::gobs::eDT_BIT}, oContext);
    return std::unique_ptr<Mask>(oBuilder.BuildMask(oRaster));
}

Ring Box(double nLeft, double nRight, double nTop = 0, double nBottom = 1)
{
    return {{nLeft, nTop}, {nRight, nTop}, {nRight, nBottom}, {nLeft, nBottom}};
}

TEST(PolygonMaskBuilder, HostileOutlinesDoNoHarm)
{
    const double nNan = std::numeric_limits<double>::quiet_NaN(), nInf = std::numeric_limits<double>::infinity();
    const double nMost = std::numeric_limits<double>::max();
    const auto Count = [](const std::vector<Ring>& oRings)
    {
        return Build(PolygonMaskBuilder(ShapeOf(oRings), 0, 0), 20, 10, {0, 0, 3, 3})->CountSet();
    };
    EXPECT_EQ(Count({}), 0u);
    EXPECT_EQ(Count({{}, {{1, 1}}, {{nNan, 2}, {3, nInf}, {5, 5}}}), 0u);
    // Left out, the rest is the square without them.
    EXPECT_EQ(Count({{{nNan, 0}, {0, 0}, {10, 0}, {nInf, 4}, {10, 10}, {3, -nInf}, {0, 10}, {nNan, nNan}}}), 100u);
    EXPECT_EQ(Count({{{0, 0}, {10, 0}, {10, 10}, {0, 10}, {0, 0}}}), 100u);
    EXPECT_EQ(Count({{{-nMost, -nMost}, {nMost, -nMost}, {nMost, nMost}, {-nMost, nMost}}}), 26u * 16);
    EXPECT_EQ(Count({{{-1e9, -1e9}, {1e9, -1e9}, {1e9, 1e9}, {-1e9, 1e9}},
                     {{5, -nMost}, {9, -nMost}, {9, nMost}, {5, nMost}}}),
              22u * 16);
    Count({{{-nMost, -1}, {nMost, nMost}, {nMost, -nMost}, {-1, nMost}, {1e-300, -1e-300}, {nMost, 0.75}}});

    // A million edges, all of them in every row: the mask is that of the sorted crossings.
    Ring oZigzag;
    std::mt19937 oRandom(3);
    std::uniform_real_distribution<double> oX(-5, 400);
    for (int i = 0; i < 1000000; ++i)
        oZigzag.push_back({oX(oRandom), i % 2 == 0 ? -2e9 : 2e9});
    const GGLPolyRaster oPolygon(ShapeOf({oZigzag}), 0, 0);
    EXPECT_EQ(oPolygon.GetScanline(7).size(), 1000000u);
    EXPECT_EQ(Build(PolygonMaskBuilder(ShapeOf({oZigzag}), 0, 0), 300, 5, {2147483000, 100, 0, 0})->CountSet(), 0u);
    EXPECT_GT(Build(PolygonMaskBuilder(ShapeOf({oZigzag}), 0, 0), 300, 5, {20, 5, 0, 0})->CountSet(), 1400u);
}

TEST(GGLPolyRaster, TellsItsRowsAndRefusesBadArguments)
{
    const GGLPolyRaster oPolygon(ShapeOf({{{4, 2.5}, {8, 6}, {4, 6}}, Box(20, 21, -4, -3)}), 0, 0);
    EXPECT_TRUE(oPolygon.IsNonEmpty());
    EXPECT_EQ(oPolygon.GetFirstRow(), -4);
    EXPECT_EQ(oPolygon.GetLastRow(), 5);
    EXPECT_EQ(oPolygon.GetScanline(-4), (std::vector<double>{20, 21}));
    EXPECT_TRUE(oPolygon.GetScanline(0).empty());
    EXPECT_EQ(oPolygon.GetScanline(2), (std::vector<double>{4, 4})); // a centre on a vertex counts once
    EXPECT_TRUE(oPolygon.GetScanline(std::numeric_limits<int>::max()).empty());
    const GGLPolyRaster oFlat(ShapeOf({{{0, 1.2}, {9, 1.2}, {4, 1.3}}}), 0, 0);
    EXPECT_FALSE(oFlat.IsNonEmpty());
    EXPECT_EQ(oFlat.GetLastRow(), -1);

    const Ring oBox = Box(0, 4);
    const std::vector<int> oStarts{0, 2}, oBackwards{2, 0}, oBeyond{0, 5}, oNegative{-1, 2};
    EXPECT_NO_THROW(GGLPolyRaster(oBox.data(), 4, oStarts.data(), 2, 0));
    EXPECT_NO_THROW(GGLPolyRaster(nullptr, 0, nullptr, 0, 0));
    EXPECT_THROW(GGLPolyRaster(nullptr, 4, oStarts.data(), 2, 0), krv::DataException);
    EXPECT_THROW(GGLPolyRaster(oBox.data(), 4, nullptr, 2, 0), krv::DataException);
    EXPECT_THROW(GGLPolyRaster(oBox.data(), -4, oStarts.data(), 2, 0), krv::DataException);
    EXPECT_THROW(GGLPolyRaster(oBox.data(), 4, oStarts.data(), -2, 0), krv::DataException);
    for (const auto& oBad : {oBackwards, oBeyond, oNegative})
        EXPECT_THROW(GGLPolyRaster(oBox.data(), 4, oBad.data(), 2, 0), krv::DataException);
}

} // namespace

} // namespace krv::datasources
