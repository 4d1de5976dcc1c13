#pragma once

#include "datasources/metadata/imetadatafilter.h"

#include <memory>

namespace krv::qrfutils
{

// Selects the entries in whose key a regular expression is found anywhere (anchors decide otherwise); the value takes
// no part. Perl syntax of Boost.Regex with its default flags: ^ and $ match at line breaks inside a key too, \< and \>
// are word boundaries. Letters fold by the classic locale. Copies share the compiled expression.
// Any thread. Example: "^band_[0-9]+$" selects "band_4".
class KRV_DATASOURCES_API RegexMetadataFilter : public IMetadataFilter
{
public:
    // Throws boost::regex_error for a pattern that does not compile. Boost.Regex is loaded with the first pattern that
    // is more than plain text between anchors and ".*": krv::LibraryException when it cannot be.
    RegexMetadataFilter(const std::string& pattern, bool bCaseInsensitive);
    RegexMetadataFilter(const RegexMetadataFilter& oOther);
    RegexMetadataFilter& operator=(const RegexMetadataFilter& oOther);
    ~RegexMetadataFilter() override;

    // Throws std::runtime_error or its kind boost::regex_error when the expression is too complex for the key (nested
    // repeats). Patterns that are plain text between anchors and ".*" never are: they take time linear in the length of
    // the key.
    bool operator()(const std::string& key, const std::string& value) const override;

private:
    struct Expression;

    std::shared_ptr<const Expression> mpoExpression;
};

} // namespace krv::qrfutils
