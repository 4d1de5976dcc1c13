#pragma once

#include "gobs/raster/datatype.h"

namespace krv::gobs
{

// The limits of a type's values (of one part for complex types). Integers have exact limits; GetMinimum and GetMaximum
// give them as the nearest double, which for 64-bit integers is rounded.
class KRV_GOBS_API DataTypeConstraints
{
public:
    // No type: every limit 0.
    DataTypeConstraints() = default;
    // Throws ParameterException for a type outside the table.
    explicit DataTypeConstraints(const DataType& oType);

    const DataType& GetDataType() const { return moType; }
    bool IsInteger() const { return mbInteger; }
    double GetMinimum() const { return mnMinimum; }
    double GetMaximum() const { return mnMaximum; }
    // Exact limits of an integer type; 0 for reals.
    std::int64_t GetIntegerMinimum() const { return mnIntegerMinimum; }
    std::uint64_t GetIntegerMaximum() const { return mnIntegerMaximum; }
    // Reals: the distance from 1 to the next value; integers: 1.
    double GetEpsilon() const { return mnEpsilon; }
    // Whether the type holds the value exactly (NaN and infinities: reals only).
    bool Holds(double nValue) const;

private:
    DataType moType;
    bool mbInteger = false;
    double mnMinimum = 0;
    double mnMaximum = 0;
    std::int64_t mnIntegerMinimum = 0;
    std::uint64_t mnIntegerMaximum = 0;
    double mnEpsilon = 0;
};

} // namespace krv::gobs
