#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "plugins/tif/geo/geowriter.h"
#include "plugins/tif/reading/metadata.h"
#include "plugins/tif/writing/fileeditor.h"

#include <memory>
#include <set>
#include <string>

namespace krv::plugins::tif
{

// Stores a record in the tags of a page so that ReadMetadata gives it back. Only what differs from the page's record is
// touched. Values go into the tag that ReadMetadata takes them from, when it can hold them exactly; everything else
// becomes an item of tag 42112. Keys keep their letter case: one that is known by another case is said twice, by its
// tag and by an item. An empty value counts as none. What the form of the pixels says by itself (colours) cannot be
// taken away, only said otherwise.
class MetadataWriter
{
public:
    // The editor outlives it.
    MetadataWriter(FileEditor& oEditor, std::shared_ptr<PageModel> poPage);

    // Throws DataException for a record of another channel count and for one that is too long to be read again.
    void Write(const krv::datasources::AuxiliaryData& oNew, const Place& oPlace);

private:
    void FindChanges(const krv::datasources::AuxiliaryData& oOld, const krv::datasources::AuxiliaryData& oNew);
    void Compare(unsigned int nChannel, const krv::datasources::MetadataMap& oOld,
                 const krv::datasources::MetadataMap& oNew);
    // Whether the key's tag says the value now, so that no item has to.
    bool StoreInTag(const std::string& key, const std::string& value);
    bool StoreText(std::uint16_t nTag, const std::string& value);
    bool StoreResolution(std::uint16_t nTag, const std::string& value);
    bool StoreUnit(const std::string& value);
    bool StoreNumber(std::uint16_t nTag, const std::string& value, unsigned int nFrom, unsigned int nTo);
    bool StorePhotometric(const std::string& value);
    bool StoreRasterType(const std::string& value);
    bool StoreRpc(const std::string& value);
    bool StorePoints(const std::string& value);
    bool StoreAlpha(unsigned int nChannel, const std::string& colour, const std::string& kind);
    void StoreColourModel(const krv::datasources::AuxiliaryData& oNew);
    void NoteColours(const krv::datasources::AuxiliaryData& oNew);
    void StoreColours(const krv::datasources::AuxiliaryData& oNew);
    void StoreItems(const krv::datasources::AuxiliaryData& oNew, const Place& oPlace);

    void SayElsewhere(const MetadataKey& oKey);

    FileEditor& moEditor;
    std::shared_ptr<PageModel> mpoPage;
    GeoWriter moGeography;
    std::set<MetadataKey> moChanged;   // with the new record's keys
    std::set<MetadataKey> moElsewhere; // what of that needs no item
};

} // namespace krv::plugins::tif
