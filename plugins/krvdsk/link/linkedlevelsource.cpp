#include "plugins/krvdsk/link/linkedlevelsource.h"

#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "plugins/krvdsk/link/linkedio.h"

#include <algorithm>
#include <utility>

namespace krv::plugins::krvdsk
{

using krv::datasources::IOverviewManager;
using krv::datasources::IRasterDataset;
using krv::datasources::IRasterIO;

LinkedLevelSource::LinkedLevelSource(std::shared_ptr<Link> poLink, std::vector<Channel> oChannels, unsigned int nLevel,
                                     std::shared_ptr<support::IBlockSource> poOwn)
    : mpoLink(std::move(poLink)), moChannels(std::move(oChannels)), mnLevel(nLevel), mpoOwn(std::move(poOwn)),
      moTheirs(moChannels.size())
{
}

LinkedLevelSource::~LinkedLevelSource() = default;

IRasterIO* LinkedLevelSource::FindIO(std::size_t nChannel)
{
    Theirs& oTheirs = moTheirs[nChannel];
    if (std::exchange(oTheirs.mbKnown, true))
        return oTheirs.mpoIO.get();
    auto* const poRaster = mpoLink->Find<IRasterDataset>();
    const std::unique_ptr<IOverviewManager> poLevels(poRaster != nullptr ? poRaster->GetOverviewManager() : nullptr);
    const std::vector<unsigned int> oLevels = poLevels ? poLevels->GetLevels() : std::vector<unsigned int>();
    const LinkedLevelIO::Size oSize{GetLayout().GetWidth(), GetLayout().GetHeight()};
    if (std::find(oLevels.begin(), oLevels.end(), mnLevel) != oLevels.end() &&
        poLevels->GetLevelWidth(mnLevel) == oSize.mnWidth && poLevels->GetLevelHeight(mnLevel) == oSize.mnHeight)
        oTheirs.mpoIO = std::make_unique<LinkedLevelIO>(
            mnLevel, mpoLink, oSize, [&] { return poLevels->GetOverviewIO(mnLevel, {moChannels[nChannel].mnNumber}); });
    return oTheirs.mpoIO.get();
}

void LinkedLevelSource::ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart,
                                  unsigned char* pTarget, std::size_t nPitch)
{
    const bool bTheirs = oBlock.mnPlane < moChannels.size() && moChannels[oBlock.mnPlane].mpoTable->IsEmpty();
    IRasterIO* const poIO = bTheirs ? FindIO(oBlock.mnPlane) : nullptr;
    if (poIO == nullptr)
        return mpoOwn->ReadBlock(oBlock, oPart, pTarget, nPitch);
    ReadBlockWindow(*poIO, {GetLayout(), oBlock, oPart}, pTarget, nPitch, moScratch);
}

void LinkedLevelSource::WriteBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart,
                                   const unsigned char* pSource, std::size_t nPitch)
{
    mpoOwn->WriteBlock(oBlock, oPart, pSource, nPitch);
    // Pixels that are held back count too.
    if (oBlock.mnPlane < moChannels.size())
        moChannels[oBlock.mnPlane].mpoTable->Touch();
}

} // namespace krv::plugins::krvdsk
