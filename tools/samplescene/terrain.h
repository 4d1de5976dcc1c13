#pragma once

#include "tools/samplescene/latticenoise.h"

namespace krv::samplescene
{

// Fractal relief, row by row: broad basins with lakes, and ridges that grow rougher with height as erosion leaves them.
class Terrain
{
public:
    Terrain(unsigned int nSize, std::uint32_t nSeed);

    // Heights in metres along a row. Below WATER_LEVEL the lake's ground.
    void Row(unsigned int nY, float* pHeights) const;

    static constexpr float WATER_LEVEL = 240.0F;

private:
    unsigned int mnSize;
    std::vector<LatticeNoise> moBroad;
    std::vector<LatticeNoise> moRidges;
    mutable std::vector<float> moField;
    mutable std::vector<float> moWeight;
    mutable std::vector<float> moRidge;
};

} // namespace krv::samplescene
