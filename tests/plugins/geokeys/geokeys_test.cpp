#include "plugins/tif/geo/geokeys.h"
#include "tests/support/facts.h"
#include "tests/support/thrown.h"
#include "tests/support/tiffwriter.h"
#include "toolkit/ogc/cs/coordinatetransformation.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <limits>
#include <map>
#include <optional>

#include <geotiff.h>
#include <geovalues.h>
#include <unistd.h>
#include <xtiffio.h>

using namespace krv::plugins::tif;
using namespace krv::ogc::cs;
using krv::test::DataFolder;
using krv::test::TiffFile;
using ::testing::HasSubstr;

namespace
{

// Geographic keys as a writer lays them out.
class Keys
{
public:
    Keys& Code(int nKey, int nValue)
    {
        moEntries[nKey] = {0, 1, nValue};
        return *this;
    }
    Keys& Number(int nKey, std::vector<double> oValues)
    {
        moEntries[nKey] = {TIFFTAG_GEODOUBLEPARAMS, static_cast<int>(oValues.size()),
                           static_cast<int>(moDoubles.size())};
        moDoubles.insert(moDoubles.end(), oValues.begin(), oValues.end());
        return *this;
    }
    Keys& Text(int nKey, const std::string& text)
    {
        moEntries[nKey] = {TIFFTAG_GEOASCIIPARAMS, static_cast<int>(text.size() + 1), static_cast<int>(moAscii.size())};
        moAscii += text + "|";
        return *this;
    }
    Keys& Projected() { return Code(GTModelTypeGeoKey, ModelTypeProjected).Code(ProjectedCSTypeGeoKey, KvUserDefined); }

    std::vector<std::uint16_t> Directory() const
    {
        std::vector<std::uint16_t> oDirectory = {1, 1, 0, static_cast<std::uint16_t>(moEntries.size())};
        for (const auto& [nKey, oEntry] : moEntries)
        {
            oDirectory.push_back(static_cast<std::uint16_t>(nKey));
            for (const int nValue : oEntry)
                oDirectory.push_back(static_cast<std::uint16_t>(nValue));
        }
        return oDirectory;
    }
    const std::vector<double>& Doubles() const { return moDoubles; }
    const std::string& Ascii() const { return moAscii; }

private:
    std::map<int, std::array<int, 3>> moEntries;
    std::vector<double> moDoubles;
    std::string moAscii;
};

// A directory that is being written answers for its tags like one that was read.
TiffFile NewTiff()
{
    RegisterGeoTags();
    TIFFSetWarningHandler(nullptr);
    const auto path = std::filesystem::temp_directory_path() / ("geokeys" + std::to_string(::getpid()) + ".tif");
    TiffFile poFile = krv::test::NewTiff(path);
    std::filesystem::remove(path);
    return poFile;
}

void SetDoubles(TIFF* poFile, int nTag, const std::vector<double>& oValues)
{
    if (!oValues.empty())
        TIFFSetField(poFile, nTag, static_cast<int>(oValues.size()), oValues.data());
}

void SetKeys(TIFF* poFile, const std::vector<std::uint16_t>& oDirectory, const std::vector<double>& oDoubles,
             const std::string& ascii)
{
    TIFFSetField(poFile, TIFFTAG_GEOKEYDIRECTORY, static_cast<int>(oDirectory.size()), oDirectory.data());
    SetDoubles(poFile, TIFFTAG_GEODOUBLEPARAMS, oDoubles);
    if (!ascii.empty())
        TIFFSetField(poFile, TIFFTAG_GEOASCIIPARAMS, ascii.c_str());
}

std::unique_ptr<ICRS> CRSOf(const Keys& oKeys)
{
    const TiffFile poFile = NewTiff();
    SetKeys(poFile.get(), oKeys.Directory(), oKeys.Doubles(), oKeys.Ascii());
    return ReadCRS(poFile.get());
}

std::string ErrorOf(const std::vector<std::uint16_t>& oDirectory, const std::vector<double>& oDoubles = {})
{
    const TiffFile poFile = NewTiff();
    SetKeys(poFile.get(), oDirectory, oDoubles, "");
    const std::string error = krv::test::Error([&] { ReadCRS(poFile.get()); });
    EXPECT_THAT(error, HasSubstr(TIFFFileName(poFile.get())));
    return error;
}

std::string ErrorOf(const Keys& oKeys)
{
    return ErrorOf(oKeys.Directory(), oKeys.Doubles());
}

TiffFile OpenData(const std::string& file)
{
    TIFFSetWarningHandler(nullptr);
    return TiffFile(TIFFOpen((DataFolder() + "/" + file).c_str(), "r"));
}

void ExpectTerms(const GeocodingInfo& oInfo, const std::array<double, 6>& oExpected)
{
    for (std::size_t nTerm = 0; nTerm < 6; ++nTerm)
        EXPECT_NEAR(oInfo.GetTerms()[nTerm], oExpected[nTerm], 1e-12 * std::max(1.0, std::abs(oExpected[nTerm])))
            << nTerm;
}

} // namespace

TEST(GeoKeysOfRealFiles, DefinitionsWithoutCodesAreTheSystemsTheyAreNamedAfter)
{
    const std::pair<const char*, int> KNOWN[] = {{"albers_equal_area", 3083},
                                                 {"equidistant_cylindrical", 4087},
                                                 {"hotine_oblique_mercator_variant_a", 6808},
                                                 {"lcc1sp", 5456},
                                                 {"lcc2sp", 3812},
                                                 {"new_zealand_mapping_grid", 27200},
                                                 {"oblique_stereographic", 5588},
                                                 {"polyconic", 29101},
                                                 {"transverse_mercator", 3814}};
    if (!std::filesystem::exists(DataFolder()))
        GTEST_SKIP() << "no real files at " << DataFolder();
    for (const auto& [poName, nCode] : KNOWN)
    {
        const TiffFile poFile = OpenData(std::string("crs/") + poName + ".tif");
        const auto poCRS = ReadCRS(poFile.get());
        EXPECT_EQ(poCRS->GetEPSG(), 0) << poName;
        EXPECT_TRUE(poCRS->IsEquivalent(*CreateCRSFromEPSG(nCode))) << poName << "\n" << poCRS->GetWKT();
    }
    const auto poMercator = ReadCRS(OpenData("nodata/propval_bg_01_01.tif").get());
    EXPECT_TRUE(poMercator->IsEquivalent(*CreateCRSFromEPSG(3857)));
    const auto poHeights = ReadCRS(OpenData("crs/test_esri_wkt.tif").get());
    EXPECT_TRUE(poHeights->HasVertical());
    EXPECT_THAT(poHeights->GetWKT(), HasSubstr("NAVD88 height"));
}

TEST(GeoKeys, GeocodingIsForTheOuterCorner)
{
    const double nNaN = std::numeric_limits<double>::quiet_NaN();
    struct Case
    {
        std::vector<double> scale, ties, matrix;
        int rasterType = 1;
        std::optional<std::array<double, 6>> expected; // nothing: there is no geocoding in it
    };
    using Terms = std::array<double, 6>;
    const std::vector<double> MATRIX = {3, 1, 0, 500, 1, -2, 0, 900, 0, 0, 0, 0, 0, 0, 0, 1};
    const Case CASES[] = {{{2, 4, 0}, {0, 0, 0, 100, 200, 0}, {}, 1, Terms{100, 2, 0, 200, 0, -4}},
                          {{2, 4, 0}, {0, 0, 0, 100, 200, 0}, {}, 2, Terms{99, 2, 0, 202, 0, -4}},
                          {{2, 4, 0}, {10, 5, 0, 100, 200, 0}, {}, 0, Terms{80, 2, 0, 220, 0, -4}},
                          {{2, 4, 0}, {0, 0, 0, 1, 1, 0, 9, 9, 0, 9, 9, 0}, {}, 1, Terms{1, 2, 0, 1, 0, -4}},
                          {{}, {}, MATRIX, 1, Terms{500, 3, 1, 900, 1, -2}},
                          {{}, {}, MATRIX, 2, Terms{498, 3, 1, 900.5, 1, -2}},
                          {{2, 4, 0}, {0, 0, 0, 100, 200, 0}, MATRIX, 1, Terms{500, 3, 1, 900, 1, -2}},
                          {{}, {}, {}, 1, {}},
                          {{}, {0, 0, 0, 1, 1, 0}, {}, 1, {}},
                          {{}, {0, 0, 0, 1, 1, 0, 9, 9, 0, 9, 9, 0}, {}, 1, {}},
                          {{2, 4, 0}, {}, {}, 1, {}},
                          {{2, 4, 0}, {0, 0, 0, 1, 1}, {}, 1, {}},
                          {{0, 4, 0}, {0, 0, 0, 1, 1, 0}, {}, 1, {}},
                          {{2, nNaN, 0}, {0, 0, 0, 1, 1, 0}, {}, 1, {}},
                          {{2, 4, 0}, {0, 0, 0, INFINITY, 1, 0}, {}, 1, {}},
                          {{}, {}, std::vector<double>(16, 0.0), 1, {}},
                          {{}, {}, std::vector<double>(12, 1.0), 1, {}}};
    for (const Case& oCase : CASES)
    {
        const TiffFile poFile = NewTiff();
        SetDoubles(poFile.get(), TIFFTAG_GEOPIXELSCALE, oCase.scale);
        SetDoubles(poFile.get(), TIFFTAG_GEOTIEPOINTS, oCase.ties);
        SetDoubles(poFile.get(), TIFFTAG_GEOTRANSMATRIX, oCase.matrix);
        SetKeys(poFile.get(), Keys().Code(GTRasterTypeGeoKey, oCase.rasterType).Directory(), {}, "");
        GeocodingInfo oInfo(7, 7, 0, 7, 0, 7);
        ASSERT_EQ(ReadGeocoding(poFile.get(), oInfo), oCase.expected.has_value());
        ExpectTerms(oInfo, oCase.expected.value_or(Terms{7, 7, 0, 7, 0, 7}));
        EXPECT_EQ(ReadCRS(poFile.get()), nullptr);
    }
}

TEST(GeoKeys, TiePointsAreGivenFromTheCornerToo)
{
    const TiffFile poFile = NewTiff();
    SetDoubles(poFile.get(), TIFFTAG_GEOTIEPOINTS, {1, 2, 0, 10, 20, 30, 3, 4, 0, NAN, 0, 0, 5, 6, 0, 50, 60, 70, 9});
    SetKeys(poFile.get(), Keys().Code(GTRasterTypeGeoKey, RasterPixelIsPoint).Directory(), {}, "");
    const std::vector<TiePoint> oPoints = ReadTiePoints(poFile.get());
    ASSERT_EQ(oPoints.size(), 2U);
    EXPECT_EQ(oPoints[0].column, 1.5);
    EXPECT_EQ(oPoints[0].row, 2.5);
    EXPECT_EQ(oPoints[1].x, 50.0);
    EXPECT_EQ(oPoints[1].z, 70.0);
}

// Every method: the false origin in map coordinates must come out at the origin of the projection on the ground.
TEST(GeoKeys, EveryProjectionMethodHasItsOriginInTheRightPlace)
{
    constexpr int FREE = 1000; // the origin is not where the false coordinates are
    struct Case
    {
        int method;
        const char* name;
        double latitude;
        std::map<int, double> numbers;
        std::pair<int, int> origin = {ProjNatOriginLatGeoKey, ProjNatOriginLongGeoKey};
    };
    const std::pair<int, int> CENTER = {ProjCenterLatGeoKey, ProjCenterLongGeoKey};
    const std::pair<int, int> FALSE_ORIGIN = {ProjFalseOriginLatGeoKey, ProjFalseOriginLongGeoKey};
    const std::pair<int, int> POLE = {ProjNatOriginLatGeoKey, ProjStraightVertPoleLongGeoKey};
    const std::map<int, double> PARALLELS = {{ProjStdParallel1GeoKey, 45}, {ProjStdParallel2GeoKey, 55}};
    const std::map<int, double> AZIMUTHS = {{ProjAzimuthAngleGeoKey, 30}, {ProjRectifiedGridAngleGeoKey, 30}};
    const std::map<int, double> AZIMUTH_19 = {{ProjAzimuthAngleGeoKey, 18.9}};
    const std::map<int, double> SCALE = {{ProjScaleAtNatOriginGeoKey, 0.994}};
    const std::map<int, double> PARALLEL = {{ProjStdParallel1GeoKey, 30}};
    const std::map<int, double> NO_OFFSET = {{ProjFalseEastingGeoKey, 0}, {ProjFalseNorthingGeoKey, 0}};
    const std::map<int, double> NEW_ZEALAND = {{ProjFalseEastingGeoKey, 2510000}, {ProjFalseNorthingGeoKey, 6023150}};
    const Case CASES[] = {
        {CT_TransverseMercator, "Transverse Mercator", 40, {}},
        {CT_ObliqueMercator, "Hotine Oblique Mercator (variant A)", FREE, AZIMUTHS, CENTER},
        {CT_HotineObliqueMercatorAzimuthCenter, "Hotine Oblique Mercator (variant B)", 40, AZIMUTHS, CENTER},
        {CT_ObliqueMercator_Laborde, "Laborde Oblique Mercator", -18.9, AZIMUTH_19, CENTER},
        {CT_ObliqueMercator_Rosenmund, "Hotine Oblique Mercator (variant B)", 46.9, {}, CENTER},
        {CT_Mercator, "Mercator (variant A)", 0, {{ProjScaleAtNatOriginGeoKey, 0.9}}},
        {CT_Mercator, "Mercator (variant B)", 0, {{ProjStdParallel1GeoKey, 42}}},
        {CT_LambertConfConic_2SP, "Lambert Conic Conformal (2SP)", 50, PARALLELS, FALSE_ORIGIN},
        {CT_LambertConfConic_1SP, "Lambert Conic Conformal (1SP)", 50, {}},
        {CT_LambertAzimEqualArea, "Lambert Azimuthal Equal Area", 52, {}, CENTER},
        {CT_AlbersEqualArea, "Albers Equal Area", 50, PARALLELS},
        {CT_AzimuthalEquidistant, "Modified Azimuthal Equidistant", 50, {}},
        {CT_EquidistantConic, "Equidistant Conic", 50, PARALLELS},
        {CT_Stereographic, "Stereographic", 50, {}},
        {CT_PolarStereographic, "Polar Stereographic (variant A)", 90, SCALE, POLE},
        {CT_PolarStereographic, "Polar Stereographic (variant B)", -71, {}, POLE},
        {CT_ObliqueStereographic, "Oblique Stereographic", 50, {}},
        {CT_Equirectangular, "Equidistant Cylindrical", 0, PARALLEL, CENTER},
        {CT_CassiniSoldner, "Cassini-Soldner", 10, {}},
        {CT_Gnomonic, "Gnomonic", 50, {}},
        {CT_MillerCylindrical, "Miller Cylindrical", 0, {}},
        {CT_Orthographic, "Orthographic", 50, {}},
        {CT_Polyconic, "American Polyconic", 30, {}},
        {CT_Robinson, "Robinson", 0, {}},
        {CT_Sinusoidal, "Sinusoidal", 0, {}},
        {CT_VanDerGrinten, "Van Der Grinten", 0, {}},
        {CT_NewZealandMapGrid, "New Zealand Map Grid", -41, NEW_ZEALAND},
        {CT_TransvMercator_SouthOriented, "Transverse Mercator (South Orientated)", -20, NO_OFFSET},
        {CT_CylindricalEqualArea, "Lambert Cylindrical Equal Area", 0, PARALLEL}};
    for (const Case& oCase : CASES)
    {
        SCOPED_TRACE(oCase.name);
        const double nLongitude = oCase.method == CT_NewZealandMapGrid ? 173.0 : 12.0;
        Keys oKeys;
        oKeys.Projected().Code(GeographicTypeGeoKey, 4326).Code(ProjCoordTransGeoKey, oCase.method);
        oKeys.Number(oCase.origin.first, {oCase.latitude == FREE ? 40.0 : oCase.latitude});
        oKeys.Number(oCase.origin.second, {nLongitude});
        oKeys.Number(ProjFalseEastingGeoKey, {700000.0}).Number(ProjFalseNorthingGeoKey, {300000.0});
        for (const auto& [nKey, nValue] : oCase.numbers)
            oKeys.Number(nKey, {nValue});
        const auto poCRS = CRSOf(oKeys);
        ASSERT_NE(poCRS, nullptr);
        EXPECT_EQ(poCRS->GetProjectionMethod(), oCase.name);
        const auto oEasting = oCase.numbers.find(ProjFalseEastingGeoKey);
        const auto oNorthing = oCase.numbers.find(ProjFalseNorthingGeoKey);
        double nX = oEasting == oCase.numbers.end() ? 700000.0 : oEasting->second;
        double nY = oNorthing == oCase.numbers.end() ? 300000.0 : oNorthing->second;
        ASSERT_TRUE(CoordinateTransformation(*poCRS, *CreateCRSFromEPSG(4326)).Transform(nX, nY));
        if (oCase.latitude == FREE)
            continue;
        EXPECT_NEAR(nY, oCase.latitude == -71 ? -90.0 : oCase.latitude, 1e-6);
        if (std::abs(nY) < 89.0)
        {
            EXPECT_NEAR(nX, nLongitude, 1e-6);
        }
    }
    EXPECT_THAT(ErrorOf(Keys().Projected().Code(GeographicTypeGeoKey, 4326).Code(ProjCoordTransGeoKey, 6)),
                HasSubstr("method 6 is not known"));
    EXPECT_THAT(ErrorOf(Keys().Projected().Code(GeographicTypeGeoKey, 4326)), HasSubstr("name no projection"));
}

TEST(GeoKeys, DefinitionsFromPartsEqualTheSystemsWithCodes)
{
    Keys oZone; // a projection with a code, on a system with a code
    oZone.Projected().Code(GeographicTypeGeoKey, 4326).Code(ProjectionGeoKey, 16032);
    EXPECT_TRUE(CRSOf(oZone)->IsEquivalent(*CreateCRSFromEPSG(32632)));

    Keys oParis; // grads, a meridian of its own, an ellipsoid by its axes
    oParis.Projected().Code(GeographicTypeGeoKey, KvUserDefined).Code(GeogAngularUnitsGeoKey, 9105);
    oParis.Text(GeogCitationGeoKey,
                "GCS Name = NTF (Paris)|Datum = Nouvelle Triangulation Francaise (Paris)|Primem = Paris");
    oParis.Number(GeogSemiMajorAxisGeoKey, {6378249.2}).Number(GeogSemiMinorAxisGeoKey, {6356515});
    oParis.Number(GeogPrimeMeridianLongGeoKey, {2.5969213});
    oParis.Code(ProjCoordTransGeoKey, CT_LambertConfConic_1SP).Number(ProjNatOriginLatGeoKey, {49});
    oParis.Number(ProjScaleAtNatOriginGeoKey, {0.999877499}).Number(ProjFalseEastingGeoKey, {600000});
    oParis.Number(ProjFalseNorthingGeoKey, {200000});
    EXPECT_TRUE(CRSOf(oParis)->IsEquivalent(*CreateCRSFromEPSG(27563))) << CRSOf(oParis)->GetWKT();
}

TEST(GeoKeys, UnitsEllipsoidsAndShiftsAreTakenAsTheyStand)
{
    Keys oKeys;
    oKeys.Projected().Text(GTCitationGeoKey, "Local \"grid\" \xFF").Text(GeogCitationGeoKey, "Local base");
    oKeys.Code(GeogEllipsoidGeoKey, 7008).Number(GeogTOWGS84GeoKey, {-8, 160, 176});
    oKeys.Code(ProjCoordTransGeoKey, CT_TransverseMercator).Code(ProjLinearUnitsGeoKey, KvUserDefined);
    oKeys.Number(ProjLinearUnitSizeGeoKey, {0.5}).Number(ProjFalseEastingGeoKey, {1000000.1});
    const auto poCRS = CRSOf(oKeys);
    EXPECT_EQ(poCRS->GetName(), "Local \"grid\" \xEF\xBF\xBD");
    EXPECT_EQ(poCRS->GetEllipsoidName(), "Clarke 1866");
    EXPECT_EQ(poCRS->GetUnitFactor(), 0.5);
    EXPECT_EQ(poCRS->GetProjectionParameters()[3].value, 1000000.1);
    EXPECT_THAT(poCRS->GetWKT1(), HasSubstr("TOWGS84[-8,160,176,0,0,0,0]"));
    EXPECT_THAT(poCRS->GetWKT1(), HasSubstr("GEOGCS[\"Local base\""));

    Keys oSphere;
    oSphere.Code(GTModelTypeGeoKey, ModelTypeGeographic).Code(GeographicTypeGeoKey, KvUserDefined);
    oSphere.Code(GeogLinearUnitsGeoKey, 9036).Number(GeogSemiMajorAxisGeoKey, {3396.19});
    const auto poSphere = CRSOf(oSphere);
    EXPECT_TRUE(poSphere->IsGeographic());
    EXPECT_EQ(poSphere->GetSemiMajorAxis(), 3396190.0);
    EXPECT_EQ(poSphere->GetInverseFlattening(), 0.0);

    EXPECT_EQ(CRSOf(Keys().Code(GTModelTypeGeoKey, ModelTypeProjected).Code(ProjectedCSTypeGeoKey, 54009))->GetName(),
              "World_Mollweide");
    EXPECT_EQ(CRSOf(Keys().Code(GTModelTypeGeoKey, ModelTypeGeocentric).Code(GeographicTypeGeoKey, 4978))->GetEPSG(),
              4978);
    EXPECT_EQ(CRSOf(Keys().Code(ProjectedCSTypeGeoKey, 32632))->GetEPSG(), 32632); // no model key
}

// What stands as text in a citation counts beside the code of a base, and what contradicts itself gives nothing.
TEST(GeoKeys, ADefinitionInACitationCountsUnlessTheKeysContradictIt)
{
    const std::string base = "GEOGCS[\"GCS_WGS_1984\",DATUM[\"D_WGS_1984\",SPHEROID[\"WGS_1984\",6378137.0,"
                             "298.257223563]],PRIMEM[\"Greenwich\",0.0],UNIT[\"Degree\",0.0174532925199433]]";
    const auto Map = [&](const std::string& method, const std::string& unit)
    {
        return "ESRI PE String = PROJCS[\"WGS_1984_Web_Mercator_Auxiliary_Sphere\"," + base + ",PROJECTION[\"" +
               method +
               "\"],PARAMETER[\"False_Easting\",0.0],PARAMETER[\"False_Northing\",0.0],PARAMETER[\"Central_Meridian\","
               "0.0],PARAMETER[\"Standard_Parallel_1\",0.0],UNIT[" +
               unit + "]]";
    };
    const std::string web = Map("Mercator_Auxiliary_Sphere", "\"Meter\",1.0"), foot = "\"Foot_US\",0.3048006096";
    const std::string unknown = Map("Nobodys_Projection", "\"Meter\",1.0"), plain = "ESRI PE String = " + base,
                      broken = "ESRI PE String = PROJCS[";
    struct Case
    {
        int model, base, method, unit; // 0: absent
        int key;                       // of the text
        std::string text;
        const char* expected; // an EPSG code, or a part of the complaint or of the exception
        int code = KvUserDefined;
    };
    const Case CASES[] = {
        {KvUserDefined, 4326, 0, 9001, PCSCitationGeoKey, web, "3857"},
        {0, 4326, 0, 0, GTCitationGeoKey, web + "|PCS Name = x", "3857"},
        {1, 4326, CT_Mercator, 9001, PCSCitationGeoKey, web, "3857"},
        {1, 4326, CT_Mercator, 9001, GTCitationGeoKey, "WGS_1984_Web_Mercator_Auxiliary_Sphere", "3857"},
        {1, 4326, CT_Mercator, 9001, GTCitationGeoKey, "a Mercator", "3395"},
        {1, 4326, CT_Mercator, 9001, PCSCitationGeoKey, unknown, "3395"},
        {1, 4326, 0, 9001, PCSCitationGeoKey, web, "32632", 32632},
        {KvUserDefined, 4326, 0, 9003, PCSCitationGeoKey, Map("Mercator_Auxiliary_Sphere", foot), "own"},
        {KvUserDefined, 4326, 0, 9001, PCSCitationGeoKey, Map("Mercator_Auxiliary_Sphere", foot), "unit is the metre"},
        {KvUserDefined, 4326, 0, 9102, PCSCitationGeoKey, web, "unit is the degree"},
        {1, 4326, CT_Mercator, 9001, PCSCitationGeoKey, broken, "3395"},
        {KvUserDefined, 4326, 0, 9001, PCSCitationGeoKey, broken, "do not name"},
        {KvUserDefined, 4326, 0, 9001, GTCitationGeoKey, "Web Mercator", "do not name"},
        {2, 4326, 0, 9001, PCSCitationGeoKey, web, "model is geographic"},
        {2, 4326, 0, 0, GTCitationGeoKey, "none", "name a projected system", 32632},
        {2, 4326, 0, 9001, GeogCitationGeoKey, plain, "4326", 0},
        {2, 0, 0, 0, GTCitationGeoKey, plain, "4326", 0},
        {1, 0, CT_Mercator, 9001, GeogCitationGeoKey, plain, "3395"},
        {1, 0, 0, 9001, PCSCitationGeoKey, plain, "model is projected"},
        {0, 0, 0, 9001, GTCitationGeoKey, plain, "unit is the metre", 0},
        {1, 4326, 0, 9001, PCSCitationGeoKey, broken, "cannot be understood"}};
    for (const Case& oCase : CASES)
    {
        SCOPED_TRACE(oCase.text.substr(0, 40) + " " + oCase.expected);
        Keys oKeys;
        for (const auto& [nKey, nValue] : {std::pair<int, int>{GTModelTypeGeoKey, oCase.model},
                                           {GeographicTypeGeoKey, oCase.base},
                                           {ProjCoordTransGeoKey, oCase.method},
                                           {ProjLinearUnitsGeoKey, oCase.unit},
                                           {ProjectedCSTypeGeoKey, oCase.code}})
            if (nValue != 0)
                oKeys.Code(nKey, nValue);
        oKeys.Text(oCase.key, oCase.text);
        const TiffFile poFile = NewTiff();
        SetKeys(poFile.get(), oKeys.Directory(), oKeys.Doubles(), oKeys.Ascii());
        std::string trouble;
        std::unique_ptr<ICRS> poCRS;
        const std::string error = krv::test::Error([&] { poCRS = ReadCRS(poFile.get(), &trouble); });
        const int nCode = std::atoi(oCase.expected);
        EXPECT_EQ(poCRS != nullptr, nCode != 0 || oCase.expected == std::string("own"));
        if (nCode != 0 && poCRS)
        {
            EXPECT_TRUE(poCRS->IsEquivalent(*CreateCRSFromEPSG(nCode))) << poCRS->GetWKT();
        }
        else if (poCRS)
            EXPECT_NEAR(poCRS->GetUnitFactor(), 0.3048006096, 1e-9);
        else
            EXPECT_THAT(trouble + error, HasSubstr(oCase.expected));
    }
}

TEST(GeoKeys, HeightsMakeACompoundThatKeepsTheCodeOfItsPixels)
{
    struct Case
    {
        int code;
        const char* name;
    };
    const Case CASES[] = {
        {5773, "EGM96 height"}, {5703, "NAVD88 height"}, {5103, "North American Vertical Datum 1988"}};
    for (const Case& oCase : CASES)
    {
        Keys oKeys;
        oKeys.Code(GTModelTypeGeoKey, ModelTypeProjected)
            .Code(ProjectedCSTypeGeoKey, 32632)
            .Code(VerticalCSTypeGeoKey, oCase.code);
        const auto poCRS = CRSOf(oKeys);
        EXPECT_TRUE(poCRS->HasVertical()) << oCase.code;
        EXPECT_EQ(poCRS->GetEPSG(), 32632) << oCase.code;
        EXPECT_THAT(poCRS->GetWKT(), HasSubstr(oCase.name));
    }
    Keys oOwn;
    oOwn.Code(ProjectedCSTypeGeoKey, 32632).Code(VerticalCSTypeGeoKey, KvUserDefined).Code(VerticalUnitsGeoKey, 9002);
    EXPECT_THAT(CRSOf(oOwn.Text(VerticalCitationGeoKey, "Mine datum"))->GetWKT(), HasSubstr("VERTCRS[\"Mine datum\""));
    EXPECT_FALSE(CRSOf(Keys().Code(ProjectedCSTypeGeoKey, 32632).Code(VerticalCSTypeGeoKey, 5030))->HasVertical());
}

TEST(GeoKeys, DamageIsNamedSilently)
{
    ::testing::internal::CaptureStderr();
    EXPECT_THAT(ErrorOf({1, 1}), HasSubstr("too short"));
    EXPECT_THAT(ErrorOf({2, 1, 0, 0}), HasSubstr("version 2"));
    EXPECT_THAT(ErrorOf({1, 1, 0, 7, 1024, 0, 1, 1}), HasSubstr("7 keys are announced, 1 found"));
    EXPECT_THAT(ErrorOf({1, 1, 0, 1, 1024, 0, 3, 1}), HasSubstr("key 1024 has 3 values"));
    EXPECT_THAT(ErrorOf({1, 1, 0, 1, 3082, 34736, 1, 1}, {1.0}), HasSubstr("key 3082 points outside"));
    EXPECT_THAT(ErrorOf({1, 1, 0, 1, 3082, 34735, 60000, 60000}), HasSubstr("key 3082 points outside"));
    EXPECT_EQ(ErrorOf({1, 1, 0, 2, 1024, 0, 1, 2, 1026, 34737, 50, 60000}), ErrorOf(Keys().Code(1024, 2)));
    EXPECT_THAT(ErrorOf(Keys().Code(ProjectedCSTypeGeoKey, 31)), HasSubstr("EPSG:31 is no known"));
    EXPECT_THAT(ErrorOf(Keys().Code(ProjectedCSTypeGeoKey, 60000)), HasSubstr("ESRI:60000 is no known"));
    EXPECT_THAT(ErrorOf(Keys().Code(GTModelTypeGeoKey, 2)), HasSubstr("neither a geographic system nor a datum"));
    EXPECT_THAT(ErrorOf(Keys().Code(GTModelTypeGeoKey, 2).Number(GeogSemiMajorAxisGeoKey, {-1})),
                HasSubstr("no possible size"));
    Keys oBoth;
    oBoth.Projected().Code(GeographicTypeGeoKey, 4326).Code(ProjCoordTransGeoKey, CT_PolarStereographic);
    oBoth.Number(ProjNatOriginLatGeoKey, {70}).Number(ProjScaleAtNatOriginGeoKey, {0.9});
    EXPECT_THAT(ErrorOf(oBoth), HasSubstr("both a parallel"));
    EXPECT_EQ(::testing::internal::GetCapturedStderr(), "");
}
