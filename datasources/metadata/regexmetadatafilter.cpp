#include "datasources/metadata/regexmetadatafilter.h"

#include "datasources/metadata/detail/keypattern.h"
#include "datasources/metadata/detail/regexsupport.h"
#include "toolkit/core/ownlibrary.h"

#include <optional>

namespace krv::qrfutils
{

namespace
{

const detail::RegexSupport& Load()
{
    void* const pFunction = krv::core::LoadBesideOwn(reinterpret_cast<const void*>(&Load), KRV_REGEX_LIBRARY,
                                                     detail::REGEX_SUPPORT_SYMBOL, "The library for expressions");
    return *reinterpret_cast<const detail::RegexSupport* (*)()>(pFunction)();
}

const detail::RegexSupport& Support()
{
    static const detail::RegexSupport& oSupport = Load();
    return oSupport;
}

} // namespace

struct RegexMetadataFilter::Expression
{
    Expression(const std::string& pattern, bool bCaseInsensitive)
        : moPlain(detail::KeyPattern::Parse(pattern, bCaseInsensitive)),
          mpoRegex(moPlain ? nullptr : Support().mpCompile(pattern, bCaseInsensitive))
    {
    }

    std::optional<detail::KeyPattern> moPlain;
    std::shared_ptr<const void> mpoRegex; // where it is not plain
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
    return Support().mpSearch(mpoExpression->mpoRegex.get(), key);
}

} // namespace krv::qrfutils
