#pragma once

#include <cstdint>
#include <vector>

namespace krv::samplescene
{

// A well mixed 32-bit value of a lattice point: the only source of chance, so that a seed gives the same scene
// anywhere.
std::uint32_t Hash(int nX, int nY, std::uint32_t nSeed);

// The same as a real in [0, 1).
float HashUnit(int nX, int nY, std::uint32_t nSeed);

// Smooth random field of one scale: random values on a square lattice, joined by cubic B-splines; about -1 to 1.
class LatticeNoise
{
public:
    // nCell: lattice spacing in pixels, at least 2; need not be whole, so that scales do not line up.
    LatticeNoise(unsigned int nWidth, double nCell, std::uint32_t nSeed);

    // The field along one row of pixels.
    void Row(unsigned int nY, float* pValues) const;

private:
    double mnCell;
    std::uint32_t mnSeed;
    std::vector<unsigned int> moStart;                             // first pixel of each lattice cell, and the end
    std::vector<float> moWeight0, moWeight1, moWeight2, moWeight3; // per pixel, of the four lattice columns around it
    mutable std::vector<float> moColumns;                          // lattice values at the row's height
};

} // namespace krv::samplescene
