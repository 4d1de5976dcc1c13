#include "datasources/datasets/detail/channellist.h"

#include "toolkit/exceptions/exceptions.h"

#include <climits>

namespace krv::datasources::detail
{

std::size_t CheckChannelType(const krv::gobs::DataType& oType, unsigned int nChannel, const std::string& name,
                             const Place& oPlace)
{
    krv::gobs::NativeDataTypeCode eCode{};
    if (!oType.FindNativeCode(eCode) || eCode == krv::gobs::eDT_BIT)
        throw krv::DataException(name + ": channel " + std::to_string(nChannel) + " is of the type " +
                                     oType.Describe() + ", which no I/O hands out",
                                 oPlace);
    return static_cast<std::size_t>(oType.GetValueBits() / 8);
}

void CheckImageSize(unsigned int nWidth, unsigned int nHeight, std::size_t nChannels, const std::string& name,
                    const Place& oPlace)
{
    if (nWidth == 0 || nHeight == 0 || nWidth > INT_MAX || nHeight > INT_MAX || nChannels == 0 || nChannels > INT_MAX)
        throw krv::DataException(name + ": an image of " + std::to_string(nWidth) + " x " + std::to_string(nHeight) +
                                     " pixels and " + std::to_string(nChannels) + " channels cannot be laid out",
                                 oPlace);
}

krv::gobs::DataType CheckChannelList(const std::vector<unsigned int>& oChannels,
                                     const std::vector<krv::gobs::DataType>& oTypes, const std::string& name,
                                     const Place& oPlace)
{
    if (oChannels.empty())
        throw krv::DataException(name + ": no channels were given", oPlace);
    for (const unsigned int nChannel : oChannels)
    {
        if (nChannel == 0 || nChannel > oTypes.size())
            throw krv::DataException(name + ": channel " + std::to_string(nChannel) + " does not exist; there are " +
                                         std::to_string(oTypes.size()),
                                     oPlace);
        if (oTypes[nChannel - 1] != oTypes[oChannels.front() - 1])
            throw krv::DataException(name + ": channels " + std::to_string(oChannels.front()) + " and " +
                                         std::to_string(nChannel) + " are of different types, " +
                                         oTypes[oChannels.front() - 1].Describe() + " and " +
                                         oTypes[nChannel - 1].Describe(),
                                     oPlace);
    }
    return oTypes[oChannels.front() - 1];
}

} // namespace krv::datasources::detail
