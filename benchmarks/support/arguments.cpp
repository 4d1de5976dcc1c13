#include "benchmarks/support/arguments.h"

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <sstream>

namespace krv::benchmarks
{

Arguments::Arguments(int nArguments, char** pArguments, const std::string& usage)
{
    ReadUsage(usage);
    const bool bHelp =
        nArguments == 2 && (std::string(pArguments[1]) == "--help" || std::string(pArguments[1]) == "-h");
    const std::string fault = bHelp ? "" : FindFault(nArguments, pArguments);
    if (!bHelp && fault.empty())
        return;
    const std::string path = pArguments[0];
    const std::string name = path.substr(path.rfind('/') + 1);
    if (!fault.empty())
        std::fprintf(stderr, "%s: %s\n", name.c_str(), fault.c_str());
    std::fprintf(bHelp ? stdout : stderr, "usage: %s %s\n", name.c_str(), usage.c_str());
    std::exit(bHelp ? 0 : 2);
}

void Arguments::ReadUsage(const std::string& usage)
{
    std::istringstream oUsage(usage);
    for (std::string token; oUsage >> token;)
    {
        if (token.starts_with("[--"))
        {
            std::string value;
            oUsage >> value;
            moKnown[token.substr(1)] = value.substr(0, value.size() - 1);
            continue;
        }
        mnLeastWords += token.starts_with('[') ? 0 : 1;
        mnMostWords = token.ends_with("...]") ? SIZE_MAX : mnMostWords + 1;
    }
}

bool Arguments::Fits(const std::string& option, const std::string& value) const
{
    const std::string& known = moKnown.at(option);
    if (known == "N")
        return !value.empty() && value.size() < 10 && value.find_first_not_of("0123456789") == std::string::npos &&
               std::stoi(value) > 0;
    return known.find('|') == std::string::npos || ("|" + known + "|").find("|" + value + "|") != std::string::npos;
}

std::string Arguments::FindFault(int nArguments, char** pArguments)
{
    for (int n = 1; n < nArguments; ++n)
    {
        const std::string argument = pArguments[n];
        if (!argument.starts_with('-'))
        {
            moWords.push_back(argument);
            continue;
        }
        if (!moKnown.contains(argument))
            return "there is no option " + argument;
        if (n + 1 == nArguments || !Fits(argument, pArguments[n + 1]))
            return argument + " wants " + moKnown.at(argument);
        moOptions[argument] = pArguments[++n];
    }
    if (moWords.size() < mnLeastWords)
        return "something is missing";
    return moWords.size() > mnMostWords ? "there is no use for " + moWords[mnMostWords] : "";
}

std::string Arguments::GetOption(const std::string& name, const std::string& otherwise) const
{
    const auto oFound = moOptions.find("--" + name);
    return oFound == moOptions.end() ? otherwise : oFound->second;
}

unsigned int Arguments::GetNumber(const std::string& name, unsigned int nOtherwise) const
{
    const std::string value = GetOption(name);
    return value.empty() ? nOtherwise : static_cast<unsigned int>(std::stoi(value));
}

bool Arguments::Wants(const std::string& part) const
{
    const std::string only = GetOption("only");
    return only.empty() || only == part;
}

} // namespace krv::benchmarks
