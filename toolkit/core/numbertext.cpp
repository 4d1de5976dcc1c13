#include "toolkit/core/numbertext.h"

namespace krv
{

std::string NumberText(double nValue)
{
    char aText[32];
    return std::string(aText, std::to_chars(aText, aText + sizeof aText, nValue).ptr);
}

} // namespace krv
