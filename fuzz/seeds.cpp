// krv_fuzz_seeds FOLDER: inputs to start from. FOLDER/tif: small TIFF files of every layout, byte order and
// compression, of several types, and with the geographic keys of every kind of reference system; FOLDER/tags: those
// keys as krv_fuzz_tags takes them.
#include "tests/support/tiffwriter.h"
#include "tools/conformance/tempfolder.h"

#include <cstdio>
#include <exception>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <random>
#include <set>
#include <string>
#include <variant>
#include <vector>

#include <geotiff.h>
#include <geovalues.h>
#include <xtiffio.h>

namespace
{

using krv::test::TiffFile;

void WriteLayouts(const std::filesystem::path& oFolder)
{
    struct Sample
    {
        std::uint16_t mnBits;
        std::uint16_t mnFormat;
    };
    constexpr Sample SAMPLES[] = {{8, 1}, {16, 1}, {32, 3}, {32, 5}};
    constexpr std::uint16_t CODECS[] = {COMPRESSION_NONE, COMPRESSION_ADOBE_DEFLATE, COMPRESSION_LZW, COMPRESSION_ZSTD,
                                        COMPRESSION_PACKBITS};
    unsigned int nSeed = 0;
    for (const Sample& oSample : SAMPLES)
        for (const std::uint16_t nCodec : CODECS)
            for (const char* pMode : {"wl", "wb8"})
            {
                const std::string name = "seed_" + std::to_string(++nSeed) + ".tif";
                const auto oFile = krv::test::NewTiff((oFolder / name).string(), pMode);
                krv::test::TiffForm oForm{37, 29, 2, oSample.mnBits, oSample.mnFormat, nCodec};
                oForm.mbSeparate = nSeed % 3 == 0;
                oForm.mnTileWidth = nSeed % 4 < 2 ? 0 : 16;
                for (const std::uint32_t nReduced : {0, FILETYPE_REDUCEDIMAGE})
                {
                    SetForm(oFile.get(), oForm);
                    TIFFSetField(oFile.get(), TIFFTAG_SUBFILETYPE, nReduced);
                    krv::test::WriteBlocks(oFile.get());
                    TIFFWriteDirectory(oFile.get());
                    oForm.mnWidth = 19;
                    oForm.mnHeight = 15;
                }
            }
}

struct Key
{
    geokey_t meKey;
    std::variant<int, double, const char*> moValue;
};

std::vector<std::vector<Key>> MakeKeys()
{
    const std::vector<Key> oProjected = {{GTModelTypeGeoKey, ModelTypeProjected},
                                         {GTRasterTypeGeoKey, RasterPixelIsArea}};
    const std::vector<Key> oDegrees = {{GTModelTypeGeoKey, ModelTypeGeographic},
                                       {GTRasterTypeGeoKey, RasterPixelIsPoint}};
    const auto With = [](std::vector<Key> oKeys, const std::vector<Key>& oMore)
    {
        oKeys.insert(oKeys.end(), oMore.begin(), oMore.end());
        return oKeys;
    };
    std::vector<std::vector<Key>> oAll;
    for (const int nCode : {4326, 4269, 4267, 4978})
        oAll.push_back(With(oDegrees, {{GeographicTypeGeoKey, nCode}, {GeogAngularUnitsGeoKey, Angular_Degree}}));
    for (const int nCode : {32632, 32719, 3857, 2154, 26915, 27700, 3031, 5514})
        oAll.push_back(With(oProjected, {{ProjectedCSTypeGeoKey, nCode}, {ProjLinearUnitsGeoKey, Linear_Meter}}));
    oAll.push_back(With(oProjected, {{ProjectedCSTypeGeoKey, 32632}, {VerticalCSTypeGeoKey, 5773}}));
    oAll.push_back(With(oDegrees, {{GeographicTypeGeoKey, KvUserDefined},
                                   {GeogCitationGeoKey, "own"},
                                   {GeogEllipsoidGeoKey, KvUserDefined},
                                   {GeogSemiMajorAxisGeoKey, 6378137.0},
                                   {GeogInvFlatteningGeoKey, 298.25},
                                   {GeogPrimeMeridianLongGeoKey, 2.5}}));
    oAll.push_back(
        With(oProjected, {{ProjectedCSTypeGeoKey, KvUserDefined},
                          {GeographicTypeGeoKey, 4326},
                          {PCSCitationGeoKey, "ESRI PE String = PROJCS[\"a\",GEOGCS[\"b\",DATUM[\"c\",SPHEROID[\"d\","
                                              "6378137,298.257223563]],PRIMEM[\"Greenwich\",0],UNIT[\"Degree\","
                                              "0.0174532925199433]],PROJECTION[\"Mercator\"],UNIT[\"Meter\",1]]"}}));
    for (int nMethod = CT_TransverseMercator; nMethod <= CT_CylindricalEqualArea; ++nMethod)
        oAll.push_back(
            With(oProjected, {{ProjectedCSTypeGeoKey, KvUserDefined},
                              {ProjectionGeoKey, KvUserDefined},
                              {ProjCoordTransGeoKey, nMethod},
                              {GeographicTypeGeoKey, 4326},
                              {ProjLinearUnitsGeoKey, nMethod % 2 == 0 ? Linear_Meter : Linear_Foot_US_Survey},
                              {ProjStdParallel1GeoKey, 45.0},
                              {ProjStdParallel2GeoKey, 33.0},
                              {ProjNatOriginLongGeoKey, 9.0},
                              {ProjNatOriginLatGeoKey, 39.0},
                              {ProjCenterLongGeoKey, 9.0},
                              {ProjCenterLatGeoKey, 39.0},
                              {ProjFalseOriginLongGeoKey, 9.0},
                              {ProjFalseOriginLatGeoKey, 39.0},
                              {ProjStraightVertPoleLongGeoKey, -100.0},
                              {ProjAzimuthAngleGeoKey, 30.0},
                              {ProjFalseEastingGeoKey, 500000.0},
                              {ProjFalseNorthingGeoKey, 0.0},
                              {ProjScaleAtNatOriginGeoKey, 0.9996},
                              {ProjScaleAtCenterGeoKey, 1.0}}));
    return oAll;
}

// A value of a tag as krv_fuzz_tags reads it: a backslash stands doubled, one with something else ends it.
std::string Escape(const void* pBytes, std::size_t nBytes)
{
    std::string text;
    for (const char nByte : std::string(static_cast<const char*>(pBytes), nBytes))
        text += nByte == '\\' ? std::string("\\\\") : std::string(1, nByte);
    return text + "\\n";
}

// The tags of the table in krv_fuzz_tags, from 33550 on; their bits come last.
std::string MakeTagsInput(TIFF* poFile)
{
    constexpr std::uint16_t WANTED = 0x1D8; // scale, tie point, keys, doubles and texts
    std::string input;
    for (const std::uint32_t nTag : {33550, 33922, 34735, 34736, 34737})
    {
        std::uint16_t nCount = 0;
        void* pValues = nullptr;
        const char* pText = "";
        if (nTag == 34737)
            TIFFGetField(poFile, nTag, &pText);
        else
            TIFFGetField(poFile, nTag, &nCount, &pValues);
        input += nTag == 34737 ? Escape(pText, std::char_traits<char>::length(pText) + 1)
                               : Escape(pValues, nCount * (nTag == 34735 ? 2u : 8u));
    }
    return input + static_cast<char>(WANTED & 255U) + static_cast<char>(WANTED >> 8U);
}

void WriteSystems(const std::filesystem::path& oFolder)
{
    unsigned int nSeed = 0;
    for (const std::vector<Key>& oKeys : MakeKeys())
    {
        const std::string name = "system_" + std::to_string(++nSeed),
                          file = (oFolder / "tif" / (name + ".tif")).string();
        {
            const TiffFile oFile(XTIFFOpen(file.c_str(), "w"));
            krv::test::SetForm(oFile.get(), {4, 4});
            const double oScale[] = {30, 30, 0}, oTie[] = {0, 0, 0, 500000, 4000000, 0};
            TIFFSetField(oFile.get(), TIFFTAG_GEOPIXELSCALE, 3, oScale);
            TIFFSetField(oFile.get(), TIFFTAG_GEOTIEPOINTS, 6, oTie);
            const std::unique_ptr<GTIF, void (*)(GTIF*)> oGeo(GTIFNew(oFile.get()), &GTIFFree);
            for (const Key& oKey : oKeys)
            {
                if (const int* const pCode = std::get_if<int>(&oKey.moValue))
                    GTIFKeySet(oGeo.get(), oKey.meKey, TYPE_SHORT, 1, *pCode);
                else if (const double* const pNumber = std::get_if<double>(&oKey.moValue))
                    GTIFKeySet(oGeo.get(), oKey.meKey, TYPE_DOUBLE, 1, *pNumber);
                else
                    GTIFKeySet(oGeo.get(), oKey.meKey, TYPE_ASCII, 0, std::get<const char*>(oKey.moValue));
            }
            GTIFWriteKeys(oGeo.get());
            krv::test::WriteBlocks(oFile.get());
        }
        const TiffFile oFile(XTIFFOpen(file.c_str(), "r"));
        krv::conformance::WriteFile((oFolder / "tags" / name).string(), MakeTagsInput(oFile.get()));
    }
}

// An image with a level below it, a mask and a palette, in several codecs.
void WritePages(const std::filesystem::path& oFolder)
{
    for (const std::uint16_t nCodec : {COMPRESSION_NONE, COMPRESSION_LZW, COMPRESSION_JPEG, COMPRESSION_PACKBITS})
        for (const char* pMode : {"wl", "wb", "wb8"})
        {
            const std::string name = "pages_" + std::to_string(nCodec) + pMode + ".tif";
            const auto oFile = krv::test::NewTiff((oFolder / name).string(), pMode);
            const bool bJpeg = nCodec == COMPRESSION_JPEG;
            for (const std::uint32_t nKind : {0, FILETYPE_MASK, FILETYPE_REDUCEDIMAGE})
            {
                krv::test::TiffForm oForm{.mnWidth = 41, .mnHeight = 35, .mnCompression = nCodec};
                if (nKind == FILETYPE_REDUCEDIMAGE)
                    oForm.mnWidth = 21, oForm.mnHeight = 18;
                oForm.mnBits = nKind == FILETYPE_MASK ? 1 : 8;
                if (bJpeg && nKind == FILETYPE_MASK)
                    oForm.mnCompression = COMPRESSION_ADOBE_DEFLATE;
                oForm.mnPhotometric = nKind == FILETYPE_MASK ? PHOTOMETRIC_MASK
                                      : bJpeg                ? PHOTOMETRIC_MINISBLACK
                                                             : PHOTOMETRIC_PALETTE;
                oForm.mnTileWidth = pMode[1] == 'b' ? 16 : 0;
                SetForm(oFile.get(), oForm);
                TIFFSetField(oFile.get(), TIFFTAG_SUBFILETYPE, nKind);
                TIFFSetField(oFile.get(), TIFFTAG_SOFTWARE, "seeds");
                std::vector<std::uint16_t> oColours(256, 12345);
                if (oForm.mnPhotometric == PHOTOMETRIC_PALETTE)
                    TIFFSetField(oFile.get(), TIFFTAG_COLORMAP, oColours.data(), oColours.data(), oColours.data());
                const toff_t aBelow[1] = {0};
                if (nKind == FILETYPE_MASK) // what comes next lies below the image and not in the chain
                    TIFFSetField(oFile.get(), TIFFTAG_SUBIFD, 1, aBelow);
                krv::test::WriteBlocks(oFile.get());
                TIFFWriteDirectory(oFile.get());
            }
        }
}

// Each file with programs as krv_fuzz_update reads them: behind it, their length last.
void WriteUpdates(const std::filesystem::path& oFrom, const std::filesystem::path& oTo)
{
    constexpr unsigned int PROGRAM_BYTES = 120;
    std::mt19937 oRandom(1);
    std::set<std::filesystem::path> oFiles;
    for (const auto& oEntry : std::filesystem::directory_iterator(oFrom))
        oFiles.insert(oEntry.path());
    for (const std::filesystem::path& oFile : oFiles)
    {
        std::ifstream oSource(oFile, std::ios::binary);
        std::string bytes{std::istreambuf_iterator<char>(oSource), {}};
        for (unsigned int nAt = 0; nAt < PROGRAM_BYTES; ++nAt)
            bytes += static_cast<char>(oRandom());
        bytes += static_cast<char>(PROGRAM_BYTES);
        bytes += '\0';
        std::ofstream(oTo / oFile.filename(), std::ios::binary) << bytes;
    }
}

} // namespace

int main(int nArguments, char** pArguments)
try
{
    if (nArguments != 2)
    {
        std::fprintf(stderr, "usage: krv_fuzz_seeds FOLDER\n");
        return 2;
    }
    const std::filesystem::path oFolder = pArguments[1];
    std::filesystem::create_directories(oFolder / "tif");
    std::filesystem::create_directories(oFolder / "tags");
    WriteLayouts(oFolder / "tif");
    WriteSystems(oFolder);
    std::filesystem::create_directories(oFolder / "update");
    WritePages(oFolder / "tif");
    WriteUpdates(oFolder / "tif", oFolder / "update");
    return 0;
}
catch (const std::exception& oError)
{
    std::fprintf(stderr, "krv_fuzz_seeds: %s\n", oError.what());
    return 1;
}
