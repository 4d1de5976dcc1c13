#include "tools/samplescene/scenewriter.h"

#include "tools/samplescene/landcover.h"
#include "tools/samplescene/latticenoise.h"
#include "tools/samplescene/terrain.h"

#include <geo_normalize.h>
#include <geotiff.h>
#include <geovalues.h>
#include <xtiffio.h>

#include <algorithm>
#include <cmath>
#include <memory>
#include <stdexcept>
#include <vector>

namespace krv::samplescene
{

namespace
{

constexpr unsigned int TILE = 256;
constexpr double PIXEL_METRES = 10.0;
constexpr double EAST = 288140.0, NORTH = 5442360.0; // outer corner of the first pixel
constexpr int EPSG_UTM_19_SOUTH = 32719;
constexpr ttag_t NO_DATA_TAG = 42113, METADATA_TAG = 42112;

struct CloseTiff
{
    void operator()(TIFF* poFile) const { XTIFFClose(poFile); }
};
using TiffHandle = std::unique_ptr<TIFF, CloseTiff>;

void Check(bool bDone, const std::string& name, const char* what)
{
    if (!bDone)
        throw std::runtime_error(name + ": " + what);
}

void SetGeographicKeys(TIFF* poFile, const std::string& name)
{
    const double aScale[3] = {PIXEL_METRES, PIXEL_METRES, 0.0};
    const double aTie[6] = {0.0, 0.0, 0.0, EAST, NORTH, 0.0};
    TIFFSetField(poFile, TIFFTAG_GEOPIXELSCALE, 3, aScale);
    TIFFSetField(poFile, TIFFTAG_GEOTIEPOINTS, 6, aTie);
    const std::unique_ptr<GTIF, void (*)(GTIF*)> oKeys(GTIFNew(poFile), &GTIFFree);
    Check(oKeys != nullptr, name, "the geographic keys could not be set");
    GTIFKeySet(oKeys.get(), GTModelTypeGeoKey, TYPE_SHORT, 1, ModelTypeProjected);
    GTIFKeySet(oKeys.get(), GTRasterTypeGeoKey, TYPE_SHORT, 1, RasterPixelIsArea);
    GTIFKeySet(oKeys.get(), GTCitationGeoKey, TYPE_ASCII, 0, "WGS 84 / UTM zone 19S");
    GTIFKeySet(oKeys.get(), ProjectedCSTypeGeoKey, TYPE_SHORT, 1, EPSG_UTM_19_SOUTH);
    GTIFKeySet(oKeys.get(), ProjLinearUnitsGeoKey, TYPE_SHORT, 1, Linear_Meter);
    Check(GTIFWriteKeys(oKeys.get()) == 1, name, "the geographic keys could not be written");
}

void SetTextTags(TIFF* poFile, const std::string& metadata)
{
    static char aNoDataName[] = "NoData", aMetadataName[] = "Metadata";
    static const TIFFFieldInfo FIELDS[] = {
        {NO_DATA_TAG, TIFF_VARIABLE, TIFF_VARIABLE, TIFF_ASCII, FIELD_CUSTOM, 1, 0, aNoDataName},
        {METADATA_TAG, TIFF_VARIABLE, TIFF_VARIABLE, TIFF_ASCII, FIELD_CUSTOM, 1, 0, aMetadataName}};
    TIFFMergeFieldInfo(poFile, FIELDS, 2);
    TIFFSetField(poFile, NO_DATA_TAG, "0");
    TIFFSetField(poFile, METADATA_TAG, metadata.c_str());
    TIFFSetField(poFile, TIFFTAG_SOFTWARE, "krv-samplescene");
}

// A tiled, deflated GeoTIFF of pixel-interleaved rows; it collects a row of tiles and writes it when it is full.
class SceneFile
{
public:
    SceneFile(const std::string& name, unsigned int nSize, unsigned int nChannels, unsigned int nBytes,
              const std::string& metadata)
        : moName(name), mnSize(nSize), mnPixelBytes(nChannels * nBytes),
          moRows(static_cast<std::size_t>(nSize) * TILE * mnPixelBytes),
          moTile(static_cast<std::size_t>(TILE) * TILE * mnPixelBytes)
    {
        const bool bBig = static_cast<std::uint64_t>(nSize) * nSize * mnPixelBytes > 3'900'000'000ULL;
        mpoFile.reset(XTIFFOpen(name.c_str(), bBig ? "w8" : "w"));
        Check(mpoFile != nullptr, name, "the file could not be made; is the folder there and may it be written?");
        TIFF* poFile = mpoFile.get();
        TIFFSetField(poFile, TIFFTAG_IMAGEWIDTH, nSize);
        TIFFSetField(poFile, TIFFTAG_IMAGELENGTH, nSize);
        TIFFSetField(poFile, TIFFTAG_BITSPERSAMPLE, 8 * nBytes);
        TIFFSetField(poFile, TIFFTAG_SAMPLESPERPIXEL, nChannels);
        TIFFSetField(poFile, TIFFTAG_PHOTOMETRIC, nChannels == 3 ? PHOTOMETRIC_RGB : PHOTOMETRIC_MINISBLACK);
        TIFFSetField(poFile, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG);
        TIFFSetField(poFile, TIFFTAG_SAMPLEFORMAT, SAMPLEFORMAT_UINT);
        TIFFSetField(poFile, TIFFTAG_TILEWIDTH, TILE);
        TIFFSetField(poFile, TIFFTAG_TILELENGTH, TILE);
        TIFFSetField(poFile, TIFFTAG_COMPRESSION, COMPRESSION_ADOBE_DEFLATE);
        TIFFSetField(poFile, TIFFTAG_PREDICTOR, PREDICTOR_HORIZONTAL);
        TIFFSetField(poFile, TIFFTAG_ZIPQUALITY, 2);
        SetTextTags(poFile, metadata);
        SetGeographicKeys(poFile, name);
    }

    unsigned char* Row(unsigned int nY)
    {
        return moRows.data() + static_cast<std::size_t>(nY % TILE) * mnSize * mnPixelBytes;
    }

    // To be called after each row, top down.
    void RowDone(unsigned int nY)
    {
        if (nY % TILE == TILE - 1 || nY + 1 == mnSize)
            WriteTiles(nY - nY % TILE);
    }

    void Close() { Check(TIFFFlush(mpoFile.get()) == 1, moName, "the file could not be finished; is the disk full?"); }

private:
    void WriteTiles(unsigned int nY)
    {
        const unsigned int nRows = std::min(TILE, mnSize - nY);
        const std::size_t nPitch = static_cast<std::size_t>(TILE) * mnPixelBytes;
        for (unsigned int x = 0; x < mnSize; x += TILE)
        {
            const std::size_t nBytes = static_cast<std::size_t>(std::min(TILE, mnSize - x)) * mnPixelBytes;
            std::fill(moTile.begin(), moTile.end(), static_cast<unsigned char>(0));
            for (unsigned int r = 0; r < nRows; ++r)
                std::copy_n(Row(r) + static_cast<std::size_t>(x) * mnPixelBytes, nBytes, moTile.data() + r * nPitch);
            Check(TIFFWriteTile(mpoFile.get(), moTile.data(), x, nY, 0, 0) > 0, moName,
                  "the pixels could not be written; is the disk full?");
        }
    }

    std::string moName;
    unsigned int mnSize;
    unsigned int mnPixelBytes;
    std::vector<unsigned char> moRows;
    std::vector<unsigned char> moTile;
    TiffHandle mpoFile;
};

std::string ChannelNames(const std::vector<std::string>& oNames)
{
    std::string text = "<Metadata>\n  <Item name=\"AREA_NAME\">Sample scene, made by computation</Item>\n";
    for (std::size_t i = 0; i < oNames.size(); ++i)
        text += "  <Item name=\"DESCRIPTION\" sample=\"" + std::to_string(i) + "\" role=\"description\">" + oNames[i] +
                "</Item>\n";
    return text + "</Metadata>\n";
}

// The part of a row that the sensor's swath covers, which lies askew on the map grid: [first, last).
struct Span
{
    unsigned int first;
    unsigned int last;
};

Span Footprint(unsigned int nSize, unsigned int nY)
{
    // A square turned by about nine degrees that just touches the four sides of the image.
    constexpr double SINE = 0.16, COSINE = 0.987;
    const double nHalf = 0.5 * nSize, nReach = nHalf / (SINE + COSINE);
    const double y = nY + 0.5 - nHalf;
    const double nFirst = std::max((-nReach - SINE * y) / COSINE, (COSINE * y - nReach) / SINE);
    const double nLast = std::min((nReach - SINE * y) / COSINE, (COSINE * y + nReach) / SINE);
    const double nFrom = std::clamp(std::ceil(nFirst + nHalf - 0.5), 0.0, 2 * nHalf);
    const double nTo = std::clamp(std::ceil(nLast + nHalf - 0.5), nFrom, 2 * nHalf);
    return {static_cast<unsigned int>(nFrom), static_cast<unsigned int>(nTo)};
}

unsigned int Quantise(float nSignal, float nNoise, float nGain, float nMost)
{
    return static_cast<unsigned int>(std::clamp(nSignal * nGain + nNoise + 0.5F, 1.0F, nMost));
}

class Renderer
{
public:
    explicit Renderer(const Options& oOptions)
        : mnSize(oOptions.size), mnSeed(oOptions.seed), moTerrain(mnSize, mnSeed), moCover(mnSeed + 500),
          moMoistureNoise(mnSize, mnSize / 9.0, mnSeed + 300), moMoistureDetail(mnSize, mnSize / 43.0, mnSeed + 301),
          moAbove(mnSize), moHere(mnSize), moBelow(mnSize), moMoisture(mnSize), moDetail(mnSize)
    {
        moTerrain.Row(0, moHere.data());
        moAbove = moHere;
    }

    // To be called for each row, top down.
    void Row(unsigned int nY, unsigned char* pColour, unsigned char* pPan)
    {
        moTerrain.Row(nY + 1, moBelow.data());
        moMoistureNoise.Row(nY, moMoisture.data());
        moMoistureDetail.Row(nY, moDetail.data());
        std::fill_n(pColour, static_cast<std::size_t>(mnSize) * 3, static_cast<unsigned char>(0));
        std::fill_n(pPan, static_cast<std::size_t>(mnSize) * 2, static_cast<unsigned char>(0));
        const Span oSpan = Footprint(mnSize, nY);
        for (unsigned int x = oSpan.first; x < oSpan.last; ++x)
            Pixel(x, nY, pColour + 3 * static_cast<std::size_t>(x), reinterpret_cast<std::uint16_t*>(pPan) + x);
        moAbove.swap(moHere);
        moHere.swap(moBelow);
    }

private:
    void Pixel(unsigned int nX, unsigned int nY, unsigned char* pColour, std::uint16_t* pPan) const
    {
        const unsigned int nWest = nX == 0 ? 0 : nX - 1, nEast = std::min(nX + 1, mnSize - 1);
        // Relief is scaled to the scene's size, so that small scenes are not cliffs; slopes as if 10 m pixels at 4096.
        const float nRun = 20.0F * 4096.0F / static_cast<float>(mnSize);
        const Place oPlace{static_cast<int>(nX),
                           static_cast<int>(nY),
                           moHere[nX],
                           (moHere[nEast] - moHere[nWest]) / nRun,
                           (moBelow[nX] - moAbove[nX]) / nRun,
                           0.7F * moMoisture[nX] + 0.45F * moDetail[nX]};
        const Reflectance oSeen = moCover.See(oPlace);
        const std::uint32_t nChance = Hash(oPlace.column, oPlace.row, mnSeed + 900);
        const auto Noise = [nChance](unsigned int nShift)
        {
            return static_cast<float>((nChance >> nShift) & 255U) / 255.0F - 0.5F;
        };
        pColour[0] = static_cast<unsigned char>(Quantise(oSeen.red, 2.0F * Noise(0), 700.0F, 255.0F));
        pColour[1] = static_cast<unsigned char>(Quantise(oSeen.green, 2.0F * Noise(8), 700.0F, 255.0F));
        pColour[2] = static_cast<unsigned char>(Quantise(oSeen.blue, 2.0F * Noise(16), 700.0F, 255.0F));
        const float nPan = 0.2F * oSeen.blue + 0.3F * oSeen.green + 0.3F * oSeen.red + 0.2F * oSeen.infrared;
        *pPan = static_cast<std::uint16_t>(Quantise(nPan, 8.0F * Noise(24), 2500.0F, 2047.0F));
    }

    unsigned int mnSize;
    std::uint32_t mnSeed;
    Terrain moTerrain;
    LandCover moCover;
    LatticeNoise moMoistureNoise;
    LatticeNoise moMoistureDetail;
    std::vector<float> moAbove, moHere, moBelow, moMoisture, moDetail;
};

} // namespace

void WriteScene(const Options& oOptions)
{
    SceneFile oColour(oOptions.folder + "/rgb.tif", oOptions.size, 3, 1, ChannelNames({"Red", "Green", "Blue"}));
    SceneFile oPan(oOptions.folder + "/pan.tif", oOptions.size, 1, 2, ChannelNames({"Panchromatic"}));
    Renderer oRenderer(oOptions);
    for (unsigned int y = 0; y < oOptions.size; ++y)
    {
        oRenderer.Row(y, oColour.Row(y), oPan.Row(y));
        oColour.RowDone(y);
        oPan.RowDone(y);
    }
    oColour.Close();
    oPan.Close();
}

} // namespace krv::samplescene
