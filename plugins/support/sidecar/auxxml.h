#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/xml/xmltree.h"

#include <cstdint>
#include <optional>
#include <string>

namespace krv::plugins::support
{

// The file "<image>.aux.xml": a root PAMDataset with the reference system, the transform, tags of the file and of each
// band, no-data values, descriptions, units, scales, names of classes. Tags have the domain of theirs before a colon,
// when it has one.
// A plain value in memory: nothing is read from or written to a file here. The document is limited as
// toolkit/xml/limits.h says.
class AuxXml
{
public:
    // Of an image with so many channels. Throws DataException for what is no such document; bands that the image does
    // not have are nobody's.
    // name: of the file, for messages. Channels count from 1.
    AuxXml(const std::string& text, const std::string& name, unsigned int nChannels);
    // An empty one.
    explicit AuxXml(unsigned int nChannels);

    // Any text that defines a system; empty when there is none. It is not parsed here.
    const std::string& GetCRS() const { return moCRS; }
    const std::optional<krv::ogc::cs::GeocodingInfo>& GetGeocoding() const { return moGeocoding; }
    // What it says in the keys of records: "NO_DATA_VALUE", "Scale", "Offset", "UnitType", "ColorInterp", descriptions.
    const krv::datasources::AuxiliaryData& GetTags() const { return moTags; }
    // The size and the time of the image that it was written beside, in nanoseconds; nothing unless this library wrote
    // it.
    struct Stamp
    {
        std::uint64_t mnBytes = 0; // of the image file
        std::int64_t mnTime = 0;

        friend bool operator==(const Stamp&, const Stamp&) = default;
    };
    const std::optional<Stamp>& GetStamp() const { return moStamp; }

    // Any text that defines a system; empty: none.
    void SetCRS(const std::string& definition) { moCRS = definition; }
    void SetGeocoding(const std::optional<krv::ogc::cs::GeocodingInfo>& oInfo) { moGeocoding = oInfo; }

    // The whole record, in place of the former one; tags whose value was emptied go.
    void SetTags(const krv::datasources::AuxiliaryData& oTags);

    // By it a later reader sees that the image changed without this file.
    void SetStamp(const Stamp& oStamp) { moStamp = oStamp; }

    // Statistics and histograms, which do not hold when pixels change. True when there were any.
    // By the keys that droppedtags.h names, and the document's own elements of histograms.
    bool DropStatistics();
    // Whether it says anything.
    bool IsEmpty() const;
    // The document with what was set, and with all that this library does not know as it was.
    std::string Write() const;

private:
    void ReadMetadata(const krv::xml::Element& oElement, unsigned int nChannel);
    void ReadBand(const krv::xml::Element& oBand);
    void ReadCategories(const krv::xml::Element& oList, unsigned int nChannel);

    krv::xml::Element moRoot; // what is not known
    std::string moCRS;        // a definition; empty: none
    std::optional<krv::ogc::cs::GeocodingInfo> moGeocoding;
    krv::datasources::AuxiliaryData moTags; // of file and channels
    std::optional<Stamp> moStamp;
};

} // namespace krv::plugins::support
