#include "operations/copy/detail/copyvalidity.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/validitysource.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "gobs/tile/tileiterator.h"
#include "operations/job/progress.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <memory>

namespace krv::operations::detail
{

using namespace krv::datasources;
using krv::gobs::Mask;
using krv::gobs::Raster;

namespace
{

// The copied channels of one file that have one type, and what says of them where they are valid.
struct Part
{
    LevelReader reader;
    std::unique_ptr<ValiditySource> validity;
};

std::vector<Part> FindParts(const CopyPlan& oPlan)
{
    std::vector<Part> oParts;
    for (std::size_t nSource = 0; nSource < oPlan.GetSourceCount(); ++nSource)
    {
        const SourceFile& oSource = oPlan.GetSource(nSource);
        std::vector<unsigned int> oChannels;
        for (const CopiedChannel& oChannel : oPlan.GetChannels())
            if (oChannel.source == nSource)
                oChannels.push_back(oChannel.channel);
        for (const ChannelGroup& oGroup : oSource.GroupByType(oChannels))
            oParts.push_back({oSource.Read(oGroup.channels), oSource.MakeValidity(oGroup.channels)});
    }
    return oParts;
}

// Adds what a part says of the pixels of a tile.
void AddValid(const Part& oPart, const PixelWindow& oWindow, Raster& oTile)
{
    const IRasterReader& oReader = oPart.reader.Get();
    Raster oPixels({oTile.GetWidth(), oTile.GetHeight(), oReader.GetChansCount(), oReader.GetDataType()},
                   {oTile.GetX() + static_cast<int>(oWindow.x), oTile.GetY() + static_cast<int>(oWindow.y)});
    oPart.reader.Get().ReadRaster(&oPixels);
    const std::unique_ptr<Mask> poMask(oPart.validity->BuildMask(oPixels));
    Raster oValid({oTile.GetWidth(), oTile.GetHeight(), 1, krv::gobs::eDT_8U}, oPixels.GetContext());
    poMask->RetrieveRaster(oValid);
    const std::size_t nPixels = std::size_t{oTile.GetWidth()} * oTile.GetHeight();
    std::transform(oValid.GetBuffer(), oValid.GetBuffer() + nPixels, oTile.GetBuffer(), oTile.GetBuffer(),
                   [](unsigned char n, unsigned char nOther) { return static_cast<unsigned char>(n | nOther); });
}

} // namespace

bool HasValidityInValues(const CopyPlan& oPlan)
{
    const auto oParts = FindParts(oPlan);
    return std::any_of(oParts.begin(), oParts.end(),
                       [](const Part& oPart) { return oPart.validity->HasNoData() || oPart.validity->HasAlpha(); });
}

void CheckLossyValidity(const Target& oTarget)
{
    if (oTarget.Find<IBitmapDataset>() == nullptr)
        throw krv::DataException(oTarget.GetName() +
                                 ": its pixels change when they are encoded, so that no-data values "
                                 "and alpha mean nothing, and the format has no mask to say it; "
                                 "choose an encoding without loss");
    Target::Warn(oTarget.GetName() +
                 ": no-data values are not kept: pixels change when they are encoded; a mask says which are valid");
}

void WriteValidity(const CopyPlan& oPlan, const Target& oTarget, unsigned int nBitmap)
{
    auto* const poBitmaps = oTarget.Find<IBitmapDataset>();
    if (nBitmap == 0)
    {
        nBitmap = poBitmaps->CreateBitmap();
        poBitmaps->SetBitmapDescription(nBitmap, ""); // a mask of validity has none
    }
    const std::vector<Part> oParts = FindParts(oPlan);
    BasicWriter oWriter(poBitmaps, {nBitmap});
    ProgressCounter oCounter(oTarget.GetProgress(), "mask", std::uint64_t{oWriter.GetWidth()} * oWriter.GetHeight());
    krv::gobs::TileIterator oTiles(oWriter.GetWidth(), oWriter.GetHeight());
    oTiles.SetChunkSize(oWriter.GetTileWidth(), oWriter.GetTileHeight());
    for (unsigned int nTile = 0; nTile != oTiles.GetTileRange() + 1; ++nTile)
    {
        const krv::gobs::Tile oTile = oTiles.GetTile(nTile);
        Raster oValid({oTile.GetWidth(), oTile.GetHeight(), 1, krv::gobs::eDT_8U},
                      {static_cast<int>(oTile.GetX()), static_cast<int>(oTile.GetY())});
        std::fill_n(oValid.GetBuffer(), oValid.GetBufferSize(), static_cast<unsigned char>(0));
        for (const Part& oPart : oParts)
            AddValid(oPart, oPlan.GetWindow(), oValid);
        oWriter.WriteRaster(&oValid);
        oCounter.Advance(oValid.GetBufferSize());
    }
}

} // namespace krv::operations::detail
