#include "plugins/tif/writing/pagewriter.h"

#include "plugins/support/writing/narrowsamples.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>
#include <utility>
#include <vector>

namespace krv::plugins::tif
{

namespace
{

constexpr std::uint64_t LEAST_HELD_BYTES = std::uint64_t{16} << 20;
constexpr std::uint64_t MOST_HELD_BYTES = std::uint64_t{256} << 20;
// Uncompressed strips and tiles above this size get rows written into them instead of being held.
constexpr std::uint64_t IN_PLACE_BYTES = std::uint64_t{8} << 20;

// Two rows of blocks, so that an image that comes row by row encodes every block once.
std::size_t ChooseBound(const PageForm& oForm, std::size_t nPixelBytes)
{
    const std::uint64_t nRow = std::uint64_t{oForm.mnWidth} * nPixelBytes * oForm.GetPlanes();
    const std::uint64_t nRows = std::uint64_t{2} * oForm.mnStrileHeight;
    return static_cast<std::size_t>(
        std::clamp(nRow > MOST_HELD_BYTES ? MOST_HELD_BYTES : nRow * std::min(nRows, MOST_HELD_BYTES), LEAST_HELD_BYTES,
                   MOST_HELD_BYTES));
}

// As the encoder makes samples narrow and the reader wide again.
support::HeldBlocks::SettlePixels MakeSettling(const SampleForm& oSample, PixelUse eUse)
{
    if (eUse == PixelUse::eBitmap)
        return &support::HeldBlocks::SettleBits;
    return oSample.meWidening == Widening::eNone ? nullptr : support::MakeNarrowing(oSample.moType, oSample.GetBits());
}

} // namespace

PageWriter::PageWriter(std::shared_ptr<FileEditor> poEditor, std::shared_ptr<PageModel> poModel,
                       std::shared_ptr<Page> poPage, PixelUse eUse)
    : mpoEditor(std::move(poEditor)), mpoModel(std::move(poModel)), mpoPage(std::move(poPage)),
      moForm(mpoPage->GetForm()), moReader(mpoPage, eUse), moEncoder(*mpoPage, eUse, mpoEditor->GetOptions().moLevel),
      moHeld(
          ChooseBound(moForm, GetPixelBytes()), GetPixelBytes(),
          [this](const support::HeldBlocks::Block& oBlock, const unsigned char* pPixels)
          { Store(oBlock, pPixels, oBlock.moRect.mnWidth * GetPixelBytes()); },
          MakeSettling(moForm.moSample, eUse))
{
}

PageWriter::~PageWriter() = default;

// The strips or tiles that a rectangle of the image touches.
template <typename Action>
void PageWriter::ForEach(unsigned int nPlane, const support::PixelRect& oRect, Action oAction) const
{
    const unsigned int nRight = (oRect.mnX + oRect.mnWidth - 1) / moForm.mnStrileWidth;
    const unsigned int nBottom = (oRect.mnY + oRect.mnHeight - 1) / moForm.mnStrileHeight;
    for (unsigned int nRow = oRect.mnY / moForm.mnStrileHeight; nRow <= nBottom; ++nRow)
        for (unsigned int nColumn = oRect.mnX / moForm.mnStrileWidth; nColumn <= nRight; ++nColumn)
        {
            const unsigned int nX = nColumn * moForm.mnStrileWidth;
            const unsigned int nY = nRow * moForm.mnStrileHeight;
            const Strile oStrile{(std::uint64_t{nPlane} * moForm.mnStrilesDown + nRow) * moForm.mnStrilesAcross +
                                     nColumn,
                                 nPlane,
                                 {nX, nY, std::min(moForm.mnStrileWidth, moForm.mnWidth - nX),
                                  std::min(moForm.mnStrileHeight, moForm.mnHeight - nY)},
                                 moForm.GetStrileRows(nRow)};
            oAction(oStrile);
        }
}

support::PixelRect PageWriter::ToImage(const support::BlockAddress& oBlock, const support::PixelRect& oPart) const
{
    return {oBlock.mnColumn * GetLayout().GetBlockWidth() + oPart.mnX,
            oBlock.mnRow * GetLayout().GetBlockHeight() + oPart.mnY, oPart.mnWidth, oPart.mnHeight};
}

void PageWriter::ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                           std::size_t nPitch)
{
    CheckPage();
    moReader.ReadBlock(oBlock, oPart, pTarget, nPitch);
    if (moHeld.IsEmpty())
        return;
    const support::PixelRect oRect = ToImage(oBlock, oPart);
    ForEach(oBlock.mnPlane, oRect,
            [&](const Strile& oStrile) { moHeld.Overlay(oStrile.mnNumber, oRect, pTarget, nPitch); });
}

void PageWriter::WriteBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart,
                            const unsigned char* pSource, std::size_t nPitch)
{
    mpoEditor->CheckWritable();
    CheckPage();
    moEncoder.CheckWritable();
    NoteChange();
    const support::PixelRect oRect = ToImage(oBlock, oPart);
    ForEach(oBlock.mnPlane, oRect,
            [&](const Strile& oStrile)
            {
                const support::PixelRect oShared = support::Intersect(oRect, oStrile.moRect);
                WritePart(oStrile, oShared,
                          pSource + (oShared.mnY - oRect.mnY) * nPitch + (oShared.mnX - oRect.mnX) * GetPixelBytes(),
                          nPitch);
            });
}

void PageWriter::NoteChange()
{
    if (!moOnChange)
        return;
    const auto oCall = moOnChange;
    oCall();
    moOnChange = nullptr;
}

void PageWriter::WritePart(const Strile& oStrile, const support::PixelRect& oPart, const unsigned char* pSource,
                           std::size_t nPitch)
{
    if (oPart == oStrile.moRect)
    {
        Store({oStrile.mnNumber, oStrile.moRect}, pSource, nPitch);
        return moHeld.Forget(oStrile.mnNumber);
    }
    const std::uint64_t nBytes = std::uint64_t{oStrile.moRect.mnWidth} * oStrile.moRect.mnHeight * GetPixelBytes();
    if (nBytes > IN_PLACE_BYTES && moEncoder.IsPlain())
        return WriteInPlace(oStrile, oPart, pSource, nPitch);
    const auto Read = [&](unsigned char* pPixels, std::size_t nHeldPitch)
    {
        if (mpoModel->Get(oStrile.mnNumber).IsStored())
            ReadStored(oStrile, pPixels, nHeldPitch);
    };
    moHeld.Write({oStrile.mnNumber, oStrile.moRect}, oPart, pSource, nPitch, Read);
}

void PageWriter::WriteInPlace(const Strile& oStrile, const support::PixelRect& oPart, const unsigned char* pSource,
                              std::size_t nPitch)
{
    const std::size_t nStoredPitch = moForm.GetStoredRowBytes(moForm.mnStrileWidth);
    mpoPage->GetStriles().Get(oStrile.mnNumber); // throws when nobody knows what it holds
    const std::uint64_t nOffset =
        mpoEditor->OwnStrile(*mpoModel, oStrile.mnNumber, nStoredPitch * oStrile.mnStoredRows);
    mpoEditor->GetFile()->WriteRows(nOffset + (oPart.mnY - oStrile.moRect.mnY) * nStoredPitch +
                                        (oPart.mnX - oStrile.moRect.mnX) * GetPixelBytes(),
                                    nStoredPitch, oPart.mnWidth * GetPixelBytes(), oPart.mnHeight, pSource, nPitch);
    moReader.Forget();
}

void PageWriter::Store(const support::HeldBlocks::Block& oBlock, const unsigned char* pPixels, std::size_t nPitch)
{
    const std::span<const unsigned char> oBytes =
        moEncoder.Encode(pPixels, nPitch, oBlock.moRect.mnWidth, oBlock.moRect.mnHeight,
                         moForm.GetStrileRows(oBlock.moRect.mnY / moForm.mnStrileHeight), ReadForm(oBlock.mnNumber));
    mpoEditor->StoreStrile(*mpoModel, oBlock.mnNumber, oBytes.data(), oBytes.size());
    moReader.Forget();
}

// The begin of what is replaced; of a strip or tile that is not stored yet that of the first one that is.
std::span<const unsigned char> PageWriter::ReadForm(std::uint64_t nStrile)
{
    const auto& oCounts = mpoModel->moByteCounts;
    if (moEncoder.GetFormBytes() == 0)
        return {};
    if (oCounts[nStrile] == 0)
    {
        if (mnLike != UINT64_MAX)
            return moLike;
        nStrile = static_cast<std::uint64_t>(
            std::find_if(oCounts.begin(), oCounts.end(), [](std::uint64_t nBytes) { return nBytes != 0; }) -
            oCounts.begin());
        if (nStrile == oCounts.size())
            return {};
    }
    mnLike = nStrile;
    moLike.resize(std::min<std::uint64_t>(oCounts[nStrile], moEncoder.GetFormBytes()));
    moLike.resize(mpoEditor->GetFile()->ReadUpTo(mpoModel->moOffsets[nStrile], moLike.data(), moLike.size()));
    return moLike;
}

void PageWriter::StoreCoded(std::uint64_t nStrile, const unsigned char* pBytes, std::size_t nBytes)
{
    mpoEditor->CheckWritable();
    CheckPage();
    NoteChange();
    mpoEditor->StoreStrile(*mpoModel, nStrile, pBytes, nBytes);
    moHeld.Forget(nStrile);
    moReader.Forget();
}

void PageWriter::CopyCoded(const support::File& oSource, const std::vector<CodedStrile>& oStriles)
{
    CheckPage();
    NoteChange();
    mpoEditor->CopyStriles(*mpoModel, oSource, oStriles);
    for (const CodedStrile& oStrile : oStriles)
        moHeld.Forget(oStrile.mnNumber);
    moReader.Forget();
}

void PageWriter::ReadStored(const Strile& oStrile, unsigned char* pTarget, std::size_t nPitch)
{
    const support::ImageLayout& oLayout = GetLayout();
    const unsigned int nColumn = oStrile.moRect.mnX / oLayout.GetBlockWidth();
    for (unsigned int nDone = 0; nDone < oStrile.moRect.mnHeight;)
    {
        const unsigned int nY = oStrile.moRect.mnY + nDone;
        const unsigned int nBlock = nY / oLayout.GetBlockHeight();
        const unsigned int nSkip = nY - nBlock * oLayout.GetBlockHeight();
        const unsigned int nRows = std::min(oStrile.moRect.mnHeight - nDone, oLayout.GetBlockHeight() - nSkip);
        moReader.ReadBlock({oStrile.mnPlane, nColumn, nBlock}, {0, nSkip, oStrile.moRect.mnWidth, nRows},
                           pTarget + nDone * nPitch, nPitch);
        nDone += nRows;
    }
}

// The room of a page that was deleted or replaced may hold something else by now.
void PageWriter::CheckPage() const
{
    if (mpoModel->mbGone)
        throw DataException(GetName() + ": the page of these pixels is no longer there");
}

void PageWriter::Flush()
{
    if (mpoModel->mbGone)
        moHeld.Clear();
    moHeld.StoreAll();
}

} // namespace krv::plugins::tif
