#include "datasources/interfaces/metadatamap.h"

namespace krv::datasources::detail
{

namespace
{

unsigned char Fold(char nByte)
{
    const auto nValue = static_cast<unsigned char>(nByte);
    return nValue >= 'A' && nValue <= 'Z' ? static_cast<unsigned char>(nValue + ('a' - 'A')) : nValue;
}

} // namespace

bool CaseInsensitiveCompare::operator()(const std::string& oFirst, const std::string& oSecond) const
{
    // c_str() ends in a NUL, so that the shorter of two keys ends the loop.
    const char* pFirst = oFirst.c_str();
    const char* pSecond = oSecond.c_str();
    while (*pFirst != '\0' && Fold(*pFirst) == Fold(*pSecond))
    {
        ++pFirst;
        ++pSecond;
    }
    return Fold(*pFirst) < Fold(*pSecond);
}

} // namespace krv::datasources::detail
