#include "plugins/tif/writing/blockencoder.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <utility>

namespace krv::plugins::tif
{

std::uint64_t GetStrile(const Page& oPage, const krv::datasources::BlockNumber& oBlock, const Place& oPlace)
{
    const PageForm& oForm = oPage.GetForm();
    if (oBlock.mnPlane >= oForm.GetPlanes() || oBlock.mnColumn >= oForm.mnStrilesAcross ||
        oBlock.mnRow >= oForm.mnStrilesDown)
        throw DataException(oPage.GetFileName() + ": there is no block " + std::to_string(oBlock.mnColumn) + ", " +
                                std::to_string(oBlock.mnRow) + " of plane " + std::to_string(oBlock.mnPlane),
                            oPlace);
    return (std::uint64_t{oBlock.mnPlane} * oForm.mnStrilesDown + oBlock.mnRow) * oForm.mnStrilesAcross +
           oBlock.mnColumn;
}

BlockEncoder::BlockEncoder(std::shared_ptr<Page> poPage, std::optional<int> oLevel, std::vector<unsigned char> oLike)
    : mpoPage(std::move(poPage)), moEncoder(*mpoPage, PixelUse::eImage, oLevel), moLike(std::move(oLike))
{
    moLike.resize(std::min(moLike.size(), moEncoder.GetFormBytes()));
}

BlockEncoder::~BlockEncoder() = default;

std::unique_ptr<BlockEncoder> BlockEncoder::Make(std::shared_ptr<Page> poPage, std::optional<int> oLevel,
                                                 std::vector<unsigned char> oLike)
{
    std::unique_ptr<BlockEncoder> poEncoder(new BlockEncoder(std::move(poPage), oLevel, std::move(oLike)));
    return poEncoder->moEncoder.FindObstacle().empty() ? std::move(poEncoder) : nullptr;
}

void BlockEncoder::Encode(const krv::datasources::BlockNumber& oBlock, const unsigned char* pPixels, std::size_t nPitch,
                          std::vector<unsigned char>& oBytes)
{
    GetStrile(*mpoPage, oBlock, Place::Current());
    const PageForm& oForm = mpoPage->GetForm();
    const std::uint32_t nWidth = std::min(oForm.mnStrileWidth, oForm.mnWidth - oBlock.mnColumn * oForm.mnStrileWidth);
    const std::uint32_t nRows = std::min(oForm.mnStrileHeight, oForm.mnHeight - oBlock.mnRow * oForm.mnStrileHeight);
    const auto oCoded = moEncoder.Encode(pPixels, nPitch, nWidth, nRows, oForm.GetStrileRows(oBlock.mnRow), moLike);
    oBytes.assign(oCoded.begin(), oCoded.end());
}

} // namespace krv::plugins::tif
