#include "datasources/writer/splitwriter.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/reader/idatasetaccess.h"
#include "datasources/writer/ioverviewwriteraccessor.h"
#include "datasources/writer/irasterwriter.h"
#include "gobs/raster/raster.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>

namespace krv::datasources
{

// The blocks of a raster, or the raster itself.
class SplitWriter::Encoded
{
public:
    struct Block
    {
        BlockNumber moNumber;
        std::vector<unsigned char> moBytes;
    };

    std::vector<Block> moBlocks;
    std::shared_ptr<const krv::gobs::Raster> mpoRaster;
};

SplitWriter::SplitWriter(IRasterWriter& oWriter, unsigned int nLevel, unsigned int nThreads)
    : moWriter(oWriter), mnLevel(nLevel), moEncoders([] { return std::unique_ptr<IBlockEncoder>(); })
{
    const auto* const poAccess = dynamic_cast<const IDatasetAccess*>(&oWriter);
    IDataset* const poDataset = poAccess != nullptr ? poAccess->GetDataset() : nullptr;
    auto* const poEncoding = dynamic_cast<IBlockEncoding*>(poDataset);
    auto* const poBlocks = dynamic_cast<IEncodedBlocks*>(poDataset);
    // Bitmaps have no levels, and their blocks are not those of the image.
    const bool bImage =
        nLevel != 1 || std::unique_ptr<IOverviewWriterAccessor>(oWriter.GetOverviewWriterAccessor()) != nullptr;
    if (poEncoding == nullptr || poBlocks == nullptr || !bImage)
        return;
    moForm = poBlocks->GetEncodedForm(nLevel);
    if (!TakesForm())
        return;
    // Encoders are the dataset's, which belongs to this thread: those of all threads are made now.
    for (unsigned int nThread = 0; nThread < nThreads; ++nThread)
    {
        std::unique_ptr<IBlockEncoder> poEncoder(poEncoding->MakeBlockEncoder(nLevel));
        if (poEncoder == nullptr)
            return;
        moEncoders.Add(std::move(poEncoder));
    }
    mpoBlocks = poBlocks;
}

SplitWriter::~SplitWriter() = default;

// Whether the writer's channels are whole planes, and there is something to encode.
bool SplitWriter::TakesForm()
{
    const auto& oChannels = dynamic_cast<const IDatasetAccess&>(moWriter).GetChannels();
    unsigned int nNext = 0;
    const bool bAll = oChannels.size() == moForm.mnChannels &&
                      std::all_of(oChannels.begin(), oChannels.end(), [&](unsigned int n) { return n == ++nNext; });
    if (moForm.moCodec == "NONE" || moForm.moType.GetValueBits() < 8 || moForm.moType != moWriter.GetDataType() ||
        moForm.mnWidth != moWriter.GetWidth() || moForm.mnHeight != moWriter.GetHeight() ||
        (!bAll && !moForm.mbSeparate))
        return false;
    moPlanes = {0};
    if (moForm.mbSeparate)
    {
        moPlanes.clear();
        for (const unsigned int nChannel : oChannels)
            moPlanes.push_back(nChannel - 1);
    }
    return true;
}

bool SplitWriter::HasWholeBlocks(const krv::gobs::Raster& oRaster) const
{
    const auto IsWhole = [](int nFrom, unsigned int nCount, unsigned int nBlock, unsigned int nImage)
    {
        const std::uint64_t nEnd = static_cast<std::uint64_t>(nFrom) + nCount;
        return nFrom >= 0 && static_cast<unsigned int>(nFrom) % nBlock == 0 && nEnd <= nImage &&
               (nEnd == nImage || nEnd % nBlock == 0);
    };
    return oRaster.GetXMargin() == 0 && oRaster.GetYMargin() == 0 && oRaster.GetDataType() == moForm.moType &&
           oRaster.GetChansCount() == moWriter.GetChansCount() &&
           IsWhole(oRaster.GetX(), oRaster.GetWidth(), moForm.mnBlockWidth, moForm.mnWidth) &&
           IsWhole(oRaster.GetY(), oRaster.GetHeight(), moForm.mnBlockHeight, moForm.mnHeight);
}

// The blocks of one plane, whose pixels are nChannels channels of the raster from nChannel on.
void SplitWriter::EncodePlane(const krv::gobs::Raster& oRaster, unsigned int nChannel, unsigned int nChannels,
                              unsigned int nPlane, Encoded& oEncoded)
{
    const krv::threading::StateStore<IBlockEncoder>::Use oEncoder(moEncoders);
    const std::size_t nValueBytes = moForm.moType.GetValueBits() / 8;
    const unsigned char* pPixels = oRaster.GetBuffer();
    std::vector<unsigned char> oPlane;
    if (nChannels != oRaster.GetChansCount())
    {
        const std::size_t nPixels = std::size_t{oRaster.GetWidth()} * oRaster.GetHeight();
        oPlane.resize(nPixels * nValueBytes);
        raster::ExtractChannel(pPixels, nPixels * nValueBytes * oRaster.GetChansCount(), nChannel,
                               oRaster.GetChansCount(), oPlane.data(), oPlane.size(), {nPixels, 1, nValueBytes});
        pPixels = oPlane.data();
    }
    const std::size_t nPixelBytes = nValueBytes * nChannels, nPitch = oRaster.GetWidth() * nPixelBytes;
    for (unsigned int nY = 0; nY < oRaster.GetHeight(); nY += std::min(moForm.mnBlockHeight, oRaster.GetHeight() - nY))
        for (unsigned int nX = 0; nX < oRaster.GetWidth(); nX += std::min(moForm.mnBlockWidth, oRaster.GetWidth() - nX))
        {
            auto& oBlock = oEncoded.moBlocks.emplace_back();
            oBlock.moNumber = {nPlane, (static_cast<unsigned int>(oRaster.GetX()) + nX) / moForm.mnBlockWidth,
                               (static_cast<unsigned int>(oRaster.GetY()) + nY) / moForm.mnBlockHeight};
            oEncoder->Encode(oBlock.moNumber, pPixels + nY * nPitch + nX * nPixelBytes, nPitch, oBlock.moBytes);
        }
}

std::shared_ptr<const SplitWriter::Encoded> SplitWriter::Encode(std::shared_ptr<const krv::gobs::Raster> poRaster)
{
    const auto poEncoded = std::make_shared<Encoded>();
    if (!IsSplit() || !HasWholeBlocks(*poRaster))
    {
        poEncoded->mpoRaster = std::move(poRaster);
        return poEncoded;
    }
    const auto nChannels = static_cast<unsigned int>(moForm.mbSeparate ? 1 : moForm.mnChannels);
    for (unsigned int nAt = 0; nAt < moPlanes.size(); ++nAt)
        EncodePlane(*poRaster, nAt, nChannels, moPlanes[nAt], *poEncoded);
    return poEncoded;
}

void SplitWriter::Store(const Encoded& oEncoded)
{
    if (oEncoded.mpoRaster != nullptr)
        return moWriter.WriteRaster(oEncoded.mpoRaster.get());
    for (const Encoded::Block& oBlock : oEncoded.moBlocks)
        mpoBlocks->StoreEncoded(mnLevel, oBlock.moNumber, oBlock.moBytes.data(), oBlock.moBytes.size());
}

} // namespace krv::datasources
