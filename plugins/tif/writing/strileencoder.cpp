#include "plugins/tif/writing/strileencoder.h"

#include "plugins/support/codec/bits.h"
#include "plugins/support/codec/predictor.h"
#include "plugins/tif/reading/compression.h"
#include "plugins/tif/writing/librarycodec.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>
#include <bit>
#include <cstring>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

constexpr bool BIG_ENDIAN_MACHINE = std::endian::native == std::endian::big;
constexpr unsigned int MOST_PACKED_BITS = 32;

std::int64_t ReadSample(const unsigned char* pSample, std::size_t nBytes, bool bSigned)
{
    std::uint64_t nValue = 0;
    std::memcpy(&nValue, pSample, nBytes);
    if (bSigned && nBytes < 8 && (nValue >> (8 * nBytes - 1) & 1) != 0)
        nValue |= ~std::uint64_t{0} << 8 * nBytes;
    return static_cast<std::int64_t>(nValue);
}

} // namespace

StrileEncoder::StrileEncoder(Page& oPage, PixelUse eUse, std::optional<int> oLevel)
    : moPage(oPage), moForm(oPage.GetForm()), meUse(eUse), moLevel(oLevel)
{
    const Compression* const pCompression = FindCompression(moForm.mnCompression);
    if (moForm.mnCompression == COMPRESSION_JPEG)
        mpoJpeg = std::make_unique<JpegEncoder>(oPage, oLevel);
    else if (pCompression != nullptr && pCompression->mpCodec != nullptr &&
             pCompression->mpCodec->mpMakeEncoder != nullptr)
        mpoEncoder = pCompression->mpCodec->mpMakeEncoder(oLevel);
}

StrileEncoder::~StrileEncoder() = default;

std::string StrileEncoder::FindObstacle() const
{
    const SampleForm& oSample = moForm.moSample;
    const bool bReal = oSample.meWidening == Widening::eHalf || oSample.meWidening == Widening::eFloat24;
    const bool bPacked = oSample.mnParts == 1 && oSample.mnPartBits <= MOST_PACKED_BITS &&
                         (oSample.meWidening == Widening::eThreeBytes || !oSample.IsWhole());
    if (oSample.meWidening != Widening::eNone && !bReal && !(bPacked && moForm.mnPredictor == PREDICTOR_NONE))
        return "samples of " + std::to_string(oSample.GetBits()) + " bits";
    if (mpoJpeg && meUse == PixelUse::eBitmap)
        return "a compression that would change its bits";
    if (mpoJpeg)
        return mpoJpeg->GetObstacle();
    if (!CanEncode(moForm.mnCompression))
        return "the compression " + std::to_string(moForm.mnCompression);
    return {};
}

void StrileEncoder::CheckWritable(const Place& oPlace) const
{
    const std::string obstacle = FindObstacle();
    if (!obstacle.empty())
        throw DataException(moPage.GetFileName() + ": pixels cannot be written with " + obstacle, oPlace);
}

bool StrileEncoder::IsPlain() const
{
    const bool bOrdered = moForm.mbBigEndian == BIG_ENDIAN_MACHINE || moForm.moSample.GetPartBytes() == 1;
    return moForm.mnCompression == COMPRESSION_NONE && moForm.moSample.meWidening == Widening::eNone && bOrdered &&
           meUse == PixelUse::eImage && !moForm.mbReversedBits;
}

// Values of fewer bits than they are handed in with. Reals become the nearest of their width.
StrileEncoder::Rows StrileEncoder::Narrow(const Rows& oRows, std::uint32_t nWidth, std::uint32_t nRows)
{
    const SampleForm& oSample = moForm.moSample;
    if (oSample.meWidening == Widening::eNone && meUse != PixelUse::eBitmap)
        return oRows;
    const std::size_t nSamples = std::size_t{nWidth} * moForm.GetPlaneChannels();
    const std::size_t nPitch = moForm.GetStoredRowBytes(nWidth);
    unsigned char* pTarget = moNarrow.Get(nPitch * nRows);
    for (std::uint32_t nRow = 0; nRow < nRows; ++nRow)
    {
        const unsigned char* pRow = oRows.mpFirst + nRow * oRows.mnPitch;
        unsigned char* pNarrow = pTarget + nRow * nPitch;
        if (oSample.meWidening == Widening::eHalf)
            codec::FloatToHalf(pRow, pNarrow, nSamples * oSample.mnParts);
        else if (oSample.meWidening == Widening::eFloat24)
            codec::FloatToFloat24(pRow, pNarrow, nSamples * oSample.mnParts);
        else
            Pack(pRow, pNarrow, nSamples);
    }
    return {pTarget, nPitch};
}

// Packed, most significant bit first; what does not fit becomes the nearest value that does. Numbers of three bytes
// come out in this machine's order.
void StrileEncoder::Pack(const unsigned char* pRow, unsigned char* pNext, std::size_t nSamples) const
{
    const SampleForm& oSample = moForm.moSample;
    const bool bMask = meUse == PixelUse::eBitmap;
    const bool bTurn = oSample.meWidening == Widening::eThreeBytes && !BIG_ENDIAN_MACHINE;
    const std::size_t nValueBytes = bMask ? 1 : oSample.GetValueBytes();
    const unsigned int nBits = oSample.GetBits();
    const std::int64_t nHighest = (std::int64_t{1} << (nBits - (oSample.IsSigned() ? 1 : 0))) - 1;
    const std::int64_t nLowest = oSample.IsSigned() ? -nHighest - 1 : 0;
    std::uint64_t nPending = 0;
    unsigned int nHeld = 0;
    unsigned char* const pFirst = pNext;
    for (std::size_t nAt = 0; nAt < nSamples; ++nAt)
    {
        const std::int64_t nValue = ReadSample(pRow + nAt * nValueBytes, nValueBytes, oSample.IsSigned());
        const std::int64_t nFitted = bMask ? (nValue != 0 ? nHighest : 0) : std::clamp(nValue, nLowest, nHighest);
        nPending = nPending << nBits | (static_cast<std::uint64_t>(nFitted) & ((std::uint64_t{1} << nBits) - 1));
        for (nHeld += nBits; nHeld >= 8; nHeld -= 8)
            *pNext++ = static_cast<unsigned char>(nPending >> (nHeld - 8));
    }
    if (nHeld > 0)
        *pNext = static_cast<unsigned char>(nPending << (8 - nHeld));
    if (bTurn)
        codec::SwapBytes(pFirst, pFirst, nSamples, 3);
}

StrileEncoder::Rows StrileEncoder::Pad(const Rows& oRows, std::uint32_t nWidth, std::uint32_t nRows,
                                       std::uint32_t nStoredRows)
{
    if (nWidth == moForm.mnStrileWidth && nRows == nStoredRows)
        return oRows;
    const std::size_t nPitch = moForm.GetStoredRowBytes(moForm.mnStrileWidth);
    const std::size_t nRowBytes = moForm.GetStoredRowBytes(nWidth);
    const bool bWhole = moForm.moSample.IsWhole();
    const std::size_t nPixelBytes = bWhole ? moForm.GetPlaneChannels() * moForm.moSample.GetBits() / 8 : 1;
    unsigned char* pTarget = moPadded.Get(nPitch * nStoredRows);
    for (std::uint32_t nRow = 0; nRow < nStoredRows; ++nRow)
    {
        unsigned char* pRow = pTarget + nRow * nPitch;
        if (nRow >= nRows)
        {
            std::memcpy(pRow, pRow - nPitch, nPitch);
            continue;
        }
        std::memcpy(pRow, oRows.mpFirst + nRow * oRows.mnPitch, nRowBytes);
        if (!bWhole)
            std::memset(pRow + nRowBytes, 0, nPitch - nRowBytes);
        for (std::size_t nAt = nRowBytes; bWhole && nAt < nPitch; nAt += nPixelBytes)
            std::memcpy(pRow + nAt, pRow + nRowBytes - nPixelBytes, nPixelBytes);
    }
    return {pTarget, nPitch};
}

// Differences and the byte order of the file; the rows come out without gaps.
StrileEncoder::Rows StrileEncoder::Order(const Rows& oRows, std::uint32_t nStoredRows)
{
    const SampleForm& oSample = moForm.moSample;
    const std::size_t nPitch = moForm.GetStoredRowBytes(moForm.mnStrileWidth);
    const bool bSwapped = moForm.mbBigEndian != BIG_ENDIAN_MACHINE;
    const bool bLibrary = moForm.mnCompression != COMPRESSION_NONE && !mpoEncoder;
    if (!bLibrary && moForm.mnPredictor != PREDICTOR_NONE)
    {
        const codec::BlockShape oShape{moForm.mnStrileWidth, nStoredRows, moForm.GetPlaneChannels(),
                                       oSample.GetBits() / 8};
        unsigned char* pTarget = moOrdered.Get(nPitch * nStoredRows);
        if (moForm.mnPredictor == PREDICTOR_FLOATINGPOINT)
            codec::ApplyFloatingPoint(oRows.mpFirst, oRows.mnPitch, pTarget, nPitch, oShape, moPredictorScratch);
        else
            codec::ApplyHorizontal(oRows.mpFirst, oRows.mnPitch, pTarget, nPitch, oShape,
                                   bSwapped ? codec::SampleOrder::eSwapped : codec::SampleOrder::eNative);
        return {pTarget, nPitch};
    }
    const std::size_t nPartBytes = oSample.mnPartBits / 8;
    const bool bTurn = !bLibrary && bSwapped && nPartBytes > 1 && oSample.meWidening != Widening::eBits;
    if (!bTurn && oRows.mnPitch == nPitch)
        return oRows;
    unsigned char* pTarget = moOrdered.Get(nPitch * nStoredRows);
    if (!bTurn)
        raster::CopyRows(oRows.mpFirst, oRows.mnPitch, pTarget, nPitch, nPitch, nStoredRows);
    for (std::uint32_t nRow = 0; bTurn && nRow < nStoredRows; ++nRow)
        codec::SwapBytes(oRows.mpFirst + nRow * oRows.mnPitch, pTarget + nRow * nPitch, nPitch / nPartBytes,
                         nPartBytes);
    return {pTarget, nPitch};
}

std::span<const unsigned char> StrileEncoder::Compress(const unsigned char* pStored, std::size_t nBytes,
                                                       std::uint32_t nStoredRows, std::span<const unsigned char> oLike)
{
    if (moForm.mnCompression == COMPRESSION_NONE)
        return {pStored, nBytes};
    if (mpoJpeg)
        return mpoJpeg->Encode(pStored, nStoredRows, oLike);
    if (mpoEncoder)
    {
        const std::size_t nBound = mpoEncoder->GetBound(nBytes);
        unsigned char* pCoded = moCoded.Get(nBound);
        mpoEncoder->TakeForm(oLike);
        return {pCoded, mpoEncoder->Encode(pStored, nBytes, pCoded, nBound)};
    }
    moLibraryBytes = EncodeByLibrary(moForm, moLevel, pStored, nBytes, nStoredRows, moPage.GetFileName());
    return moLibraryBytes;
}

std::span<const unsigned char> StrileEncoder::Encode(const unsigned char* pSource, std::size_t nPitch,
                                                     std::uint32_t nWidth, std::uint32_t nRows,
                                                     std::uint32_t nStoredRows, std::span<const unsigned char> oLike)
{
    const Rows oNarrow = Narrow({pSource, nPitch}, nWidth, nRows);
    const Rows oPadded = Pad(oNarrow, nWidth, nRows, nStoredRows);
    const Rows oOrdered = Order(oPadded, nStoredRows);
    const std::size_t nBytes = moForm.GetStoredRowBytes(moForm.mnStrileWidth) * nStoredRows;
    if (!moForm.mbReversedBits || mpoJpeg)
        return Compress(oOrdered.mpFirst, nBytes, nStoredRows, oLike);
    unsigned char aLike[2] = {};
    codec::ReverseBits(oLike.data(), aLike, std::min(oLike.size(), sizeof(aLike)));
    const std::span<const unsigned char> oCoded = Compress(oOrdered.mpFirst, nBytes, nStoredRows, aLike);
    unsigned char* pReversed = moReversed.Get(oCoded.size());
    codec::ReverseBits(oCoded.data(), pReversed, oCoded.size());
    return {pReversed, oCoded.size()};
}

} // namespace krv::plugins::tif
