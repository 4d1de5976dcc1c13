#include "operations/masking/polygontext.h"

#include "operations/job/exceptions.h"
#include "toolkit/core/lettercase.h"

#include <fmt/format.h>

#include <algorithm>
#include <cctype>
#include <charconv>
#include <cmath>

namespace krv::operations
{

namespace
{

using Ring = std::vector<GDBVertex>;
using Rings = std::vector<Ring>;

bool IsBlank(char c)
{
    return std::isspace(static_cast<unsigned char>(c)) != 0;
}

class WktParser
{
public:
    explicit WktParser(std::string_view text) : moText(text) {}

    void Parse(PolygonText& oResult)
    {
        for (SkipBlanks(); mnAt < moText.size(); SkipBlanks())
        {
            const std::size_t nStart = mnAt;
            std::string word = Word();
            while (word.ends_with('Z') || word.ends_with('M'))
                word.pop_back();
            if (word == "SRID" && Take('='))
                oResult.crs = fmt::format("EPSG:{}", Number());
            else if (word == "POLYGON" || word == "MULTIPOLYGON")
                Geometry(word == "MULTIPOLYGON", oResult);
            else
            {
                mnAt = nStart;
                Fail("POLYGON, MULTIPOLYGON or a GeoJSON object");
            }
            while (Take(';') || Take(','))
                ;
        }
    }

private:
    [[noreturn]] void Fail(const char* pExpected) const
    {
        throw RequestException(fmt::format("{} is expected at character {} of the polygon text, not \"{}\"", pExpected,
                                           mnAt + 1, moText.substr(std::min(mnAt, moText.size()), 20)));
    }

    void SkipBlanks()
    {
        while (mnAt < moText.size() && IsBlank(moText[mnAt]))
            ++mnAt;
    }

    bool Take(char c)
    {
        SkipBlanks();
        const bool bThere = mnAt < moText.size() && moText[mnAt] == c;
        mnAt += bThere ? 1 : 0;
        return bThere;
    }

    void Expect(char c, const char* pExpected)
    {
        if (!Take(c))
            Fail(pExpected);
    }

    std::string Word()
    {
        SkipBlanks();
        std::string word;
        for (; mnAt < moText.size() && std::isalpha(static_cast<unsigned char>(moText[mnAt])) != 0; ++mnAt)
            word += moText[mnAt];
        return krv::ToUpper(word);
    }

    double Number()
    {
        SkipBlanks();
        double nValue = 0;
        const char* const pFrom = moText.data() + mnAt;
        const auto [pEnd, eError] = std::from_chars(pFrom, moText.data() + moText.size(), nValue);
        if (eError != std::errc() || !std::isfinite(nValue))
            Fail("a number");
        mnAt += static_cast<std::size_t>(pEnd - pFrom);
        return nValue;
    }

    bool AtNumber()
    {
        SkipBlanks();
        return mnAt < moText.size() && (std::isdigit(static_cast<unsigned char>(moText[mnAt])) != 0 ||
                                        moText[mnAt] == '-' || moText[mnAt] == '.');
    }

    // Calls oMember for each member of a list in brackets.
    template <typename Member>
    void List(const Member& oMember)
    {
        Expect('(', "(");
        do
            oMember();
        while (Take(','));
        Expect(')', ", or )");
    }

    void Geometry(bool bSeveral, PolygonText& oResult)
    {
        std::string word = Word();
        if (word == "Z" || word == "M" || word == "ZM")
            word = Word();
        if (word == "EMPTY")
            return;
        const auto Polygon = [&]
        {
            Rings& oRings = oResult.polygons.emplace_back();
            List([&] { ParseRing(oRings.emplace_back()); });
        };
        if (bSeveral)
            List(Polygon);
        else
            Polygon();
    }

    void ParseRing(Ring& oRing)
    {
        List(
            [&]
            {
                const double nX = Number();
                oRing.push_back({nX, Number()});
                for (int i = 0; i < 2 && AtNumber(); ++i)
                    Number(); // height and measure
            });
    }

    std::string_view moText;
    std::size_t mnAt = 0;
};

} // namespace

PolygonText ParsePolygons(std::string_view text)
{
    PolygonText oResult;
    WktParser(text).Parse(oResult);
    return oResult;
}

} // namespace krv::operations
