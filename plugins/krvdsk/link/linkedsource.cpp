#include "plugins/krvdsk/link/linkedsource.h"

#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "plugins/krvdsk/link/linkedio.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

namespace krv::plugins::krvdsk
{

using krv::datasources::IOverviewManager;
using krv::datasources::IRasterDataset;
using krv::datasources::IRasterIO;

LinkedSource::LinkedSource(std::shared_ptr<Link> poLink, const std::vector<Link::Channel>& oChannels,
                           unsigned int nLevel, std::shared_ptr<support::IBlockSource> poOwn)
    : mpoLink(std::move(poLink)), mnLevel(nLevel), mpoOwn(std::move(poOwn)), moPlanes(MakePlanes(oChannels)),
      moLayout(MakeLayout())
{
}

LinkedSource::~LinkedSource() = default;

std::vector<LinkedSource::LinkedPlane> LinkedSource::MakePlanes(const std::vector<Link::Channel>& oChannels)
{
    std::vector<LinkedPlane> oPlanes;
    for (const Link::Channel& oChannel : oChannels)
    {
        if (oPlanes.empty() || oPlanes.back().moPlane.moType != oChannel.moType)
            oPlanes.push_back({{oChannel.moType, 0, {}}, {}, nullptr});
        ++oPlanes.back().moPlane.mnChannels;
        oPlanes.back().moNumbers.push_back(oChannel.mnNumber);
    }
    return oPlanes;
}

unsigned int LinkedSource::CountPlanes(const std::vector<Link::Channel>& oChannels)
{
    return static_cast<unsigned int>(MakePlanes(oChannels).size());
}

support::ImageLayout LinkedSource::MakeLayout() const
{
    const support::ImageLayout& oOwn = mpoOwn->GetLayout();
    std::vector<support::Plane> oPlanes;
    for (const LinkedPlane& oPlane : moPlanes)
        oPlanes.push_back(oPlane.moPlane);
    for (unsigned int nPlane = 0; nPlane < oOwn.GetPlaneCount(); ++nPlane)
        oPlanes.push_back(oOwn.GetPlane(nPlane));
    return {oOwn.GetWidth(), oOwn.GetHeight(), oOwn.GetBlockWidth(), oOwn.GetBlockHeight(), std::move(oPlanes)};
}

IRasterIO& LinkedSource::GetIO(LinkedPlane& oPlane)
{
    if (oPlane.mpoIO)
        return *oPlane.mpoIO;
    const auto Make = [&]() -> IRasterIO*
    {
        auto& oRaster = dynamic_cast<IRasterDataset&>(mpoLink->Get());
        if (mnLevel == 1)
            return oRaster.GetRasterIO(oPlane.moNumbers);
        const std::unique_ptr<IOverviewManager> poLevels(oRaster.GetOverviewManager());
        if (!poLevels)
            throw IOException(GetName(), GetName() + ": its linked channels have no level " + std::to_string(mnLevel));
        return poLevels->GetOverviewIO(mnLevel, oPlane.moNumbers);
    };
    oPlane.mpoIO = std::make_unique<LinkedIO>(mpoLink, LinkedIO::Size{moLayout.GetWidth(), moLayout.GetHeight()}, Make);
    return *oPlane.mpoIO;
}

void LinkedSource::ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart,
                             unsigned char* pTarget, std::size_t nPitch)
{
    if (oBlock.mnPlane >= moPlanes.size())
        return mpoOwn->ReadBlock(
            {oBlock.mnPlane - static_cast<unsigned int>(moPlanes.size()), oBlock.mnColumn, oBlock.mnRow}, oPart,
            pTarget, nPitch);
    const support::PixelRect oRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
    const std::size_t nRow = oPart.mnWidth * moLayout.GetPixelBytes(oBlock.mnPlane);
    unsigned char* const pRead = nPitch == nRow ? pTarget : moScratch.Get(nRow * oPart.mnHeight);
    GetIO(moPlanes[oBlock.mnPlane])
        .ReadWindow(oRect.mnX + oPart.mnX, oRect.mnY + oPart.mnY, oPart.mnWidth, oPart.mnHeight, pRead);
    if (pRead != pTarget)
        raster::CopyRows(pRead, nRow, pTarget, nPitch, nRow, oPart.mnHeight);
}

void LinkedSource::WriteBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart,
                              const unsigned char* pSource, std::size_t nPitch)
{
    if (oBlock.mnPlane < moPlanes.size())
        LinkedIO::RefuseWriting(*mpoLink, Place::Current());
    mpoOwn->WriteBlock({oBlock.mnPlane - static_cast<unsigned int>(moPlanes.size()), oBlock.mnColumn, oBlock.mnRow},
                       oPart, pSource, nPitch);
}

} // namespace krv::plugins::krvdsk
