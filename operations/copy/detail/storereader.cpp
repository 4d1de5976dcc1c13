#include "operations/copy/detail/storereader.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/reader/irasterreader.h"
#include "datasources/reader/readervalidity.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "operations/copy/detail/copyrecord.h"
#include "operations/copy/detail/target.h"
#include "operations/job/exceptions.h"
#include "operations/job/progress.h"
#include "toolkit/ogc/cs/icrs.h"

#include <algorithm>
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

void WriteMask(BasicWriter& oWriter, const Mask& oMask, unsigned int nX, unsigned int nY)
{
    Raster oValid({oMask.GetWidth(), oMask.GetHeight(), 1, krv::gobs::eDT_8U},
                  {static_cast<int>(nX), static_cast<int>(nY)});
    oMask.RetrieveRaster(oValid);
    oWriter.WriteRaster(&oValid);
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
        throw krv::DataException(target + " is there and no plain file; name another for the copy");
}

void StoreReader(IRasterReader& oReader, const PixelWindow& oWindow, const Target& oTarget, const char* pPart)
{
    StorePlace(oReader, oWindow, oTarget);
    const AuxiliaryData oRecord = oReader.GetAuxiliaryData().GetCleanedMeta();
    oTarget.Try("the metadata", [&] { oTarget.Get().WriteAuxiliaryData(oRecord); });
    ReaderValidity oValidity(oReader);
    BasicWriter oWriter(&oTarget.GetRaster(), {});
    const std::unique_ptr<BasicWriter> poMask = MakeMask(oValidity.IsNeeded() && !HasNoData(oRecord), oTarget);
    const unsigned int nWidth = PieceSide(oWriter.GetTileWidth(), oWindow.width);
    const unsigned int nHeight = PieceSide(oWriter.GetTileHeight(), oWindow.height);
    ProgressCounter oCounter(
        oTarget.GetProgress(), pPart,
        krv::gobs::BufferBytes(oWindow.width, oWindow.height, oReader.GetChansCount(), oReader.GetDataType()));
    for (unsigned int nY = 0; nY < oWindow.height; nY += std::min(nHeight, oWindow.height - nY))
    {
        for (unsigned int nX = 0; nX < oWindow.width; nX += std::min(nWidth, oWindow.width - nX))
        {
            const krv::gobs::RasterInfo oInfo(std::min(nWidth, oWindow.width - nX),
                                              std::min(nHeight, oWindow.height - nY), oReader.GetChansCount(),
                                              oReader.GetDataType());
            Raster oPiece(oInfo, {static_cast<int>(oWindow.x + nX), static_cast<int>(oWindow.y + nY)});
            std::unique_ptr<Mask> poValid;
            if (poMask != nullptr)
                poValid = oValidity.Read(oPiece);
            else
                oReader.ReadRaster(&oPiece);
            const Raster oStored(oInfo, {static_cast<int>(nX), static_cast<int>(nY)}, oPiece.GetBuffer(), false);
            oWriter.WriteRaster(&oStored);
            if (poValid != nullptr)
                WriteMask(*poMask, *poValid, nX, nY);
            oCounter.Advance(oPiece.GetBufferSize());
        }
    }
    oTarget.Get().Close();
}

} // namespace krv::operations::detail
