#pragma once

#include "gobs/mask/maskdecision.h"
#include "operations/api.h"
#include "operations/job/progress.h"
#include "operations/masking/polygontext.h"

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace krv::threading
{
class IExecutor;
}

namespace krv::operations
{

class SourceFile;

// What the coordinates of polygons are. eAsWritten: pixels and map units of the file for WKT are map units, GeoJSON is
// longitude and latitude, unless the text names a system of its own.
enum class PolygonCoordinates
{
    eAsWritten,
    ePixels,  // continuous, (0, 0) the outer corner of the first pixel
    eMap,     // of the file's own reference system
    eNamedMap // of another one
};

// As IBitmapDataset has them.
// A validity mask changes what all readers take for data; a zone changes nothing.
enum class BitmapKind
{
    eZone, // somebody's selection of pixels
    eValidity
};

// A mask is made of one kind of source: polygons, bitmaps (union) or the recorded no-data values.
// Example: the no-data pixels of all channels as the file's validity mask:
//   MaskRequest oRequest; oRequest.noData = true; oRequest.kind = BitmapKind::eValidity;
struct MaskRequest
{
    // Joined: a pixel is set when it lies in any of them.
    std::vector<PolygonText> polygons;
    PolygonCoordinates coordinates = PolygonCoordinates::eAsWritten;
    std::string crs;                   // for eNamedMap: a code such as EPSG:32719 or a definition
    std::vector<unsigned int> bitmaps; // by their numbers, from 1
    bool noData = false;               // the pixels that the recorded values say hold no data
    krv::gobs::BkgdRule rule = krv::gobs::eAnyChannel;
    std::vector<unsigned int> channels; // of the no-data values; empty: all

    // Nothing: the mask is only counted, and drawn when a picture is asked for.
    std::optional<unsigned int> target; // the bitmap to write, 0 for a new one
    // What the bitmap becomes; nothing: a new one is a zone, another stays what it is. A validity mask without a target
    // goes into the one that there is or else into a new bitmap.
    std::optional<BitmapKind> kind;

    // Empty: none.
    std::string picture;             // a PNG file to draw
    unsigned int pictureSize = 1024; // pixels of its longest side

    // Whether the file is changed.
    bool IsWriting() const { return target || kind; }
};

// Counts are of the mask as it was made, whatever was written of it.
struct MaskResult
{
    std::uint64_t set = 0;    // bits
    std::uint64_t pixels = 0; // of the image
    unsigned int bitmap = 0;  // the one that was written, 0 for none
    bool complement = false;  // whether it holds the complement: set = valid
    bool validity = false;    // whether it is the image's validity mask
    bool levels = false;      // whether the image has levels that were made before
};

// Makes the mask tile by tile. Bits set are inside a polygon, set in a bitmap, or no-data; a picture shows them white.
// A bitmap of the file gets them as they are, but the validity mask the complement of no-data: there set bits are valid
// pixels. Polygons that all lie outside of the image are a warning, and nothing is written. oFile: opened for update
// when the request is writing. When something fails it stays as it was. Throws RequestException for a second validity
// mask.
// poExecutor: whose threads take part; borrowed, null for none. The mask is the same for any number of threads.
KRV_OPERATIONS_API MaskResult MakeMask(const SourceFile& oFile, const MaskRequest& oRequest,
                                       const Progress& oProgress = {}, krv::threading::IExecutor* poExecutor = nullptr);

} // namespace krv::operations
