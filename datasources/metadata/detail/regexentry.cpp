// Part of libkrvregex: what libkrvdatasources calls in it.
#include "datasources/api.h"
#include "datasources/metadata/detail/regexsupport.h"

#include <boost/regex.hpp>

#include <locale>

namespace krv::qrfutils::detail
{

namespace
{

std::shared_ptr<const void> Compile(const std::string& pattern, bool bCaseInsensitive)
{
    auto poRegex = std::make_shared<boost::regex>();
    poRegex->imbue(std::locale::classic());
    poRegex->assign(pattern, bCaseInsensitive ? boost::regex::perl | boost::regex::icase : boost::regex::perl);
    return poRegex;
}

bool Search(const void* pExpression, const std::string& key)
{
    return boost::regex_search(key, *static_cast<const boost::regex*>(pExpression));
}

} // namespace

extern "C" KRV_DATASOURCES_API const RegexSupport* krvRegexSupport()
{
    static constexpr RegexSupport SUPPORT = {&Compile, &Search};
    return &SUPPORT;
}

} // namespace krv::qrfutils::detail
