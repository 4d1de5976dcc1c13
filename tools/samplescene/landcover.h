#pragma once

#include <cstdint>

namespace krv::samplescene
{

// What the sensor's four bands see of a place, as reflectance 0 to 1.
struct Reflectance
{
    float blue;
    float green;
    float red;
    float infrared;
};

// A place on the ground. Slopes are metres of rise per metre towards the east and the south.
struct Place
{
    int column;
    int row;
    float height;
    float slopeEast;
    float slopeSouth;
    float moisture; // about -1 (dry) to 1
};

// Which cover grows or lies there: water by depth, fields on the plain, forest, meadow, rock and snow by height, slope
// and moisture; lit by a morning sun in the north-east, as in the southern hemisphere, seen through a little haze.
class LandCover
{
public:
    explicit LandCover(std::uint32_t nSeed);

    Reflectance See(const Place& oPlace) const;

private:
    Reflectance Ground(const Place& oPlace, float nSteepness) const;
    Reflectance Field(const Place& oPlace) const;

    std::uint32_t mnSeed;
};

} // namespace krv::samplescene
