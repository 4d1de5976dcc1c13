#include "plugins/krvdsk/link/link.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/iomanager/linkchain.h"
#include "toolkit/exceptions/exceptions.h"

#include <filesystem>

#include <sys/stat.h>

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

std::optional<Link::State> ReadState(const std::string& name)
{
    struct stat oStatus = {};
    if (stat(name.c_str(), &oStatus) != 0)
        return std::nullopt;
    constexpr std::uint64_t SECOND = 1'000'000'000;
    return Link::State{static_cast<std::uint64_t>(oStatus.st_size),
                       static_cast<std::uint64_t>(oStatus.st_mtim.tv_sec) * SECOND +
                           static_cast<std::uint64_t>(oStatus.st_mtim.tv_nsec)};
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

std::optional<Link::State> Link::FindState() noexcept
{
    Find();
    return moState;
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
    moState = ReadState(moName);
    const auto Try = [&](const auto& oStep)
    {
        try
        {
            oStep();
        }
        catch (const krv::Exception&)
        {
            Rethrow(oPlace);
        }
    };
    Try(
        [&]
        {
            poDataset.reset(krv::datasources::DatasetManager::GetInstance()->Open(moName, eReadOnly));
            if (!poDataset)
                throw DataException("it cannot be opened");
        });
    // This comes before anything is asked that would open what the link leads to.
    for (const std::string& file : krv::datasources::FollowLinks(*poDataset, moOwner, oPlace))
        if (const auto oState = ReadState(file); oState && moState)
        {
            moState->mnBytes += oState->mnBytes;
            moState->mnModified += oState->mnModified;
        }
    Try([&] { Check(*poDataset); });
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
