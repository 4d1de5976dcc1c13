#include "plugins/support/writing/options.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <sstream>

namespace krv::plugins::support
{

void Options::AddText(const std::string& key, std::string& target)
{
    const auto Take = [&target](const std::string& value)
    {
        target = value;
        return true;
    };
    moKeys.push_back({{key, "a text"}, Take});
}

void Options::Parse(const std::string& options, const Place& oPlace)
{
    std::istringstream oWords(options);
    for (std::string word; oWords >> word;)
    {
        const std::size_t nSign = word.find('=');
        if (nSign == std::string::npos || nSign == 0)
            throw DataException("The option \"" + word + "\" is not of the form KEY=VALUE", oPlace);
        const std::string key = ToUpper(word.substr(0, nSign));
        const std::string value = word.substr(nSign + 1);
        const auto oKey = std::find_if(moKeys.begin(), moKeys.end(),
                                       [&key](const Key& oOne) { return oOne.moDescription.moKey == key; });
        if (oKey == moKeys.end())
            throw DataException("The option " + key + " is not known; there are " + ListKeys(), oPlace);
        if (!oKey->moTake(value))
            throw DataException("The option " + key + " does not take \"" + value + "\"; it takes " +
                                    oKey->moDescription.moTakes,
                                oPlace);
        if (oKey->mbGiven)
            throw DataException("The option " + key + " is given twice", oPlace);
        oKey->mbGiven = true;
    }
}

std::string Options::ListKeys() const
{
    std::string all;
    for (const Key& oKey : moKeys)
        all += (all.empty() ? "" : ", ") + oKey.moDescription.moKey;
    return all;
}

bool Options::IsGiven(const std::string& key) const
{
    return std::any_of(moKeys.begin(), moKeys.end(),
                       [&key](const Key& oKey) { return oKey.mbGiven && oKey.moDescription.moKey == key; });
}

std::vector<Options::Description> Options::Describe() const
{
    std::vector<Description> oDescriptions;
    for (const Key& oKey : moKeys)
        oDescriptions.push_back(oKey.moDescription);
    return oDescriptions;
}

} // namespace krv::plugins::support
