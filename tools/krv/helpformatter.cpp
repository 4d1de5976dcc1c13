#include "tools/krv/helpformatter.h"

#include <sstream>

namespace krv::tool
{

namespace
{

constexpr std::size_t LEFT = 26;
constexpr std::size_t RIGHT = 96;

// Broken between words; the parser puts what follows a break below its beginning.
std::string Wrap(const std::string& text)
{
    std::string result;
    std::size_t nLine = 0;
    std::istringstream oWords(text);
    for (std::string word; oWords >> word;)
    {
        const bool bBreak = nLine != 0 && nLine + 1 + word.size() > RIGHT - LEFT;
        result += nLine == 0 ? "" : bBreak ? "\n" : " ";
        nLine = (bBreak || nLine == 0 ? 0 : nLine + 1) + word.size();
        result += word;
    }
    return result;
}

} // namespace

std::vector<std::string> GetWordsOf(const CLI::Option& oOption)
{
    const std::string type = oOption.get_type_name();
    const std::size_t nBegin = type.find('{'), nEnd = type.find('}');
    std::vector<std::string> oWords;
    if (nBegin == std::string::npos || nEnd == std::string::npos || nEnd < nBegin)
        return oWords;
    std::istringstream oList(type.substr(nBegin + 1, nEnd - nBegin - 1));
    for (std::string word; std::getline(oList, word, '|');)
        oWords.push_back(word);
    return oWords;
}

HelpFormatter::HelpFormatter()
{
    column_width(LEFT);
    label("SUBCOMMAND", "VERB");
    label("Positionals", "Arguments");
}

std::string HelpFormatter::make_option_opts(const CLI::Option* poOption) const
{
    if (poOption->get_type_size() == 0 || poOption->get_items_expected_max() == 0)
        return {};
    if (poOption->get_positional())
        return poOption->get_items_expected_max() > 2 ? " ..." : "";
    return GetWordsOf(*poOption).empty() ? " VALUE" : " WORD";
}

std::string HelpFormatter::make_option_desc(const CLI::Option* poOption) const
{
    std::string words;
    for (const std::string& word : GetWordsOf(*poOption))
        words += (words.empty() ? " One of " : ", ") + word;
    return Wrap(poOption->get_description() + (words.empty() ? "" : "." + words));
}

std::string HelpFormatter::make_footer(const CLI::App* poApp) const
{
    const std::string every = poApp->get_parent() != nullptr
                                  ? "\nEvery verb takes --threads and --verbose too: `krv --help` explains them.\n"
                                  : "";
    return Formatter::make_footer(poApp) + every;
}

std::string HelpFormatter::make_subcommand(const CLI::App* poVerb) const
{
    std::ostringstream oText;
    CLI::detail::format_help(oText, poVerb->get_name(), Wrap(poVerb->get_description()), LEFT);
    return oText.str();
}

} // namespace krv::tool
