#include "gobs/raster/datatype.h"

#include "gobs/raster/datatypeadapter.h"
#include "gobs/raster/pixelvalue.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <array>
#include <optional>

namespace krv::gobs
{

namespace
{

__extension__ using Wide = unsigned __int128;

struct Fields
{
    std::uint8_t mnBits;
    bool mbSigned;
    bool mbReal;
    bool mbComplex;
};

template <class... Values>
constexpr std::array<Fields, sizeof...(Values) + 1> MakeFields(std::type_identity<std::tuple<Values...>>)
{
    return {Fields{8 * sizeof(PartOf<Values>), std::is_signed_v<PartOf<Values>>,
                   std::is_floating_point_v<PartOf<Values>>, PARTS_OF<Values> == 2}...,
            Fields{1, false, false, false}};
}

// In the order of NativeDataTypeCode.
constexpr auto FIELDS = MakeFields(std::type_identity<PixelValues>());

const Fields& FieldsOf(NativeDataTypeCode eCode, const Place& oPlace)
{
    if (eCode < eDT_8U || eCode > eDT_BIT)
        throw ParameterException("There is no data type with the code " + std::to_string(static_cast<int>(eCode)),
                                 ParameterException::eInvalidValue, "eCode", oPlace);
    return FIELDS[eCode];
}

// Whole numbers up to this many bits of magnitude are exact in a real of the given size.
std::uint32_t MagnitudeBits(std::uint32_t nRealBits)
{
    return nRealBits == 32 ? 24 : 53;
}

bool PartCovers(const DataType& oTo, const DataType& oFrom)
{
    if (oFrom.IsReal())
        return oTo.IsReal() && oTo.GetBits() >= oFrom.GetBits();
    const std::uint32_t nMagnitude = oFrom.GetBits() - (oFrom.IsSigned() ? 1 : 0);
    if (oTo.IsReal())
        return nMagnitude <= MagnitudeBits(oTo.GetBits());
    if (oFrom.IsSigned() && !oTo.IsSigned())
        return false;
    return nMagnitude <= oTo.GetBits() - (oTo.IsSigned() ? 1 : 0);
}

bool Covers(const DataType& oTo, const DataType& oFrom)
{
    return (oTo.IsComplex() || !oFrom.IsComplex()) && PartCovers(oTo, oFrom);
}

bool IsInTable(const DataType& oType)
{
    NativeDataTypeCode eCode{};
    return oType.FindNativeCode(eCode) && eCode != eDT_BIT;
}

// Smaller ones first, integers before reals.
bool IsSmaller(const DataType& oLeft, const DataType& oRight)
{
    if (oLeft.GetValueBits() != oRight.GetValueBits())
        return oLeft.GetValueBits() < oRight.GetValueBits();
    return !oLeft.IsReal() && oRight.IsReal();
}

std::optional<DataType> SmallestCover(const std::vector<DataType>& oTypes, bool bComplex)
{
    std::optional<DataType> oBest;
    for (int nCode = eDT_8U; nCode <= eDT_C64R; ++nCode)
    {
        const DataType oCandidate(static_cast<NativeDataTypeCode>(nCode));
        const auto bCovered = [&](const DataType& oType)
        {
            return Covers(oCandidate, oType);
        };
        if (oCandidate.IsComplex() == bComplex && (!oBest || IsSmaller(oCandidate, *oBest)) &&
            std::all_of(oTypes.begin(), oTypes.end(), bCovered))
            oBest = oCandidate;
    }
    return oBest;
}

bool AllEqual(const std::vector<DataType>& oTypes)
{
    return std::all_of(oTypes.begin(), oTypes.end(), [&](const DataType& oType) { return oType == oTypes.front(); });
}

void CheckTypes(const std::vector<DataType>& oTypes, const Place& oPlace)
{
    if (oTypes.empty())
        throw ParameterException("There is no data type to promote", ParameterException::eInvalidValue, "oTypes",
                                 oPlace);
    if (AllEqual(oTypes))
        return;
    for (const DataType& oType : oTypes)
        if (!IsInTable(oType))
            throw ParameterException("The data type (" + oType.Describe() + ") cannot be promoted",
                                     ParameterException::eInvalidValue, "oTypes", oPlace);
}

bool AnyComplex(const std::vector<DataType>& oTypes)
{
    return std::any_of(oTypes.begin(), oTypes.end(), [](const DataType& oType) { return oType.IsComplex(); });
}

} // namespace

DataType::DataType(NativeDataTypeCode eCode)
{
    const Fields& oFields = FieldsOf(eCode, Place::Current());
    mnBits = oFields.mnBits;
    mbSigned = oFields.mbSigned ? 1 : 0;
    mbReal = oFields.mbReal ? 1 : 0;
    mbComplex = oFields.mbComplex ? 1 : 0;
}

DataType::DataType(std::uint32_t nBits, bool bSigned, bool bReal, std::uint32_t nReserved1, std::uint32_t nReserved2,
                   bool bComplex)
    : mnBits(nBits), mbSigned(bSigned ? 1 : 0), mbReal(bReal ? 1 : 0), mnReserved1(nReserved1), mnReserved2(nReserved2),
      mbComplex(bComplex ? 1 : 0)
{
}

bool DataType::FindNativeCode(NativeDataTypeCode& eCode) const
{
    if (mnReserved1 != 0 || mnReserved2 != 0)
        return false;
    for (std::size_t nCode = 0; nCode < FIELDS.size(); ++nCode)
    {
        const Fields& oFields = FIELDS[nCode];
        if (oFields.mnBits == mnBits && oFields.mbSigned == IsSigned() && oFields.mbReal == IsReal() &&
            oFields.mbComplex == IsComplex())
        {
            eCode = static_cast<NativeDataTypeCode>(nCode);
            return true;
        }
    }
    return false;
}

NativeDataTypeCode DataType::GetNativeCode(const Place& oPlace) const
{
    NativeDataTypeCode eCode{};
    if (!FindNativeCode(eCode))
        throw DataException("There is no code for the data type (" + Describe() + ")", oPlace);
    return eCode;
}

std::string DataType::Describe() const
{
    NativeDataTypeCode eCode{};
    if (FindNativeCode(eCode))
        return eCode == eDT_BIT ? "BIT" : DataTypeAdapter::TypeToString(eCode);
    std::string sText = std::to_string(mnBits) + "-bit";
    sText += IsReal() ? (IsSigned() ? " real" : " unsigned real") : (IsSigned() ? " signed" : " unsigned");
    if (IsComplex())
        sText += " complex";
    if (mnReserved1 != 0 || mnReserved2 != 0)
        sText += ", reserved " + std::to_string(mnReserved1) + " and " + std::to_string(mnReserved2);
    return sText;
}

std::uint64_t BufferBytes(std::uint64_t nWidth, std::uint64_t nHeight, std::uint64_t nChannels, const DataType& oType,
                          const Place& oPlace)
{
    constexpr Wide LIMIT = Wide(1) << 63;
    Wide nBits = Wide(nWidth) * nHeight;
    const bool bOverflow = __builtin_mul_overflow(nBits, Wide(nChannels), &nBits) ||
                           __builtin_mul_overflow(nBits, Wide(oType.GetValueBits()), &nBits);
    const Wide nBytes = nBits / 8 + (nBits % 8 != 0 ? 1 : 0);
    if (bOverflow || nBytes >= LIMIT)
        throw DataException("A buffer of " + std::to_string(nWidth) + " x " + std::to_string(nHeight) + " pixels, " +
                                std::to_string(nChannels) + " channels of type " + oType.Describe() + " is too large",
                            oPlace);
    return static_cast<std::uint64_t>(nBytes);
}

DataType PromoteType(const std::vector<DataType>& oTypes)
{
    CheckTypes(oTypes, Place::Current());
    if (AllEqual(oTypes))
        return oTypes.front();
    const bool bComplex = AnyComplex(oTypes);
    return SmallestCover(oTypes, bComplex).value_or(bComplex ? DataType(eDT_C64R) : DataType(eDT_64R));
}

bool IsLossless(const DataType& oFrom, const DataType& oTo)
{
    NativeDataTypeCode eCode{};
    if (oFrom == oTo)
        return true;
    return oFrom.FindNativeCode(eCode) && oTo.FindNativeCode(eCode) && Covers(oTo, oFrom);
}

bool PromotionIsExact(const std::vector<DataType>& oTypes)
{
    CheckTypes(oTypes, Place::Current());
    return AllEqual(oTypes) || SmallestCover(oTypes, AnyComplex(oTypes)).has_value();
}

} // namespace krv::gobs
