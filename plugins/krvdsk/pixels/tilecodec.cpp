#include "plugins/krvdsk/pixels/tilecodec.h"

#include "plugins/support/codec/bits.h"
#include "plugins/support/codec/predictor.h"
#include "plugins/support/writing/narrowsamples.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>
#include <cstring>
#include <optional>

namespace krv::plugins::krvdsk
{

std::size_t TileCodec::GetLargest(unsigned int nWidth, unsigned int nRows) const
{
    const ImageSize oStored = GetStoredSize(nWidth, nRows);
    const std::size_t nPlain = GetStoredRowBytes(oStored.mnWidth) * oStored.mnHeight;
    return moPlane.meCoding == Coding::eNone ? nPlain : nPlain + nPlain / 2 + 65536;
}

void TileCodec::Pick(const unsigned char* pStored, std::size_t nStoredPitch, std::size_t nWidth, std::size_t nRows,
                     unsigned char* pTarget, std::size_t nPitch) const
{
    std::vector<std::size_t> oPositions;
    for (std::size_t nAt = 0; nAt < moPlane.moThere.size(); ++nAt)
        if (moPlane.moThere[nAt])
            oPositions.push_back(nAt);
    raster::GatherChannels(pStored, nStoredPitch, moPlane.moThere.size(), pTarget, nPitch, oPositions.data(),
                           oPositions.size(), {nWidth, nRows, moPlane.moType.GetValueBits() / 8});
}

const char* TileCodec::Decode(const unsigned char* pStored, std::size_t nStored, unsigned int nWidth,
                              unsigned int nRows, unsigned char* pTarget, std::size_t nPitch)
{
    const ImageSize oStored = GetStoredSize(nWidth, nRows);
    if (oStored.mnWidth == nWidth && oStored.mnHeight == nRows)
        return DecodeStored(pStored, nStored, nWidth, nRows, pTarget, nPitch);
    const std::size_t nPixel = moPlane.moType.GetValueBits() / 8 * moPlane.GetChannels();
    unsigned char* const pWhole = moWhole.Get(nPixel * oStored.mnWidth * oStored.mnHeight);
    const char* const pCause =
        DecodeStored(pStored, nStored, oStored.mnWidth, oStored.mnHeight, pWhole, nPixel * oStored.mnWidth);
    if (pCause == nullptr)
        raster::CopyRows(pWhole, nPixel * oStored.mnWidth, pTarget, nPitch, nPixel * nWidth, nRows);
    return pCause;
}

const char* TileCodec::DecodeStored(const unsigned char* pStored, std::size_t nStored, std::size_t nWidth,
                                    std::size_t nRows, unsigned char* pTarget, std::size_t nPitch)
{
    const std::size_t nRowBytes = GetStoredRowBytes(nWidth), nBytes = nRowBytes * nRows;
    const bool bPredicted = moPlane.mnPredictor != 1;
    const bool bDirect = IsWhole() && !IsBits() && !bPredicted && nPitch == nRowBytes;
    const unsigned char* pRows = pStored;
    if (moPlane.meCoding == Coding::eNone)
    {
        if (nStored != nBytes)
            return "it is of another size";
    }
    else
    {
        if (!mpoDecoder)
            mpoDecoder = codec::FindBlockCodec(GetCodingName(moPlane.meCoding))->mpMakeDecoder();
        unsigned char* pDecoded = bDirect ? pTarget : moRows.Get(nBytes);
        const codec::Result oResult = mpoDecoder->Decode(pStored, nStored, pDecoded, nBytes);
        if (!oResult.IsDone() || oResult.mbMore)
            return oResult.IsDone() ? "its data give more than it holds" : codec::StatusText(oResult.moStatus);
        if (bDirect)
            return nullptr;
        pRows = pDecoded;
    }
    if (IsBits())
    {
        codec::UnpackBits(pRows, nBytes, nRowBytes, pTarget, nPitch, nWidth, nRows, 1, false);
        return nullptr;
    }
    if (bPredicted)
    {
        const codec::BlockShape oShape{nWidth, nRows, moPlane.moThere.size(), moPlane.moType.GetBits() / 8};
        unsigned char* pUndone = IsWhole() ? pTarget : moPredicted.Get(nBytes);
        const std::size_t nUndonePitch = IsWhole() ? nPitch : nRowBytes;
        if (moPlane.mnPredictor == 2)
            codec::UndoHorizontal(pRows, nRowBytes, pUndone, nUndonePitch, oShape);
        else
            codec::UndoFloatingPoint(pRows, nRowBytes, pUndone, nUndonePitch, oShape, moPredictorScratch);
        pRows = pUndone;
    }
    if (!IsWhole())
        Pick(pRows, nRowBytes, nWidth, nRows, pTarget, nPitch);
    else if (!bPredicted)
        raster::CopyRows(pRows, nRowBytes, pTarget, nPitch, nRowBytes, nRows);
    return nullptr;
}

// Null when no bit is set.
const unsigned char* TileCodec::PackBits(const unsigned char* pSource, std::size_t nPitch, std::size_t nWidth,
                                         std::size_t nRows)
{
    const std::size_t nRowBytes = GetStoredRowBytes(nWidth);
    unsigned char* pPacked = moRows.Get(nRowBytes * nRows);
    std::memset(pPacked, 0, nRowBytes * nRows);
    bool bAny = false;
    for (std::size_t nRow = 0; nRow < nRows; ++nRow)
        for (std::size_t nAt = 0; nAt < nWidth; ++nAt)
            if (pSource[nRow * nPitch + nAt] != 0)
            {
                pPacked[nRow * nRowBytes + nAt / 8] |= static_cast<unsigned char>(0x80U >> nAt % 8);
                bAny = true;
            }
    return bAny ? pPacked : nullptr;
}

// Spreads samples into rows of all stored channels; those that are not there become 0.
const unsigned char* TileCodec::Spread(const unsigned char* pSource, std::size_t nPitch, std::size_t nWidth,
                                       std::size_t nRows)
{
    const std::size_t nRowBytes = GetStoredRowBytes(nWidth), nValue = moPlane.moType.GetValueBits() / 8;
    const raster::PixelArea oArea{nWidth, nRows, nValue};
    unsigned char* pRows = moRows.Get(nRowBytes * nRows);
    unsigned char* pOne = moPredicted.Get(nWidth * nValue * nRows);
    std::memset(pRows, 0, nRowBytes * nRows);
    std::size_t nFrom = 0;
    for (std::size_t nAt = 0; nAt < moPlane.moThere.size(); ++nAt)
        if (moPlane.moThere[nAt])
        {
            raster::ExtractChannel(pSource, nPitch, nFrom++, moPlane.GetChannels(), pOne, nWidth * nValue, oArea);
            raster::PlaceChannel(pOne, nWidth * nValue, pRows, nRowBytes, nAt, moPlane.moThere.size(), oArea);
        }
    return pRows;
}

// What lies beyond the image is 0.
std::span<const unsigned char> TileCodec::Encode(const unsigned char* pSource, std::size_t nPitch, unsigned int nWidth,
                                                 unsigned int nRows)
{
    const ImageSize oStored = GetStoredSize(nWidth, nRows);
    if (oStored.mnWidth == nWidth && oStored.mnHeight == nRows)
        return EncodeStored(pSource, nPitch, nWidth, nRows);
    const std::size_t nPixel = moPlane.moType.GetValueBits() / 8 * moPlane.GetChannels();
    const std::size_t nWholePitch = nPixel * oStored.mnWidth;
    unsigned char* const pWhole = moWhole.Get(nWholePitch * oStored.mnHeight);
    std::memset(pWhole, 0, nWholePitch * oStored.mnHeight);
    raster::CopyRows(pSource, nPitch, pWhole, nWholePitch, nPixel * nWidth, nRows);
    return EncodeStored(pWhole, nWholePitch, oStored.mnWidth, oStored.mnHeight);
}

std::span<const unsigned char> TileCodec::EncodeStored(const unsigned char* pSource, std::size_t nPitch,
                                                       std::size_t nWidth, std::size_t nRows)
{
    const std::size_t nRowBytes = GetStoredRowBytes(nWidth), nBytes = nRowBytes * nRows;
    if (moPlane.mnKeptBits != 0)
    {
        const std::size_t nKeptPitch = nWidth * moPlane.GetChannels() * moPlane.moType.GetValueBits() / 8;
        unsigned char* const pKept = moKept.Get(nKeptPitch * nRows);
        raster::CopyRows(pSource, nPitch, pKept, nKeptPitch, nKeptPitch, nRows);
        support::MakeNarrowing(moPlane.moType, moPlane.mnKeptBits)(pKept, nKeptPitch * nRows);
        pSource = pKept;
        nPitch = nKeptPitch;
    }
    const unsigned char* pRows = pSource;
    if (IsBits())
        pRows = PackBits(pSource, nPitch, nWidth, nRows);
    else if (!IsWhole())
        pRows = Spread(pSource, nPitch, nWidth, nRows);
    if (pRows == nullptr)
        return {};
    const std::size_t nRowsPitch = pRows == pSource ? nPitch : nRowBytes;
    if (moPlane.mnPredictor != 1)
    {
        const codec::BlockShape oShape{nWidth, nRows, moPlane.moThere.size(), moPlane.moType.GetBits() / 8};
        unsigned char* pPredicted = moPredicted.Get(nBytes);
        if (moPlane.mnPredictor == 2)
            codec::ApplyHorizontal(pRows, nRowsPitch, pPredicted, nRowBytes, oShape);
        else
            codec::ApplyFloatingPoint(pRows, nRowsPitch, pPredicted, nRowBytes, oShape, moPredictorScratch);
        pRows = pPredicted;
    }
    else if (nRowsPitch != nRowBytes)
    {
        unsigned char* pDense = moPredicted.Get(nBytes);
        raster::CopyRows(pRows, nRowsPitch, pDense, nRowBytes, nRowBytes, nRows);
        pRows = pDense;
    }
    if (moPlane.meCoding == Coding::eNone)
        return {pRows, nBytes};
    if (!mpoEncoder)
    {
        const std::optional<int> oLevel =
            moPlane.mnCodingLevel == 0 ? std::nullopt : std::optional<int>(moPlane.mnCodingLevel);
        mpoEncoder = codec::FindBlockCodec(GetCodingName(moPlane.meCoding))->mpMakeEncoder(oLevel);
    }
    const std::size_t nBound = mpoEncoder->GetBound(nBytes);
    unsigned char* pCoded = moCoded.Get(nBound);
    return {pCoded, mpoEncoder->Encode(pRows, nBytes, pCoded, nBound)};
}

} // namespace krv::plugins::krvdsk
