#include "plugins/tif/reading/strilesource.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>
#include <cstring>

namespace krv::plugins::tif
{

namespace
{

// Blocks made of strips hold about so many bytes and at most so many rows.
constexpr std::uint64_t GROUP_BYTES = std::uint64_t{1} << 20;
constexpr std::uint32_t GROUP_ROWS = 256;
constexpr std::size_t AHEAD_BYTES = std::size_t{1} << 20;
constexpr std::size_t SLICE_BYTES = std::size_t{256} << 10;
constexpr std::size_t KEPT_RAW_BYTES = std::size_t{4} << 20;
// Reading so many bytes that nobody wants is cheaper than another call to the system.
constexpr std::size_t GAP_BYTES = 4096;
// Strips or tiles that lie further apart are not fetched together.
constexpr std::uint64_t MOST_FORESEEN_BYTES = std::uint64_t{32} << 20;

bool IsPlain(const PageForm& oForm)
{
    return oForm.mnCompression == COMPRESSION_NONE && !oForm.mbReversedBits;
}

// Whole strips, never the whole image when it has several.
std::uint32_t GetStripBlockRows(const PageForm& oForm)
{
    const std::uint32_t nSensible = StrileSource::GetSensibleRows(oForm);
    if (oForm.mnStrileHeight >= nSensible)
        return IsPlain(oForm) ? nSensible : oForm.mnStrileHeight;
    const std::uint32_t nStrips = std::min(nSensible / oForm.mnStrileHeight, (oForm.mnStrilesDown + 1) / 2);
    return nStrips * oForm.mnStrileHeight;
}

} // namespace

std::uint32_t StrileSource::GetSensibleRows(const PageForm& oForm)
{
    const std::uint64_t nRowBytes = std::max<std::uint64_t>(1, oForm.GetRowBytes(oForm.mnWidth));
    return static_cast<std::uint32_t>(std::clamp<std::uint64_t>(GROUP_BYTES / nRowBytes, 1, GROUP_ROWS));
}

support::ImageLayout StrileSource::MakeLayout(const PageForm& oForm, PixelUse eUse, std::uint32_t nBlockRows)
{
    support::Plane oPlane;
    oPlane.moType = eUse == PixelUse::eBitmap ? krv::gobs::DataType(krv::gobs::eDT_8U) : oForm.moSample.moType;
    oPlane.moNativeType = oForm.moSample.moNativeType;
    oPlane.mnChannels = oForm.GetPlaneChannels();
    support::ImageLayout oLayout(oForm.mnWidth, oForm.mnHeight, oForm.mnStrileWidth, nBlockRows,
                                 std::vector<support::Plane>(oForm.GetPlanes(), oPlane));
    if (!oForm.mbTiled)
        oLayout.SetPreferredBlock(oForm.mnStrileWidth, std::min(nBlockRows, GetSensibleRows(oForm)));
    return oLayout;
}

std::uint64_t StrileSource::GetStrileBytes(const PageForm& oForm)
{
    const std::uint64_t nRow =
        std::max(oForm.GetRowBytes(oForm.mnStrileWidth), oForm.GetStoredRowBytes(oForm.mnStrileWidth));
    std::uint64_t nBytes = 0;
    return __builtin_mul_overflow(nRow, std::uint64_t{oForm.mnStrileHeight}, &nBytes) ? UINT64_MAX : nBytes;
}

StrileSource::StrileSource(std::shared_ptr<Page> poPage, PixelUse eUse)
    : mpoPage(std::move(poPage)), moForm(mpoPage->GetForm()), meUse(eUse), mbPlain(IsPlain(moForm)),
      moLayout(MakeLayout(moForm, eUse, moForm.mbTiled ? moForm.mnStrileHeight : GetStripBlockRows(moForm))),
      moDecoder(*mpoPage)
{
    if (!mbPlain && GetStrileBytes(moForm) > MAXIMUM_STRILE_BYTES)
        mpoPage->Refuse("compressed strips or tiles of " + std::to_string(GetStrileBytes(moForm)) + " bytes");
}

StrileSource::~StrileSource() = default;

void StrileSource::ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart,
                             unsigned char* pTarget, std::size_t nPitch)
{
    if (!moForm.mbTiled)
        return ReadStrips(oBlock, oPart, pTarget, nPitch);
    const std::uint32_t nStrile = GetFirstStrile(oBlock);
    const bool bExpected = nStrile >= mnExpected && nStrile < mnExpectedEnd;
    ReadPiece({nStrile,
               moForm.mnStrileHeight,
               oPart.mnX,
               oPart.mnY,
               {oPart.mnWidth, oPart.mnHeight, pTarget, nPitch},
               bExpected ? static_cast<std::uint32_t>(mnExpectedEnd - 1 - nStrile) : 0},
              oPart.mnHeight);
}

support::BlockOrigin StrileSource::MakeOrigin(const Page& oPage, PixelUse eUse)
{
    return {oPage.ShareFile(), "TIF " + std::to_string(oPage.GetDirectory().GetOffset()) +
                                   (eUse == PixelUse::eBitmap ? " bitmap" : " image")};
}

std::uint32_t StrileSource::GetFirstStrile(const support::BlockAddress& oBlock) const
{
    const std::uint64_t nRow =
        moForm.mbTiled ? oBlock.mnRow : oBlock.mnRow * std::uint64_t{moLayout.GetBlockHeight()} / moForm.mnStrileHeight;
    return static_cast<std::uint32_t>(
        (std::uint64_t{oBlock.mnPlane} * moForm.mnStrilesDown + nRow) * moForm.mnStrilesAcross + oBlock.mnColumn);
}

void StrileSource::Expect(const support::BlockAddress& oFirst, unsigned int nBlocks)
{
    if (!moForm.mbTiled)
        return;
    mnExpected = GetFirstStrile(oFirst);
    mnExpectedEnd = mnExpected + nBlocks;
}

// Where the stored bytes of a strip or tile end, together with those of the ones after it that lie behind it with
// hardly a gap. What is damaged among these is none of the first one's business.
std::uint64_t StrileSource::FindEnd(std::uint32_t nStrile, std::uint32_t nFollowing, std::uint64_t nMost)
{
    const Strile oFirst = mpoPage->GetStriles().Get(nStrile);
    std::uint64_t nEnd = oFirst.mnOffset + std::min(oFirst.mnBytes, nMost);
    try
    {
        for (std::uint32_t nAt = 1; nAt <= nFollowing; ++nAt)
        {
            const Strile oNext = mpoPage->GetStriles().Get(nStrile + nAt);
            if (!oNext.mbBytesKnown || oNext.mnOffset < nEnd || oNext.mnOffset - nEnd > GAP_BYTES ||
                oNext.mnBytes > nMost || oNext.mnOffset + oNext.mnBytes - oFirst.mnOffset > nMost)
                break;
            nEnd = oNext.mnOffset + oNext.mnBytes;
        }
    }
    catch (const krv::FileException&)
    {
    }
    return std::min(nEnd, mpoPage->GetFile().GetSize());
}

void StrileSource::Foresee(const support::BlockAddress& oFirst, unsigned int nBlocks)
{
    if (!mpoPage->GetFile().IsSlow())
        return;
    const std::uint32_t nStriles =
        moForm.mbTiled ? nBlocks : (moLayout.GetBlockHeight() - 1) / moForm.mnStrileHeight + 1;
    const std::uint32_t nFirst = GetFirstStrile(oFirst);
    try
    {
        const Strile oStrile = mpoPage->GetStriles().Get(nFirst);
        if (oStrile.IsStored() && oStrile.mbBytesKnown && oStrile.mnBytes <= MOST_FORESEEN_BYTES)
            mpoPage->GetFile().Foresee(oStrile.mnOffset,
                                       FindEnd(nFirst, nStriles - 1, MOST_FORESEEN_BYTES) - oStrile.mnOffset);
    }
    catch (const krv::FileException&)
    {
        // Told when it is read.
    }
}

void StrileSource::ReadStrips(const support::BlockAddress& oBlock, const support::PixelRect& oPart,
                              unsigned char* pTarget, std::size_t nPitch)
{
    const std::uint32_t nFirst = oBlock.mnRow * moLayout.GetBlockHeight() + oPart.mnY;
    for (std::uint32_t nDone = 0; nDone < oPart.mnHeight;)
    {
        const std::uint32_t nStrip = (nFirst + nDone) / moForm.mnStrileHeight;
        const std::uint32_t nSkipped = nFirst + nDone - nStrip * moForm.mnStrileHeight;
        const std::uint32_t nStored = moForm.GetStrileRows(nStrip);
        const std::uint32_t nLeft = oPart.mnHeight - nDone;
        const std::uint32_t nRows = std::min(nLeft, nStored - nSkipped);
        const std::uint64_t nStrile = std::uint64_t{oBlock.mnPlane} * moForm.mnStrilesDown + nStrip;
        nDone += ReadPiece({static_cast<std::uint32_t>(nStrile),
                            nStored,
                            oPart.mnX,
                            nSkipped,
                            {oPart.mnWidth, nRows, pTarget + nDone * nPitch, nPitch},
                            (nLeft - nRows) / moForm.mnStrileHeight},
                           nLeft);
    }
}

std::uint32_t StrileSource::ReadPiece(const Piece& oPiece, std::uint32_t nRowsWanted)
{
    const Strile oStrile = mpoPage->GetStriles().Get(oPiece.mnStrile);
    const auto [nWidth, nWanted, pTarget, nPitch] = oPiece.moWanted;
    std::uint32_t nRows = nWanted;
    if (!oStrile.IsStored())
        for (std::uint32_t nRow = 0; nRow < nWanted; ++nRow)
            std::memset(pTarget + nRow * nPitch, 0, moForm.GetRowBytes(nWidth));
    else if (oStrile.mnOffset == 0)
        mpoPage->Fail(moDecoder.Describe(oPiece.mnStrile) + ": its offset is 0");
    else if (mbPlain)
        nRows = ReadPlain(oPiece, oStrile, nRowsWanted);
    else
        ReadCoded(oPiece, oStrile);
    if (meUse == PixelUse::eBitmap && (moForm.moSample.GetBits() != 1 || moForm.moSample.IsSigned()))
        for (std::uint32_t nRow = 0; nRow < nRows; ++nRow)
            for (std::uint32_t nAt = 0; nAt < nWidth; ++nAt)
                pTarget[nRow * nPitch + nAt] = pTarget[nRow * nPitch + nAt] != 0;
    return nRows;
}

void StrileSource::CheckPlainBytes(const Piece& oPiece, const Strile& oStrile) const
{
    const std::uint64_t nWanted =
        (std::uint64_t{oPiece.mnY} + oPiece.moWanted.mnRows) * moForm.GetStoredRowBytes(moForm.mnStrileWidth);
    if (oStrile.mbBytesKnown && oStrile.mnBytes < nWanted)
        mpoPage->Fail(moDecoder.Describe(oPiece.mnStrile) + ": it holds " + std::to_string(oStrile.mnBytes) +
                      " bytes, " + std::to_string(nWanted) + " are wanted");
    if (oStrile.mnOffset > mpoPage->GetFile().GetSize())
        mpoPage->Fail(moDecoder.Describe(oPiece.mnStrile) + ": the file is truncated: it lies behind the end");
}

// Strips that follow each other without a gap are read as one.
std::uint32_t StrileSource::ReadPlain(Piece oPiece, const Strile& oStrile, std::uint32_t nRowsWanted)
{
    CheckPlainBytes(oPiece, oStrile);
    const std::uint64_t nPitch = moForm.GetStoredRowBytes(moForm.mnStrileWidth);
    const std::uint64_t nOffset = oStrile.mnOffset + oPiece.mnY * nPitch;
    WantedPixels oWanted = oPiece.moWanted;
    std::uint64_t nNext = oStrile.mnOffset + oPiece.mnStoredRows * nPitch;
    while (!moForm.mbTiled && oWanted.mnRows < nRowsWanted)
    {
        oPiece.mnStrile += 1;
        oPiece.mnY = 0;
        oPiece.mnStoredRows = moForm.GetStrileRows(oPiece.mnStrile % moForm.mnStrilesDown);
        oPiece.moWanted.mnRows = std::min(oPiece.mnStoredRows, nRowsWanted - oWanted.mnRows);
        const Strile oFollowing = mpoPage->GetStriles().Get(oPiece.mnStrile);
        if (oFollowing.mnOffset != nNext || !oFollowing.IsStored())
            break;
        CheckPlainBytes(oPiece, oFollowing);
        oWanted.mnRows += oPiece.moWanted.mnRows;
        nNext += oPiece.mnStoredRows * nPitch;
    }
    ReadRows(nOffset, oPiece.mnX, oWanted);
    return oWanted.mnRows;
}

// Eight pixels of any width end with a byte: packed rows are taken from such a pixel on, and the first few dropped.
void StrileSource::ReadRows(std::uint64_t nOffset, unsigned int nX, const WantedPixels& oWanted)
{
    const std::size_t nStoredPitch = moForm.GetStoredRowBytes(moForm.mnStrileWidth);
    const std::uint32_t nSkip = moForm.moSample.IsWhole() ? 0 : nX % 8;
    const std::size_t nRowBytes = moForm.GetStoredRowBytes(nSkip + oWanted.mnWidth);
    nOffset += moForm.GetStoredRowBytes(nX - nSkip);
    if (moForm.moSample.meWidening == Widening::eNone)
    {
        mpoPage->GetFile().ReadRows(nOffset, nStoredPitch, nRowBytes, oWanted.mnRows, oWanted.mpTarget, oWanted.mnPitch,
                                    moRows);
        return moDecoder.Convert(oWanted.mpTarget, oWanted.mnPitch, oWanted);
    }
    const std::size_t nWidePitch = moForm.GetRowBytes(nSkip + oWanted.mnWidth);
    const auto nSlice = static_cast<std::uint32_t>(std::max<std::size_t>(1, SLICE_BYTES / nRowBytes));
    unsigned char* pStored = moPacked.Get(std::min(nSlice, oWanted.mnRows) * nRowBytes);
    unsigned char* pWide = nSkip == 0 ? nullptr : moWide.Get(nWidePitch);
    for (std::uint32_t nRow = 0; nRow < oWanted.mnRows; nRow += nSlice)
    {
        const std::uint32_t nRows = std::min(nSlice, oWanted.mnRows - nRow);
        unsigned char* pTarget = oWanted.mpTarget + nRow * oWanted.mnPitch;
        mpoPage->GetFile().ReadRows(nOffset + nRow * std::uint64_t{nStoredPitch}, nStoredPitch, nRowBytes, nRows,
                                    pStored, nRowBytes, moRows);
        if (nSkip == 0)
            moDecoder.Convert(pStored, nRowBytes, {oWanted.mnWidth, nRows, pTarget, oWanted.mnPitch});
        for (std::uint32_t nAt = 0; nSkip != 0 && nAt < nRows; ++nAt)
        {
            moDecoder.Convert(pStored + nAt * nRowBytes, nRowBytes, {nSkip + oWanted.mnWidth, 1, pWide, nWidePitch});
            std::memcpy(pTarget + nAt * oWanted.mnPitch, pWide + moForm.GetRowBytes(nSkip),
                        moForm.GetRowBytes(oWanted.mnWidth));
        }
    }
}

unsigned char* StrileSource::ReadRaw(const Piece& oPiece, const Strile& oStrile)
{
    const std::uint64_t nSize = mpoPage->GetFile().GetSize();
    const auto nRaw = static_cast<std::size_t>(oStrile.mnBytes);
    if (oStrile.mnOffset >= mnRawOffset && oStrile.mnOffset + nRaw <= mnRawOffset + mnRawBytes)
        return moRaw.Get(0) + (oStrile.mnOffset - mnRawOffset);
    std::uint64_t nAhead = nRaw;
    if (oPiece.mnFollowing != 0 && moForm.mbTiled)
        nAhead = FindEnd(oPiece.mnStrile, oPiece.mnFollowing, AHEAD_BYTES) - oStrile.mnOffset;
    else if (oPiece.mnFollowing != 0)
        nAhead = std::min<std::uint64_t>(std::min<std::uint64_t>(AHEAD_BYTES, nSize - oStrile.mnOffset),
                                         (nRaw + nRaw / 8) * (oPiece.mnFollowing + std::uint64_t{1}));
    const auto nBytes = static_cast<std::size_t>(std::max<std::uint64_t>(nRaw, nAhead));
    mnRawBytes = 0;
    moRaw.Shrink(std::max(KEPT_RAW_BYTES, nBytes));
    unsigned char* pRaw = moRaw.Get(nBytes);
    mpoPage->GetFile().Read(oStrile.mnOffset, pRaw, nBytes);
    mnRawOffset = oStrile.mnOffset;
    mnRawBytes = nBytes;
    return pRaw;
}

void StrileSource::ReadCoded(const Piece& oPiece, const Strile& oStrile)
{
    const std::uint64_t nSize = mpoPage->GetFile().GetSize();
    if (oStrile.mnOffset >= nSize)
        mpoPage->Fail(moDecoder.Describe(oPiece.mnStrile) + ": the file is truncated: it lies behind the end");
    if (oStrile.mbBytesKnown && oStrile.mnBytes > nSize - oStrile.mnOffset)
        mpoPage->Fail(moDecoder.Describe(oPiece.mnStrile) + ": the file is truncated: it holds " +
                      std::to_string(oStrile.mnBytes) + " bytes, " + std::to_string(nSize - oStrile.mnOffset) +
                      " are there");
    // No coding makes data several times as long: more than that is not read.
    const std::uint64_t nStored = std::uint64_t{moForm.mnStrileHeight} * moForm.GetStoredRowBytes(moForm.mnStrileWidth);
    const std::uint64_t nMost = std::min<std::uint64_t>(nStored + nStored / 8 + AHEAD_BYTES, nSize - oStrile.mnOffset);
    Strile oRaw = oStrile;
    oRaw.mnBytes = oStrile.mbBytesKnown ? std::min(oStrile.mnBytes, nMost) : nMost;
    unsigned char* pRaw = ReadRaw(oPiece, oRaw);
    const auto Decode = [&](const WantedPixels& oWanted)
    {
        moDecoder.Decode(oPiece.mnStrile, oPiece.mnStoredRows, pRaw, static_cast<std::size_t>(oRaw.mnBytes), oWanted);
    };
    const WantedPixels& oWanted = oPiece.moWanted;
    if (moForm.mbTiled || (oPiece.mnX == 0 && oPiece.mnY == 0 && oWanted.mnWidth == moForm.mnWidth))
        Decode(oWanted);
    else
    {
        // A part of a strip, wanted where the block as a whole is damaged.
        const std::size_t nPitch = moForm.GetRowBytes(moForm.mnWidth);
        std::vector<unsigned char> oRows(nPitch * (oPiece.mnY + oWanted.mnRows));
        Decode({moForm.mnWidth, oPiece.mnY + oWanted.mnRows, oRows.data(), nPitch});
        raster::CopyRows(oRows.data() + oPiece.mnY * nPitch + moForm.GetRowBytes(oPiece.mnX), nPitch, oWanted.mpTarget,
                         oWanted.mnPitch, moForm.GetRowBytes(oWanted.mnWidth), oWanted.mnRows);
    }
    moDecoder.Relax();
}

} // namespace krv::plugins::tif
