#include "datasources/reader/detail/leveldata.h"

#include "datasources/metadata/auxiliarydata.h"
#include "toolkit/exceptions/exceptions.h"

namespace krv::datasources::detail
{

unsigned int ChannelAt(const std::vector<unsigned int>& oChannels, unsigned int nPosition, const Place& oPlace)
{
    if (nPosition == 0 || nPosition > oChannels.size())
        throw krv::OutOfBoundsException({nPosition}, "Out of bounds.", oPlace);
    return oChannels[nPosition - 1];
}

AuxiliaryData SelectLevelData(const AuxiliaryData& oLevelData, const std::vector<unsigned int>& oChannels)
{
    AuxiliaryData oResult(static_cast<unsigned int>(oChannels.size()));
    oResult.SetFileMetadata(oLevelData.GetFileMetadata());
    unsigned int nPosition = 0;
    for (const unsigned int nChannel : oChannels)
        oResult.SetChanMetadata(oLevelData.GetChanMetadata(nChannel), ++nPosition);
    return oResult;
}

} // namespace krv::datasources::detail
