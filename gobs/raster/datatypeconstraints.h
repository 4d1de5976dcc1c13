#pragma once

#include "gobs/raster/datatype.h"

namespace krv::gobs
{

// The limits of a type's values (of one part for complex types). Integers have exact limits; GetMinimum and GetMaximum
// give them as the nearest double, which for 64-bit integers is rounded.
// A plain value. Example: DataTypeConstraints(eDT_16S).GetMinimum() is -32768.
class KRV_GOBS_API DataTypeConstraints
{
public:
    // No type: every limit 0.
    DataTypeConstraints() = default;
    // Throws ParameterException for a type outside the table.
    explicit DataTypeConstraints(const DataType& oType);

    const DataType& GetDataType() const { return moType; }
    bool IsInteger() const { return mbInteger; }

    // Reals: the lowest finite number.
    double GetMinimum() const { return mnMinimum; }
    double GetMaximum() const { return mnMaximum; }
    // Exact limits of an integer type; 0 for reals.
    // 64S: -2^63; the maximum of 64U is 2^64 - 1.
    std::int64_t GetIntegerMinimum() const { return mnIntegerMinimum; }
    std::uint64_t GetIntegerMaximum() const { return mnIntegerMaximum; }
    // Reals: the distance from 1 to the next value; integers: 1.
    double GetEpsilon() const { return mnEpsilon; }
    // Whether the type holds the value exactly (NaN and infinities: reals only).
    // Example: 255.5 and 256 are held by no 8U; 0.1 is held by 64R and not by 32R.
    bool Holds(double nValue) const;

private:
    DataType moType; // the limits are its own
    bool mbInteger = false;
    double mnMinimum = 0;
    double mnMaximum = 0;
    std::int64_t mnIntegerMinimum = 0;
    std::uint64_t mnIntegerMaximum = 0;
    double mnEpsilon = 0;
};

} // namespace krv::gobs
