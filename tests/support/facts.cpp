#include "tests/support/facts.h"

#include <bit>
#include <cstdlib>
#include <fstream>
#include <sstream>

namespace krv::test
{

namespace
{

std::vector<Facts> ReadFacts(const std::string& table)
{
    std::vector<Facts> oRows;
    std::ifstream oStream(DataFolder() + "/" + table);
    std::string line;
    std::getline(oStream, line);
    const auto oNames = Split(line, '\t');
    while (std::getline(oStream, line))
        oRows.emplace_back(oNames, Split(line, '\t'));
    return oRows;
}

} // namespace

std::string DataFolder()
{
    const char* const pFolder = std::getenv("KRV_TEST_DATA");
    return pFolder != nullptr ? pFolder : KRV_TEST_DATA;
}

std::vector<std::string> Split(const std::string& text, char nSeparator)
{
    std::vector<std::string> oParts;
    std::istringstream oStream(text);
    for (std::string part; std::getline(oStream, part, nSeparator);)
        oParts.push_back(part);
    return oParts;
}

Facts::Facts(const std::vector<std::string>& oNames, const std::vector<std::string>& oValues)
{
    for (std::size_t i = 0; i < oNames.size(); ++i)
        moValues[oNames[i]] = i < oValues.size() ? oValues[i] : "-";
}

std::vector<std::string> Facts::List(const std::string& name, char nSeparator) const
{
    return Has(name) ? Split((*this)[name], nSeparator) : std::vector<std::string>();
}

std::vector<double> Facts::Numbers(const std::string& name) const
{
    std::vector<double> oNumbers;
    for (const std::string& number : List(name, ' '))
        oNumbers.push_back(std::stod(number));
    return oNumbers;
}

const std::vector<Facts>& GetFacts(const std::string& table)
{
    static std::map<std::string, std::vector<Facts>> aTables;
    const auto oFound = aTables.find(table);
    return oFound != aTables.end() ? oFound->second : aTables[table] = ReadFacts(table);
}

std::uint16_t ToHalf(float nValue)
{
    return std::bit_cast<std::uint16_t>(static_cast<_Float16>(nValue));
}

} // namespace krv::test
