#include "datasources/metadata/regexmetadatafilter.h"

#include "datasources/metadata/detail/keypattern.h"

#include <boost/regex.hpp>

#include <locale>
#include <optional>

namespace krv::qrfutils
{

struct RegexMetadataFilter::Expression
{
    Expression(const std::string& pattern, bool bCaseInsensitive)
    {
        moRegex.imbue(std::locale::classic());
        moRegex.assign(pattern, bCaseInsensitive ? boost::regex::perl | boost::regex::icase : boost::regex::perl);
        moPlain = detail::KeyPattern::Parse(pattern, bCaseInsensitive);
    }

    boost::regex moRegex;
    std::optional<detail::KeyPattern> moPlain;
};

RegexMetadataFilter::RegexMetadataFilter(const std::string& pattern, bool bCaseInsensitive)
    : mpoExpression(std::make_shared<const Expression>(pattern, bCaseInsensitive))
{
}

RegexMetadataFilter::RegexMetadataFilter(const RegexMetadataFilter& oOther) = default;

RegexMetadataFilter& RegexMetadataFilter::operator=(const RegexMetadataFilter& oOther) = default;

RegexMetadataFilter::~RegexMetadataFilter() = default;

bool RegexMetadataFilter::operator()(const std::string& key, const std::string&) const
{
    if (const auto& oPlain = mpoExpression->moPlain)
        return oPlain->Search(key);
    return boost::regex_search(key, mpoExpression->moRegex);
}

} // namespace krv::qrfutils
