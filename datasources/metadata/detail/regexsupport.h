#pragma once

#include <memory>
#include <string>

namespace krv::qrfutils::detail
{

// What the filters want of Boost.Regex. With ICU it takes longer to load than the rest of a small program, and hardly
// any filter has a use of it: what uses it is in libkrvregex.
struct RegexSupport
{
    // Throws boost::regex_error.
    std::shared_ptr<const void> (*mpCompile)(const std::string& pattern, bool bCaseInsensitive);

    // Whether what mpCompile made is found in the key. Throws std::runtime_error when that is too complex.
    bool (*mpSearch)(const void* pExpression, const std::string& key);
};

// The name under which libkrvregex hands it out: a function without arguments, of C linkage.
constexpr char REGEX_SUPPORT_SYMBOL[] = "krvRegexSupport";

} // namespace krv::qrfutils::detail
