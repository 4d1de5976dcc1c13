#include "plugins/krvdsk/link/linkedsource.h"

#include "datasources/interfaces/irasterdataset.h"
#include "plugins/krvdsk/link/linkedio.h"

namespace krv::plugins::krvdsk
{

using krv::datasources::IRasterDataset;
using krv::datasources::IRasterIO;

LinkedSource::LinkedSource(std::shared_ptr<Link> poLink, const std::vector<Link::Channel>& oChannels,
                           std::shared_ptr<support::IBlockSource> poOwn)
    : mpoLink(std::move(poLink)), mpoOwn(std::move(poOwn)), moPlanes(MakePlanes(oChannels)), moLayout(MakeLayout())
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
    const auto Make = [&]
    {
        return dynamic_cast<IRasterDataset&>(mpoLink->Get()).GetRasterIO(oPlane.moNumbers);
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
    ReadBlockWindow(GetIO(moPlanes[oBlock.mnPlane]), {moLayout, oBlock, oPart}, pTarget, nPitch, moScratch);
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
