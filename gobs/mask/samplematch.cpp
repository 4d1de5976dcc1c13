#include "gobs/mask/samplematch.h"

#include "gobs/raster/pixelvalue.h"

#include <cstring>

namespace krv::gobs
{

bool StoreSample(const SampleValue& oNumber, const DataType& oType, unsigned char* pTarget)
{
    const auto Store = [&]<class Part>(std::type_identity<Part>)
    {
        const std::optional<Part> oPart = ToSample<Part>(oNumber);
        if (!oPart)
            return false;
        const Part aParts[2] = {*oPart, oNumber.IsNaN() ? *oPart : Part(0)};
        std::memcpy(pTarget, aParts, sizeof(Part) * oType.GetParts());
        return true;
    };
    return VisitPartType(oType, Store);
}

} // namespace krv::gobs
