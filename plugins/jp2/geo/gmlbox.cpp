#include "plugins/jp2/geo/gmlbox.h"

#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/xml/xmltree.h"

#include <array>
#include <cmath>
#include <sstream>
#include <string_view>
#include <vector>

namespace krv::plugins::jp2
{

namespace
{

using krv::ogc::cs::GeocodingInfo;
using krv::xml::Element;
using Pair = std::array<double, 2>;

std::string_view LocalName(const Element& oElement)
{
    const std::string_view name = oElement.name;
    return name.substr(name.find(':') == std::string_view::npos ? 0 : name.find(':') + 1);
}

const Element* FindFirst(const Element& oElement, std::string_view name)
{
    if (LocalName(oElement) == name)
        return &oElement;
    for (const Element& oChild : oElement.children)
        if (const Element* const pFound = FindFirst(oChild, name))
            return pFound;
    return nullptr;
}

// Two numbers, separated by blanks or a comma.
std::optional<Pair> ParsePair(std::string text)
{
    for (char& nLetter : text)
        if (nLetter == ',')
            nLetter = ' ';
    std::istringstream oWords(text);
    Pair oPair{};
    for (double& nNumber : oPair)
    {
        std::string word;
        oWords >> word;
        const std::optional<double> oNumber = ParseNumber<double>(word);
        if (!oNumber || !std::isfinite(*oNumber))
            return std::nullopt;
        nNumber = *oNumber;
    }
    return oPair;
}

// "urn:ogc:def:crs:EPSG::32633", "http://www.opengis.net/gml/srs/epsg.xml#32633", "EPSG:32633".
int FindCode(const std::string& name)
{
    const auto Is = [](char nFirst, char nSecond)
    {
        return (nFirst | 32) == nSecond;
    };
    for (std::size_t nAt = 0; nAt + 4 < name.size(); ++nAt)
    {
        if (!Is(name[nAt], 'e') || !Is(name[nAt + 1], 'p') || !Is(name[nAt + 2], 's') || !Is(name[nAt + 3], 'g'))
            continue;
        const auto nDigits = name.find_last_not_of("0123456789");
        return ParseNumber<int>(std::string_view(name).substr(nDigits == std::string::npos ? 0 : nDigits + 1))
            .value_or(0);
    }
    return 0;
}

const std::string* FindSystem(const Element& oElement)
{
    if (const std::string* const pName = oElement.FindAttribute("srsName"))
        return pName;
    for (const Element& oChild : oElement.children)
        if (const std::string* const pName = FindSystem(oChild))
            return pName;
    return nullptr;
}

// Whether the first number of a pair is the one to the north.
bool IsNorthFirst(const Pair& oPerColumn, const Pair& oPerRow, int nEPSG)
{
    if (oPerColumn[0] == 0 && oPerRow[1] == 0)
        return true;
    if (oPerColumn[1] == 0 && oPerRow[0] == 0)
        return false;
    try
    {
        return nEPSG != 0 && krv::ogc::cs::CreateCRSFromEPSG(nEPSG)->IsGeographic();
    }
    catch (const krv::DataException&)
    {
        return false;
    }
}

} // namespace

GmlGrid ParseGml(const std::string& text, const std::string& name)
{
    const Element oRoot = krv::xml::ParseTree(text.data(), text.size(), name);
    GmlGrid oGrid;
    const Element* const pGrid = FindFirst(oRoot, "RectifiedGrid");
    const Element& oFrom = pGrid != nullptr ? *pGrid : oRoot;
    const std::string* pSystem = FindSystem(oFrom);
    if (pSystem == nullptr)
        pSystem = FindSystem(oRoot);
    if (pSystem != nullptr)
        oGrid.mnEPSG = FindCode(*pSystem);
    if (pGrid == nullptr)
        return oGrid;
    const Element* const pOrigin = FindFirst(*pGrid, "origin");
    const Element* pPosition = pOrigin != nullptr ? FindFirst(*pOrigin, "pos") : nullptr;
    if (pPosition == nullptr && pOrigin != nullptr)
        pPosition = FindFirst(*pOrigin, "coordinates");
    std::vector<Pair> oVectors;
    for (const Element& oChild : pGrid->children)
        if (LocalName(oChild) == "offsetVector")
            if (const auto oPair = ParsePair(oChild.text))
                oVectors.push_back(*oPair);
    const std::optional<Pair> oOrigin = pPosition != nullptr ? ParsePair(pPosition->text) : std::nullopt;
    if (!oOrigin || oVectors.size() != 2)
        return oGrid;
    const Pair& oPerColumn = oVectors[0];
    const Pair& oPerRow = oVectors[1];
    const std::size_t nX = IsNorthFirst(oPerColumn, oPerRow, oGrid.mnEPSG) ? 1 : 0;
    const std::size_t nY = 1 - nX;
    constexpr double HALF_PIXEL = 0.5;
    const GeocodingInfo oInfo((*oOrigin)[nX] - HALF_PIXEL * (oPerColumn[nX] + oPerRow[nX]), oPerColumn[nX], oPerRow[nX],
                              (*oOrigin)[nY] - HALF_PIXEL * (oPerColumn[nY] + oPerRow[nY]), oPerColumn[nY],
                              oPerRow[nY]);
    if (oInfo.IsInvertible())
        oGrid.moGeocoding = oInfo;
    return oGrid;
}

} // namespace krv::plugins::jp2
