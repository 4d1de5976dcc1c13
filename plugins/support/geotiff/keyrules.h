#pragma once

#include "toolkit/ogc/cs/projectionmethod.h"

#include <array>
#include <cstdint>
#include <string_view>

namespace krv::plugins::support
{

// What geographic keys of reference systems mean, for those who read them and those who write them.

// Stands before a whole definition in a citation.
inline constexpr std::string_view DEFINITION_PREFIX = "ESRI PE String = ";

// Where the value of a projection's parameter stands. Writers differ in the keys that they take: the first that is
// there counts, and we write the first of all.
// A constant of the library.
struct ParameterKeys
{
    int parameter = 0;                      // its code in the EPSG database
    std::array<std::uint16_t, 4> keys = {}; // 0: none
    double fallback = 0.0;                  // where none of the keys is there
    std::uint16_t method = 0;               // value of key 3075 for which alone it is so; 0: for all the others
};

// nMethod: value of key 3075. nParameter: code of the EPSG database.
const ParameterKeys& FindParameterKeys(std::uint16_t nMethod, int nParameter);

// The projection method of a value of key 3075; null for one that cannot be expressed. Methods with variants are told
// apart by bSecond: Mercator with a standard parallel in place of the scale, polar stereographic with a parallel of
// true scale away from the pole.
const krv::ogc::cs::ProjectionMethod* FindMethod(std::uint16_t nMethod, bool bSecond);

// The value of key 3075 of a method; 0 when there is none.
std::uint16_t FindMethodKey(const krv::ogc::cs::ProjectionMethod& oMethod);

} // namespace krv::plugins::support
