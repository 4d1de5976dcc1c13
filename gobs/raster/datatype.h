#pragma once

#include "gobs/api.h"
#include "toolkit/exceptions/place.h"

#include <compare>
#include <cstdint>
#include <string>
#include <vector>

namespace krv::gobs
{

// The pixel types. The value, the text and the byte size of each are public; files and plug-ins depend on them.
enum NativeDataTypeCode
{
    eDT_8U = 0,    // bytes: 1
    eDT_8S = 1,    // 1
    eDT_16U = 2,   // 2
    eDT_16S = 3,   // 2
    eDT_32U = 4,   // 4
    eDT_32S = 5,   // 4
    eDT_32R = 6,   // 4, IEEE 754
    eDT_64U = 7,   // 8
    eDT_64S = 8,   // 8
    eDT_64R = 9,   // 8, IEEE 754
    eDT_C16U = 10, // 4: two parts of 16U, the real one first
    eDT_C16S = 11, // 4
    eDT_C32S = 12, // 8
    eDT_C32R = 13, // 8
    eDT_C64R = 14, // 16
    eDT_BIT = 15   // one bit per pixel: masks only, without text and byte size
};

// A channel's pixel type as six fields. Two types are equal when all fields are; the order is that of the fields, which
// sorts 8U, 8S, 16U, C16U, 16S, C16S, 32U, 32S, C32S, 32R, C32R, 64U, 64S, 64R, C64R.
// A plain value of 20 bytes and less; any thread.
class KRV_GOBS_API DataType
{
public:
    // All fields 0: no type.
    DataType() = default;

    // Implicit, intended: wherever a type is asked for its code will do. An unknown code gives a type that is not in
    // the table.
    DataType(NativeDataTypeCode eCode);

    // For formats that describe types by their parts. The reserved fields are 0 for every type of the table.
    DataType(std::uint32_t nBits, bool bSigned, bool bReal, std::uint32_t nReserved1, std::uint32_t nReserved2,
             bool bComplex);

    // Bits of one sample; of one part for complex types.
    std::uint32_t GetBits() const { return mnBits; }
    // Set for reals too.
    bool IsSigned() const { return mbSigned != 0; }

    // False for integers.
    bool IsReal() const { return mbReal != 0; }
    std::uint32_t GetReserved1() const { return mnReserved1; }
    std::uint32_t GetReserved2() const { return mnReserved2; }
    bool IsComplex() const { return mbComplex != 0; }
    // 2 for complex types, else 1.
    unsigned int GetParts() const { return mbComplex != 0 ? 2u : 1u; }
    // Bits of one value, both parts of a complex one counted.
    std::uint64_t GetValueBits() const { return static_cast<std::uint64_t>(mnBits) * GetParts(); }

    // Whether the type is one of the table; then `eCode` is set.
    bool FindNativeCode(NativeDataTypeCode& eCode) const;
    // Throws DataException for a type that is not in the table.
    // The code, for a switch. oPlace: whom the exception names.
    NativeDataTypeCode GetNativeCode(const Place& oPlace = Place::Current()) const;

    // "8U" ... "C64R"; "BIT" for one-bit rasters; the fields in words for anything else. Never throws: for messages.
    std::string Describe() const;

    friend bool operator==(const DataType&, const DataType&) = default;
    friend std::strong_ordering operator<=>(const DataType&, const DataType&) = default;

private:
    std::uint32_t mnBits = 0;
    std::uint8_t mbSigned = 0;
    std::uint8_t mbReal = 0;
    std::uint32_t mnReserved1 = 0;
    std::uint32_t mnReserved2 = 0;
    std::uint8_t mbComplex = 0;
};

// Bytes of a buffer of width * height pixels with the given channels: ceil(pixels * channels * bits * parts / 8).
// One-bit values are packed without row padding. Throws DataException when the count does not fit 63 bits.
// Sizes that a file names go through here before anything is allocated.
KRV_GOBS_API std::uint64_t BufferBytes(std::uint64_t nWidth, std::uint64_t nHeight, std::uint64_t nChannels,
                                       const DataType& oType, const Place& oPlace = Place::Current());

// The smallest type that holds every value of all listed types exactly; 64R or C64R when there is none (64-bit integers
// mixed with reals, or with the other sign). One element, or equal elements, give that element. The order of the list
// does not matter. Throws ParameterException for an empty list and for types outside the table.
// Examples: 8U and 16S give 16S, 16U and 16S give 32S, 32S and 32R give 64R, 8U and C32R give C32R.
KRV_GOBS_API DataType PromoteType(const std::vector<DataType>& oTypes);

// Whether every value of `oFrom` has an exact counterpart in `oTo`.
// False for a type outside the table, unless both are equal.
KRV_GOBS_API bool IsLossless(const DataType& oFrom, const DataType& oTo);

// Whether PromoteType of the list holds all members exactly.
KRV_GOBS_API bool PromotionIsExact(const std::vector<DataType>& oTypes);

} // namespace krv::gobs
