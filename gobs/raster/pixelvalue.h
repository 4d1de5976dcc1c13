#pragma once

#include "gobs/api.h"
#include "gobs/raster/complex.h"
#include "gobs/raster/datatype.h"

#include <cstdint>
#include <tuple>
#include <type_traits>

namespace krv::gobs
{

// The C++ type of one value of each pixel type, in the order of NativeDataTypeCode; one-bit values, which follow, have
// none.
// A type that is added goes behind the others here and in NativeDataTypeCode: the place is the code.
using PixelValues = std::tuple<std::uint8_t, std::int8_t, std::uint16_t, std::int16_t, std::uint32_t, std::int32_t,
                               float, std::uint64_t, std::int64_t, double, Complex<std::uint16_t>,
                               Complex<std::int16_t>, Complex<std::int32_t>, Complex<float>, Complex<double>>;

namespace detail
{

// How values of one part and complex ones are told apart; PartOf and PARTS_OF below are the ways to ask.
template <class Value>
struct PartsOfValue
{
    using Part = Value;
    static constexpr unsigned int COUNT = 1;
};
template <class PartOfValue>
struct PartsOfValue<Complex<PartOfValue>>
{
    using Part = PartOfValue;
    static constexpr unsigned int COUNT = 2;
};

// Worked out by the compiler.
template <class Value, class... Values>
constexpr NativeDataTypeCode FindPixelType(std::type_identity<std::tuple<Values...>>)
{
    static_assert((std::is_same_v<Value, Values> || ...), "no pixel type has such values");
    int nCode = 0;
    static_cast<void>(((std::is_same_v<Value, Values> || (++nCode, false)) || ...));
    return static_cast<NativeDataTypeCode>(nCode);
}

// One comparison after the other: a table of calls would need the type of their results beforehand, and asking for it
// makes clang 16 lose virtual members of templates that the visitor names.
template <class Visitor, class First, class... Rest>
decltype(auto) VisitValue(NativeDataTypeCode eType, const Visitor& oVisitor,
                          std::type_identity<std::tuple<First, Rest...>>)
{
    if constexpr (sizeof...(Rest) > 0)
    {
        if (eType != FindPixelType<First>(std::type_identity<PixelValues>()))
            return VisitValue(eType, oVisitor, std::type_identity<std::tuple<Rest...>>());
    }
    return oVisitor(std::type_identity<First>());
}

// The type's code. Throws DataException for one-bit values and for a type outside the table.
// What VisitPixelType switches by.
KRV_GOBS_API NativeDataTypeCode GetValueType(const DataType& oType, const Place& oPlace);

} // namespace detail

// What a value is made of: the type and the number of its parts, 2 of a complex value and else 1.
// float for Complex<float> and for float.
template <class Value>
using PartOf = typename detail::PartsOfValue<Value>::Part;

// A buffer of n values has n * PARTS_OF<Value> parts.
template <class Value>
inline constexpr unsigned int PARTS_OF = detail::PartsOfValue<Value>::COUNT;

// The pixel type whose values are of a C++ type. Does not compile for other types.
// Example: PIXEL_TYPE_OF<float> is eDT_32R.
template <class Value>
inline constexpr NativeDataTypeCode
    PIXEL_TYPE_OF = detail::FindPixelType<std::remove_const_t<Value>>(std::type_identity<PixelValues>());

// The unsigned integer of as many bytes as a value, 1, 2, 4 or 8.
// For work that moves values without looking at them, and so is compiled once for each size. Not for values of 16
// bytes.
template <class Value>
using BitsOf =
    std::conditional_t<sizeof(Value) == 1, std::uint8_t,
                       std::conditional_t<sizeof(Value) == 2, std::uint16_t,
                                          std::conditional_t<sizeof(Value) == 4, std::uint32_t, std::uint64_t>>>;

// Calls oVisitor(std::type_identity<Value>()) with the C++ type of one value of a pixel type and gives what that gives,
// which is of one type for all of them. Throws DataException for one-bit values and for a type outside the table.
// Example: how many bytes a value has:
//   VisitPixelType(oType, []<class Value>(std::type_identity<Value>) { return sizeof(Value); });
// The visitor is compiled for every type; keep what does not depend on the type outside of it.
template <class Visitor>
decltype(auto) VisitPixelType(const DataType& oType, const Visitor& oVisitor, const Place& oPlace = Place::Current())
{
    return detail::VisitValue(detail::GetValueType(oType, oPlace), oVisitor, std::type_identity<PixelValues>());
}

// The same with the type of one part, for work that takes complex values apart.
// For C32R the visitor gets float. Work that must know how many parts there are asks DataType::GetParts.
template <class Visitor>
decltype(auto) VisitPartType(const DataType& oType, const Visitor& oVisitor, const Place& oPlace = Place::Current())
{
    return VisitPixelType(
        oType,
        [&]<class Value>(std::type_identity<Value>) -> decltype(auto)
        { return oVisitor(std::type_identity<PartOf<Value>>()); },
        oPlace);
}

} // namespace krv::gobs
