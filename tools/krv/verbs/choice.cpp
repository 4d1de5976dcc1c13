#include "toolkit/core/lettercase.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include <algorithm>

namespace krv::tool
{

CLI::Option* AddWords(CLI::App& oVerb, const std::string& name, const std::string& what,
                      const std::vector<std::string>& oWords, const std::function<void(std::size_t)>& oTake)
{
    const auto Find = [oWords](const std::string& text)
    {
        const auto oFound = std::find_if(oWords.begin(), oWords.end(),
                                         [&](const auto& word) { return krv::ToUpper(word) == krv::ToUpper(text); });
        return static_cast<std::size_t>(oFound - oWords.begin());
    };
    auto* const poOption = oVerb.add_option_function<std::string>(
        name, [Find, oTake](const std::string& text) { oTake(Find(text)); }, what);
    poOption->type_name("WORD")->check(
        [Find, oWords](const std::string& text)
        {
            return Find(text) < oWords.size() ? std::string()
                                              : fmt::format("\"{}\" is none of {}", text, fmt::join(oWords, ", "));
        },
        fmt::format("{{{}}}", fmt::join(oWords, "|")), "");
    return poOption;
}

} // namespace krv::tool
