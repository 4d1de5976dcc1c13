#include "datasources/reader/derived/rastercache.h"

#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/checkrastercompatible.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/readervalidity.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "toolkit/cache/tilestore.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <algorithm>
#include <atomic>
#include <cstring>
#include <mutex>
#include <utility>

namespace krv::datasources
{

using krv::cache::TileHold;
using krv::cache::TileOwner;
using krv::cache::TileRequest;
using krv::cache::TileStore;
using krv::gobs::Mask;
using krv::gobs::Raster;

// What all fronts, levels included, have in common.
struct RasterCache::Core
{
    explicit Core(const CacheOptions& oOptions)
        : moOptions(oOptions),
          mpoOwnStore(oOptions.mnCeiling != 0 ? std::make_unique<TileStore>(oOptions.mnCeiling) : nullptr),
          moTiles(mpoOwnStore != nullptr ? *mpoOwnStore : TileStore::Process(), krv::cache::TileLayer::eDerived)
    {
    }

    // Tiles below a ceiling of their own count into the process's budget too.
    void Charge()
    {
        if (mpoOwnStore == nullptr)
            return;
        const std::lock_guard<std::mutex> oLock(moChargeMutex);
        moCharge.Set(mpoOwnStore->GetStatistics().mnBytes);
    }

    CacheOptions moOptions;
    Factory moMake; // empty: there is one source, below
    OwnedOrBorrowed<IRasterReader> mpoSource;
    std::mutex moSourceMutex; // guards the source and its levels, when there is one
    std::mutex moChargeMutex; // guards moCharge
    krv::cache::TileCharge moCharge;
    std::unique_ptr<TileStore> mpoOwnStore;
    TileOwner moTiles;
    std::atomic<std::uint64_t> mnHits{0};
    std::atomic<std::uint64_t> mnMisses{0};
    std::atomic<std::uint64_t> mnPassed{0};
    std::atomic<bool> mbLevels{false}; // a level was asked for
};

// What a source says of itself, asked once.
struct RasterCache::Image
{
    Image(std::shared_ptr<Core> poCore, unsigned int nLevel, IRasterReader& oSource)
        : mpoCore(std::move(poCore)), mnLevel(nLevel), mnWidth(oSource.GetWidth()), mnHeight(oSource.GetHeight()),
          mnChannels(oSource.GetChansCount()), moType(oSource.GetDataType()), mpoFormat(oSource.GetFileFormat()),
          moRecord(oSource.GetAuxiliaryData()), mpoCrs(oSource.GetCRS()), mpoGeocoding(oSource.GetGeocodingInfo()),
          mnSourceTileWidth(oSource.GetTileWidth()), mnSourceTileHeight(oSource.GetTileHeight())
    {
        if (mnWidth == 0 || mnHeight == 0 || mnChannels == 0)
            throw krv::DataException("The source reader has no pixels");
        if (moType.GetValueBits() % 8 != 0)
            throw krv::DataException("The source reader has the data type " + moType.Describe() +
                                     ", which has no whole bytes");
        for (const IChannelInfo* const poInfo : oSource.GetChannelsInfo())
            moInfos.Add(std::make_unique<ChannelInfo>(poInfo->GetDataType()));
        mbValidity = ReaderValidity(oSource).IsNeeded();
        const CacheOptions& oOptions = mpoCore->moOptions;
        mnTileWidth = std::clamp(oOptions.mnTileWidth != 0 ? oOptions.mnTileWidth : mnSourceTileWidth, 1u, mnWidth);
        mnTileHeight =
            std::clamp(oOptions.mnTileHeight != 0 ? oOptions.mnTileHeight : mnSourceTileHeight, 1u, mnHeight);
        mnPixelBytes = moType.GetValueBits() / 8 * mnChannels;
    }

    // Whether another source is of the same kind.
    void Check(const IRasterReader& oSource) const
    {
        if (oSource.GetWidth() != mnWidth || oSource.GetHeight() != mnHeight || oSource.GetChansCount() != mnChannels ||
            oSource.GetDataType() != moType)
            throw krv::DataException("The factory made a reader of another image");
    }

    unsigned int GetColumns() const { return (mnWidth - 1) / mnTileWidth + 1; }
    std::size_t GetRowBytes(unsigned int nPixels) const { return nPixels * (mnPixelBytes + (mbValidity ? 1 : 0)); }

    std::shared_ptr<Core> mpoCore;
    unsigned int mnLevel; // 0: the image itself
    unsigned int mnWidth;
    unsigned int mnHeight;
    unsigned int mnChannels;
    krv::gobs::DataType moType;
    IFileFormat* mpoFormat;
    AuxiliaryData moRecord;
    std::unique_ptr<krv::ogc::cs::ICRS> mpoCrs;
    std::mutex moCrsMutex; // guards mpoCrs, which a thread clones
    std::unique_ptr<krv::ogc::cs::GeocodingInfo> mpoGeocoding;
    unsigned int mnSourceTileWidth;
    unsigned int mnSourceTileHeight;
    detail::ChannelInfos moInfos;
    bool mbValidity = false;
    unsigned int mnTileWidth = 0;
    unsigned int mnTileHeight = 0;
    std::size_t mnPixelBytes = 0;
};

namespace
{

// A rectangle of an image.
struct Area
{
    unsigned int mnX;
    unsigned int mnY;
    unsigned int mnWidth;
    unsigned int mnHeight;
};

} // namespace

// The reading of one front.
class RasterCache::Front
{
public:
    // poOwn: of this front alone, or null.
    Front(Image& oImage, std::unique_ptr<IRasterReader> poOwn) : moImage(oImage), mpoOwn(std::move(poOwn)) {}

    // Runs an action with the source, under its lock when others use it too.
    template <typename Action>
    auto WithSource(const Action& oAction)
    {
        Core& oCore = *moImage.mpoCore;
        std::unique_lock<std::mutex> oLock;
        if (!oCore.moMake)
            oLock = std::unique_lock(oCore.moSourceMutex);
        return oAction(GetSource());
    }

    // A rectangle inside the image; pValid: a byte per pixel, or null when it is not asked for.
    void Read(const Area& oArea, unsigned char* pPixels, unsigned char* pValid, bool bPassing)
    {
        for (unsigned int nRow = oArea.mnY / moImage.mnTileHeight;
             nRow <= (oArea.mnY + oArea.mnHeight - 1) / moImage.mnTileHeight; ++nRow)
        {
            for (unsigned int nColumn = oArea.mnX / moImage.mnTileWidth;
                 nColumn <= (oArea.mnX + oArea.mnWidth - 1) / moImage.mnTileWidth; ++nColumn)
                CopyTile(nColumn, nRow, oArea, pPixels, pValid, bPassing);
        }
    }

    // A raster that the source makes by itself, with its margins.
    std::unique_ptr<Mask> PassOn(Raster& oRaster, eMarginBehaviour eBehaviour, bool bValidity)
    {
        ++moImage.mpoCore->mnPassed;
        return WithSource(
            [&](IRasterReader& oSource)
            {
                oSource.SetMargins(0, 0, eBehaviour);
                if (bValidity)
                    return GetValidity(oSource).Read(oRaster);
                oSource.ReadRaster(&oRaster);
                return std::unique_ptr<Mask>();
            });
    }

    // Stands on the front itself, for rasters that reach outside; null without exact margins.
    ExactHaloReader* GetBordered(RasterCache& oReader)
    {
        if (moImage.mpoCore->moOptions.mbExactMargins && mpoBordered == nullptr)
            mpoBordered = std::make_unique<ExactHaloReader>(&oReader, false);
        return mpoBordered.get();
    }

private:
    IRasterReader& GetSource()
    {
        Core& oCore = *moImage.mpoCore;
        if (mpoOwn == nullptr && oCore.moMake)
        {
            std::unique_ptr<IRasterReader> poMade = oCore.moMake();
            if (poMade == nullptr)
                throw krv::DataException("The factory made no reader");
            moImage.Check(*poMade);
            mpoOwn = std::move(poMade);
        }
        return mpoOwn != nullptr ? *mpoOwn : *oCore.mpoSource;
    }

    ReaderValidity& GetValidity(IRasterReader& oSource)
    {
        if (mpoValidity == nullptr)
            mpoValidity = std::make_unique<ReaderValidity>(oSource);
        return *mpoValidity;
    }

    void CopyTile(unsigned int nColumn, unsigned int nRow, const Area& oArea, unsigned char* pPixels,
                  unsigned char* pValid, bool bPassing)
    {
        const unsigned int nLeft = nColumn * moImage.mnTileWidth, nTop = nRow * moImage.mnTileHeight;
        const Area oTile{nLeft, nTop, std::min(moImage.mnTileWidth, moImage.mnWidth - nLeft),
                         std::min(moImage.mnTileHeight, moImage.mnHeight - nTop)};
        const unsigned int nX = std::max(oArea.mnX, nLeft), nY = std::max(oArea.mnY, nTop);
        const unsigned int nRight = std::min(oArea.mnX + oArea.mnWidth, nLeft + oTile.mnWidth);
        const unsigned int nBottom = std::min(oArea.mnY + oArea.mnHeight, nTop + oTile.mnHeight);
        const std::size_t nRowBytes = moImage.GetRowBytes(oTile.mnWidth);
        TileRequest oRequest;
        oRequest.moName = {std::uint64_t{nRow} * moImage.GetColumns() + nColumn, moImage.mnLevel};
        oRequest.moShape = {nRowBytes, oTile.mnHeight};
        oRequest.moArea = {0, nY - nTop, nRowBytes, nBottom - nY};
        const TileHold oHold = Obtain(oRequest, oTile);
        const unsigned char* pFrom = oHold.GetFirst();
        std::size_t nTo = std::size_t{nY - oArea.mnY} * oArea.mnWidth + (nX - oArea.mnX);
        for (unsigned int n = nY; n < nBottom; ++n, pFrom += oHold.GetPitch(), nTo += oArea.mnWidth)
        {
            std::memcpy(pPixels + nTo * moImage.mnPixelBytes, pFrom + (nX - nLeft) * moImage.mnPixelBytes,
                        (nRight - nX) * moImage.mnPixelBytes);
            if (pValid != nullptr)
                std::memcpy(pValid + nTo, pFrom + oTile.mnWidth * moImage.mnPixelBytes + (nX - nLeft), nRight - nX);
        }
        if (bPassing)
            moImage.mpoCore->moTiles.Retire(oRequest.moName);
    }

    TileHold Obtain(const TileRequest& oRequest, const Area& oTile)
    {
        Core& oCore = *moImage.mpoCore;
        bool bMade = false;
        TileHold oHold = oCore.moTiles.Obtain(oRequest,
                                              [&](unsigned char* pBytes)
                                              {
                                                  bMade = true;
                                                  MakeTile(oTile, pBytes);
                                              });
        ++(bMade ? oCore.mnMisses : oCore.mnHits);
        if (bMade)
            oCore.Charge();
        return oHold;
    }

    // Rows of pixels, each followed by a byte for every pixel that says whether it is valid, where anything can be
    // invalid.
    void MakeTile(const Area& oTile, unsigned char* pBytes)
    {
        const krv::gobs::RasterInfo oInfo(oTile.mnWidth, oTile.mnHeight, moImage.mnChannels, moImage.moType);
        const krv::gobs::RasterContext oContext(static_cast<int>(oTile.mnX), static_cast<int>(oTile.mnY));
        if (!moImage.mbValidity)
        {
            Raster oRaster(oInfo, oContext, pBytes, false);
            return WithSource([&](IRasterReader& oSource) { oSource.ReadRaster(&oRaster); });
        }
        Raster oRaster(oInfo, oContext);
        const std::unique_ptr<Mask> poMask =
            WithSource([&](IRasterReader& oSource) { return GetValidity(oSource).Read(oRaster); });
        const std::size_t nPixelBytes = oTile.mnWidth * moImage.mnPixelBytes;
        for (unsigned int nRow = 0; nRow < oTile.mnHeight; ++nRow, pBytes += moImage.GetRowBytes(oTile.mnWidth))
        {
            std::memcpy(pBytes, oRaster.GetBuffer() + nRow * nPixelBytes, nPixelBytes);
            for (unsigned int n = 0; n < oTile.mnWidth; ++n)
                pBytes[nPixelBytes + n] = poMask == nullptr || poMask->GetBit(n, nRow) ? 1 : 0;
        }
    }

    Image& moImage;
    std::unique_ptr<IRasterReader> mpoOwn;
    std::unique_ptr<ReaderValidity> mpoValidity; // of the source; used as that is
    std::unique_ptr<ExactHaloReader> mpoBordered;
};

// The levels of a source, each behind the same tiles.
class CachedLevels : public DerivedOverviewReaderAccessor
{
public:
    CachedLevels(std::unique_ptr<IOverviewReaderAccessor> poLevels, std::shared_ptr<RasterCache::Core> poCore)
        : DerivedOverviewReaderAccessor(std::move(poLevels)), mpoCore(std::move(poCore))
    {
    }

    IRasterReader* CreateRasterReader(unsigned int nLevel) override
    {
        mpoCore->mbLevels = true;
        std::unique_lock<std::mutex> oLock;
        if (!mpoCore->moMake)
            oLock = std::unique_lock(mpoCore->moSourceMutex);
        return new RasterCache(mpoCore, nLevel, OpenWrapped(nLevel));
    }

private:
    std::shared_ptr<RasterCache::Core> mpoCore;
};

RasterCache::RasterCache(IRasterReader* poSource, bool bTakeOwnership, const CacheOptions& oOptions)
{
    if (poSource == nullptr)
        throw krv::DataException("The source reader is NULL");
    const auto poCore = std::make_shared<Core>(oOptions);
    poCore->mpoSource.reset(poSource);
    mpoImage = std::make_shared<Image>(poCore, 0, *poSource);
    mpoFront = std::make_unique<Front>(*mpoImage, nullptr);
    UseSourceGrid();
    poCore->mpoSource.get_deleter().mbOwned = bTakeOwnership;
}

RasterCache::RasterCache(Factory oMake, const CacheOptions& oOptions)
{
    if (!oMake)
        throw krv::DataException("The factory is empty");
    std::unique_ptr<IRasterReader> poFirst = oMake();
    if (poFirst == nullptr)
        throw krv::DataException("The factory made no reader");
    const auto poCore = std::make_shared<Core>(oOptions);
    poCore->moMake = std::move(oMake);
    mpoImage = std::make_shared<Image>(poCore, 0, *poFirst);
    mpoFront = std::make_unique<Front>(*mpoImage, std::move(poFirst));
    UseSourceGrid();
}

RasterCache::RasterCache(std::shared_ptr<Core> poCore, unsigned int nLevel, std::unique_ptr<IRasterReader> poLevel)
    : mpoImage(std::make_shared<Image>(std::move(poCore), nLevel, *poLevel)),
      mpoFront(std::make_unique<Front>(*mpoImage, std::move(poLevel)))
{
    UseSourceGrid();
}

// A front of its own over the same store; the base has nothing to copy.
// NOLINTNEXTLINE(bugprone-copy-constructor-init)
RasterCache::RasterCache(const RasterCache& oOther)
    : DerivedReader(), mpoImage(oOther.mpoImage), mpoFront(std::make_unique<Front>(*mpoImage, nullptr))
{
    if (mpoImage->mnLevel != 0)
        throw krv::DataException("A level has one front; its accessor makes others");
    SetGrid(GetWidth(), GetHeight(), oOther.GetTileWidth(), oOther.GetTileHeight());
    KeepMargins(oOther.GetXMargin(), oOther.GetYMargin(), oOther.GetMarginBehaviour());
    if (ExactHaloReader* const poBordered = mpoFront->GetBordered(*this))
        poBordered->SetMargins(GetXMargin(), GetYMargin(), GetMarginBehaviour());
}

RasterCache::~RasterCache()
{
    std::unique_lock<std::mutex> oLock;
    if (!mpoImage->mpoCore->moMake && mpoImage->mnLevel != 0)
        oLock = std::unique_lock(mpoImage->mpoCore->moSourceMutex);
    mpoFront.reset(); // a level's reader is part of the source
}

void RasterCache::UseSourceGrid()
{
    SetGrid(GetWidth(), GetHeight(), mpoImage->mnSourceTileWidth, mpoImage->mnSourceTileHeight);
}

void RasterCache::SetOptimalTileSize()
{
    SetTileSize(mpoImage->mnTileWidth, mpoImage->mnTileHeight);
}

void RasterCache::SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour)
{
    if (ExactHaloReader* const poBordered = mpoFront->GetBordered(*this))
        poBordered->SetMargins(nXMargin, nYMargin, eBehaviour);
    else
    {
        KeepMargins(GetXMargin(), GetYMargin(), eBehaviour); // stays where the widths are refused, as in the source
        mpoFront->WithSource([&](IRasterReader& oSource) { oSource.SetMargins(nXMargin, nYMargin, eBehaviour); });
    }
    KeepMargins(nXMargin, nYMargin, eBehaviour);
}

namespace
{

// The tests on the right and at the bottom are those of readers of files, which make a margin that ends at the edge.
bool IsClearOfBorder(const Raster& oRaster, unsigned int nWidth, unsigned int nHeight)
{
    const std::int64_t nX = std::int64_t{oRaster.GetX()} - oRaster.GetXMargin();
    const std::int64_t nY = std::int64_t{oRaster.GetY()} - oRaster.GetYMargin();
    const std::int64_t nRight = nX + static_cast<std::int64_t>(oRaster.GetFullWidth());
    const std::int64_t nBottom = nY + static_cast<std::int64_t>(oRaster.GetFullHeight());
    const bool bMargins = oRaster.GetXMargin() != 0 || oRaster.GetYMargin() != 0;
    return nX >= 0 && nY >= 0 && nRight <= nWidth - (bMargins ? 1 : 0) && nBottom <= nHeight - (bMargins ? 1 : 0);
}

Area AreaOf(const Raster& oRaster)
{
    return {static_cast<unsigned int>(oRaster.GetX()) - oRaster.GetXMargin(),
            static_cast<unsigned int>(oRaster.GetY()) - oRaster.GetYMargin(),
            static_cast<unsigned int>(oRaster.GetFullWidth()), static_cast<unsigned int>(oRaster.GetFullHeight())};
}

} // namespace

Raster* RasterCache::GetRaster(unsigned int nIndex)
{
    mbPassing = mpoImage->mpoCore->moOptions.mbPassing;
    std::unique_ptr<Raster> poRaster;
    try
    {
        poRaster.reset(DerivedReader::GetRaster(nIndex));
    }
    catch (...)
    {
        mbPassing = false;
        throw;
    }
    mbPassing = false;
    return poRaster.release();
}

void RasterCache::ReadRaster(Raster* poRaster)
{
    krv::gobs::CheckRasterCompatible(poRaster, this);
    if (poRaster->GetWidth() == 0 || poRaster->GetHeight() == 0)
        return;
    ExactHaloReader* const poBordered = mpoFront->GetBordered(*this);
    if (poBordered != nullptr ? poBordered->IsInside(*poRaster) : IsClearOfBorder(*poRaster, GetWidth(), GetHeight()))
        return mpoFront->Read(AreaOf(*poRaster), poRaster->GetBuffer(), nullptr, mbPassing);
    if (poBordered != nullptr)
        return poBordered->ReadRaster(poRaster);
    static_cast<void>(mpoFront->PassOn(*poRaster, GetMarginBehaviour(), false));
}

bool RasterCache::HasValidity()
{
    return mpoImage->mbValidity;
}

std::unique_ptr<Mask> RasterCache::ReadValid(Raster& oRaster)
{
    krv::gobs::CheckRasterCompatible(&oRaster, this);
    ExactHaloReader* const poBordered = mpoFront->GetBordered(*this);
    const bool bInside =
        poBordered != nullptr ? poBordered->IsInside(oRaster) : IsClearOfBorder(oRaster, GetWidth(), GetHeight());
    if (!bInside && poBordered != nullptr)
        return poBordered->ReadValid(oRaster);
    if (!bInside && mpoImage->mbValidity)
        return mpoFront->PassOn(oRaster, GetMarginBehaviour(), true);
    std::vector<unsigned char> oValid(oRaster.GetFullWidth() * oRaster.GetFullHeight() + 1, 1);
    if (!bInside)
        static_cast<void>(mpoFront->PassOn(oRaster, GetMarginBehaviour(), false));
    else if (oValid.size() > 1)
        mpoFront->Read(AreaOf(oRaster), oRaster.GetBuffer(), mpoImage->mbValidity ? oValid.data() : nullptr, false);
    return std::make_unique<Mask>(oRaster.GetInfo(), oRaster.GetContext(), oValid.data(), false);
}

const std::vector<IChannelInfo*>& RasterCache::GetChannelsInfo() const
{
    return mpoImage->moInfos.Get();
}

IFileFormat* RasterCache::GetFileFormat() const
{
    return mpoImage->mpoFormat;
}

AuxiliaryData RasterCache::GetAuxiliaryData() const
{
    return mpoImage->moRecord;
}

krv::ogc::cs::ICRS* RasterCache::GetCRS() const
{
    const std::lock_guard<std::mutex> oLock(mpoImage->moCrsMutex);
    return mpoImage->mpoCrs != nullptr ? mpoImage->mpoCrs->Clone() : nullptr;
}

krv::ogc::cs::GeocodingInfo* RasterCache::GetGeocodingInfo() const
{
    const krv::ogc::cs::GeocodingInfo* const poInfo = mpoImage->mpoGeocoding.get();
    return poInfo != nullptr ? new krv::ogc::cs::GeocodingInfo(*poInfo) : nullptr;
}

IOverviewReaderAccessor* RasterCache::GetOverviewReaderAccessor()
{
    std::unique_ptr<IOverviewReaderAccessor> poLevels =
        mpoFront->WithSource([](IRasterReader& oSource)
                             { return std::unique_ptr<IOverviewReaderAccessor>(oSource.GetOverviewReaderAccessor()); });
    return poLevels != nullptr ? new CachedLevels(std::move(poLevels), mpoImage->mpoCore) : nullptr;
}

unsigned int RasterCache::GetWidth() const
{
    return mpoImage->mnWidth;
}

unsigned int RasterCache::GetHeight() const
{
    return mpoImage->mnHeight;
}

unsigned int RasterCache::GetChansCount() const
{
    return mpoImage->mnChannels;
}

const krv::gobs::DataType& RasterCache::GetDataType() const
{
    return mpoImage->moType;
}

const std::vector<unsigned int>& RasterCache::GetChannels() const
{
    static const std::vector<unsigned int> NONE;
    return NONE;
}

// Levels have no list of their tiles; a change in the image goes with them all.
void RasterCache::Invalidate(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight)
{
    Core& oCore = *mpoImage->mpoCore;
    if (mpoImage->mnLevel != 0 || oCore.mbLevels.load())
        return oCore.moTiles.DropAll();
    const std::uint64_t nRight = std::min<std::uint64_t>(std::uint64_t{nX} + nWidth, GetWidth());
    const std::uint64_t nBottom = std::min<std::uint64_t>(std::uint64_t{nY} + nHeight, GetHeight());
    for (std::uint64_t nRow = nY / mpoImage->mnTileHeight; nRow * mpoImage->mnTileHeight < nBottom; ++nRow)
    {
        for (std::uint64_t nColumn = nX / mpoImage->mnTileWidth; nColumn * mpoImage->mnTileWidth < nRight; ++nColumn)
            oCore.moTiles.Drop({nRow * mpoImage->GetColumns() + nColumn, 0});
    }
}

void RasterCache::InvalidateAll()
{
    mpoImage->mpoCore->moTiles.DropAll();
}

CacheStatistics RasterCache::GetStatistics() const
{
    const Core& oCore = *mpoImage->mpoCore;
    return {oCore.mnHits, oCore.mnMisses, oCore.mnPassed};
}

} // namespace krv::datasources
