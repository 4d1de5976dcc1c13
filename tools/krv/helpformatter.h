#pragma once

#include <CLI/CLI.hpp>

#include <string>
#include <vector>

namespace krv::tool
{

// The words that an option takes, from "{a|b}" in its type; none for one that takes anything.
std::vector<std::string> GetWordsOf(const CLI::Option& oOption);

// Help in this command's own words: what an option takes is a list of words or VALUE, long lines are broken.
class HelpFormatter : public CLI::Formatter
{
public:
    HelpFormatter();

    std::string make_option_opts(const CLI::Option* poOption) const override;
    std::string make_option_desc(const CLI::Option* poOption) const override;
    std::string make_footer(const CLI::App* poApp) const override;
    std::string make_subcommand(const CLI::App* poVerb) const override;
};

} // namespace krv::tool
