#include "operations/copy/detail/storereader.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/reader/irasterreader.h"
#include "datasources/reader/readervalidity.h"
#include "datasources/writer/basicwriter.h"
#include "datasources/writer/splitwriter.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "operations/copy/detail/copyrecord.h"
#include "operations/copy/detail/copyvalidity.h"
#include "operations/copy/detail/target.h"
#include "operations/job/exceptions.h"
#include "operations/job/progress.h"
#include "operations/source/fileworkers.h"
#include "toolkit/ogc/cs/icrs.h"
#include "toolkit/threading/foreachitem.h"

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <memory>
#include <system_error>

namespace krv::operations::detail
{

using namespace krv::datasources;
using krv::gobs::Mask;
using krv::gobs::Raster;

namespace
{

// Whole blocks of the target, some hundred pixels on a side.
unsigned int PieceSide(unsigned int nBlock, unsigned int nImage)
{
    constexpr unsigned int SIDE = 512;
    nBlock = std::clamp(nBlock, 1U, nImage);
    return std::min(nImage, std::max(SIDE / nBlock, 1U) * nBlock);
}

// Whether a value of some channel tells which pixels are not valid.
bool HasNoData(const AuxiliaryData& oRecord)
{
    for (unsigned int n = 1; n <= oRecord.GetChannelCount(); ++n)
    {
        if (ParseNoData(GetNoDataText(oRecord, n)))
            return true;
    }
    return false;
}

void StorePlace(const IRasterReader& oReader, const PixelWindow& oWindow, const Target& oTarget)
{
    const std::unique_ptr<krv::ogc::cs::ICRS> poCrs(oReader.GetCRS());
    if (poCrs != nullptr)
        oTarget.Try("the reference system", [&] { oTarget.Get().UpdateCRS(*poCrs); });
    const std::unique_ptr<krv::ogc::cs::GeocodingInfo> poInfo(oReader.GetGeocodingInfo());
    if (poInfo == nullptr || poInfo->IsIdentity())
        return;
    auto* const poTo = oTarget.Find<IGeocodedDataset>();
    if (poTo == nullptr)
        return Target::Warn(oTarget.GetName() + ": the geocoding is not kept: the format has none");
    oTarget.Try("the geocoding", [&] { poTo->SetGeocoding(ShiftGeocoding(*poInfo, oWindow.x, oWindow.y)); });
}

struct Part
{
    krv::gobs::RasterContext place;
    unsigned int width;
    unsigned int height;
};

// A part of the new file on its way there: for each reader, and for the mask.
struct Piece
{
    std::vector<std::shared_ptr<const SplitWriter::Encoded>> encoded;
    std::uint64_t bytes = 0;
};

// The validity mask of the target, when there is something that no value says; null when not, or when it has no masks.
std::unique_ptr<BasicWriter> MakeMask(bool bNeeded, const Target& oTarget)
{
    if (!bNeeded)
        return nullptr;
    auto* const poBitmaps = oTarget.Find<IBitmapDataset>();
    if (poBitmaps == nullptr)
    {
        Target::Warn(
            oTarget.GetName() +
            ": pixels that are not valid are not marked: no value stands for them, and the format has no mask");
        return nullptr;
    }
    const unsigned int nBitmap = poBitmaps->CreateBitmap();
    poBitmaps->SetBitmapDescription(nBitmap, ""); // a mask of validity has none
    return std::make_unique<BasicWriter>(poBitmaps, std::vector<unsigned int>{nBitmap});
}

// What a thread reads with.
class Worker
{
public:
    // bLossy: no value says which pixels are valid, since they are stored with loss.
    Worker(FilePointer poFile, const std::vector<StoredChannels>& oStored, bool bLossy)
        : mpoFile(std::move(poFile)), mbLossy(bLossy)
    {
        for (const StoredChannels& oChannels : oStored)
        {
            moReaders.push_back(oChannels.open(*mpoFile));
            moValidities.push_back(std::make_unique<ReaderValidity>(*moReaders.back()));
        }
    }

    IRasterReader& GetReader(std::size_t nReader) const { return *moReaders[nReader]; }

    // Whether no value of its channels says which pixels are not valid.
    bool NeedsMask(std::size_t nReader) const
    {
        return moValidities[nReader]->IsNeeded() && (mbLossy || !HasNoData(moReaders[nReader]->GetAuxiliaryData()));
    }

    // The pixels at a place of the new file, which are those at another one of the reader's. The valid ones are added
    // to the mask, a byte for each pixel, unless it is null.
    std::shared_ptr<const Raster> Read(std::size_t nReader, const krv::gobs::RasterContext& oFrom, const Part& oPart,
                                       Raster* poMask)
    {
        IRasterReader& oReader = *moReaders[nReader];
        const krv::gobs::RasterInfo oInfo(oPart.width, oPart.height, oReader.GetChansCount(), oReader.GetDataType());
        auto poPiece = std::make_shared<Raster>(oInfo, oPart.place);
        Raster oPixels(oInfo, oFrom, poPiece->GetBuffer(), false);
        if (poMask == nullptr || !NeedsMask(nReader))
            oReader.ReadRaster(&oPixels);
        else
            AddValid(moValidities[nReader]->Read(oPixels).get(), *poMask);
        return poPiece;
    }

private:
    static void AddValid(const Mask* poValid, Raster& oMask)
    {
        const std::uint64_t nPixels = std::uint64_t{oMask.GetWidth()} * oMask.GetHeight();
        if (poValid == nullptr)
            return static_cast<void>(std::memset(oMask.GetBuffer(), 1, nPixels));
        Raster oValid({oMask.GetWidth(), oMask.GetHeight(), 1, krv::gobs::eDT_8U}, {0, 0});
        poValid->RetrieveRaster(oValid);
        for (std::uint64_t n = 0; n < nPixels; ++n)
            oMask.GetBuffer()[n] |= oValid.GetBuffer()[n];
    }

    FilePointer mpoFile;
    bool mbLossy;
    std::vector<std::shared_ptr<IRasterReader>> moReaders;
    std::vector<std::unique_ptr<ReaderValidity>> moValidities; // after the readers, which they stand on
};

// The record of all channels: that of the file is the first reader's.
AuxiliaryData JoinRecords(const Worker& oWorker, const std::vector<StoredChannels>& oStored)
{
    AuxiliaryData oFirst = oWorker.GetReader(0).GetAuxiliaryData().GetCleanedMeta();
    if (oStored.size() == 1)
        return oFirst;
    std::size_t nChannels = 0;
    for (const StoredChannels& oChannels : oStored)
        nChannels += oChannels.channels.size();
    AuxiliaryData oRecord(static_cast<unsigned int>(nChannels));
    oRecord.SetFileMetadata(oFirst.GetFileMetadata());
    for (std::size_t n = 0; n < oStored.size(); ++n)
    {
        const AuxiliaryData oOwn = oWorker.GetReader(n).GetAuxiliaryData().GetCleanedMeta();
        for (unsigned int nAt = 1; nAt <= oStored[n].channels.size(); ++nAt)
        {
            oRecord.SetChanMetadata(oOwn.GetChanMetadata(nAt), oStored[n].channels[nAt - 1]);
            oRecord.SetChannelDescription(oOwn.GetChannelDescription(nAt), oStored[n].channels[nAt - 1]);
        }
    }
    return oRecord;
}

} // namespace

void CheckTarget(const std::vector<std::string>& oSources, const std::string& target)
{
    std::error_code oNone;
    for (const std::string& source : oSources)
    {
        if (std::filesystem::equivalent(source, target, oNone))
            throw RequestException(target + " is the file itself; name another for the copy");
    }
    if (std::filesystem::exists(target, oNone) && !std::filesystem::is_regular_file(target, oNone))
        throw RequestException(target + " is there and no plain file; name another for the copy");
}

void StoreReaders(const SourceFile& oFile, const std::vector<StoredChannels>& oStored, const PixelWindow& oWindow,
                  const Target& oTarget, const char* pPart)
{
    const bool bLossy = oTarget.IsLossy();
    FileWorkers<Worker> oWorkers(oFile, [&oStored, bLossy](FilePointer poFile)
                                 { return std::make_unique<Worker>(std::move(poFile), oStored, bLossy); });
    const Worker oFirst(FilePointer(&oFile, {false}), oStored, bLossy); // for what there is one of
    StorePlace(oFirst.GetReader(0), oWindow, oTarget);
    AuxiliaryData oRecord = JoinRecords(oFirst, oStored);
    if (bLossy && HasNoData(oRecord))
    {
        CheckLossyValidity(oTarget);
        DropNoData(oRecord);
    }
    oTarget.Try("the metadata", [&] { oTarget.Get().WriteAuxiliaryData(oRecord); });

    krv::threading::IExecutor* const poExecutor = oTarget.GetExecutor();
    std::vector<std::unique_ptr<BasicWriter>> oWriters;
    bool bMask = false;
    std::uint64_t nBytes = 0;
    for (std::size_t n = 0; n < oStored.size(); ++n)
    {
        const IRasterReader& oReader = oFirst.GetReader(n);
        oWriters.push_back(std::make_unique<BasicWriter>(&oTarget.GetRaster(), oStored[n].channels));
        bMask = bMask || oFirst.NeedsMask(n);
        nBytes += krv::gobs::BufferBytes(oWindow.width, oWindow.height, oReader.GetChansCount(), oReader.GetDataType());
    }
    const std::size_t nMask = oWriters.size();
    if (std::unique_ptr<BasicWriter> poMask = MakeMask(bMask, oTarget))
        oWriters.push_back(std::move(poMask));

    ProgressCounter oCounter(oTarget.GetProgress(), pPart, nBytes);
    krv::threading::TaskGroup oThreads(poExecutor, [&oCounter] { oCounter.Repeat(); });
    std::vector<std::unique_ptr<SplitWriter>> oSplit;
    for (const auto& poWriter : oWriters)
        oSplit.push_back(std::make_unique<SplitWriter>(*poWriter, 1, oThreads.GetThreadCount()));
    const unsigned int nWidth = PieceSide(oWriters.front()->GetTileWidth(), oWindow.width);
    const unsigned int nHeight = PieceSide(oWriters.front()->GetTileHeight(), oWindow.height);
    const std::uint64_t nAcross = (std::uint64_t{oWindow.width} + nWidth - 1) / nWidth;
    const std::uint64_t nDown = (std::uint64_t{oWindow.height} + nHeight - 1) / nHeight;
    krv::threading::ForEachItem(
        oThreads, nAcross * nDown,
        [&](std::uint64_t nPiece)
        {
            const auto nX = static_cast<unsigned int>(nPiece % nAcross * nWidth);
            const auto nY = static_cast<unsigned int>(nPiece / nAcross * nHeight);
            const Part oPart{{static_cast<int>(nX), static_cast<int>(nY)},
                             std::min(nWidth, oWindow.width - nX),
                             std::min(nHeight, oWindow.height - nY)};
            std::shared_ptr<Raster> poValid;
            if (oSplit.size() > nMask)
            {
                poValid = std::make_shared<Raster>(
                    krv::gobs::RasterInfo(oPart.width, oPart.height, 1, krv::gobs::eDT_8U), oPart.place);
                std::memset(poValid->GetBuffer(), 0, poValid->GetBufferSize());
            }
            Piece oPiece;
            for (std::size_t n = 0; n < nMask; ++n)
            {
                std::shared_ptr<const Raster> poPixels;
                {
                    const FileWorkers<Worker>::Use oWorker(oWorkers);
                    poPixels = oWorker->Read(n, {static_cast<int>(oWindow.x + nX), static_cast<int>(oWindow.y + nY)},
                                             oPart, poValid.get());
                }
                oPiece.bytes += poPixels->GetBufferSize();
                oPiece.encoded.push_back(oSplit[n]->Encode(std::move(poPixels)));
            }
            if (poValid != nullptr)
                oPiece.encoded.push_back(oSplit[nMask]->Encode(std::move(poValid)));
            return oPiece;
        },
        [&](const Piece& oPiece)
        {
            for (std::size_t n = 0; n < oPiece.encoded.size(); ++n)
                oSplit[n]->Store(*oPiece.encoded[n]);
            oCounter.Advance(oPiece.bytes);
        });
    oTarget.Get().Close();
}

} // namespace krv::operations::detail
