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
    eAsPlaced,
    ePixels,     // continuous columns and rows, (0, 0) the outer corner of the first pixel
    eMap,        // of the file's own reference system
    eGeographic, // longitude and latitude on WGS 84, in degrees
    eNamedMap    // of another reference system
};

struct SamplePoint
{
    double x = 0;
    double y = 0;
};

struct SampleRequest
{
    std::vector<SamplePoint> points;
    PointCoordinates coordinates = PointCoordinates::eAsPlaced;
    std::string crs;                    // for eNamedMap: a code or a definition
    std::vector<unsigned int> channels; // empty: all
    double height = 0;                  // of points that a sensor model places, in metres above the ellipsoid
};

// Why there is no value.
enum class SampleState
{
    eValid,
    eOutside, // of the image, or nowhere on it
    eNoData,  // the channel's no-data value
    eMasked   // not valid by mask, alpha or the no-data of other channels
};

struct SampledValue
{
    SampleState state = SampleState::eOutside;
    krv::gobs::SampleValue real = krv::gobs::SampleValue::FromUnsigned(0); // what is stored, unless outside
    krv::gobs::SampleValue imaginary = krv::gobs::SampleValue::FromUnsigned(0);
    double scaled = 0; // value * scale + offset of the channel, for types that are not complex
};

struct SampledPoint
{
    double column = 0; // NaN for a point that is nowhere on the image
    double row = 0;
    std::vector<SampledValue> values; // one for each channel
};

struct SampledChannel
{
    unsigned int number = 0;
    krv::gobs::DataType type;
};

struct SampleResult
{
    PointCoordinates coordinates = PointCoordinates::ePixels; // never eAsPlaced
    std::optional<PlacedBy> placedBy;                         // none for pixels
    std::vector<SampledChannel> channels;
    std::vector<SampledPoint> points; // in the order of the request
};

// The values of the pixels that points lie in, at full size. Longitude and latitude are brought to a file without a
// transform by its sensor model, or by a polynomial through its control points. Points are read in the order of the
// file's blocks. Throws RequestException for coordinates that the file cannot have.
KRV_OPERATIONS_API SampleResult SampleValues(const SourceFile& oFile, const SampleRequest& oRequest,
                                             const Progress& oProgress = {});

} // namespace krv::operations
