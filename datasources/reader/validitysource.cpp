#include "datasources/reader/validitysource.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/detail/bitmapbackground.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/reader/detail/reducedvalidity.h"
#include "gobs/mask/exactmaskdecision.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"

#include <algorithm>
#include <map>
#include <utility>

namespace krv::datasources
{

namespace
{

using krv::gobs::BkgdRule;
using krv::gobs::ExactMaskDecision;
using krv::gobs::IMaskBuilder;
using krv::gobs::Mask;
using krv::gobs::MaskDecisionBuilder;
using krv::gobs::Raster;

using detail::BitmapBackground;
using detail::ZeroOrNaN;

void Add(Mask& oBackground, const Mask& oOther)
{
    unsigned char* const pBits = oBackground.GetBits();
    const unsigned char* const pOther = oOther.GetBits();
    for (std::uint64_t n = 0; n < oBackground.GetBitsSize(); ++n)
        pBits[n] |= pOther[n];
}

void KeepCommon(Mask& oBackground, const Mask& oOther)
{
    unsigned char* const pBits = oBackground.GetBits();
    const unsigned char* const pOther = oOther.GetBits();
    for (std::uint64_t n = 0; n < oBackground.GetBitsSize(); ++n)
        pBits[n] &= pOther[n];
}

void AddOutside(Mask& oBackground, unsigned int nImageWidth, unsigned int nImageHeight)
{
    const std::int64_t nLeft = std::int64_t{oBackground.GetX()} - oBackground.GetXMargin();
    const std::int64_t nTop = std::int64_t{oBackground.GetY()} - oBackground.GetYMargin();
    for (std::uint64_t nRow = 0; nRow < oBackground.GetFullHeight(); ++nRow)
    {
        const std::int64_t nY = nTop + static_cast<std::int64_t>(nRow);
        const bool bRowInside = nY >= 0 && nY < nImageHeight;
        for (std::uint64_t nColumn = 0; nColumn < oBackground.GetFullWidth(); ++nColumn)
        {
            const std::int64_t nX = nLeft + static_cast<std::int64_t>(nColumn);
            if (!bRowInside || nX < 0 || nX >= nImageWidth)
                oBackground.SetBit(nColumn, nRow);
        }
    }
}

bool ReachesOutside(const Mask& oMask, unsigned int nImageWidth, unsigned int nImageHeight)
{
    const std::int64_t nLeft = std::int64_t{oMask.GetX()} - oMask.GetXMargin();
    const std::int64_t nTop = std::int64_t{oMask.GetY()} - oMask.GetYMargin();
    return nLeft < 0 || nTop < 0 || nLeft + static_cast<std::int64_t>(oMask.GetFullWidth()) > nImageWidth ||
           nTop + static_cast<std::int64_t>(oMask.GetFullHeight()) > nImageHeight;
}

bool CopiesPixels(eMarginBehaviour eBehaviour)
{
    return eBehaviour == eReplicate || eBehaviour == eMirror || eBehaviour == eMirror101 || eBehaviour == eWrap;
}

// Spare bits of the last byte stay clear.
void Invert(Mask& oMask)
{
    unsigned char* const pBits = oMask.GetBits();
    const std::uint64_t nSize = oMask.GetBitsSize();
    for (std::uint64_t n = 0; n < nSize; ++n)
        pBits[n] = static_cast<unsigned char>(~pBits[n]);
    const std::uint64_t nSpare = nSize * 8 - oMask.GetFullWidth() * oMask.GetFullHeight();
    if (nSize > 0)
        pBits[nSize - 1] &= static_cast<unsigned char>(0xFFu << nSpare);
}

} // namespace

unsigned int FindAlpha(const AuxiliaryData& oMetadata)
{
    const detail::CaseInsensitiveCompare oLess;
    for (unsigned int nChannel = 1; nChannel <= oMetadata.GetChannelCount(); ++nChannel)
    {
        const std::string meaning = oMetadata.GetChanMetadataValue("ColorInterp", nChannel);
        if (!oLess(meaning, "alpha") && !oLess("alpha", meaning))
            return nChannel;
    }
    return 0;
}

ValiditySource::ValiditySource(IDataset* poDataset, const std::vector<unsigned int>& oChannels, BkgdRule eRule,
                               bool bNoData)
{
    FindSize(poDataset);
    FindAll(*poDataset, poDataset->ReadAuxiliaryData(), oChannels, eRule, bNoData);
}

ValiditySource::ValiditySource(IDataset* poDataset, const AuxiliaryData& oRecord,
                               const std::vector<unsigned int>& oChannels, BkgdRule eRule, bool bNoData)
{
    FindSize(poDataset);
    FindAll(*poDataset, oRecord, oChannels, eRule, bNoData);
}

void ValiditySource::FindSize(IDataset* poDataset, const Place& oPlace)
{
    if (poDataset == nullptr)
        throw krv::DataException("The dataset is NULL", oPlace);
    const auto& oRasterDataset =
        detail::RequireFacet<IRasterDataset>(poDataset, "This dataset doesn't support Raster.", oPlace);
    mnImageWidth = oRasterDataset.GetWidth();
    mnImageHeight = oRasterDataset.GetHeight();
}

void ValiditySource::FindAll(IDataset& oDataset, const AuxiliaryData& oRecord,
                             const std::vector<unsigned int>& oChannels, BkgdRule eRule, bool bNoData)
{
    const std::vector<unsigned int> oListed =
        oChannels.empty() ? detail::FirstChannels(oRecord.GetChannelCount()) : oChannels;
    const unsigned int nAlpha = FindAlpha(oRecord);
    FindNoData(oRecord, bNoData ? oListed : std::vector<unsigned int>(), nAlpha, eRule);
    meRule = eRule;
    FindBitmap(oDataset, oListed);
    const auto oAlpha = std::find(oListed.begin(), oListed.end(), nAlpha);
    if (nAlpha != 0 && oAlpha != oListed.end())
        UseAlphaOfRaster(static_cast<unsigned int>(oAlpha - oListed.begin()) + 1);
    else if (nAlpha != 0)
        mpoAlpha = std::make_unique<BitmapBackground>(
            std::make_unique<BasicReader>(&oDataset, std::vector<unsigned int>{nAlpha}, false));
    for (std::size_t n = 0; n < moChannels.size(); ++n)
    {
        const auto oValue = bNoData ? GetTypedNoData(oRecord, oListed[n]) : std::nullopt;
        if (!oValue || oListed[n] == nAlpha)
            continue;
        const ExactMaskDecision oDecision(krv::gobs::eAnyChannel, {*oValue}, {static_cast<unsigned int>(n) + 1});
        moChannels[n].mpoNoData = std::make_unique<MaskDecisionBuilder>(&oDecision);
    }
}

ValiditySource::ValiditySource(IDataset* poDataset, const std::vector<unsigned int>& oChannels, unsigned int nWidth,
                               unsigned int nHeight, BkgdRule eRule)
    : ValiditySource(poDataset, oChannels, eRule)
{
    if (nWidth != mnImageWidth || nHeight != mnImageHeight)
        UseLevel(*poDataset, nWidth, nHeight);
}

ValiditySource::ValiditySource(const IRasterReader& oReader, BkgdRule eRule)
    : mnImageWidth(oReader.GetWidth()), mnImageHeight(oReader.GetHeight())
{
    const AuxiliaryData oMetadata = oReader.GetAuxiliaryData();
    const unsigned int nAlpha = FindAlpha(oMetadata);
    FindNoData(oMetadata, detail::FirstChannels(oMetadata.GetChannelCount()), nAlpha, eRule);
    if (nAlpha != 0)
        UseAlphaOfRaster(nAlpha);
    SetMarginBehaviour(oReader.GetMarginBehaviour());
}

ValiditySource::~ValiditySource() = default;

void ValiditySource::FindNoData(const AuxiliaryData& oMetadata, const std::vector<unsigned int>& oChannels,
                                unsigned int nAlpha, BkgdRule eRule)
{
    std::vector<unsigned int> oPositions;
    std::vector<NoDataValue> oValues;
    for (std::size_t n = 0; n < oChannels.size(); ++n)
    {
        const auto oValue = GetTypedNoData(oMetadata, oChannels[n]);
        if (!oValue || oChannels[n] == nAlpha)
            continue;
        oPositions.push_back(static_cast<unsigned int>(n) + 1);
        oValues.push_back(*oValue);
    }
    mbNoData = !oValues.empty();
    const ExactMaskDecision oDecision(eRule, oValues, oPositions);
    mpoNoData = std::make_unique<MaskDecisionBuilder>(&oDecision);
}

void ValiditySource::FindBitmap(IDataset& oDataset, const std::vector<unsigned int>& oChannels)
{
    auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(&oDataset);
    if (poBitmaps == nullptr)
        return;
    const auto Read = [&](unsigned int nBitmap)
    {
        auto poReader = std::make_unique<BasicReader>(poBitmaps, std::vector<unsigned int>{nBitmap}, false);
        if (poReader->GetWidth() != mnImageWidth || poReader->GetHeight() != mnImageHeight)
            throw krv::DataException("Bitmap " + std::to_string(nBitmap) + " is not of the image's size");
        return std::make_unique<BitmapBackground>(std::move(poReader));
    };
    mnBitmap = FindValidityMask(*poBitmaps);
    if (mnBitmap != 0)
        mpoBitmap = Read(mnBitmap);
    const std::map<unsigned int, unsigned int> oMasks = FindChannelMasks(*poBitmaps);
    const auto HasMask = [&oMasks](unsigned int nChannel)
    {
        return oMasks.count(nChannel) != 0;
    };
    if (std::none_of(oChannels.begin(), oChannels.end(), HasMask))
        return;
    moChannels.resize(oChannels.size());
    for (std::size_t n = 0; n < oChannels.size(); ++n)
        if (HasMask(oChannels[n]))
            moChannels[n].mpoMask = Read(oMasks.at(oChannels[n]));
}

std::vector<BitmapBackground*> ValiditySource::ListBeside() const
{
    std::vector<BitmapBackground*> oList = {mpoBitmap.get(), mpoAlpha.get()};
    for (const Channel& oChannel : moChannels)
        oList.push_back(oChannel.mpoMask.get());
    std::erase(oList, nullptr);
    return oList;
}

const IMaskBuilder* ValiditySource::GetChannelMask(std::size_t nPosition) const
{
    return nPosition < moChannels.size() ? moChannels[nPosition].mpoMask.get() : nullptr;
}

void ValiditySource::UseLevel(IDataset& oDataset, unsigned int nWidth, unsigned int nHeight)
{
    std::unique_ptr<BasicReader> poStored;
    if (mpoBitmap != nullptr)
        poStored = detail::ReadStoredLevel(oDataset, mnBitmap, nWidth, nHeight);
    for (BitmapBackground* const poBeside : ListBeside())
        poBeside->SetReader(detail::ReadReduced(oDataset, poBeside->TakeReader(), nWidth, nHeight));
    if (poStored != nullptr)
        mpoBitmap->SetReader(std::move(poStored));
    mnImageWidth = nWidth;
    mnImageHeight = nHeight;
}

void ValiditySource::UseAlphaOfRaster(unsigned int nPosition)
{
    mnAlphaInRaster = nPosition;
    mpoAlphaOfRaster = ZeroOrNaN(nPosition);
}

void ValiditySource::SetMarginBehaviour(eMarginBehaviour eBehaviour)
{
    meBehaviour = eBehaviour;
    // What is read beside the raster is not valid outside the image when the raster's margins are not copies.
    const eMarginBehaviour eRead = CopiesPixels(eBehaviour) ? eBehaviour : eConstant;
    for (const BitmapBackground* const poBeside : ListBeside())
        poBeside->GetReader().SetMargins(0, 0, eRead);
}

std::unique_ptr<Mask> ValiditySource::CombineChannels(const Raster& oRaster) const
{
    std::unique_ptr<Mask> poAll;
    for (const Channel& oChannel : moChannels)
    {
        std::unique_ptr<Mask> poOne(oChannel.mpoNoData != nullptr ? oChannel.mpoNoData->BuildMask(oRaster)
                                                                  : new Mask(oRaster.GetInfo(), oRaster.GetContext()));
        if (oChannel.mpoMask != nullptr)
            Add(*poOne, *std::unique_ptr<Mask>(oChannel.mpoMask->BuildMask(oRaster)));
        if (poAll == nullptr)
            poAll = std::move(poOne);
        else if (meRule == krv::gobs::eAllChannels)
            KeepCommon(*poAll, *poOne);
        else
            Add(*poAll, *poOne);
    }
    return poAll;
}

Mask* ValiditySource::BuildMask(const Raster& oRaster) const
{
    std::unique_ptr<Mask> oMask =
        HasChannelMasks() ? CombineChannels(oRaster) : std::unique_ptr<Mask>(mpoNoData->BuildMask(oRaster));
    if (mpoAlphaOfRaster != nullptr)
        Add(*oMask, *std::unique_ptr<Mask>(mpoAlphaOfRaster->BuildMask(oRaster)));
    for (const BitmapBackground* const poBeside : {mpoBitmap.get(), mpoAlpha.get()})
        if (poBeside != nullptr)
            Add(*oMask, *std::unique_ptr<Mask>(poBeside->BuildMask(oRaster)));
    if (!CopiesPixels(meBehaviour) && ReachesOutside(*oMask, mnImageWidth, mnImageHeight))
        AddOutside(*oMask, mnImageWidth, mnImageHeight);
    Invert(*oMask);
    return oMask.release();
}

} // namespace krv::datasources
