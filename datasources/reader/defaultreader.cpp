#include "datasources/reader/defaultreader.h"

#include "datasources/reader/basicreader.h"
#include "datasources/reader/multitypereader.h"
#include "toolkit/exceptions/exceptions.h"

namespace krv::datasources
{

IRasterReader* CreateDefaultReader(IDataset* poDataset, const std::vector<unsigned int>& oChannels)
{
    try
    {
        return new BasicReader(poDataset, oChannels, false);
    }
    catch (const krv::Exception&)
    {
        return new MultiTypeReader(poDataset, oChannels);
    }
}

// NOLINTNEXTLINE(performance-unnecessary-value-param)
IRasterReader* CreateDefaultReader(std::string fileName, const std::vector<unsigned int>& oChannels)
{
    try
    {
        return new BasicReader(fileName, oChannels);
    }
    catch (const krv::Exception&)
    {
        return new MultiTypeReader(fileName, oChannels);
    }
}

bool GetPCTParameters(IDataset*, const std::vector<unsigned int>&, unsigned int&, std::string&, unsigned int&)
{
    return false;
}

} // namespace krv::datasources
