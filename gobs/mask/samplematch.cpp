#include "gobs/mask/samplematch.h"

#include "toolkit/exceptions/exceptions.h"

#include <cstring>

namespace krv::gobs
{

namespace
{

template <class Part>
bool Store(const SampleValue& oNumber, const DataType& oType, unsigned char* pTarget)
{
    const std::optional<Part> oPart = ToSample<Part>(oNumber);
    if (!oPart)
        return false;
    const Part aParts[2] = {*oPart, oNumber.IsNaN() ? *oPart : Part(0)};
    std::memcpy(pTarget, aParts, sizeof(Part) * oType.GetParts());
    return true;
}

} // namespace

bool StoreSample(const SampleValue& oNumber, const DataType& oType, unsigned char* pTarget)
{
    switch (oType.GetNativeCode())
    {
    case eDT_8U:
        return Store<std::uint8_t>(oNumber, oType, pTarget);
    case eDT_8S:
        return Store<std::int8_t>(oNumber, oType, pTarget);
    case eDT_16U:
    case eDT_C16U:
        return Store<std::uint16_t>(oNumber, oType, pTarget);
    case eDT_16S:
    case eDT_C16S:
        return Store<std::int16_t>(oNumber, oType, pTarget);
    case eDT_32U:
        return Store<std::uint32_t>(oNumber, oType, pTarget);
    case eDT_32S:
    case eDT_C32S:
        return Store<std::int32_t>(oNumber, oType, pTarget);
    case eDT_64U:
        return Store<std::uint64_t>(oNumber, oType, pTarget);
    case eDT_64S:
        return Store<std::int64_t>(oNumber, oType, pTarget);
    case eDT_32R:
    case eDT_C32R:
        return Store<float>(oNumber, oType, pTarget);
    case eDT_64R:
    case eDT_C64R:
        return Store<double>(oNumber, oType, pTarget);
    case eDT_BIT:
        break;
    }
    throw DataException("A value of type " + oType.Describe() + " has no bytes of its own");
}

} // namespace krv::gobs
