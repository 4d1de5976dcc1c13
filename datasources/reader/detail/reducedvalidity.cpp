#include "datasources/reader/detail/reducedvalidity.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/reader/basicreader.h"
#include "gobs/mask/exactmaskdecision.h"
#include "gobs/mask/imaskbuilder.h"
#include "gobs/mask/mask.h"
#include "gobs/mask/maskdecision.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cstring>

namespace krv::datasources::detail
{

namespace
{

unsigned int LevelSize(unsigned int nSize, unsigned int nFactor)
{
    return nSize / nFactor + (nSize % nFactor != 0 ? 1 : 0);
}

// The factor of a level by its size, 0 when no level of the dataset has that.
unsigned int FindFactor(IDataset& oDataset, unsigned int nWidth, unsigned int nHeight)
{
    auto& oRasters = dynamic_cast<IRasterDataset&>(oDataset);
    const auto Fits = [&](unsigned int nFactor)
    {
        return nFactor != 0 && LevelSize(oRasters.GetWidth(), nFactor) == nWidth &&
               LevelSize(oRasters.GetHeight(), nFactor) == nHeight;
    };
    const std::unique_ptr<IOverviewManager> poManager(oRasters.GetOverviewManager());
    for (const unsigned int nLevel : poManager != nullptr ? poManager->GetLevels() : std::vector<unsigned int>())
    {
        if (Fits(nLevel))
            return nLevel;
    }
    const unsigned int nRounded = (oRasters.GetWidth() + nWidth / 2) / std::max(nWidth, 1u);
    return Fits(nRounded) ? nRounded : 0;
}

// Where the box of a pixel of a level begins.
unsigned int BoxStart(unsigned int nPixel, unsigned int nSize, unsigned int nLevelSize, unsigned int nFactor)
{
    const std::uint64_t nStart =
        nFactor != 0 ? std::uint64_t{nPixel} * nFactor : std::uint64_t{nPixel} * nSize / nLevelSize;
    return static_cast<unsigned int>(std::min<std::uint64_t>(nStart, nSize));
}

class LevelReader : public BasicReader
{
public:
    LevelReader(IDataset& oDataset, std::unique_ptr<IRasterIO> poIO,
                std::unique_ptr<IOverviewManager> poManager = nullptr)
        : mpoManager(std::move(poManager))
    {
        SetDataset(&oDataset, {1}, false);
        SetRasterIO(std::move(poIO), krv::gobs::eDT_8U);
    }

private:
    std::unique_ptr<IOverviewManager> mpoManager; // of the I/O
};

} // namespace

std::unique_ptr<const krv::gobs::IMaskBuilder> ZeroOrNaN(unsigned int nChannel)
{
    const krv::gobs::ExactMaskDecision oDecision(krv::gobs::eAnyChannel, {krv::gobs::SampleValue::FromUnsigned(0)},
                                                 {nChannel}, true);
    return std::make_unique<krv::gobs::MaskDecisionBuilder>(&oDecision);
}

std::unique_ptr<BasicReader> ReadStoredLevel(IDataset& oDataset, unsigned int nBitmap, unsigned int nWidth,
                                             unsigned int nHeight)
{
    auto& oBitmaps = dynamic_cast<IBitmapDataset&>(oDataset);
    std::unique_ptr<IOverviewManager> poManager(oBitmaps.GetBitmapOverviewManager());
    for (const unsigned int nLevel : poManager != nullptr ? poManager->GetLevels() : std::vector<unsigned int>())
    {
        if (poManager->GetLevelWidth(nLevel) != nWidth || poManager->GetLevelHeight(nLevel) != nHeight ||
            !poManager->IsValid(nBitmap, nLevel))
            continue;
        std::unique_ptr<IRasterIO> poIO(poManager->GetOverviewIO(nLevel, {nBitmap}));
        return std::make_unique<LevelReader>(oDataset, std::move(poIO), std::move(poManager));
    }
    return nullptr;
}

std::unique_ptr<BasicReader> ReadReduced(IDataset& oDataset, std::unique_ptr<BasicReader> poFull, unsigned int nWidth,
                                         unsigned int nHeight)
{
    const unsigned int nFactor = FindFactor(oDataset, nWidth, nHeight);
    return std::make_unique<LevelReader>(
        oDataset, std::make_unique<ReducedValidity>(std::move(poFull), nWidth, nHeight, nFactor));
}

ReducedValidity::ReducedValidity(std::unique_ptr<BasicReader> poFull, unsigned int nWidth, unsigned int nHeight,
                                 unsigned int nFactor)
    : mpoFull(std::move(poFull)), mpoBackground(ZeroOrNaN(1)), mnWidth(nWidth), mnHeight(nHeight), mnFactor(nFactor)
{
}

ReducedValidity::~ReducedValidity() = default;

void ReducedValidity::ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch)
{
    const auto Column = [&](unsigned int n)
    {
        return BoxStart(oRect.mnX + n, mpoFull->GetWidth(), mnWidth, mnFactor);
    };
    const auto Row = [&](unsigned int n)
    {
        return BoxStart(oRect.mnY + n, mpoFull->GetHeight(), mnHeight, mnFactor);
    };
    const unsigned int nLeft = Column(0);
    for (unsigned int nY = 0; nY < oRect.mnHeight; ++nY, pTarget += nPitch)
    {
        std::memset(pTarget, 0, oRect.mnWidth);
        if (Column(oRect.mnWidth) == nLeft || Row(nY + 1) == Row(nY))
            continue;
        const std::unique_ptr<krv::gobs::Raster> poBand(
            mpoFull->ReadRaster(nLeft, Row(nY), Column(oRect.mnWidth) - nLeft, Row(nY + 1) - Row(nY)));
        const std::unique_ptr<krv::gobs::Mask> poMask(mpoBackground->BuildMask(*poBand));
        for (unsigned int nX = 0; nX < oRect.mnWidth; ++nX)
            for (unsigned int nRow = 0; nRow < poBand->GetHeight() && pTarget[nX] == 0; ++nRow)
                for (unsigned int n = Column(nX) - nLeft; n < Column(nX + 1) - nLeft && pTarget[nX] == 0; ++n)
                    pTarget[nX] = poMask->GetBit(n, nRow) ? 0 : 1;
    }
}

void ReducedValidity::WritePixels(const PixelRect&, const unsigned char*, std::size_t)
{
    throw krv::DataException("The validity of a level is only read");
}

} // namespace krv::datasources::detail
