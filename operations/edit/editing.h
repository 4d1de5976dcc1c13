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
// Bits, to be joined.
enum EditPart : unsigned int
{
    eEditNoData = 1,        // of the file and of its channels
    eEditCrs = 2,           // the reference system
    eEditGeocoding = 4,     // the affine transform
    eEditTags = 8,          // all others than those of the other parts
    eEditDescriptions = 16, // of channels
    eEditColours = 32,      // what channels show, tag "ColorInterp"
    eEditDisplay = 64,      // the channels shown as red, green, blue and grey
    eEditAll = 127
};

// A tag that is set, or removed when it has no value.
// Keys that differ only in letter case are one key.
struct TagEdit
{
    std::string key;
    std::optional<std::string> value;
};

// A rectangle that the outer edges of the image are placed on, in map coordinates.
// In the unit of the file's reference system as it is after the edit.
struct PlacedBounds
{
    double west = 0;
    double south = 0;
    double east = 0;
    double north = 0;
};

// What changes about a file; what is left open stays. An empty text removes: a no-data value, a reference system, a
// description, a role. What is copied from another file comes first, so that single values win over it.
// Example: EditRequest oRequest; oRequest.noData = "-9999"; oRequest.crs = "EPSG:32633"; EditFile("dem.tif", oRequest);
struct EditRequest
{
    std::string like;              // the other file; empty: none
    unsigned int parts = eEditAll; // of it

    // A number, "nan" or "inf" as text, so that 64-bit integers stay exact.
    std::optional<std::string> noData;
    std::vector<unsigned int> channels;                   // that noData and tags are of; empty: the file as a whole
    std::optional<std::string> crs;                       // a code such as EPSG:32633 or a definition
    std::optional<krv::ogc::cs::GeocodingInfo> geocoding; // the identity removes it
    std::optional<PlacedBounds> bounds;                   // in place of a geocoding

    // In this order, so that of two edits of one key the later counts.
    std::vector<TagEdit> tags;
    std::map<unsigned int, std::string> descriptions; // by channel
    std::map<unsigned int, std::string> colours;      // what channels show: red, alpha, ...; by channel
    // Red, green and blue, or grey alone; 0 for none. One number for grey, three for the colours, none removes all.
    std::optional<std::vector<unsigned int>> display;
};

// Words for what was changed: those of the parts above, and "statistics" for stored ones, which go with the no-data
// value that they were made by.
// Whether a file was written at all is told by `changed`.
struct EditResult
{
    std::vector<std::string> changed; // empty: the file said all of it before and was not written
    bool levels = false;              // the no-data value changed and there are levels, which were made by the old one
};

// Changes what a file says beside its pixels, in place. All of it is checked before any is written; TIF and KRVDSK
// files change at once. The refusal of a format without a place for such things passes. Throws RequestException for
// what makes no sense for the file.
// Pixels are neither read nor written, so that the time does not depend on the size of the image.
// Throws FileNotFoundException and FileFormatException as opening does, and IOException for what cannot be written.
KRV_OPERATIONS_API EditResult EditFile(const std::string& file, const EditRequest& oRequest);

} // namespace krv::operations
