#pragma once

#include "datasources/metadata/typednodata.h"
#include "gobs/raster/datatype.h"

#include <cstdint>
#include <optional>
#include <utility>

namespace krv::operations
{

// A channel's no-data value, when it has one.
using OptionalNoData = std::optional<krv::datasources::NoDataValue>;

// Calls the function with a zero of the C++ type of one value, or of one part of a complex value. Throws DataException
// for a type outside the table.
template <typename Function>
decltype(auto) VisitPart(const krv::gobs::DataType& oType, Function&& oFunction)
{
    switch (oType.GetNativeCode())
    {
    case krv::gobs::eDT_8S:
        return oFunction(std::int8_t{});
    case krv::gobs::eDT_16U:
    case krv::gobs::eDT_C16U:
        return oFunction(std::uint16_t{});
    case krv::gobs::eDT_16S:
    case krv::gobs::eDT_C16S:
        return oFunction(std::int16_t{});
    case krv::gobs::eDT_32U:
        return oFunction(std::uint32_t{});
    case krv::gobs::eDT_32S:
    case krv::gobs::eDT_C32S:
        return oFunction(std::int32_t{});
    case krv::gobs::eDT_32R:
    case krv::gobs::eDT_C32R:
        return oFunction(float{});
    case krv::gobs::eDT_64U:
        return oFunction(std::uint64_t{});
    case krv::gobs::eDT_64S:
        return oFunction(std::int64_t{});
    case krv::gobs::eDT_64R:
    case krv::gobs::eDT_C64R:
        return oFunction(double{});
    default:
        return oFunction(std::uint8_t{});
    }
}

} // namespace krv::operations
