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

} // namespace krv
