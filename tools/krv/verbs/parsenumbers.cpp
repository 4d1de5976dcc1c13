#include "tools/krv/errors.h"
#include "tools/krv/verbs/verbs.h"

#include <charconv>
#include <limits>
#include <string>

namespace krv::tool
{

std::vector<unsigned int> ParseNumbers(const std::string& text, const std::string& option)
{
    std::vector<unsigned int> oNumbers;
    const char* pAt = text.data();
    const char* const pEnd = pAt + text.size();
    while (pAt != pEnd)
    {
        unsigned int nNumber = 0;
        const auto [pNext, eError] = std::from_chars(pAt, pEnd, nNumber);
        const bool bLast = pNext == pEnd;
        if (eError == std::errc::result_out_of_range)
            throw UsageError(option + ": \"" + text + "\" holds a number above " +
                             std::to_string(std::numeric_limits<unsigned int>::max()) + "; give smaller ones");
        if (eError != std::errc() || (!bLast && (*pNext != ',' || pNext + 1 == pEnd)))
            throw UsageError(option + ": \"" + text + "\" is no list of numbers such as 1,2,3");
        oNumbers.push_back(nNumber);
        pAt = bLast ? pEnd : pNext + 1;
    }
    return oNumbers;
}

} // namespace krv::tool
