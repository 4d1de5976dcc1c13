#include "toolkit/core/gglshape.h"

GGLShape::GGLShape() = default;
GGLShape::GGLShape(const GGLShape&) = default;
GGLShape::GGLShape(GGLShape&&) noexcept = default;
GGLShape& GGLShape::operator=(const GGLShape&) = default;
GGLShape& GGLShape::operator=(GGLShape&&) noexcept = default;
GGLShape::~GGLShape() = default;

void GGLShape::AddRing(const std::vector<GDBVertex>& oVertices)
{
    moRingStarts.push_back(moVertices.size());
    moVertices.insert(moVertices.end(), oVertices.begin(), oVertices.end());
}
