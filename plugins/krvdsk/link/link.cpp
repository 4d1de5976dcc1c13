#include "plugins/krvdsk/link/link.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/iomanager/linkchain.h"
#include "toolkit/exceptions/exceptions.h"

#include <filesystem>

namespace krv::plugins::krvdsk
{

namespace
{

using krv::datasources::IChannelInfo;
using krv::datasources::IDataset;
using krv::datasources::IRasterDataset;

krv::gobs::DataType GetType(const IRasterDataset& oRaster, unsigned int nChannel)
{
    const std::unique_ptr<IChannelInfo> poInfo(oRaster.GetChannelInfo(nChannel));
    return poInfo->GetDataType();
}

} // namespace

Link::Link(const std::string& owner, const std::string& path, unsigned int nWidth, unsigned int nHeight,
           std::vector<Channel> oChannels)
    : moOwner(owner), moName((std::filesystem::path(owner).parent_path() / path).string()), mnWidth(nWidth),
      mnHeight(nHeight), moChannels(std::move(oChannels))
{
}

Link::~Link() = default;

IDataset& Link::Get(const Place& oPlace)
{
    if (!mpoDataset)
        Open(oPlace);
    return *mpoDataset;
}

IDataset* Link::Find() noexcept
{
    try
    {
        return &Get();
    }
    catch (...)
    {
        return nullptr; // whoever wants pixels is told
    }
}

void Link::Rethrow(const Place& oPlace) const
{
    try
    {
        throw;
    }
    catch (const krv::Exception& oError)
    {
        const std::string cause = oError.what();
        throw IOException(moOwner,
                          moOwner + ": its pixels lie in " + moName + ": " +
                              (cause.starts_with(moName + ": ") ? cause.substr(moName.size() + 2) : cause),
                          oPlace);
    }
}

void Link::Open(const Place& oPlace)
{
    std::unique_ptr<IDataset> poDataset;
    std::error_code oNone;
    if (std::filesystem::equivalent(moName, moOwner, oNone))
        throw DataException(moOwner + ": the file is linked to itself", oPlace);
    try
    {
        poDataset.reset(krv::datasources::DatasetManager::GetInstance()->Open(moName, eReadOnly));
        if (!poDataset)
            throw DataException("it cannot be opened");
        Check(*poDataset);
    }
    catch (const krv::Exception&)
    {
        Rethrow(oPlace);
    }
    krv::datasources::CheckLinkChain(*poDataset, moOwner, oPlace);
    mpoDataset = std::move(poDataset);
}

void Link::Check(const IDataset& oDataset) const
{
    const auto* const poRaster = dynamic_cast<const IRasterDataset*>(&oDataset);
    if (poRaster == nullptr)
        throw DataException("it holds no image");
    if (poRaster->GetWidth() != mnWidth || poRaster->GetHeight() != mnHeight)
        throw DataException("it is of " + std::to_string(poRaster->GetWidth()) + " x " +
                            std::to_string(poRaster->GetHeight()) + " pixels now, no longer of " +
                            std::to_string(mnWidth) + " x " + std::to_string(mnHeight));
    for (const Channel& oChannel : moChannels)
    {
        if (oChannel.mnNumber > poRaster->GetChanCount())
            throw DataException("it has no channel " + std::to_string(oChannel.mnNumber) + " any more");
        const krv::gobs::DataType oType = GetType(*poRaster, oChannel.mnNumber);
        if (oType != oChannel.moType)
            throw DataException("its channel " + std::to_string(oChannel.mnNumber) + " is of the type " +
                                oType.Describe() + " now, no longer " + oChannel.moType.Describe());
    }
}

std::vector<Link::Channel> FindLinkableChannels(const IDataset& oDataset)
{
    std::vector<Link::Channel> oChannels;
    const auto* const poRaster = dynamic_cast<const IRasterDataset*>(&oDataset);
    const unsigned int nCount = poRaster == nullptr ? 0 : poRaster->GetChanCount();
    for (unsigned int nChannel = 1; nChannel <= nCount; ++nChannel)
        if (const krv::gobs::DataType oType = GetType(*poRaster, nChannel); oType.GetBits() > 1)
            oChannels.push_back({nChannel, oType});
    return oChannels;
}

} // namespace krv::plugins::krvdsk
