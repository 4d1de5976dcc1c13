#include "toolkit/mathmodel/rpcmodel.h"

#include "tests/support/thrown.h"
#include "toolkit/mathmodel/findground.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <memory>
#include <random>
#include <vector>

#include <gtest/gtest.h>

namespace krv::mathmodel
{

namespace
{

// A panchromatic scene of Pleiades 1B over Nice of 28 September 2017, with a ground position in it that its provider's
// tools place at column 100.5, row 200.5.
constexpr char NICE[] =
    "0 0 11469.5 19999.5 43.6772638723064 7.17744850367561 670 11469.5 19999.5 0.059094070033936 "
    "0.132212619668901 630 -0.00185020904067451 0.0698104447407509 -1.09235324117618 -0.021814249276077 "
    "0.00121171425410876 2.76638772076096e-05 8.0980462299178e-06 -0.00119093530484733 0.00114897060816587 "
    "2.24620568639661e-06 -3.60161922714853e-06 -5.5151765856299e-06 -7.83514754712989e-05 -1.05772130483304e-05 "
    "0.000111691142895374 0.000548333220077419 0.000164910424389974 2.26464059524339e-06 1.78029600933359e-05 "
    "3.28894996895612e-06 1 0.00153702966600767 -0.000850255148536953 -3.31305939685797e-05 "
    "-9.55977505058452e-05 -3.45865692724229e-07 2.87774922284592e-05 -9.71752015557712e-05 0.000393303600277223 "
    "-0.000150584568710015 1.1205565753101e-08 -4.19615731849281e-07 -2.91756165031344e-06 -4.08302077735705e-07 "
    "2.71755153784986e-06 -2.06604788106092e-06 -6.59870613549866e-08 4.48992839909244e-08 -8.21670158409646e-07 "
    "6.70815592387116e-09 0.00374321456500487 1.01161201549305 -0.000108650176255135 0.0113280713091793 "
    "-0.000158400348205981 0.000456165294729941 -0.000124246258872532 -0.00339052319644368 0.00049260287439426 "
    "1.39382163458586e-06 1.52184293078925e-06 2.69142726729643e-06 1.25282679825342e-05 -7.43627570471524e-07 "
    "1.25591796202999e-05 -0.000192693282645298 -3.13481994353245e-07 -2.93387312507297e-06 -1.2042569869777e-05 "
    "-1.08970866389161e-08 1 -0.000362013732739162 0.000161936463848829 -0.000503790573335675 "
    "-1.96459240941631e-05 1.21810025788615e-06 -1.46361989236423e-06 7.55579559413767e-06 -1.58450537412824e-05 "
    "-1.12284475568369e-06 -1.2839719516335e-08 -7.61965838022596e-08 2.24057677786235e-07 9.24695826346757e-11 "
    "1.77152806817512e-07 7.08760218732476e-07 1.07574931499556e-10 -2.53815234783449e-09 5.83684624878976e-08 "
    "5.92090135139572e-10";
constexpr double NICE_LONGITUDE = 7.048662660737769592;
constexpr double NICE_LATITUDE = 43.72774839443545858;

RpcModel Nice()
{
    return RpcModel(RpcCoefficients::FromText(NICE).value());
}

struct Point
{
    double column = -1;
    double row = -1;
};

Point Place(const IMathModel& oModel, double nLongitude, double nLatitude, double nHeight)
{
    Point oPoint;
    oModel.GroundToImage(nLongitude, nLatitude, nHeight, oPoint.column, oPoint.row);
    return oPoint;
}

void ExpectNear(const Point& oPoint, double nColumn, double nRow, double nError)
{
    EXPECT_NEAR(oPoint.column, nColumn, nError);
    EXPECT_NEAR(oPoint.row, nRow, nError);
}

// Powers of L, P and H of each term, as the form's definition lists them.
constexpr int POWERS[20][3] = {{0, 0, 0}, {1, 0, 0}, {0, 1, 0}, {0, 0, 1}, {1, 1, 0}, {1, 0, 1}, {0, 1, 1},
                               {2, 0, 0}, {0, 2, 0}, {0, 0, 2}, {1, 1, 1}, {3, 0, 0}, {1, 2, 0}, {1, 0, 2},
                               {2, 1, 0}, {0, 3, 0}, {0, 1, 2}, {2, 0, 1}, {0, 2, 1}, {0, 0, 3}};

double TermByTerm(const RpcCoefficients::Polynomial& oC, double nL, double nP, double nH)
{
    double nSum = 0;
    for (std::size_t i = 0; i < oC.size(); ++i)
        nSum += oC[i] * std::pow(nL, POWERS[i][0]) * std::pow(nP, POWERS[i][1]) * std::pow(nH, POWERS[i][2]);
    return nSum;
}

} // namespace

TEST(RpcModel, PlacesAKnownPoint)
{
    ExpectNear(Place(Nice(), NICE_LONGITUDE, NICE_LATITUDE, 0), 100.5, 200.5, 1e-3);
}

TEST(RpcModel, TermsStandInTheirOrder)
{
    std::mt19937 oRandom(7);
    std::uniform_real_distribution<double> oPart(-1, 1);
    RpcCoefficients oC = Nice().GetCoefficients();
    for (auto* const poC : {&oC.lineNumerator, &oC.lineDenominator, &oC.sampleNumerator, &oC.sampleDenominator})
        for (double& nC : *poC)
            nC = 0.04 * oPart(oRandom);
    oC.lineDenominator[0] = oC.sampleDenominator[0] = -1;
    const RpcModel oModel(oC);
    for (int n = 0; n < 100; ++n)
    {
        const double nL = oPart(oRandom), nP = oPart(oRandom), nH = oPart(oRandom);
        const Point oPoint = Place(oModel, oC.longitudeOffset + nL * oC.longitudeScale,
                                   oC.latitudeOffset + nP * oC.latitudeScale, oC.heightOffset + nH * oC.heightScale);
        const auto Expected = [&](double nOffset, double nScale, const auto& oAbove, const auto& oBelow)
        {
            return nOffset + 0.5 + nScale * TermByTerm(oAbove, nL, nP, nH) / TermByTerm(oBelow, nL, nP, nH);
        };
        ExpectNear(oPoint, Expected(oC.sampleOffset, oC.sampleScale, oC.sampleNumerator, oC.sampleDenominator),
                   Expected(oC.lineOffset, oC.lineScale, oC.lineNumerator, oC.lineDenominator), 1e-7);
    }
}

TEST(RpcModel, ImageOfGroundIsWhereItBeganForManyPointsAndForOne)
{
    const RpcModel oModel = Nice();
    std::vector<double> oColumns, oRows, oHeights;
    for (int n = 0; n < 9 * 9 * 9; ++n)
    {
        oColumns.push_back(n % 9 * 5000.0 + 0.25);
        oRows.push_back(n / 9 % 9 * 2868.0);
        oHeights.push_back(670 + 630 * (n / 81 / 4.0 - 1));
    }
    const std::size_t nCount = oColumns.size();
    std::vector<double> oLongitudes(nCount), oLatitudes(nCount), oAgain(oHeights);
    ASSERT_EQ(oModel.ImageToGround(nCount, oColumns.data(), oRows.data(), oHeights.data(), oLongitudes.data(),
                                   oLatitudes.data()),
              nCount);
    for (std::size_t n = 0; n < nCount; ++n)
    {
        double nLongitude = 0, nLatitude = 0;
        ASSERT_TRUE(oModel.ImageToGround(oColumns[n], oRows[n], oHeights[n], nLongitude, nLatitude));
        ASSERT_TRUE(nLongitude == oLongitudes[n] && nLatitude == oLatitudes[n]) << n;
        const Point oPoint = Place(oModel, nLongitude, nLatitude, oHeights[n]);
        ExpectNear(oPoint, oColumns[n], oRows[n], 1e-6);
        oAgain[n] = oPoint.row;
    }
    // Results in the place of arguments, and a part that ends inside of a vector.
    ASSERT_EQ(oModel.GroundToImage(101, oLongitudes.data(), oLatitudes.data(), oHeights.data(), oLongitudes.data(),
                                   oHeights.data()),
              101U);
    EXPECT_TRUE(std::equal(oAgain.begin(), oAgain.begin() + 101, oHeights.begin()));
}

TEST(RpcModel, LevelsAndWindowsKeepTheCorner)
{
    const RpcModel oModel = Nice();
    const std::unique_ptr<IMathModel> poLevel(oModel.CreateScaled(2, 4));
    ExpectNear(Place(*poLevel, NICE_LONGITUDE, NICE_LATITUDE, 0), 50.25, 50.125, 1e-3);
    const RpcModel oWindow(oModel.GetCoefficients().Shifted(100, 30.5));
    ExpectNear(Place(oWindow, NICE_LONGITUDE, NICE_LATITUDE, 0), 0.5, 170, 1e-3);
    for (const double nBad : {0.0, -1.0, std::numeric_limits<double>::infinity(), std::nan("")})
        EXPECT_THROW(oModel.CreateScaled(1, nBad), krv::ParameterException) << nBad;
}

TEST(RpcModel, WhatItDoesNotReachStaysUntouched)
{
    const RpcModel oModel = Nice();
    const double nFar = 7.17744850367561 + 1.51 * 0.132212619668901;
    const double nInfinite = std::numeric_limits<double>::infinity();
    const double aGrounds[][3] = {{nFar, 43.7, 0}, {7.1, 45, 0}, {std::nan(""), 43.7, 0}, {7.1, 43.7, nInfinite}};
    for (const auto& aGround : aGrounds)
        ExpectNear(Place(oModel, aGround[0], aGround[1], aGround[2]), -1, -1, 0);
    const double aImages[][3] = {
        {1e6, 0, 0}, {0, -1e9, 0}, {std::nan(""), 5, 0}, {5, std::nan(""), 0}, {5, 5, nInfinite}};
    for (const auto& aImage : aImages)
    {
        double nLongitude = -1, nLatitude = -1;
        EXPECT_FALSE(oModel.ImageToGround(aImage[0], aImage[1], aImage[2], nLongitude, nLatitude));
        EXPECT_TRUE(nLongitude == -1 && nLatitude == -1);
    }
    // A point between two that are reached.
    double aLongitudes[] = {7.1, nFar, 7.2}, aLatitudes[] = {43.7, 43.7, 43.7}, aHeights[] = {0, 0, 0};
    EXPECT_EQ(oModel.GroundToImage(3, aLongitudes, aLatitudes, aHeights, aLongitudes, aLatitudes), 2U);
    EXPECT_TRUE(std::isnan(aLongitudes[1]) && std::isnan(aLatitudes[1]) && !std::isnan(aLatitudes[2]));
}

TEST(RpcModel, DenominatorsAreNotZero)
{
    RpcCoefficients oC;
    oC.lineNumerator[2] = oC.sampleNumerator[1] = 1;
    oC.lineDenominator[1] = -1; // 1 - L
    const RpcModel oModel(oC);
    ExpectNear(Place(oModel, 0.5, 0.25, 0), 1, 1, 1e-12);
    EXPECT_EQ(krv::test::Error([&] { Place(oModel, 1, 0.25, 0); }),
              "data: A denominator of the rational polynomial model is zero");
    ExpectNear(Place(oModel, 1.25, 0.25, 0), -1, -1, 0); // behind the pole

    const std::pair<double RpcCoefficients::*, double> aFaults[] = {{&RpcCoefficients::heightScale, 0},
                                                                    {&RpcCoefficients::lineOffset, std::nan("")}};
    for (const auto& [pNumber, nValue] : aFaults)
    {
        RpcCoefficients oBad = oC;
        oBad.*pNumber = nValue;
        EXPECT_THROW(RpcModel{oBad}, krv::DataException);
    }
    oC.sampleDenominator = {};
    EXPECT_THROW(RpcModel{oC}, krv::DataException);
}

TEST(RpcModel, LongitudesGoOnAcrossTheDateLine)
{
    RpcCoefficients oC = Nice().GetCoefficients();
    oC.longitudeOffset = 179.95;
    const RpcModel oModel(oC);
    const Point oEast = Place(oModel, -179.97, oC.latitudeOffset, 0);
    ExpectNear(oEast, Place(oModel, 180.03, oC.latitudeOffset, 0).column, oEast.row, 1e-6);
    double nLongitude = 0, nLatitude = 0;
    ASSERT_TRUE(oModel.ImageToGround(oEast.column, oEast.row, 0, nLongitude, nLatitude));
    EXPECT_NEAR(nLongitude, 180.03, 1e-9);
}

TEST(RpcModel, AccuracyIsStatedOrUnknown)
{
    const double aCases[][3] = {{3, 4, 5}, {0, 0.5, 0.5}, {0, 0, -1}, {1, -1, -1}};
    for (const auto& aCase : aCases)
    {
        RpcCoefficients oC = Nice().GetCoefficients();
        oC.biasError = aCase[0];
        oC.randomError = aCase[1];
        const std::unique_ptr<IMathModel> poClone(RpcModel(oC).Clone());
        EXPECT_EQ(poClone->GetAccuracy(), aCase[2]);
        EXPECT_EQ(poClone->GetName(), "RPC");
    }
}

TEST(RpcCoefficients, TextsReadBackTheSame)
{
    const RpcCoefficients oC = Nice().GetCoefficients();
    EXPECT_EQ(RpcCoefficients::FromText(oC.GetText()), oC);
    EXPECT_EQ(oC.GetValues()[2], 11469.5);
    EXPECT_EQ(oC.GetValues()[91], 5.92090135139572e-10);
    for (const std::string& bad : {oC.GetText() + " 1", oC.GetText().substr(2), "x" + oC.GetText(), std::string()})
        EXPECT_FALSE(RpcCoefficients::FromText(bad)) << bad;
}

TEST(FindGround, MeetsTheTerrain)
{
    const RpcModel oModel = Nice();
    double nEast = 0, nLow = 0, nStep = 0;
    ASSERT_TRUE(oModel.ImageToGround(23000, 12000, 0, nEast, nLow));
    ASSERT_TRUE(oModel.ImageToGround(23000, 12000, 1000, nEast, nStep));
    // Gentle, so steep that heights taken in turn run away, a step, and one that is not known everywhere.
    const std::vector<std::pair<const char*, TerrainHeight>> oTerrains = {
        {"gentle",
         [](double nX, double nY, double& nH)
         {
             return nH = 500 + 300 * (nX - 7.2) + 900 * (nY - 43.7), true;
         }},
        {"steep",
         [](double nX, double nY, double& nH)
         {
             return nH = 500 + 8e5 * (nX - 7.2) - 9e5 * (nY - 43.67), true;
         }},
        {"step",
         [&](double, double nY, double& nH)
         {
             return nH = (nY < nStep) == (nLow < nStep) ? 2000 : 0, true;
         }},
    };
    for (const auto& [pName, oTerrain] : oTerrains)
    {
        SCOPED_TRACE(pName);
        double nLongitude = 0, nLatitude = 0, nHeight = 0;
        ASSERT_TRUE(FindGround(oModel, 23000, 12000, oTerrain, 670, nLongitude, nLatitude, nHeight));
        ExpectNear(Place(oModel, nLongitude, nLatitude, nHeight), 23000, 12000, 1e-6);
        double nThere = 0;
        oTerrain(nLongitude, nLatitude, nThere);
        if (std::string(pName) == "step")
            EXPECT_NEAR(nHeight, 1000, 1e-3);
        else
            EXPECT_NEAR(nThere, nHeight, 1e-3);
    }
    double nUntouched = -1;
    const TerrainHeight oUnknown = [](double, double, double&)
    {
        return false;
    };
    EXPECT_FALSE(FindGround(oModel, 23000, 12000, oUnknown, 670, nUntouched, nUntouched, nUntouched));
    EXPECT_FALSE(FindGround(oModel, 1e6, 12000, oTerrains[0].second, 670, nUntouched, nUntouched, nUntouched));
    EXPECT_EQ(nUntouched, -1);
}

} // namespace krv::mathmodel
