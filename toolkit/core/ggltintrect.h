#pragma once

// A rectangle of whole pixels: those from x to x + width - 1 and from y to y + height - 1.
// At global scope, like all of the toolkit's geometry. Nothing is checked: a signed T may have negative sizes.
template <typename T>
struct GGLTIntRect
{
    T x = 0;
    T y = 0;
    T width = 0;
    T height = 0;
};
