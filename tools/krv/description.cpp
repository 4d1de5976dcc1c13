#include "tools/krv/description.h"

#include "tools/krv/errors.h"
#include "tools/krv/helpformatter.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include <algorithm>
#include <sstream>
#include <vector>

namespace krv::tool
{

namespace
{

// What man takes for its own: a backslash, a minus that is to be copied, a point or quote at the beginning of a line.
std::string Roff(const std::string& text)
{
    std::string result;
    for (const char c : text)
    {
        if (c == '\\')
            result += "\\e";
        else if (c == '-')
            result += "\\-";
        else
            result += c;
    }
    return result.starts_with('.') || result.starts_with('\'') ? "\\&" + result : result;
}

// Lines as they are, those of examples too.
std::string Lines(const std::string& text)
{
    std::string result;
    std::istringstream oLines(text);
    for (std::string line; std::getline(oLines, line);)
        result += line.empty() ? ".PP\n" : Roff(line) + "\n";
    return result;
}

std::vector<const CLI::App*> ListVerbs(const CLI::App& oApp)
{
    const auto oVerbs = oApp.get_subcommands([](const CLI::App* poVerb) { return !poVerb->get_group().empty(); });
    return {oVerbs.begin(), oVerbs.end()};
}

// Whether a user is told of it.
bool IsShown(const CLI::Option& oOption)
{
    return !oOption.get_group().empty();
}

bool TakesValue(const CLI::Option& oOption)
{
    return oOption.get_items_expected_max() > 0 && oOption.get_type_size_max() > 0;
}

std::vector<std::string> NamesOf(const CLI::Option& oOption)
{
    std::vector<std::string> oNames;
    for (const std::string& name : oOption.get_snames())
        oNames.push_back("-" + name);
    for (const std::string& name : oOption.get_lnames())
        oNames.push_back("--" + name);
    return oNames;
}

std::string OptionText(const CLI::Option& oOption)
{
    const std::vector<std::string> oWords = GetWordsOf(oOption);
    std::string text = ".TP\n\\fB" + Roff(fmt::format("{}", fmt::join(NamesOf(oOption), ", "))) + "\\fR";
    if (TakesValue(oOption))
        text +=
            " \\fI" + Roff(oWords.empty() ? std::string("VALUE") : fmt::format("{}", fmt::join(oWords, "|"))) + "\\fR";
    return text + "\n" + Lines(oOption.get_description());
}

std::string OptionsText(const CLI::App& oApp)
{
    std::string positional, named;
    for (const CLI::Option* const poOption : oApp.get_options())
    {
        if (!IsShown(*poOption))
            continue;
        if (poOption->get_positional())
            positional += ".TP\n\\fI" + Roff(poOption->get_name(true)) + "\\fR\n" + Lines(poOption->get_description());
        else
            named += OptionText(*poOption);
    }
    return (positional.empty() ? "" : ".SH ARGUMENTS\n" + positional) + (named.empty() ? "" : ".SH OPTIONS\n" + named);
}

std::string PlacesText(const CLI::App& oVerb)
{
    std::string text;
    for (const CLI::Option* const poOption : oVerb.get_options())
        if (poOption->get_positional())
        {
            const std::string name = poOption->get_name(true);
            text += (poOption->get_required() ? " " + name : " [" + name + "]") +
                    (poOption->get_items_expected_max() > 2 ? "..." : "");
        }
    return text;
}

std::string Heading(const std::string& name, const std::string& what, const std::string& version)
{
    return fmt::format(".TH {} 1 \"\" \"krv {}\"\n.SH NAME\n{} \\- {}\n", name, version, Roff(name), Roff(what));
}

std::string FooterText(const CLI::App& oApp)
{
    const std::string footer = oApp.get_footer();
    return footer.empty() ? "" : ".SH NOTES\n.nf\n" + Lines(footer) + ".fi\n";
}

// A verb's options and those that every verb takes, each once for each of its names.
std::vector<const CLI::Option*> ListNamed(const CLI::App& oApp, const CLI::App* poVerb)
{
    std::vector<const CLI::Option*> oOptions;
    for (const CLI::App* const poOne : {poVerb, &oApp})
    {
        if (poOne == nullptr)
            continue;
        for (const CLI::Option* const poOption : poOne->get_options())
            if (IsShown(*poOption) && !poOption->get_positional() &&
                !(poOne == &oApp && poVerb != nullptr && poOption->check_lname("version")) &&
                !(poOne == &oApp && poVerb != nullptr && poOption->check_lname("help")))
                oOptions.push_back(poOption);
    }
    return oOptions;
}

std::string NameList(const std::vector<const CLI::Option*>& oOptions)
{
    std::vector<std::string> oNames;
    for (const CLI::Option* const poOption : oOptions)
        for (const std::string& name : NamesOf(*poOption))
            if (name.starts_with("--"))
                oNames.push_back(name);
    return fmt::format("{}", fmt::join(oNames, " "));
}

// Prints the short names of the formats, as a shell does.
constexpr char LIST_FORMATS[] = "krv formats 2>/dev/null | sed -n '2,/^$/s/ .*//p'";
constexpr char TYPES[] = "8U 8S 16U 16S 32U 32S 32R 64U 64S 64R C16U C16S C32S C32R C64R promoted";

bool HasName(const CLI::Option& oOption, const std::vector<std::string>& oNames)
{
    return std::ranges::any_of(oNames, [&](const std::string& name) { return oOption.check_lname(name); });
}

// What a shell may offer behind an option.
enum class Offer
{
    eWords,
    eFormats,
    eFiles,
    eNothing
};

Offer OfferOf(const CLI::Option& oOption)
{
    if (!GetWordsOf(oOption).empty() || HasName(oOption, {"type"}))
        return Offer::eWords;
    if (HasName(oOption, {"format"}))
        return Offer::eFormats;
    return HasName(oOption, {"add", "crs", "home", "like", "png", "polygon"}) ? Offer::eFiles : Offer::eNothing;
}

std::string WordsText(const CLI::Option& oOption)
{
    const std::vector<std::string> oWords = GetWordsOf(oOption);
    return oWords.empty() ? TYPES : fmt::format("{}", fmt::join(oWords, " "));
}

std::string BashReply(const std::string& words)
{
    return fmt::format("COMPREPLY=($(compgen -W \"{}\" -- \"$word\")); return", words);
}

std::string BashOffer(const CLI::Option& oOption)
{
    switch (OfferOf(oOption))
    {
    case Offer::eWords:
        return BashReply(WordsText(oOption));
    case Offer::eFormats:
        return BashReply(fmt::format("$({})", LIST_FORMATS));
    case Offer::eFiles:
        return "return";
    default:
        return "compopt +o default 2>/dev/null; return";
    }
}

// What follows an option: its words, a file name, or nothing that could be told.
std::string BashValues(const CLI::App& oApp, const CLI::App& oVerb)
{
    std::string cases;
    for (const CLI::Option* const poOption : ListNamed(oApp, &oVerb))
        if (TakesValue(*poOption))
            cases += fmt::format("            {}) {} ;;\n", fmt::join(NamesOf(*poOption), "|"), BashOffer(*poOption));
    return cases.empty() ? "" : "            case \"$before\" in\n" + cases + "            esac\n";
}

std::string MakeBashCompletion(const CLI::App& oApp)
{
    std::vector<std::string> oNames;
    std::string verbs;
    for (const CLI::App* const poVerb : ListVerbs(oApp))
    {
        oNames.push_back(poVerb->get_name());
        verbs += fmt::format("        {})\n{}            options=\"{}\" ;;\n", poVerb->get_name(),
                             BashValues(oApp, *poVerb), NameList(ListNamed(oApp, poVerb)));
    }
    return fmt::format(
        "# bash completion of krv, made from its own description\n"
        "_krv()\n{{\n"
        "    local word=\"${{COMP_WORDS[COMP_CWORD]}}\" before=\"${{COMP_WORDS[COMP_CWORD-1]}}\" verb= at "
        "options\n"
        "    local verbs=\"{0}\"\n"
        "    for at in \"${{COMP_WORDS[@]:1:COMP_CWORD-1}}\"; do\n"
        "        case \" $verbs \" in *\" $at \"*) verb=\"$at\"; break ;; esac\n"
        "    done\n"
        "    case \"$verb\" in\n"
        "        '') COMPREPLY=($(compgen -W \"$verbs {1}\" -- \"$word\")); return ;;\n"
        "{2}"
        "    esac\n"
        "    case \"$word\" in -*) COMPREPLY=($(compgen -W \"$options\" -- \"$word\")); return ;; esac\n"
        "    case \"$verb\" in formats) {3} ;; esac\n"
        "}}\n"
        "complete -o default -F _krv krv\n",
        fmt::join(oNames, " "), NameList(ListNamed(oApp, nullptr)), verbs,
        BashReply(fmt::format("$({})", LIST_FORMATS)));
}

// Text between the quotes in which zsh describes an option: what would end it, or one of its fields, is escaped.
std::string ZshText(const std::string& text)
{
    std::string result;
    for (const char c : text)
    {
        if (c == '\'')
            result += "'\\''";
        else if (c == '[' || c == ']' || c == ':')
            result += std::string("\\") + c;
        else
            result += c == '\n' ? ' ' : c;
    }
    return result;
}

std::string ZshOffer(const CLI::Option& oOption)
{
    switch (OfferOf(oOption))
    {
    case Offer::eWords:
        return fmt::format(":word:({})", WordsText(oOption));
    case Offer::eFormats:
        return ":format:_krv_formats";
    case Offer::eFiles:
        return ":file:_files";
    default:
        return ":value: ";
    }
}

std::string ZshOptions(const CLI::App& oApp, const CLI::App* poVerb)
{
    std::string text;
    for (const CLI::Option* const poOption : ListNamed(oApp, poVerb))
        for (const std::string& name : NamesOf(*poOption))
            text += fmt::format(" \\\n                '{}{}[{}]{}'", poOption->get_items_expected_max() > 1 ? "*" : "",
                                name, ZshText(poOption->get_description()),
                                TakesValue(*poOption) ? ZshOffer(*poOption) : std::string());
    return text;
}

std::string MakeZshCompletion(const CLI::App& oApp)
{
    std::string verbs, cases;
    for (const CLI::App* const poVerb : ListVerbs(oApp))
    {
        verbs += fmt::format("        '{}:{}'\n", poVerb->get_name(), ZshText(poVerb->get_description()));
        cases += fmt::format("            {})\n            _arguments{} \\\n                '{}' ;;\n",
                             poVerb->get_name(), ZshOptions(oApp, poVerb),
                             poVerb->get_name() == "formats" ? "*:format:_krv_formats" : "*:file:_files");
    }
    return fmt::format("#compdef krv\n# zsh completion of krv, made from its own description\n"
                       "_krv_formats()\n{{\n    compadd -- $({})\n}}\n"
                       "_krv()\n{{\n"
                       "    local -a verbs=(\n{}    )\n"
                       "    local state\n"
                       "    _arguments -C{} \\\n                '1:verb:->verb' '*::argument:->argument'\n"
                       "    case \"$state\" in\n"
                       "        verb) _describe verb verbs ;;\n"
                       "        argument) case \"$words[1]\" in\n{}        esac ;;\n"
                       "    esac\n"
                       "}}\n"
                       "_krv \"$@\"\n",
                       LIST_FORMATS, verbs, ZshOptions(oApp, nullptr), cases);
}

} // namespace

std::string MakeManPage(const CLI::App& oApp, const std::string& verb, const std::string& version)
{
    std::string text;
    const std::vector<const CLI::App*> oVerbs = ListVerbs(oApp);
    if (verb.empty())
    {
        text = Heading("krv", "reads and writes raster files of every format that has a plug-in", version) +
               ".SH SYNOPSIS\n\\fBkrv\\fR \\fIVERB\\fR [\\fIOPTIONS\\fR] [\\fIARGUMENTS\\fR]\n.SH VERBS\n";
        for (const CLI::App* const poVerb : oVerbs)
            text += fmt::format(".TP\n\\fB{}\\fR\n{}", poVerb->get_name(), Lines(poVerb->get_description()));
        text += OptionsText(oApp) + FooterText(oApp) + ".SH SEE ALSO\n";
        for (const CLI::App* const poVerb : oVerbs)
            text += fmt::format("\\fBkrv\\-{}\\fR(1){}\n", poVerb->get_name(), poVerb == oVerbs.back() ? "" : ",");
        return text;
    }
    for (const CLI::App* const poVerb : oVerbs)
        if (poVerb->get_name() == verb)
            return Heading("krv-" + verb, poVerb->get_description(), version) +
                   fmt::format(".SH SYNOPSIS\n\\fBkrv {}\\fR [\\fIOPTIONS\\fR]\\fI{}\\fR\n", verb,
                               Roff(PlacesText(*poVerb))) +
                   OptionsText(*poVerb) + FooterText(*poVerb) +
                   ".SH SEE ALSO\n\\fBkrv\\fR(1), for \\-\\-threads and \\-\\-verbose too, and exit codes\n";
    throw UsageError("\"" + verb + "\" is no verb of krv");
}

std::string MakeCompletion(const CLI::App& oApp, const std::string& shell)
{
    if (shell == "bash")
        return MakeBashCompletion(oApp);
    if (shell == "zsh")
        return MakeZshCompletion(oApp);
    throw UsageError("\"" + shell + "\" is none of bash, zsh");
}

} // namespace krv::tool
