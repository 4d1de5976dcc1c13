#include "operations/masking/masking.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/maskbuilder/bitmapmaskbuilder.h"
#include "datasources/maskbuilder/polygonmaskbuilder.h"
#include "datasources/reader/irasterreader.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/mask/exactmaskdecision.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "gobs/tile/tileiterator.h"
#include "operations/job/exceptions.h"
#include "operations/job/progress.h"
#include "operations/masking/detail/polygonplacer.h"
#include "operations/masking/polygontext.h"
#include "operations/picture/picturewriter.h"
#include "operations/source/fileworkers.h"
#include "operations/source/sourcefile.h"
#include "toolkit/core/gglshape.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/threading/foreachitem.h"

#include <fmt/format.h>

#include <algorithm>
#include <bit>
#include <cmath>
#include <functional>
#include <limits>
#include <memory>

namespace krv::operations
{

namespace
{

using krv::gobs::Mask;
using krv::gobs::Raster;
using krv::gobs::RasterContext;
using krv::gobs::RasterInfo;
using MaskPointer = std::unique_ptr<Mask>;
using TileMasker = std::function<MaskPointer(const RasterInfo&, const RasterContext&)>;

// Whether the rectangle around a shape meets that of the image.
bool Touches(const GGLShape& oShape, const krv::datasources::IRasterDataset& oImage)
{
    double nLeft = HUGE_VAL, nTop = HUGE_VAL, nRight = -HUGE_VAL, nBottom = -HUGE_VAL;
    for (const GDBVertex& oVertex : oShape.GetVertices())
    {
        nLeft = std::min(nLeft, oVertex.x);
        nRight = std::max(nRight, oVertex.x);
        nTop = std::min(nTop, oVertex.y);
        nBottom = std::max(nBottom, oVertex.y);
    }
    return nRight > 0 && nBottom > 0 && nLeft < oImage.GetWidth() && nTop < oImage.GetHeight();
}

// Nothing when all polygons lie outside of the image.
TileMasker MaskPolygons(const SourceFile& oFile, const MaskRequest& oRequest)
{
    const auto nRows = static_cast<int>(oFile.GetRaster().GetHeight());
    std::shared_ptr<krv::datasources::PolygonMaskBuilder> poBuilder;
    for (const PolygonText& oText : oRequest.polygons)
    {
        detail::PolygonPlacer oPlacer(oFile, oRequest, oText);
        for (const auto& oRings : oText.polygons)
            for (const GGLShape& oShape : oPlacer.Place(oRings))
            {
                if (!Touches(oShape, oFile.GetRaster()))
                    continue;
                if (poBuilder == nullptr)
                    poBuilder = std::make_shared<krv::datasources::PolygonMaskBuilder>(oShape, 0, nRows);
                else
                    poBuilder->AddPolygon(oShape, 0, nRows);
            }
    }
    if (poBuilder == nullptr)
        return {};
    return [poBuilder](const RasterInfo& oInfo, const RasterContext& oContext)
    {
        return MaskPointer(poBuilder->BuildMask(Raster(oInfo, oContext)));
    };
}

krv::datasources::IBitmapDataset& GetBitmaps(const SourceFile& oFile)
{
    auto* const poBitmaps = dynamic_cast<krv::datasources::IBitmapDataset*>(&oFile.GetDataset());
    if (poBitmaps == nullptr)
        throw krv::DataException(oFile.GetName() + ": files of this format have no bitmaps");
    return *poBitmaps;
}

void CheckBitmap(const SourceFile& oFile, unsigned int nBitmap)
{
    const auto oList = GetBitmaps(oFile).GetBitmapList();
    if (std::find(oList.begin(), oList.end(), nBitmap) == oList.end())
        throw RequestException(
            fmt::format("{}: there is no bitmap {}; {}", oFile.GetName(), nBitmap,
                        oList.empty() ? "the file has none" : fmt::format("there are {}", fmt::join(oList, ", "))));
}

template <typename Operation>
void Combine(Mask& oMask, const Mask& oOther, Operation oOperation)
{
    std::transform(oMask.GetBits(), oMask.GetBits() + oMask.GetBitsSize(), oOther.GetBits(), oMask.GetBits(),
                   oOperation);
}

TileMasker MaskBitmaps(const SourceFile& oFile, const MaskRequest& oRequest)
{
    std::vector<krv::datasources::BitmapMaskBuilder> oBuilders;
    for (const unsigned int nBitmap : oRequest.bitmaps)
    {
        CheckBitmap(oFile, nBitmap);
        oBuilders.emplace_back(&GetBitmaps(oFile), nBitmap, false);
    }
    return [oBuilders](const RasterInfo& oInfo, const RasterContext& oContext)
    {
        MaskPointer poMask(oBuilders.front().BuildMask(oInfo, oContext));
        for (std::size_t i = 1; i < oBuilders.size(); ++i)
            Combine(*poMask, *MaskPointer(oBuilders[i].BuildMask(oInfo, oContext)), std::bit_or<unsigned char>());
        return poMask;
    };
}

// The channels of one type that have a no-data value, and what marks them.
struct NoDataGroup
{
    LevelReader reader;
    krv::gobs::MaskDecisionBuilder builder;
};

TileMasker MaskNoData(const SourceFile& oFile, const MaskRequest& oRequest)
{
    std::vector<unsigned int> oChannels = oFile.CheckChannels(oRequest.channels);
    std::erase_if(oChannels, [&](unsigned int nChannel) { return !oFile.GetNoData(nChannel); });
    if (oChannels.empty())
        throw krv::DataException(oFile.GetName() + ": no no-data value is recorded");
    const auto poGroups = std::make_shared<std::vector<NoDataGroup>>();
    for (const ChannelGroup& oGroup : oFile.GroupByType(oChannels))
    {
        std::vector<krv::gobs::SampleValue> oValues;
        std::vector<unsigned int> oPlaces;
        for (const unsigned int nChannel : oGroup.channels)
        {
            oValues.push_back(*oFile.GetNoData(nChannel));
            oPlaces.push_back(static_cast<unsigned int>(oPlaces.size()) + 1);
        }
        const krv::gobs::ExactMaskDecision oDecision(oRequest.rule, oValues, oPlaces);
        poGroups->push_back({oFile.Read(oGroup.channels), krv::gobs::MaskDecisionBuilder(&oDecision)});
    }
    const bool bAny = oRequest.rule == krv::gobs::eAnyChannel;
    return [poGroups, bAny](const RasterInfo& oInfo, const RasterContext& oContext)
    {
        MaskPointer poMask;
        for (const NoDataGroup& oGroup : *poGroups)
        {
            const std::unique_ptr<Raster> poTile(oGroup.reader.Get().ReadRaster(
                static_cast<unsigned int>(oContext.GetX()), static_cast<unsigned int>(oContext.GetY()),
                oInfo.GetWidth(), oInfo.GetHeight()));
            MaskPointer poNext(oGroup.builder.BuildMask(*poTile));
            if (poMask == nullptr)
                poMask = std::move(poNext);
            else if (bAny)
                Combine(*poMask, *poNext, std::bit_or<unsigned char>());
            else
                Combine(*poMask, *poNext, std::bit_and<unsigned char>());
        }
        return poMask;
    };
}

// A reduced picture of the mask: each pixel as bright as the share of set bits in it.
class MaskPicture
{
public:
    MaskPicture(unsigned int nWidth, unsigned int nHeight, unsigned int nLongest)
        : mnFullWidth(nWidth), mnFullHeight(nHeight)
    {
        const double nScale = std::min(static_cast<double>(nLongest) / std::max({nWidth, nHeight, 1u}), 1.0);
        moPicture.width = std::max(static_cast<unsigned int>(std::lround(nWidth * nScale)), 1u);
        moPicture.height = std::max(static_cast<unsigned int>(std::lround(nHeight * nScale)), 1u);
        moPicture.samples = 1;
        moCounts.resize(std::size_t{moPicture.width} * moPicture.height);
    }

    void Add(const Mask& oMask)
    {
        for (unsigned int y = 0; y < oMask.GetHeight(); ++y)
        {
            const std::uint64_t nRow =
                (std::uint64_t{static_cast<unsigned int>(oMask.GetY())} + y) * moPicture.height / mnFullHeight;
            std::uint32_t* const pCounts = moCounts.data() + nRow * moPicture.width;
            for (unsigned int x = 0; x < oMask.GetWidth(); ++x)
            {
                if (!oMask.GetBit(x, y))
                    continue;
                const std::uint64_t nColumn = std::uint64_t{static_cast<unsigned int>(oMask.GetX())} + x;
                ++pCounts[nColumn * moPicture.width / mnFullWidth];
            }
        }
    }

    const Picture& Finish()
    {
        const auto SizeOf = [](std::uint64_t n, std::uint64_t nReduced, std::uint64_t nFull)
        {
            const auto FirstOf = [=](std::uint64_t i)
            {
                return (i * nFull + nReduced - 1) / nReduced;
            };
            return FirstOf(n + 1) - FirstOf(n);
        };
        moPicture.pixels.resize(moCounts.size());
        for (std::uint64_t y = 0, i = 0; y < moPicture.height; ++y)
            for (std::uint64_t x = 0; x < moPicture.width; ++x, ++i)
            {
                const std::uint64_t nAll =
                    SizeOf(x, moPicture.width, mnFullWidth) * SizeOf(y, moPicture.height, mnFullHeight);
                moPicture.pixels[i] = static_cast<std::uint8_t>((std::uint64_t{moCounts[i]} * 255 + nAll / 2) / nAll);
            }
        return moPicture;
    }

private:
    std::uint64_t mnFullWidth;
    std::uint64_t mnFullHeight;
    std::vector<std::uint32_t> moCounts;
    Picture moPicture;
};

// The bitmap that takes the mask.
class BitmapTarget
{
public:
    BitmapTarget(const SourceFile& oFile, const MaskRequest& oRequest)
        : mnBitmap(Choose(oFile, oRequest)), mbComplement(oRequest.noData && oRequest.kind == BitmapKind::eValidity),
          moWriter(&GetBitmaps(oFile), {mnBitmap})
    {
    }

    unsigned int GetBitmap() const { return mnBitmap; }
    bool IsComplement() const { return mbComplement; }

    void Add(const Mask& oMask)
    {
        Raster oBytes({oMask.GetWidth(), oMask.GetHeight(), 1, krv::gobs::eDT_8U}, oMask.GetContext());
        oMask.RetrieveRaster(oBytes);
        if (mbComplement)
        {
            for (std::uint64_t i = 0; i < oBytes.GetBufferSize(); ++i)
                oBytes.GetBuffer()[i] ^= 1;
        }
        moWriter.WriteRaster(&oBytes);
    }

    void Finish() { moWriter.Synchronize(); }

private:
    static unsigned int Choose(const SourceFile& oFile, const MaskRequest& oRequest)
    {
        auto& oBitmaps = GetBitmaps(oFile);
        const bool bValidity = oRequest.kind == BitmapKind::eValidity;
        const unsigned int nMask = krv::datasources::FindValidityMask(oBitmaps);
        unsigned int nBitmap = oRequest.target.value_or(nMask);
        if (nBitmap != 0)
            CheckBitmap(oFile, nBitmap);
        if (bValidity && nMask != 0 && nBitmap != nMask)
            throw RequestException(fmt::format("{}: bitmap {} is the validity mask, and there is only one; write to "
                                               "that bitmap to replace it, or store a zone beside it",
                                               oFile.GetName(), nMask),
                                   "target");
        if (nBitmap == 0)
            nBitmap = oBitmaps.CreateBitmap();
        if (bValidity)
            oBitmaps.SetBitmapDescription(nBitmap, "");
        else if (oRequest.kind && oBitmaps.GetBitmapDescription(nBitmap).empty())
            oBitmaps.SetBitmapDescription(nBitmap, fmt::format("Bitmap {}", nBitmap));
        return nBitmap;
    }

    unsigned int mnBitmap;
    bool mbComplement;
    krv::datasources::BasicWriter moWriter;
};

// What a thread needs: what makes masks, and the file that it reads.
struct Worker
{
    FilePointer file;
    TileMasker masker;
};

// Polygons are placed once; what makes their masks is not changed by it.
FileWorkers<Worker>::MakeWorker MakeMaskers(const MaskRequest& oRequest, const TileMasker& oPolygons)
{
    return [&oRequest, oPolygons](FilePointer poFile)
    {
        TileMasker oMasker = oPolygons         ? oPolygons
                             : oRequest.noData ? MaskNoData(*poFile, oRequest)
                                               : MaskBitmaps(*poFile, oRequest);
        return std::make_unique<Worker>(std::move(poFile), std::move(oMasker));
    };
}

struct TileMask
{
    MaskPointer mask;
    std::uint64_t set;
};

} // namespace

MaskResult MakeMask(const SourceFile& oFile, const MaskRequest& oRequest, const Progress& oProgress,
                    krv::threading::IExecutor* poExecutor)
{
    const unsigned int nWidth = oFile.GetRaster().GetWidth(), nHeight = oFile.GetRaster().GetHeight();
    if (std::max(nWidth, nHeight) > static_cast<unsigned int>(std::numeric_limits<int>::max()))
        throw krv::DataException(oFile.GetName() + ": the image is too large for masks");
    // A file that is written belongs to the thread that writes: others read what was there before, or nobody does.
    const auto poRead = oRequest.IsWriting() && poExecutor != nullptr ? oFile.OpenAgain() : nullptr;
    if (oRequest.IsWriting() && poRead == nullptr)
        poExecutor = nullptr;
    const SourceFile& oSource = poRead != nullptr ? *poRead : oFile;
    const TileMasker oPolygons = oRequest.polygons.empty() ? TileMasker() : MaskPolygons(oSource, oRequest);
    if (!oRequest.polygons.empty() && !oPolygons)
    {
        krv::nspio::Warning::Warn(oFile.GetName() + ": no polygon touches the image; nothing is written");
        return {0, std::uint64_t{nWidth} * nHeight};
    }
    FileWorkers<Worker> oWorkers(oSource, MakeMaskers(oRequest, oPolygons));
    std::optional<MaskPicture> oPicture;
    if (!oRequest.picture.empty())
        oPicture.emplace(nWidth, nHeight, oRequest.pictureSize);
    std::optional<BitmapTarget> oTarget;
    if (oRequest.IsWriting())
        oTarget.emplace(oFile, oRequest);

    const LevelReader oGrid = oFile.Read({1});
    krv::gobs::TileIterator oTiles(nWidth, nHeight);
    oTiles.SetChunkSize(oGrid.Get().GetTileWidth(), oGrid.Get().GetTileHeight());
    MaskResult oResult;
    ProgressCounter oCounter(oProgress, "mask", std::uint64_t{nWidth} * nHeight);
    krv::threading::TaskGroup oThreads(poExecutor, [&oCounter] { oCounter.Repeat(); });
    krv::threading::ForEachItem(
        oThreads, oTiles.GetTileRange() + 1,
        [&](std::uint64_t nTile)
        {
            const FileWorkers<Worker>::Use oWorker(oWorkers);
            const krv::gobs::Tile oTile = oTiles.GetTile(static_cast<unsigned int>(nTile));
            const RasterContext oContext(static_cast<int>(oTile.GetX()), static_cast<int>(oTile.GetY()));
            MaskPointer poMask =
                oWorker->masker({oTile.GetWidth(), oTile.GetHeight(), 1, krv::gobs::eDT_BIT}, oContext);
            const std::uint64_t nSet = poMask->CountSet();
            return TileMask{std::move(poMask), nSet};
        },
        [&](const TileMask& oTile)
        {
            oResult.set += oTile.set;
            if (oPicture)
                oPicture->Add(*oTile.mask);
            if (oTarget)
                oTarget->Add(*oTile.mask);
            oCounter.Advance(std::uint64_t{oTile.mask->GetWidth()} * oTile.mask->GetHeight());
        });
    oResult.pixels = std::uint64_t{nWidth} * nHeight;
    if (oPicture)
        WritePng(oPicture->Finish(), oRequest.picture, oProgress);
    if (oTarget)
    {
        const StoringProgress oStoring(oFile.GetDataset(), oProgress);
        oTarget->Finish();
        oResult.bitmap = oTarget->GetBitmap();
        oResult.complement = oTarget->IsComplement();
        oResult.validity = krv::datasources::FindValidityMask(GetBitmaps(oFile)) == oResult.bitmap;
        const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(oFile.GetRaster().GetOverviewManager());
        oResult.levels = poLevels != nullptr && !poLevels->GetLevels().empty();
    }
    return oResult;
}

} // namespace krv::operations
