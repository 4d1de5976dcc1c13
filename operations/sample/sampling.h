#pragma once

#include "gobs/mask/samplevalue.h"
#include "gobs/raster/datatype.h"
#include "operations/api.h"
#include "operations/job/progress.h"
#include "operations/source/imageplace.h"

#include <optional>
#include <string>
#include <vector>

namespace krv::operations
{

class SourceFile;

// What the coordinates of points are. eAsPlaced: map coordinates for a file that says where it lies, else pixels.
enum class PointCoordinates
{
    eAsPlaced,   // never in a result, which says what was taken
    ePixels,     // continuous columns and rows, (0, 0) the outer corner of the first pixel
    eMap,        // of the file's own reference system
    eGeographic, // longitude and latitude on WGS 84, in degrees
    eNamedMap    // of another reference system
};

struct SamplePoint
{
    double x = 0; // column, easting or longitude
    double y = 0; // row, northing or latitude
};

// Example: one point in degrees: {{{7.5, 46.9}}, PointCoordinates::eGeographic}.
struct SampleRequest
{
    // Any number, in any order; points that lie in one block cost one decoding of it.
    std::vector<SamplePoint> points;
    PointCoordinates coordinates = PointCoordinates::eAsPlaced;
    std::string crs;                    // for eNamedMap: a code or a definition
    std::vector<unsigned int> channels; // empty: all
    double height = 0;                  // of points that a sensor model places, in metres above the ellipsoid
};

// Why there is no value.
// A value that is not valid is handed out all the same, since it is stored.
enum class SampleState
{
    eValid,   // by everything that the file says
    eOutside, // of the image, or nowhere on it
    eNoData,  // the channel's no-data value
    eMasked   // not valid by mask, alpha or the no-data of other channels
};

// Numbers of 64-bit integers are exact. A complex value has both parts, others an imaginary part of 0.
struct SampledValue
{
    SampleState state = SampleState::eOutside;
    krv::gobs::SampleValue real = krv::gobs::SampleValue::FromUnsigned(0); // what is stored, unless outside
    krv::gobs::SampleValue imaginary = krv::gobs::SampleValue::FromUnsigned(0);
    double scaled = 0; // value * scale + offset of the channel, for types that are not complex
};

// Where the point lies in the image, continuous: the pixel's numbers are the whole parts.
struct SampledPoint
{
    double column = 0;                // NaN for a point that is nowhere on the image
    double row = 0;                   // the same
    std::vector<SampledValue> values; // one for each channel
};

// One for each channel of the values, in their order.
struct SampledChannel
{
    unsigned int number = 0;  // in the file, from 1
    krv::gobs::DataType type; // of the values that are handed out
};

// As many points as the request has, those outside the image among them.
struct SampleResult
{
    PointCoordinates coordinates = PointCoordinates::ePixels; // never eAsPlaced

    // By what map coordinates and degrees were brought to the image.
    std::optional<PlacedBy> placedBy;     // none for pixels
    std::vector<SampledChannel> channels; // that the values are of
    std::vector<SampledPoint> points;     // in the order of the request
};

// The values of the pixels that points lie in, at full size. Longitude and latitude are brought to a file without a
// transform by its sensor model, or by a polynomial through its control points. Points are read in the order of the
// file's blocks. Throws RequestException for coordinates that the file cannot have.
// Values are those of the pixel, nothing is interpolated. No memory but that of the result and of some blocks.
// oProgress: told of the values that are done; StoppedException when it says to stop.
KRV_OPERATIONS_API SampleResult SampleValues(const SourceFile& oFile, const SampleRequest& oRequest,
                                             const Progress& oProgress = {});

} // namespace krv::operations
