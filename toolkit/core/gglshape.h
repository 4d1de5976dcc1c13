#pragma once

#include "toolkit/api.h"
#include "toolkit/core/gdbvertex.h"

#include <cstddef>
#include <vector>

// An outline of any number of rings. A ring is closed by itself: its first vertex may be repeated at the end or not.
// Rings inside rings are holes, since filling is even-odd; their order and turning sense do not matter. A plain value.
class KRV_TOOLKIT_API GGLShape
{
public:
    GGLShape();
    GGLShape(const GGLShape&);
    GGLShape(GGLShape&&) noexcept;
    GGLShape& operator=(const GGLShape&);
    GGLShape& operator=(GGLShape&&) noexcept;
    ~GGLShape();

    // Fewer than three vertices enclose nothing but are kept. The vertices are copied.
    // Example: a square of 10 pixels: oShape.AddRing({{0, 0}, {10, 0}, {10, 10}, {0, 10}});
    void AddRing(const std::vector<GDBVertex>& oVertices);

    // The vertices of all rings, one ring after the other, and the index of the first vertex of each ring.
    // Valid until a ring is added. Without rings both are empty.
    const std::vector<GDBVertex>& GetVertices() const { return moVertices; }
    const std::vector<std::size_t>& GetRingStarts() const { return moRingStarts; }

private:
    std::vector<GDBVertex> moVertices;     // of all rings
    std::vector<std::size_t> moRingStarts; // as many as there are rings
};
