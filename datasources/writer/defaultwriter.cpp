#include "datasources/writer/defaultwriter.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/writer/basicwriter.h"
#include "datasources/writer/multitypewriter.h"
#include "toolkit/core/core.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

namespace krv::datasources
{

IRasterWriter* CreateDefaultWriter(IDataset* poDataset, const std::vector<unsigned int>& oChannels)
{
    auto* const poRasters = dynamic_cast<IRasterDataset*>(poDataset);
    try
    {
        return new BasicWriter(poRasters, oChannels);
    }
    catch (const krv::Exception&)
    {
        return new MultiTypeWriter(poRasters, oChannels);
    }
}

IRasterWriter* CreateDefaultWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels)
{
    try
    {
        return new BasicWriter(fileName, oChannels);
    }
    catch (const krv::Exception&)
    {
        return new MultiTypeWriter(fileName, oChannels);
    }
}

IRasterWriter* CreateDefaultWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                                   const std::vector<krv::gobs::DataType>& oTypes, const std::string& format,
                                   const std::string& options)
{
    if (krv::core::fileio::File(fileName).Exists())
        return CreateDefaultWriter(fileName, oChannels);
    MixedTypes oMixed;
    oMixed.moChannels = oTypes;
    const bool bOneType = std::all_of(oTypes.begin(), oTypes.end(), [&](const auto& o) { return o == oTypes.front(); });
    if (oTypes.size() == oChannels.size() && bOneType)
        return new BasicWriter(fileName, oChannels, format, options);
    return new MultiTypeWriter(fileName, oChannels, format, options, oMixed);
}

} // namespace krv::datasources
