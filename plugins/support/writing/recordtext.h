#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <cstdint>
#include <istream>
#include <map>
#include <memory>
#include <string>

namespace krv::plugins::support
{

// A record as lines of text, for formats that have no other form for it:
//     scene=alps          a tag of the file
//     [2]band=red         of channel 2
//     [2]=Red             its description
//     [crs]=EPSG:32632    the reference system, as any text that defines one
//     [geocoding]=...     the six terms
//     [level 2]=81920     a number that the format finds the level by
// Lines without "=" mean nothing. In keys and values %XX stands for the byte of that hexadecimal number: a key has none
// of %, = and control characters otherwise, nor a [ at its beginning, and a value none of % and control characters.
// A plain value in memory.
class RecordText
{
public:
    krv::datasources::AuxiliaryData moTags;         // of file and channels
    std::map<unsigned int, std::uint64_t> moLevels; // from 2 on

    // Adds the lines up to the end; channels that moTags does not have are nobody's.
    // Lines come from a file and may be anything: those that make no sense are passed over.
    void Read(std::istream& oLines);

    // Each line with its end. What Read makes of it is the same record.
    std::string Write() const;

    // Null when there is none. Throws DataException for a text that defines no system.
    std::unique_ptr<krv::ogc::cs::ICRS> GetCRS() const;

    // Kept as a text, so that it costs nothing to carry along.
    void SetCRS(const krv::ogc::cs::ICRS& oCRS);
    // Its definition as it is kept; empty when there is none.
    std::string GetDefinition() const;
    void SetDefinition(const std::string& definition);
    bool HasGeocoding() const;
    // The identity when there is none.
    krv::ogc::cs::GeocodingInfo GetGeocoding() const;
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo);
    void RemoveCRS();
    void RemoveGeocoding();

private:
    void ReadOwn(const std::string& name, const std::string& value);

    krv::datasources::MetadataMap moOwn; // crs and geocoding
};

} // namespace krv::plugins::support
