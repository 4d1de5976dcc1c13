#include "gobs/pct/pct.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cmath>
#include <string>

namespace krv::gobs
{

namespace
{

// 65535 / 255: an 8-bit part v is 257 * v in 16 bits.
constexpr unsigned int STEP = 257;

std::uint16_t Widen(unsigned char nPart)
{
    return static_cast<std::uint16_t>(nPart * STEP);
}

unsigned char Narrow(std::uint16_t nPart)
{
    return static_cast<unsigned char>((nPart + STEP / 2) / STEP);
}

double CentreOf(const PCT::Entry& oEntry)
{
    return oEntry.low / 2 + oEntry.high / 2;
}

std::uint16_t Between(std::uint16_t nFrom, std::uint16_t nTo, double nShare)
{
    return static_cast<std::uint16_t>(std::lround(nFrom + (static_cast<double>(nTo) - nFrom) * nShare));
}

bool StartsBefore(double nValue, const PCT::Entry& oEntry)
{
    return nValue < oEntry.low;
}

} // namespace

PCT PCT::FromColours(const std::vector<RGBTuple<std::uint16_t>>& oColours)
{
    PCT oTable;
    oTable.moEntries.reserve(oColours.size());
    for (const RGBTuple<std::uint16_t>& oColour : oColours)
    {
        const auto nIndex = static_cast<double>(oTable.moEntries.size());
        oTable.moEntries.push_back({nIndex, nIndex + 1, oColour});
    }
    return oTable;
}

void PCT::Add(const Entry& oEntry)
{
    if (!(oEntry.low < oEntry.high))
        throw ParameterException("A range of a colour table must go from a lower to a higher value",
                                 ParameterException::eInvalidValue, "oEntry");
    const auto oNext = std::upper_bound(moEntries.begin(), moEntries.end(), oEntry.low, StartsBefore);
    if ((oNext != moEntries.end() && oNext->low < oEntry.high) ||
        (oNext != moEntries.begin() && std::prev(oNext)->high > oEntry.low))
        throw ParameterException("The range from " + std::to_string(oEntry.low) + " to " + std::to_string(oEntry.high) +
                                     " overlaps another of the colour table",
                                 ParameterException::eInvalidValue, "oEntry");
    moEntries.insert(oNext, oEntry);
}

const PCT::Entry* PCT::Find(double nValue) const
{
    if (std::isnan(nValue) || moEntries.empty())
        return nullptr;
    const auto oNext = std::upper_bound(moEntries.begin(), moEntries.end(), nValue, StartsBefore);
    return oNext == moEntries.begin() ? &moEntries.front() : &*std::prev(oNext);
}

RGBTuple<unsigned char> PCT::GetValue(double nValue) const
{
    unsigned char nAlpha = 0;
    return GetValue(nValue, nAlpha);
}

RGBTuple<unsigned char> PCT::GetValue(double nValue, unsigned char& nAlpha) const
{
    std::uint16_t nWideAlpha = 0;
    const RGBTuple<std::uint16_t> oColour = GetValue16(nValue, nWideAlpha);
    nAlpha = Narrow(nWideAlpha);
    return {Narrow(oColour.red), Narrow(oColour.green), Narrow(oColour.blue)};
}

RGBTuple<std::uint16_t> PCT::GetValue16(double nValue, std::uint16_t& nAlpha) const
{
    const Entry* poEntry = Find(nValue);
    if (poEntry == nullptr)
    {
        nAlpha = 0;
        return {Widen(moBackground.red), Widen(moBackground.green), Widen(moBackground.blue)};
    }
    nAlpha = poEntry->alpha;
    if (!mbInterpolate || !std::isfinite(nValue))
        return poEntry->colour;

    const bool bBelowCentre = nValue < CentreOf(*poEntry);
    if (poEntry == (bBelowCentre ? &moEntries.front() : &moEntries.back()))
        return poEntry->colour;
    const Entry* poOther = bBelowCentre ? poEntry - 1 : poEntry + 1;
    const double nShare = (nValue - CentreOf(*poEntry)) / (CentreOf(*poOther) - CentreOf(*poEntry));
    if (!std::isfinite(nShare))
        return poEntry->colour;
    nAlpha = Between(poEntry->alpha, poOther->alpha, nShare);
    return {Between(poEntry->colour.red, poOther->colour.red, nShare),
            Between(poEntry->colour.green, poOther->colour.green, nShare),
            Between(poEntry->colour.blue, poOther->colour.blue, nShare)};
}

bool PCT::HasAlpha() const
{
    return std::any_of(moEntries.begin(), moEntries.end(), [](const Entry& oEntry) { return oEntry.alpha != 65535; });
}

} // namespace krv::gobs
