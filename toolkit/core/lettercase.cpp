#include "toolkit/core/lettercase.h"

namespace krv
{

std::string ToUpper(std::string_view text)
{
    std::string upper(text);
    for (char& nCharacter : upper)
        if (nCharacter >= 'a' && nCharacter <= 'z')
            nCharacter = static_cast<char>(nCharacter - 'a' + 'A');
    return upper;
}

std::string ToLower(std::string_view text)
{
    std::string lower(text);
    for (char& nCharacter : lower)
        if (nCharacter >= 'A' && nCharacter <= 'Z')
            nCharacter = static_cast<char>(nCharacter - 'A' + 'a');
    return lower;
}

} // namespace krv
