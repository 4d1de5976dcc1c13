#pragma once

#include "operations/api.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <array>
#include <map>
#include <optional>
#include <string>
#include <vector>

namespace krv::operations
{

// What of another file is taken over.
enum EditPart : unsigned int
{
    eEditNoData = 1,
    eEditCrs = 2,
    eEditGeocoding = 4,
    eEditTags = 8, // all others than those of the other parts
    eEditDescriptions = 16,
    eEditColours = 32,
    eEditDisplay = 64,
    eEditAll = 127
};

// A tag that is set, or removed when it has no value.
struct TagEdit
{
    std::string key;
    std::optional<std::string> value;
};

// A rectangle that the outer edges of the image are placed on, in map coordinates.
struct PlacedBounds
{
    double west = 0;
    double south = 0;
    double east = 0;
    double north = 0;
};

// What changes about a file; what is left open stays. An empty text removes: a no-data value, a reference system, a
// description, a role. What is copied from another file comes first, so that single values win over it.
struct EditRequest
{
    std::string like;              // the other file; empty: none
    unsigned int parts = eEditAll; // of it
    std::optional<std::string> noData;
    std::vector<unsigned int> channels;                   // that noData and tags are of; empty: the file as a whole
    std::optional<std::string> crs;                       // a code such as EPSG:32633 or a definition
    std::optional<krv::ogc::cs::GeocodingInfo> geocoding; // the identity removes it
    std::optional<PlacedBounds> bounds;                   // in place of a geocoding
    std::vector<TagEdit> tags;
    std::map<unsigned int, std::string> descriptions; // by channel
    std::map<unsigned int, std::string> colours;      // what channels show: red, alpha, ...; by channel
    // Red, green and blue, or grey alone; 0 for none. One number for grey, three for the colours, none removes all.
    std::optional<std::vector<unsigned int>> display;
};

// Words for what was changed: those of the parts above, and "statistics" for stored ones, which go with the no-data
// value that they were made by.
struct EditResult
{
    std::vector<std::string> changed; // empty: the file said all of it before and was not written
    bool levels = false;              // the no-data value changed and there are levels, which were made by the old one
};

// Changes what a file says beside its pixels, in place. All of it is checked before any is written; TIF and KRVDSK
// files change at once. The refusal of a format without a place for such things passes. Throws RequestException for
// what makes no sense for the file.
KRV_OPERATIONS_API EditResult EditFile(const std::string& file, const EditRequest& oRequest);

} // namespace krv::operations
