#include "plugins/tif/reading/striledecoder.h"

#include "plugins/support/codec/bits.h"
#include "plugins/tif/reading/compression.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

#include <bit>
#include <cstring>

namespace krv::plugins::tif
{

namespace
{

constexpr std::size_t KEPT_SCRATCH_BYTES = std::size_t{4} << 20;
// The JPEG library writes coloured rows past the processor's caches, and waits for each, where they lie on 16 or 32
// bytes: into memory that does not, tiles of 256 are decoded in half the time, the copy out of it included.
constexpr std::size_t OFF_ALIGNMENT = 8;
constexpr bool BIG_ENDIAN_MACHINE = std::endian::native == std::endian::big;

} // namespace

StrileDecoder::StrileDecoder(Page& oPage) : moPage(oPage), moForm(oPage.GetForm()) {}

std::string StrileDecoder::Describe(std::uint32_t nStrile) const
{
    return (moForm.mbTiled ? "tile " : "strip ") + std::to_string(nStrile);
}

void StrileDecoder::Relax()
{
    moScratch.Shrink(KEPT_SCRATCH_BYTES);
}

codec::SampleOrder StrileDecoder::GetOrder() const
{
    return moForm.mbBigEndian == BIG_ENDIAN_MACHINE ? codec::SampleOrder::eNative : codec::SampleOrder::eSwapped;
}

// The library behind JBIG ends the process when the size in a stream asks for more memory than there is.
void StrileDecoder::CheckStream(std::uint32_t nStrile, const unsigned char* pRaw, std::size_t nRaw) const
{
    constexpr std::size_t HEADER_BYTES = 20;
    if (moForm.mnCompression != COMPRESSION_JBIG)
        return;
    unsigned char aHeader[HEADER_BYTES] = {};
    std::memcpy(aHeader, pRaw, std::min(nRaw, HEADER_BYTES));
    // libtiff's JBIG turns the bits of the usual fill order, not of the other one.
    if (!moForm.mbReversedBits)
        codec::ReverseBits(aHeader, aHeader, HEADER_BYTES);
    if (nRaw < HEADER_BYTES || aHeader[2] != 1 || ReadNumber(aHeader + 4, 4, true) != moForm.mnStrileWidth ||
        ReadNumber(aHeader + 8, 4, true) > moForm.mnStrileHeight ||
        ReadNumber(aHeader + 12, 4, true) > moForm.mnStrileHeight)
        moPage.Fail(Describe(nStrile) + ": its JBIG stream is of another size");
}

// Where the directory says nothing of the colours' sampling, the streams do.
void StrileDecoder::PrepareJpeg(std::uint32_t nStrile, std::span<unsigned char>& oRaw)
{
    if (!moJpeg)
    {
        moJpeg.emplace(moPage.GetJpegTables());
        const JpegHeader oHeader = JpegHeader::Read(oRaw);
        if (moForm.mnPhotometric == PHOTOMETRIC_YCBCR && oHeader.moComponents.size() == 3 &&
            moPage.GetDirectory().Find(TIFFTAG_YCBCRSUBSAMPLING) == nullptr)
            TIFFSetField(moPage.GetTiff(), TIFFTAG_YCBCRSUBSAMPLING, int{oHeader.moComponents[0].mnAcross},
                         int{oHeader.moComponents[0].mnDown});
    }
    if (!moJpeg->Complete(oRaw))
        moPage.Fail(Describe(nStrile) + ": its JPEG stream lacks a table");
}

void StrileDecoder::DecodeByLibrary(std::uint32_t nStrile, unsigned char* pRaw, std::size_t nRaw,
                                    unsigned char* pTarget, std::size_t nBytes)
{
    CheckStream(nStrile, pRaw, nRaw);
    std::span<unsigned char> oRaw{pRaw, nRaw};
    if (moForm.mnCompression == COMPRESSION_JPEG)
        PrepareJpeg(nStrile, oRaw);
    std::vector<unsigned char> oCopy;
    if (moForm.mnCompression == COMPRESSION_JBIG)
    {
        // libtiff turns the bits of these where they lie, and the caller keeps the bytes for the next reading.
        oCopy.assign(oRaw.begin(), oRaw.end());
        oRaw = oCopy;
    }
    TiffHandle& oHandle = moPage.GetHandle();
    oHandle.Forget();
    const int nDone = TIFFReadFromUserBuffer(oHandle.Get(), nStrile, oRaw.data(), static_cast<tmsize_t>(oRaw.size()),
                                             pTarget, static_cast<tmsize_t>(nBytes));
    const TiffTrouble oTrouble = oHandle.TakeTrouble();
    if (nDone != 1 || oTrouble.mbLostData)
        moPage.Fail(Describe(nStrile) + ": ", oTrouble);
}

void StrileDecoder::Decode(std::uint32_t nStrile, std::uint32_t nStoredRows, unsigned char* pRaw, std::size_t nRaw,
                           const WantedPixels& oWanted)
{
    // All of it is decoded, rows below the image too: damage may show at the end alone.
    const bool bOwn = moForm.IsOwnCodec();
    const std::size_t nStoredPitch = moForm.GetStoredRowBytes(moForm.mnStrileWidth);
    const std::size_t nBytes = nStoredPitch * nStoredRows;
    const bool bDirect = moForm.moSample.meWidening == Widening::eNone && oWanted.mnPitch == nStoredPitch &&
                         oWanted.mnWidth == moForm.mnStrileWidth && oWanted.mnRows == nStoredRows;
    // Before a predictor, memory that stays in the processor's caches takes what the codec writes and reads again; the
    // target is then written once.
    const bool bPassing = bOwn && moForm.mnPredictor != PREDICTOR_NONE && nBytes <= KEPT_SCRATCH_BYTES;
    const bool bColours = moForm.mnPhotometric == PHOTOMETRIC_YCBCR;
    unsigned char* pStored = bColours               ? moScratch.Get(nBytes + OFF_ALIGNMENT) + OFF_ALIGNMENT
                             : bDirect && !bPassing ? oWanted.mpTarget
                                                    : moScratch.Get(nBytes);
    if (!bOwn)
    {
        // A codec that stops early must not hand out what was there before.
        std::memset(pStored, 0, nBytes);
        DecodeByLibrary(nStrile, pRaw, nRaw, pStored, nBytes);
        return ConvertDecoded(pStored, nStoredPitch, oWanted);
    }
    if (!mpoDecoder)
        mpoDecoder = FindCompression(moForm.mnCompression)->mpCodec->mpMakeDecoder();
    const codec::Result oResult = mpoDecoder->Decode(pRaw, nRaw, pStored, nBytes);
    if (!oResult.IsDone())
        moPage.Fail(Describe(nStrile) + ": " + codec::StatusText(oResult.moStatus));
    const bool bLastStrip = !moForm.mbTiled && (nStrile + 1) % moForm.mnStrilesDown == 0;
    if (oResult.mbMore && !bLastStrip)
        moPage.Fail(Describe(nStrile) + ": the data give more than it holds");
    if (moForm.mnPredictor != PREDICTOR_NONE)
        return UndoPredictor(pStored, nStoredPitch, moForm.mnStrileWidth, oWanted);
    Finish(pStored, nStoredPitch, GetOrder() == codec::SampleOrder::eSwapped, oWanted);
}

void StrileDecoder::UndoPredictor(unsigned char* pStored, std::size_t nStoredPitch, std::uint32_t nStoredWidth,
                                  const WantedPixels& oWanted)
{
    const SampleForm& oSample = moForm.moSample;
    codec::BlockShape oShape{nStoredWidth, oWanted.mnRows, moForm.GetPlaneChannels(), oSample.GetBits() / 8};
    const bool bWiden = oSample.meWidening != Widening::eNone;
    if (moForm.mnPredictor == PREDICTOR_FLOATINGPOINT)
    {
        if (!bWiden && oWanted.mnWidth == nStoredWidth)
            return codec::UndoFloatingPoint(pStored, nStoredPitch, oWanted.mpTarget, oWanted.mnPitch, oShape,
                                            moPredictorScratch);
        codec::UndoFloatingPoint(pStored, nStoredPitch, pStored, nStoredPitch, oShape, moPredictorScratch);
        return Finish(pStored, nStoredPitch, false, oWanted);
    }
    oShape.mnWidth = oWanted.mnWidth;
    unsigned char* pTarget = bWiden ? pStored : oWanted.mpTarget;
    const std::size_t nPitch = bWiden ? nStoredPitch : oWanted.mnPitch;
    codec::UndoHorizontal(pStored, nStoredPitch, pTarget, nPitch, oShape, GetOrder());
    if (bWiden)
        Finish(pStored, nStoredPitch, false, oWanted);
}

void StrileDecoder::Convert(unsigned char* pStored, std::size_t nStoredPitch, const WantedPixels& oWanted)
{
    Finish(pStored, nStoredPitch, GetOrder() == codec::SampleOrder::eSwapped, oWanted);
}

void StrileDecoder::ConvertDecoded(unsigned char* pStored, std::size_t nStoredPitch, const WantedPixels& oWanted)
{
    // libtiff turns round words of these widths and leaves all others as they are stored.
    const unsigned int nBits = moForm.moSample.GetBits();
    const bool bTurned = nBits == 16 || nBits == 24 || nBits == 32 || nBits == 64 || nBits == 128;
    Finish(pStored, nStoredPitch, !bTurned && GetOrder() == codec::SampleOrder::eSwapped, oWanted);
}

// bSwapped: whole samples are still in the other byte order.
void StrileDecoder::Finish(unsigned char* pStored, std::size_t nStoredPitch, bool bSwapped, const WantedPixels& oWanted)
{
    const SampleForm& oSample = moForm.moSample;
    const std::size_t nSamples = std::size_t{oWanted.mnWidth} * moForm.GetPlaneChannels();
    const std::size_t nPartBytes = oSample.mnPartBits / 8;
    const bool bTurn = oSample.mnPartBits % 8 == 0 && nPartBytes > 1 && bSwapped;
    if (oSample.meWidening == Widening::eNone)
    {
        if (!bTurn && pStored == oWanted.mpTarget)
            return;
        if (!bTurn)
            return raster::CopyRows(pStored, nStoredPitch, oWanted.mpTarget, oWanted.mnPitch,
                                    nSamples * oSample.GetValueBytes(), oWanted.mnRows);
        for (std::uint32_t nRow = 0; nRow < oWanted.mnRows; ++nRow)
            codec::SwapBytes(pStored + nRow * nStoredPitch, oWanted.mpTarget + nRow * oWanted.mnPitch,
                             nSamples * oSample.mnParts, nPartBytes);
        return;
    }
    // Words of five to seven bytes are packed bits in big-endian files; libtiff leaves them as they are.
    const bool bLongWords = oSample.meWidening == Widening::eBits && oSample.mnPartBits % 8 == 0 && nPartBytes > 1;
    const bool bTurnWords = bLongWords ? !moForm.mbBigEndian : bTurn;
    for (std::uint32_t nRow = 0; bTurnWords && nRow < oWanted.mnRows; ++nRow)
        codec::SwapBytes(pStored + nRow * nStoredPitch, pStored + nRow * nStoredPitch, nSamples * oSample.mnParts,
                         nPartBytes);
    WidenRows(oSample, pStored, nStoredPitch, oWanted.mpTarget, oWanted.mnPitch, nSamples, oWanted.mnRows);
}

} // namespace krv::plugins::tif
