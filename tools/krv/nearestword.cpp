#include "tools/krv/nearestword.h"

#include <algorithm>
#include <cstddef>

namespace krv::tool
{

namespace
{

constexpr std::size_t LONGEST_WORD = 64;

// Changes that lead from one word to the other; row by row, each from the two above.
std::size_t CountChanges(const std::string& one, const std::string& other)
{
    std::vector<std::size_t> oBefore(other.size() + 1), oAbove(other.size() + 1), oRow(other.size() + 1);
    for (std::size_t i = 0; i <= other.size(); ++i)
        oAbove[i] = i;
    for (std::size_t n = 1; n <= one.size(); ++n)
    {
        oRow[0] = n;
        for (std::size_t i = 1; i <= other.size(); ++i)
        {
            oRow[i] = std::min({oAbove[i] + 1, oRow[i - 1] + 1, oAbove[i - 1] + (one[n - 1] == other[i - 1] ? 0 : 1)});
            if (n > 1 && i > 1 && one[n - 1] == other[i - 2] && one[n - 2] == other[i - 1])
                oRow[i] = std::min(oRow[i], oBefore[i - 2] + 1);
        }
        std::swap(oBefore, oAbove);
        std::swap(oAbove, oRow);
    }
    return oAbove.back();
}

} // namespace

std::string FindNearestWord(const std::string& word, const std::vector<std::string>& oWords)
{
    if (word.size() > LONGEST_WORD)
        return {};
    std::string nearest;
    std::size_t nFewest = word.size() / 3 + 2;
    for (const std::string& other : oWords)
    {
        const std::size_t nChanges = CountChanges(word, other);
        if (nChanges < nFewest)
        {
            nFewest = nChanges;
            nearest = other;
        }
    }
    return nearest;
}

} // namespace krv::tool
