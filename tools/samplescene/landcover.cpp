#include "tools/samplescene/landcover.h"

#include "tools/samplescene/latticenoise.h"
#include "tools/samplescene/terrain.h"

#include <algorithm>
#include <cmath>

namespace krv::samplescene
{

namespace
{

constexpr Reflectance DEEP_WATER{0.055F, 0.045F, 0.022F, 0.008F};
constexpr Reflectance SHALLOW_WATER{0.080F, 0.105F, 0.070F, 0.020F};
constexpr Reflectance SHORE{0.135F, 0.165F, 0.190F, 0.250F};
constexpr Reflectance GRASS{0.055F, 0.105F, 0.080F, 0.340F};
constexpr Reflectance DRY_GRASS{0.095F, 0.145F, 0.165F, 0.290F};
constexpr Reflectance FOREST{0.024F, 0.048F, 0.026F, 0.260F};
constexpr Reflectance ALPINE{0.080F, 0.120F, 0.110F, 0.260F};
constexpr Reflectance ROCK{0.150F, 0.165F, 0.180F, 0.220F};
constexpr Reflectance SNOW{0.760F, 0.750F, 0.730F, 0.640F};
constexpr Reflectance CROPS[] = {{0.040F, 0.095F, 0.045F, 0.420F},
                                 {0.060F, 0.120F, 0.070F, 0.360F},
                                 {0.105F, 0.160F, 0.190F, 0.270F},
                                 {0.120F, 0.150F, 0.185F, 0.230F},
                                 {0.075F, 0.145F, 0.110F, 0.380F}};
constexpr float SUN_EAST = 0.50F, SUN_NORTH = 0.48F, SUN_UP = 0.72F;

Reflectance Mix(const Reflectance& oA, const Reflectance& oB, float nShareOfB)
{
    const float a = 1.0F - nShareOfB, b = nShareOfB;
    return {oA.blue * a + oB.blue * b, oA.green * a + oB.green * b, oA.red * a + oB.red * b,
            oA.infrared * a + oB.infrared * b};
}

Reflectance Scale(const Reflectance& oA, float nFactor)
{
    return {oA.blue * nFactor, oA.green * nFactor, oA.red * nFactor, oA.infrared * nFactor};
}

// 0 below nFrom, 1 above nTo, smooth between.
float Step(float nFrom, float nTo, float nValue)
{
    const float t = std::clamp((nValue - nFrom) / (nTo - nFrom), 0.0F, 1.0F);
    return t * t * (3.0F - 2.0F * t);
}

float Illumination(const Place& oPlace)
{
    const float nLength = std::sqrt(1.0F + oPlace.slopeEast * oPlace.slopeEast + oPlace.slopeSouth * oPlace.slopeSouth);
    const float nCosine = (SUN_UP - SUN_EAST * oPlace.slopeEast + SUN_NORTH * oPlace.slopeSouth) / nLength;
    return 0.18F + 0.82F * std::max(nCosine, 0.0F) / SUN_UP;
}

} // namespace

LandCover::LandCover(std::uint32_t nSeed) : mnSeed(nSeed) {}

// Parcels: estates of 150 pixels, each with a direction and a strip width of its own.
Reflectance LandCover::Field(const Place& oPlace) const
{
    constexpr int ESTATE = 150;
    const int nEstateX = (16 * oPlace.column + 5 * oPlace.row) / (16 * ESTATE);
    const int nEstateY = (16 * oPlace.row - 5 * oPlace.column + (1 << 24)) / (16 * ESTATE);
    const float nTurn = 0.5F * HashUnit(nEstateX, nEstateY, mnSeed + 1) + 0.2F;
    const float nAlong = 38.0F + 40.0F * HashUnit(nEstateX, nEstateY, mnSeed + 2);
    const float nAcross = 14.0F + 16.0F * HashUnit(nEstateX, nEstateY, mnSeed + 3);
    const float nU = (static_cast<float>(oPlace.column) + nTurn * static_cast<float>(oPlace.row)) / nAlong;
    const float nV = (static_cast<float>(oPlace.row) - nTurn * static_cast<float>(oPlace.column)) / nAcross;
    const float nFloorU = std::floor(nU), nFloorV = std::floor(nV);
    const bool bTrack = (nU - nFloorU) * nAlong < 1.4F || (nV - nFloorV) * nAcross < 1.1F;
    if (bTrack)
        return Mix(GRASS, SHORE, 0.6F);
    const std::uint32_t nParcel = Hash(static_cast<int>(nFloorU), static_cast<int>(nFloorV), mnSeed + 4);
    return Scale(CROPS[nParcel % 5], 0.85F + 0.3F * static_cast<float>(nParcel >> 24U) / 255.0F);
}

Reflectance LandCover::Ground(const Place& oPlace, float nSteepness) const
{
    const float nGrain = HashUnit(oPlace.column, oPlace.row, mnSeed + 5);
    const float nBelt = oPlace.height + 120.0F * oPlace.moisture + 60.0F * (nGrain - 0.5F);
    Reflectance oGround = Mix(GRASS, DRY_GRASS, Step(0.35F, -0.55F, oPlace.moisture));
    const float nFields = Step(0.10F, 0.05F, nSteepness) * Step(560.0F, 430.0F, oPlace.height);
    if (nFields > 0.0F)
        oGround = Mix(oGround, Field(oPlace), nFields);
    const float nForest = Step(-0.15F, 0.15F, oPlace.moisture + 1.6F * nSteepness - 0.25F + 0.3F * (nGrain - 0.5F)) *
                          Step(1480.0F, 1320.0F, nBelt) * (1.0F - 0.85F * nFields);
    oGround = Mix(oGround, Scale(FOREST, 0.65F + 0.7F * nGrain), nForest);
    oGround = Mix(oGround, ALPINE, Step(1300.0F, 1560.0F, nBelt));
    oGround = Mix(oGround, Scale(ROCK, 0.85F + 0.3F * nGrain),
                  std::max(Step(1620.0F, 1850.0F, nBelt), Step(0.75F, 1.15F, nSteepness)));
    const float nSnowLine = 1880.0F - 250.0F * (oPlace.slopeEast - oPlace.slopeSouth);
    oGround = Mix(oGround, SNOW, Step(nSnowLine, nSnowLine + 130.0F, nBelt) * Step(1.9F, 1.2F, nSteepness));
    return Mix(SHORE, oGround, Step(0.0F, 5.0F, oPlace.height - Terrain::WATER_LEVEL));
}

Reflectance LandCover::See(const Place& oPlace) const
{
    constexpr Reflectance HAZE{0.046F, 0.028F, 0.016F, 0.006F};
    Reflectance oSeen{};
    if (oPlace.height < Terrain::WATER_LEVEL)
        oSeen = Mix(SHALLOW_WATER, DEEP_WATER, Step(0.0F, 30.0F, Terrain::WATER_LEVEL - oPlace.height));
    else
    {
        const float nSteepness = std::sqrt(oPlace.slopeEast * oPlace.slopeEast + oPlace.slopeSouth * oPlace.slopeSouth);
        oSeen = Scale(Ground(oPlace, nSteepness), Illumination(oPlace));
    }
    return {oSeen.blue + HAZE.blue, oSeen.green + HAZE.green, oSeen.red + HAZE.red, oSeen.infrared + HAZE.infrared};
}

} // namespace krv::samplescene
