#pragma once

#include "gobs/raster/datatype.h"
#include "toolkit/exceptions/exceptions.h"

#include <optional>
#include <string>

namespace krv::gobs
{

// Sizes and texts of the type codes. The texts are those of messages, of metadata and of the command: U and S are
// unsigned and signed integers, R is a real, C a complex value of two such parts; the number is the bits of one part.
// No object is needed. Any thread.
class DataTypeAdapter
{
public:
    // Bytes of one value. Complex of two unsigned 16-bit values has none and fails like an unknown code, intended:
    // callers learn from it that this type has no fixed sample size here. Buffers are sized by BufferBytes instead.
    // Throws ParameterException of type 1 for the parameter "eDataType".
    // 1 for 8U to 16 for C64R.
    static int ByteSize(NativeDataTypeCode eDataType)
    {
        switch (eDataType)
        {
        case eDT_8U:
        case eDT_8S:
            return 1;
        case eDT_16U:
        case eDT_16S:
            return 2;
        case eDT_32U:
        case eDT_32S:
        case eDT_32R:
        case eDT_C16S:
            return 4;
        case eDT_64U:
        case eDT_64S:
        case eDT_64R:
        case eDT_C32S:
        case eDT_C32R:
            return 8;
        case eDT_C64R:
            return 16;
        default:
            break;
        }

        // The line is part of the contract.
        throw ParameterException("Could not determine byte size for provided datatype",
                                 ParameterException::eInvalidValue, "eDataType", Place::AtLine(86));
    }

    // "8U" ... "C64R" for codes 0 to 14. Throws ParameterException for the parameter "eDataType".
    // DataType::Describe never throws and is the one for messages.
    static std::string TypeToString(NativeDataTypeCode eDataType)
    {
        // In the order of the codes.
        constexpr const char* TEXTS[] = {"8U",  "8S",  "16U",  "16S",  "32U",  "32S",  "32R", "64U",
                                         "64S", "64R", "C16U", "C16S", "C32S", "C32R", "C64R"};
        if (eDataType < eDT_8U || eDataType > eDT_C64R)
            throw ParameterException("Cannot evaluate TypeToString() for the provided datatype",
                                     ParameterException::eInvalidValue, "eDataType");
        return TEXTS[eDataType];
    }

    // The counterpart; no value for any other text.
    // Letter case counts. Example: StringToType("16U") is eDT_16U, StringToType("uint16") nothing.
    static std::optional<NativeDataTypeCode> StringToType(const std::string& text)
    {
        for (int nCode = eDT_8U; nCode <= eDT_C64R; ++nCode)
            if (TypeToString(static_cast<NativeDataTypeCode>(nCode)) == text)
                return static_cast<NativeDataTypeCode>(nCode);
        return std::nullopt;
    }
};

} // namespace krv::gobs
