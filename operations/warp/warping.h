#pragma once

#include "gobs/resampling/resampling.h"
#include "operations/api.h"
#include "operations/copy/conversion.h"
#include "operations/job/progress.h"
#include "operations/source/mapwindow.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <optional>
#include <string>
#include <vector>

namespace krv::operations
{

// The grid that a file is to be brought into, in its own reference system. What is left open is the file's own: its
// outline, and the size of its pixels. At most one of a resolution and a size.
// Example: {.source = "scene.tif", .like = "dem.tif"} makes pixels that lie on those of the other file.
struct WarpRequest
{
    std::string source;
    std::vector<unsigned int> channels; // empty: all
    std::string like;                   // a file whose grid it is; nothing else is given then
    std::optional<MapBounds> bounds;    // of the outer edges; pixels at the far edges may reach beyond
    std::vector<double> resolution;     // map units of a pixel, of a column and of a row
    std::vector<unsigned int> size;     // columns and rows

    // Nearest, bilinear, cubic, lanczos, average or mode.
    std::optional<krv::gobs::Resampling> method; // none: mode for indices of a colour table, else bilinear
    std::optional<double> noData;                // of pixels that have no source; none: the file's own
    unsigned int degree = 0;                     // of the polynomial through control points; 0: by their number
    bool exact = false;                          // not from levels
};

// What came of it.
// What was chosen where the request left it open.
struct WarpResult
{
    unsigned int width = 0; // of the new file
    unsigned int height = 0;
    krv::ogc::cs::GeocodingInfo geocoding;
    krv::gobs::Resampling method = krv::gobs::Resampling::eNearest;
    // Of a file that is placed by control points alone: how many, the polynomial's degree, and how far off they are in
    // pixels of the file, by the root of the mean square and at most.
    std::size_t points = 0;
    unsigned int degree = 0;
    double residual = 0;
    double largestResidual = 0;
};

// Resamples a file into another grid of its reference system. A file without a transform that has ground control points
// is placed by a polynomial through them. Colour tables stay with their channel where pixels are taken as they are. A
// mask says which pixels are valid where no value does. Each channel keeps its type. The new file as with Convert, the
// same for any number of threads. Throws RequestException for what makes no sense and for a file in another reference
// system.
// Memory: windows of the source and the tiles of the threads, whatever the size of both images.
KRV_OPERATIONS_API WarpResult Warp(const WarpRequest& oRequest, const TargetForm& oForm, const Progress& oProgress = {},
                                   krv::threading::IExecutor* poExecutor = nullptr);

} // namespace krv::operations
