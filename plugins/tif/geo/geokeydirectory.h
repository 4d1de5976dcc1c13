#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include <geotiff.h>
#include <geovalues.h>
#include <tiffio.h>

namespace krv::plugins::tif
{

// The values of a tag of doubles or of 16-bit numbers; empty when the directory has no such tag or holds another type.
std::vector<double> ReadDoubles(TIFF* poFile, std::uint32_t nTag);
std::vector<std::uint16_t> ReadShorts(TIFF* poFile, std::uint32_t nTag);

// Whether the file says that raster positions are pixel centres. False when it says nothing, or nothing sensible.
bool IsPixelPoint(TIFF* poFile);

// The geographic keys of a TIFF directory, copied out of it and checked, so that every access is within what the file
// holds.
class GeoKeyDirectory
{
public:
    // Null when the directory has no keys. Throws krv::DataException naming the key when the keys are damaged.
    static std::unique_ptr<GeoKeyDirectory> Read(TIFF* poFile);

    GeoKeyDirectory(const GeoKeyDirectory&) = delete;
    GeoKeyDirectory& operator=(const GeoKeyDirectory&) = delete;
    ~GeoKeyDirectory();

    // The value of a key that holds a code; 0 when it is absent.
    int GetCode(geokey_t eKey) const;

    // Whether the key holds a code that stands for something: neither absent nor "user-defined".
    bool HasCode(geokey_t eKey) const;

    // The values of a key that holds numbers; none when it is absent.
    std::vector<double> GetNumbers(geokey_t eKey) const;
    std::optional<double> GetNumber(geokey_t eKey) const;

    // The text of a key as UTF-8, without blanks and separators at its ends; "" when it is absent.
    std::string GetText(geokey_t eKey) const;

private:
    struct Tags;
    explicit GeoKeyDirectory(std::unique_ptr<Tags> poTags);

    std::unique_ptr<Tags> mpoTags;
    GTIF* mpoKeys;
};

} // namespace krv::plugins::tif
