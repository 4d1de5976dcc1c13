#include "tools/krv/errors.h"
#include "tools/krv/verbs/verbs.h"

#include <charconv>
#include <limits>
#include <string>
#include <string_view>

namespace krv::tool
{

namespace
{

constexpr std::size_t MOST_NUMBERS = 65536;

// The number that a text begins with, which is taken off it.
unsigned int TakeNumber(std::string_view& rest, const std::string& text, const std::string& option)
{
    unsigned int nNumber = 0;
    const auto [pNext, eError] = std::from_chars(rest.data(), rest.data() + rest.size(), nNumber);
    if (eError == std::errc::result_out_of_range)
        throw UsageError(option + ": \"" + text + "\" holds a number above " +
                         std::to_string(std::numeric_limits<unsigned int>::max()) + "; give smaller ones");
    if (eError != std::errc())
        throw UsageError(option + ": \"" + text + "\" is no list of numbers such as 1,2,3 or 1-3");
    rest.remove_prefix(static_cast<std::size_t>(pNext - rest.data()));
    return nNumber;
}

} // namespace

std::vector<unsigned int> ParseNumbers(const std::string& text, const std::string& option)
{
    std::vector<unsigned int> oNumbers;
    std::string_view rest = text;
    while (!rest.empty())
    {
        const unsigned int nFirst = TakeNumber(rest, text, option);
        unsigned int nLast = nFirst;
        if (rest.starts_with('-'))
        {
            rest.remove_prefix(1);
            nLast = TakeNumber(rest, text, option);
        }
        if (nLast < nFirst)
            throw UsageError(option + ": \"" + text + "\" holds a range that does not count upwards");
        if (nLast - nFirst >= MOST_NUMBERS)
            throw UsageError(option + ": \"" + text + "\" holds a range of more than " + std::to_string(MOST_NUMBERS) +
                             " numbers");
        for (unsigned int n = nFirst; n - nFirst <= nLast - nFirst; ++n)
            oNumbers.push_back(n);
        if (!rest.empty() && (rest.front() != ',' || rest.size() == 1))
            throw UsageError(option + ": \"" + text + "\" is no list of numbers such as 1,2,3 or 1-3");
        rest.remove_prefix(rest.empty() ? 0 : 1);
    }
    return oNumbers;
}

} // namespace krv::tool
