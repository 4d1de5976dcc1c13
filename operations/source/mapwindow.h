#pragma once

#include "operations/api.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/mapwindow.h"

#include <optional>
#include <string>

namespace krv::operations
{

class SourceFile;

using krv::ogc::cs::MapBounds;
using krv::ogc::cs::OutlineOf;
using krv::ogc::cs::PixelWindow;

// Which part of a file's image a user means: pixels, map coordinates, or where another file lies. At most one of them.
// Example: {.bounds = MapBounds{west, south, east, north}}.
struct WindowRequest
{
    std::optional<PixelWindow> pixels = {};
    std::optional<MapBounds> bounds = {};
    std::string like = {}; // a file in the same reference system; empty: none
};

// The transform of a file. Throws RequestException for a file without one: with the identity, which says nothing.
KRV_OPERATIONS_API krv::ogc::cs::GeocodingInfo RequireGeocoding(const SourceFile& oFile);

// Where another file lies. Throws RequestException when both have reference systems that differ.
// Of the outer edges, in the map units that both files share.
KRV_OPERATIONS_API MapBounds BoundsLike(const SourceFile& oFile, const SourceFile& oOther);
// Throws RequestException when both have reference systems and these differ.
// Equivalent systems count as the same, whatever their names. One that says none agrees with any.
KRV_OPERATIONS_API void CheckSameSystem(const SourceFile& oFile, const SourceFile& oOther);

// The pixels of the image that are touched, those that are no more than a millionth aside; nothing when the request
// asks for nothing, the rectangle of pixels as it is. Throws RequestException for bounds that hold no pixel.
KRV_OPERATIONS_API std::optional<PixelWindow> FindWindow(const SourceFile& oFile, const WindowRequest& oRequest);

} // namespace krv::operations
