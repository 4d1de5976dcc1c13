#include "gobs/resampling/resampling.h"

#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <iterator>

namespace krv::gobs
{

namespace
{

constexpr const char* NAMES[] = {"NEAREST", "AVERAGE", "MODE", "BILINEAR", "CUBIC", "LANCZOS", "RMS", "MIN", "MAX"};

} // namespace

Resampling ParseResampling(const std::string& name)
{
    const auto* const pFound = std::find(std::begin(NAMES), std::end(NAMES), ToUpper(name));
    if (pFound == std::end(NAMES))
        throw krv::ParameterException("The resampling method " + name + " is not known",
                                      krv::ParameterException::eInvalidValue, "name");
    return static_cast<Resampling>(pFound - std::begin(NAMES));
}

std::string GetResamplingName(Resampling eMethod)
{
    return NAMES[static_cast<int>(eMethod)];
}

unsigned int GetKernelRadius(Resampling eMethod)
{
    switch (eMethod)
    {
    case Resampling::eBilinear:
        return 1;
    case Resampling::eCubic:
        return 2;
    case Resampling::eLanczos:
        return 3;
    default:
        return 0;
    }
}

} // namespace krv::gobs
