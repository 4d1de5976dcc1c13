#pragma once

// A point of an outline in continuous pixel coordinates: (0, 0) is the outer corner of the image's first pixel,
// (0.5, 0.5) its centre; y grows downwards. At global scope, like all of the toolkit's geometry.
struct GDBVertex
{
    double x = 0; // columns
    double y = 0; // rows
};
