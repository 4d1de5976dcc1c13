#include "tests/support/thrown.h"
#include "toolkit/ogc/cs/coordinatetransformation.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/ogc/cs/crsparts.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <limits>
#include <vector>

using namespace krv::ogc::cs;
using ::testing::HasSubstr;

namespace
{

std::string WKTError(const std::string& definition)
{
    return krv::test::Error([&] { CreateCRSFromWKT(definition); });
}

const char* const WKT1_UTM =
    "PROJCS[\"WGS 84 / UTM zone 32N\",GEOGCS[\"WGS 84\",DATUM[\"WGS_1984\",SPHEROID[\"WGS 84\",6378137,298.257223563]],"
    "PRIMEM[\"Greenwich\",0],UNIT[\"degree\",0.0174532925199433]],PROJECTION[\"Transverse_Mercator\"],"
    "PARAMETER[\"latitude_of_origin\",0],PARAMETER[\"central_meridian\",9],PARAMETER[\"scale_factor\",0.9996],"
    "PARAMETER[\"false_easting\",500000],PARAMETER[\"false_northing\",0],UNIT[\"metre\",1]]";

} // namespace

TEST(GeocodingInfo, MapsThereAndBack)
{
    const GeocodingInfo oInfo(500000.0, 8.0, 3.0, 5800000.0, 2.0, -9.0);
    double nX = 0.0;
    double nY = 0.0;
    oInfo.RasterToMap(10.5, 20.25, nX, nY);
    EXPECT_DOUBLE_EQ(nX, 500000.0 + 84.0 + 60.75);
    EXPECT_DOUBLE_EQ(nY, 5800000.0 + 21.0 - 182.25);
    double nColumn = 0.0;
    double nRow = 0.0;
    ASSERT_TRUE(oInfo.MapToRaster(nX, nY, nColumn, nRow));
    EXPECT_NEAR(nColumn, 10.5, 1e-9);
    EXPECT_NEAR(nRow, 20.25, 1e-9);
    EXPECT_TRUE(oInfo.IsRotated());
    EXPECT_FALSE(oInfo.IsIdentity() || oInfo == GeocodingInfo());
    EXPECT_TRUE(GeocodingInfo().IsIdentity() && GeocodingInfo() == GeocodingInfo(0, 1, 0, 0, 0, 1));
    EXPECT_DOUBLE_EQ(oInfo.GetColumnSpacing(), std::hypot(8.0, 2.0));
    EXPECT_DOUBLE_EQ(oInfo.GetRowSpacing(), std::hypot(3.0, 9.0));
}

TEST(GeocodingInfo, SingularTransformsHaveNoInverse)
{
    const double nNaN = std::numeric_limits<double>::quiet_NaN();
    const GeocodingInfo SINGULAR[] = {{0, 0, 0, 0, 0, 0}, {0, 1, 2, 0, 2, 4},    {0, 0.1, 0.3, 0, 0.2, 0.6},
                                      {0, 1, 0, 0, 0, 0}, {nNaN, 1, 0, 0, 0, 1}, {0, 1, 0, 0, 0, INFINITY}};
    for (const GeocodingInfo& oInfo : SINGULAR)
    {
        double nColumn = 5.0;
        double nRow = 6.0;
        EXPECT_FALSE(oInfo.MapToRaster(1.0, 1.0, nColumn, nRow));
        EXPECT_EQ(nColumn, 5.0);
        EXPECT_EQ(nRow, 6.0);
    }
    EXPECT_TRUE(GeocodingInfo(0, 1e-12, 0, 0, 0, -1e-12).IsInvertible());
}

TEST(Crs, AnswersWhatAnEngineerAsks)
{
    const std::unique_ptr<ICRS> poCRS(CreateCRSFromEPSG(32632)->Clone());
    EXPECT_EQ(poCRS->GetEPSG(), 32632);
    EXPECT_EQ(poCRS->GetName(), "WGS 84 / UTM zone 32N");
    EXPECT_EQ(poCRS->GetUnitName(), "metre");
    EXPECT_EQ(poCRS->GetUnitFactor(), 1.0);
    EXPECT_EQ(poCRS->GetDatumName(), "World Geodetic System 1984 ensemble");
    EXPECT_EQ(poCRS->GetEllipsoidName(), "WGS 84");
    EXPECT_EQ(poCRS->GetSemiMajorAxis(), 6378137.0);
    EXPECT_NEAR(poCRS->GetInverseFlattening(), 298.257223563, 1e-9);
    const auto oParameters = poCRS->GetProjectionParameters();
    ASSERT_EQ(oParameters.size(), 5U);
    EXPECT_EQ(oParameters[1].name, "Longitude of natural origin");
    EXPECT_EQ(oParameters[1].value, 9.0);
    EXPECT_EQ(oParameters[1].unitName, "degree");

    const auto poFeet = CreateCRSFromEPSG(32064);
    EXPECT_EQ(poFeet->GetUnitName(), "US survey foot");
    EXPECT_NEAR(poFeet->GetUnitFactor(), 1200.0 / 3937.0, 1e-15);
    EXPECT_TRUE(CreateCRSFromEPSG(4326)->GetProjectionParameters().empty());
}

TEST(Crs, SeesThroughBoundAndCompoundSystems)
{
    const auto poCompound = CreateCRSFromEPSG(7405); // OSGB36 / British National Grid + ODN height
    EXPECT_TRUE(poCompound->IsProjected());
    EXPECT_TRUE(poCompound->HasVertical());
    EXPECT_EQ(poCompound->GetEllipsoidName(), "Airy 1830");
    EXPECT_TRUE(CreateCRSFromEPSG(4979)->HasVertical());
    std::string wkt = WKT1_UTM;
    wkt.insert(wkt.find("298.257223563]") + 14, ",TOWGS84[0,0,0,0,0,0,0]");
    wkt.insert(wkt.size() - 1, ",AUTHORITY[\"EPSG\",\"32632\"]");
    const auto poBound = CreateCRSFromWKT(wkt);
    EXPECT_TRUE(poBound->IsProjected());
    EXPECT_EQ(poBound->GetEPSG(), 32632);
    EXPECT_FALSE(poBound->HasVertical());
}

TEST(Crs, SurvivesEveryNotation)
{
    for (const int nCode : {32632, 4326, 3035, 3031, 2193, 32064, 27200, 7405})
    {
        const auto poCRS = CreateCRSFromEPSG(nCode);
        for (const std::string& text :
             {poCRS->GetWKT(), poCRS->GetWKT1(), poCRS->GetPROJJSON(), " epsg:" + std::to_string(nCode) + "\n"})
        {
            const auto poAgain = CreateCRSFromWKT(text);
            EXPECT_EQ(poAgain->GetEPSG(), nCode) << text;
            EXPECT_TRUE(poAgain->IsEquivalent(*poCRS)) << text;
            EXPECT_EQ(text.find('\n') == std::string::npos || text.front() == ' ', true);
        }
    }
}

TEST(Crs, EquivalenceLooksAtTheGroundNotAtNames)
{
    const auto poCode = CreateCRSFromEPSG(32632);
    std::string wkt = WKT1_UTM;
    const auto poText = CreateCRSFromWKT(wkt);
    EXPECT_EQ(poText->GetEPSG(), 0);
    EXPECT_TRUE(poCode->IsEquivalent(*poText));
    EXPECT_TRUE(poText->IsEquivalent(*poCode));
    wkt.replace(wkt.find("0.9996"), 6, "0.9999");
    EXPECT_FALSE(poCode->IsEquivalent(*CreateCRSFromWKT(wkt)));
    EXPECT_FALSE(poCode->IsEquivalent(*CreateCRSFromEPSG(32633)));
    EXPECT_FALSE(poCode->IsEquivalent(*CreateCRSFromEPSG(25832)));
    // The authority lists northing first; the same in the usual order of maps is the same system.
    std::string swapped = CreateCRSFromEPSG(3035)->GetWKT();
    const auto nNorth = swapped.find("AXIS[\"northing");
    const auto nEast = swapped.find("AXIS[\"easting");
    ASSERT_LT(nNorth, nEast);
    swapped =
        swapped.substr(0, nNorth) + "AXIS[\"(E)\",east,ORDER[1]],AXIS[\"(N)\",north,ORDER[2]],LENGTHUNIT[\"metre\",1]]";
    EXPECT_TRUE(CreateCRSFromEPSG(3035)->IsEquivalent(*CreateCRSFromWKT(swapped)));
}

TEST(Crs, FailuresNameTheDefinitionAndTheCauseSilently)
{
    ::testing::internal::CaptureStderr();
    EXPECT_THAT(WKTError("EPSG:1"), HasSubstr("EPSG:1 is no known reference system: crs not found"));
    EXPECT_THAT(WKTError(""), HasSubstr("empty"));
    EXPECT_THAT(WKTError("GARBAGE[\"x\"]"), HasSubstr("\"GARBAGE[\"x\"]\" cannot be understood"));
    EXPECT_THAT(WKTError("PROJCRS[\"x\","), HasSubstr("cannot be understood: "));
    EXPECT_THAT(WKTError("{\"type\":\"Nothing\"}"), HasSubstr("cannot be understood: "));
    EXPECT_THAT(WKTError("ELLIPSOID[\"WGS 84\",6378137,298.257223563]"),
                HasSubstr("does not define a reference system"));
    // What would open files or run pipelines is no definition here.
    EXPECT_NE(WKTError("+init=epsg:4326"), "");
    EXPECT_NE(WKTError("+proj=utm +zone=32 +type=crs"), "");
    EXPECT_NE(WKTError("/etc/passwd"), "");
    std::string nested;
    for (int nAt = 0; nAt < 10000; ++nAt)
        nested += "{\"type\":\"BoundCRS\",\"source_crs\":";
    EXPECT_THAT(WKTError(nested), HasSubstr("nested too deep"));
    EXPECT_THAT(WKTError(std::string(2 << 20, 'x')), HasSubstr("longer than"));
    EXPECT_EQ(::testing::internal::GetCapturedStderr(), "");
}

TEST(Crs, MissingDatabaseIsNamed)
{
    const char* poOld = std::getenv("PROJ_LIB");
    const std::string old = poOld == nullptr ? "" : poOld;
    ::setenv("PROJ_LIB", "/nonexistent", 1);
    const std::string message = WKTError("EPSG:4326");
    poOld == nullptr ? ::unsetenv("PROJ_LIB") : ::setenv("PROJ_LIB", old.c_str(), 1);
    EXPECT_THAT(message, HasSubstr("proj.db cannot be found"));
}

TEST(EPSGParts, AreFoundOrNamed)
{
    EXPECT_THAT(DescribeEPSGPart(eEPSG_Datum, 6326), HasSubstr("World Geodetic System 1984"));
    EXPECT_THAT(DescribeEPSGPart(eEPSG_Datum, 6267), HasSubstr("North American Datum 1927"));
    EXPECT_THAT(DescribeEPSGPart(eEPSG_PrimeMeridian, 8903), HasSubstr("Paris"));
    EXPECT_THROW(DescribeEPSGPart(eEPSG_Datum, 1), krv::DataException);
    EXPECT_THROW(FindEPSGUnit(1), krv::DataException);
}

TEST(CRSParts, WhatWasTakenApartIsTheSameSystemWhenPutTogether)
{
    for (const int nCode : {32632, 2046, 3395, 3388, 3857, 6808,  2056, 3812,  27563, 3035,
                            6933,  3083, 3295, 5041, 3031, 28992, 4390, 29101, 27200, 32064})
    {
        const auto poCRS = CreateCRSFromEPSG(nCode);
        const ProjectedParts oParts = DescribeCRS(*poCRS).horizontal;
        ASSERT_NE(oParts.method, nullptr) << nCode << poCRS->GetWKT();
        const auto poAgain = CreateProjectedCRS(oParts);
        EXPECT_TRUE(poAgain->IsEquivalent(*poCRS)) << nCode << poAgain->GetWKT();
    }
    GeodeticParts oBase = DescribeCRS(*CreateCRSFromEPSG(27700)).horizontal.base;
    EXPECT_EQ(oBase.code, 4277);
    oBase.code = oBase.datum.code = 0;
    oBase.shift = {446, -125, 542};
    const auto poBound = CreateGeodeticCRS(oBase);
    EXPECT_TRUE(poBound->IsGeographic());
    EXPECT_EQ(poBound->GetEllipsoidName(), "Airy 1830");
    EXPECT_EQ(DescribeCRS(*poBound).horizontal.base.shift, oBase.shift);
    VerticalParts oHeights;
    oHeights.code = 5701;
    const auto poBoth = CreateCompoundCRS(*CreateCRSFromEPSG(27700), *CreateVerticalCRS(oHeights));
    EXPECT_EQ(DescribeCRS(*poBoth).verticalCode, 5701);
    EXPECT_TRUE(poBoth->IsEquivalent(*CreateCRSFromEPSG(7405)));
}

TEST(CRSParts, ImpossibleValuesAreNamed)
{
    const auto Trouble = [](const ProjectedParts& oParts)
    {
        return krv::test::Error([&] { CreateProjectedCRS(oParts); });
    };
    ProjectedParts oParts;
    EXPECT_THAT(Trouble(oParts), HasSubstr("the ellipsoid has no possible size"));
    oParts.base.code = 4326;
    EXPECT_THAT(Trouble(oParts), HasSubstr("the projection has no method"));
    oParts.method = FindProjectionMethod("Transverse Mercator");
    EXPECT_THAT(Trouble(oParts), HasSubstr("the projection has another number of parameters"));
    oParts.values = {0, 9, 1, NAN, 0};
    EXPECT_THAT(Trouble(oParts), HasSubstr("the parameter \"False easting\" is not finite"));
    oParts.length.size = -1;
    EXPECT_THAT(Trouble(oParts), HasSubstr("a unit has no possible size"));
    oParts.base.angle.code = 9001;
    EXPECT_THAT(Trouble(oParts), HasSubstr("the unit metre is no unit of angle"));
    EXPECT_EQ(FindProjectionMethod("Nobody's"), nullptr);
}

TEST(CoordinateTransformation, UsesEastingFirstWhateverTheAuthoritySays)
{
    // False origins, and one position by hand from the formulas of the polar stereographic projection.
    struct Known
    {
        int nCode;
        double nX, nY, nLongitude, nLatitude;
    };
    const Known KNOWN[] = {{32632, 500000.0, 0.0, 9.0, 0.0},
                           {3035, 4321000.0, 3210000.0, 10.0, 52.0}, // northing first
                           {2193, 1600000.0, 10000000.0, 173.0, 0.0},
                           {3031, 0.0, 1000000.0, 0.0, -80.8152653}};
    for (const Known& oKnown : KNOWN)
    {
        const CoordinateTransformation oToGround(*CreateCRSFromEPSG(oKnown.nCode), *CreateCRSFromEPSG(4326));
        double nX = oKnown.nX;
        double nY = oKnown.nY;
        ASSERT_TRUE(oToGround.Transform(nX, nY)) << oKnown.nCode;
        EXPECT_NEAR(nX, oKnown.nLongitude, 2e-5) << oKnown.nCode;
        EXPECT_NEAR(nY, oKnown.nLatitude, 2e-5) << oKnown.nCode;
        ASSERT_TRUE(oToGround.TransformBack(nX, nY)) << oKnown.nCode;
        EXPECT_NEAR(nX, oKnown.nX, 1e-3) << oKnown.nCode;
        EXPECT_NEAR(nY, oKnown.nY, 1e-3) << oKnown.nCode;
    }
}

TEST(CoordinateTransformation, MarksPointsThatHaveNoPlace)
{
    const CoordinateTransformation oTransformation(*CreateCRSFromEPSG(4326), *CreateCRSFromEPSG(3857));
    const double nNaN = std::numeric_limits<double>::quiet_NaN();
    std::vector<double> oX = {0.0, 180.0, nNaN, 10.0};
    std::vector<double> oY = {0.0, 45.0, 0.0, 9000.0};
    std::vector<double> oZ = {1.0, 2.0, 3.0, 4.0};
    EXPECT_EQ(oTransformation.Transform(4, oX.data(), oY.data(), oZ.data()), 2U);
    EXPECT_NEAR(oX[1], 20037508.342789, 1e-5);
    EXPECT_NEAR(oZ[1], 2.0, 1e-9);
    for (const std::size_t nBad : {2U, 3U})
    {
        EXPECT_TRUE(std::isinf(oX[nBad]) && std::isinf(oY[nBad]) && std::isinf(oZ[nBad]));
    }
    EXPECT_EQ(oTransformation.Transform(0, nullptr, nullptr), 0U);
}
