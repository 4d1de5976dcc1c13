#include "datasources/metadata/metadatafilters.h"

#include <memory>
#include <string_view>
#include <vector>

namespace krv::qrfutils
{

namespace
{

// Pairs: a character, and what is put in front of it. The backslash comes first, so that later ones are not doubled.
constexpr std::string_view ESCAPES = R"(\\^\[\.\$\{\(\+\)\|\?\<\>\*.)";
static_assert(ESCAPES.size() == 28);

constexpr const char* DISPLAY_DEFAULTS = "Default(Red|Green|Blue|Gray)";

const std::vector<std::string>& PixelValueWildcards()
{
    static const std::vector<std::string> WILDCARDS = {
        "Histogram_*", "LAYER_CRC",   "SAR_Quantity",  "MD_IncidentAngle_Scale", "MD_IncidentAngle_Shift",
        "Join*",       "Matrix_Type", "NumRangeLooks", "NumAzimuthLooks"};
    return WILDCARDS;
}

char Prefix(char cFound)
{
    for (std::size_t n = 0; n < ESCAPES.size(); n += 2)
    {
        if (ESCAPES[n] == cFound)
            return ESCAPES[n + 1];
    }
    return '\0';
}

std::string WildcardToRegEx(const std::string& wildcard)
{
    std::string pattern;
    if (!wildcard.starts_with('*'))
        pattern += '^';
    for (const char cFound : wildcard)
    {
        if (const char cPrefix = Prefix(cFound); cPrefix != '\0')
            pattern += cPrefix;
        pattern += cFound;
    }
    if (!wildcard.ends_with('*'))
        pattern += '$';
    return pattern;
}

void AddWildcard(LogicalOrFilter& oFilter, const std::string& wildcard)
{
    oFilter.PushBack(GetMetadataFilter(wildcard, true));
}

} // namespace

IMetadataFilter* GetMetadataFilterRegEx(const std::string& pattern, bool bCaseInsensitive)
{
    return new RegexMetadataFilter(pattern, bCaseInsensitive);
}

IMetadataFilter* GetMetadataFilter(const std::string& wildcard, bool bCaseInsensitive)
{
    return new RegexMetadataFilter(WildcardToRegEx(wildcard), bCaseInsensitive);
}

LogicalOrFilter* GetMetadataFilter(unsigned long long nCategories)
{
    auto poFilter = std::make_unique<LogicalOrFilter>();
    AddWildcard(*poFilter, "_*");
    AddWildcard(*poFilter, "TIFFType");
    if ((nCategories & eReferenceTags) != 0)
    {
        AddWildcard(*poFilter, "*_REF");
        AddWildcard(*poFilter, "Join*");
    }
    if ((nCategories & (eGeocodingTags | eImageSizeTags)) != 0)
        AddWildcard(*poFilter, "Extents");
    if ((nCategories & ePixelValueTags) != 0)
    {
        for (const std::string& wildcard : PixelValueWildcards())
            AddWildcard(*poFilter, wildcard);
    }
    if ((nCategories & eDisplayDefaultTags) != 0)
        poFilter->PushBack(GetMetadataFilterRegEx(DISPLAY_DEFAULTS, true));
    return poFilter.release();
}

} // namespace krv::qrfutils
