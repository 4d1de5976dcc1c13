#include "datasources/metadata/metadatafilters.h"

#include "toolkit/exceptions/exceptions.h"

#include <boost/regex.hpp>
#include <gtest/gtest.h>

#include <memory>
#include <random>
#include <vector>

namespace krv::qrfutils
{

namespace
{

using Filter = std::unique_ptr<IMetadataFilter>;

bool Selects(const IMetadataFilter& oFilter, const std::string& key)
{
    return oFilter(key, "value");
}

// Answers as told, and counts the questions and the living.
class ProbeFilter : public IMetadataFilter
{
public:
    explicit ProbeFilter(bool bAnswer) : mbAnswer(bAnswer) { ++snAlive; }
    ~ProbeFilter() override { --snAlive; }

    bool operator()(const std::string& key, const std::string& value) const override
    {
        ++snAsked;
        EXPECT_EQ(key + "=" + value, "Key=value");
        return mbAnswer;
    }

    static int snAlive;
    static int snAsked;

private:
    bool mbAnswer;
};

int ProbeFilter::snAlive = 0;
int ProbeFilter::snAsked = 0;

template <class Logical>
void ExpectLogical(const std::vector<bool>& oAnswers, bool bExpected, int nAsked)
{
    ProbeFilter::snAsked = 0;
    {
        Logical oFilter;
        for (const bool bAnswer : oAnswers)
            oFilter.PushBack(new ProbeFilter(bAnswer));
        EXPECT_EQ(Selects(oFilter, "Key"), bExpected);
    }
    EXPECT_EQ(ProbeFilter::snAsked, nAsked);
    EXPECT_EQ(ProbeFilter::snAlive, 0);
}

struct WildcardCase
{
    const char* mpWildcard;
    bool mbCaseInsensitive;
    std::vector<std::string> moSelected;
    std::vector<std::string> moDeclined;
};

std::string RandomText(std::mt19937& oRandom, const std::string& alphabet, std::size_t nMaximum)
{
    std::string text(oRandom() % (nMaximum + 1), ' ');
    for (char& cByte : text)
        cByte = alphabet[oRandom() % alphabet.size()];
    return text;
}

} // namespace

TEST(LogicalFilters, StopAtTheFirstDecidingChild)
{
    ExpectLogical<LogicalAndFilter>({}, true, 0);
    ExpectLogical<LogicalAndFilter>({true, true}, true, 2);
    ExpectLogical<LogicalAndFilter>({true, false, true}, false, 2);
    ExpectLogical<LogicalOrFilter>({}, false, 0);
    ExpectLogical<LogicalOrFilter>({false, false}, false, 2);
    ExpectLogical<LogicalOrFilter>({false, true, false}, true, 2);
}

TEST(MetadataFilters, WildcardsMatchWholeKeys)
{
    const WildcardCase CASES[] = {
        {"TIFFType", false, {"TIFFType"}, {"tifftype", "TIFFType2", "xTIFFType", ""}},
        {"TIFFType", true, {"tifftype", "TIFFTYPE"}, {"TIFFType2"}},
        {"a.b", false, {"a.b"}, {"axb", "a..b"}},
        {"*", false, {"", "anything", "a\nb"}, {}},
        {"**", false, {"", "anything"}, {}},
        {"Histogram_*", false, {"Histogram_", "Histogram_Red"}, {"Histogram", "histogram_", "xHistogram_"}},
        {"*_REF", false, {"_REF", "DEFAULT_LUT_REF"}, {"_REFx", "REF", "_ref"}},
        {"a*b", false, {"ab", "axxb", "abb"}, {"a", "b", "abc", "ba"}},
        {"a+(b)|[c]?^$", false, {"a+(b)|[c]?^$"}, {"aab", "a", "c"}},
        {"$^.{(+)|?\\", false, {"$^.{(+)|?\\"}, {"$^.{(+)|?"}},
        {"[c]", false, {"[c]"}, {"c"}},
        {"{c}", false, {"{c}"}, {"c"}},
        {"a<b", false, {}, {"a<b", "ab"}}, // < and > became word boundaries
        {"<a>", false, {"a"}, {"<a>"}},
        {"Key", false, {"Key\nmore", "first\r\nKey"}, {"Key more"}}, // anchors hold at line breaks
    };
    for (const WildcardCase& oCase : CASES)
    {
        const Filter oFilter(GetMetadataFilter(oCase.mpWildcard, oCase.mbCaseInsensitive));
        for (const std::string& key : oCase.moSelected)
            EXPECT_TRUE(Selects(*oFilter, key)) << oCase.mpWildcard << " on " << key;
        for (const std::string& key : oCase.moDeclined)
            EXPECT_FALSE(Selects(*oFilter, key)) << oCase.mpWildcard << " on " << key;
    }
}

TEST(MetadataFilters, RegularExpressionsSearchWithinTheKey)
{
    EXPECT_TRUE(Selects(*Filter(GetMetadataFilterRegEx("Overview", false)), "_Overview_2"));
    EXPECT_FALSE(Selects(*Filter(GetMetadataFilterRegEx("overview", false)), "_Overview_2"));
    EXPECT_TRUE(Selects(*Filter(GetMetadataFilterRegEx("overview", true)), "_Overview_2"));
    EXPECT_TRUE(Selects(*Filter(GetMetadataFilterRegEx("\\<View\\>", true)), "my view 2"));
    for (const char* pBroken : {"(", "[", "a{2,1}", "*", "(?<", "a\\"})
        EXPECT_THROW(GetMetadataFilterRegEx(pBroken, false), boost::regex_error) << pBroken;
}

TEST(MetadataFilters, CategoriesSelectTheirTags)
{
    struct Case
    {
        unsigned long long mnCategories;
        std::vector<const char*> moSelected;
        std::vector<const char*> moDeclined;
    };
    const Case CASES[] = {{0, {"_anything", "_", "TiffType"}, {"a_", "MyDefaultRedChannel", "defaultgray", "Extents"}},
                          {1,
                           {"Histogram_1", "layer_crc", "SAR_Quantity", "MD_IncidentAngle_Scale",
                            "MD_IncidentAngle_Shift", "joins", "Matrix_Type", "NumRangeLooks", "NumAzimuthLooks"},
                           {"NumAzimuthLooks2", "x_REF"}},
                          {2, {"extents"}, {"Extents_Old"}},
                          {4, {"Extents"}, {"Extents_Old"}},
                          {8, {"default_lut_ref", "JoinTable"}, {"LAYER_CRC"}},
                          {16, {"MyDefaultRedChannel", "defaultgray", "_x"}, {"DefaultGrey"}},
                          {~31ull, {}, {"Extents"}},
                          {~0ull, {"Extents"}, {}}};
    for (const Case& oCase : CASES)
    {
        const Filter oFilter(GetMetadataFilter(oCase.mnCategories));
        for (const char* pKey : oCase.moSelected)
            EXPECT_TRUE(Selects(*oFilter, pKey)) << oCase.mnCategories << " on " << pKey;
        for (const char* pKey : oCase.moDeclined)
            EXPECT_FALSE(Selects(*oFilter, pKey)) << oCase.mnCategories << " on " << pKey;
    }
    const Filter oFilter(GetMetadataFilter(eGeocodingTags | eDisplayDefaultTags));
    EXPECT_TRUE(Selects(*oFilter, "Extents") && Selects(*oFilter, "DefaultRed"));
}

TEST(MetadataFilters, PlainExpressionsAnswerAsBoostDoes)
{
    const std::string KEYS("aAbB_.\\\n\r\f\0\xE4\xC4]}17", 17);
    const std::string PIECES[] = {"a", "B", "_", ".*", ".*", "\\.", "\\\\", "\\$", "\n", "\r", "\xC4", "ab", "]", "}"};
    const unsigned int nSeed = 20240607;
    std::mt19937 oRandom(nSeed);
    for (int nRound = 0; nRound < 4000; ++nRound)
    {
        std::string pattern = oRandom() % 2 == 0 ? "^" : "";
        for (std::size_t n = oRandom() % 5; n > 0; --n)
            pattern += PIECES[oRandom() % std::size(PIECES)];
        pattern += oRandom() % 4 == 0 ? "[0-9]+" : "";
        pattern += oRandom() % 2 == 0 ? "$" : "";
        const bool bFold = oRandom() % 2 == 0;
        const RegexMetadataFilter oFilter(pattern, bFold);
        const boost::regex oExpected(pattern, bFold ? boost::regex::perl | boost::regex::icase : boost::regex::perl);
        for (int nKey = 0; nKey < 20; ++nKey)
        {
            const std::string key = RandomText(oRandom, KEYS, 8);
            ASSERT_EQ(Selects(oFilter, key), boost::regex_search(key, oExpected))
                << "seed " << nSeed << " round " << nRound << " pattern " << testing::PrintToString(pattern) << " key "
                << testing::PrintToString(key);
        }
    }
}

TEST(MetadataFilters, HostileKeysAndPatternsNeitherHangNorCrash)
{
    const std::string LONG(4 << 20, 'a');
    const Filter oCategories(GetMetadataFilter(31));
    EXPECT_FALSE(Selects(*oCategories, LONG));
    EXPECT_TRUE(Selects(*oCategories, LONG + "_REF"));
    EXPECT_FALSE(Selects(*oCategories, LONG + "_REF" + LONG));
    EXPECT_TRUE(Selects(*oCategories, std::string("_\0\xFF", 3)));

    const std::string wildcard(std::string(1 << 16, 'a') + "b");
    EXPECT_FALSE(Selects(*Filter(GetMetadataFilter("*" + wildcard, true)), LONG));
    EXPECT_TRUE(Selects(*Filter(GetMetadataFilter("*" + wildcard, true)), LONG + "B"));
    EXPECT_TRUE(Selects(*Filter(GetMetadataFilter(std::string(1000, '*'), true)), LONG));

    const Filter oNumbered(GetMetadataFilterRegEx("^_Overview_[0-9]+$", false));
    EXPECT_TRUE(Selects(*oNumbered, "_Overview_" + std::string(4 << 20, '7')));
    EXPECT_FALSE(Selects(*oNumbered, "_Overview_" + std::string(4 << 20, '7') + "x"));

    // Boost gives up on nested repeats by an exception of its own.
    EXPECT_THROW(Selects(*Filter(GetMetadataFilterRegEx("(a*)*(a*)*b", false)), LONG), std::runtime_error);
    EXPECT_THROW(Selects(*Filter(GetMetadataFilterRegEx("(a|aa)+$", false)), std::string(5000, 'a') + "b"),
                 std::runtime_error);
    EXPECT_THROW(GetMetadataFilterRegEx(std::string(100000, '('), false), boost::regex_error);
}

} // namespace krv::qrfutils
