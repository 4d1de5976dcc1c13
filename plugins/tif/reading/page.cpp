#include "plugins/tif/reading/page.h"

#include "plugins/tif/reading/compression.h"
#include "plugins/tif/reading/plaindirectory.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <climits>
#include <functional>

namespace krv::plugins::tif
{

namespace
{

// All tags of a directory together, those of strips and tiles excepted, which are read piece by piece.
constexpr std::uint64_t MAXIMUM_TAG_BYTES = std::uint64_t{96} << 20;
// Even a single row of a strip is handled as a whole.
constexpr std::uint64_t MAXIMUM_ROW_BYTES = std::uint64_t{96} << 20;

std::uint32_t DivideUp(std::uint32_t nSize, std::uint32_t nPart)
{
    return (nSize - 1) / nPart + 1;
}

std::string CodecName(std::uint16_t nCompression)
{
    const TIFFCodec* poCodec = TIFFFindCODEC(nCompression);
    const std::string number = std::to_string(nCompression);
    return poCodec != nullptr ? std::string(poCodec->name) + " (" + number + ")" : number;
}

// Codecs that know one width of sample only; what libtiff makes of others is undefined.
bool FitsCodec(std::uint16_t nCompression, unsigned int nBits, unsigned int nPlaneChannels)
{
    switch (nCompression)
    {
    case COMPRESSION_CCITTRLE:
    case COMPRESSION_CCITTRLEW:
    case COMPRESSION_CCITTFAX3:
    case COMPRESSION_CCITTFAX4:
    case COMPRESSION_JBIG:
        return nBits == 1 && nPlaneChannels == 1;
    case COMPRESSION_THUNDERSCAN:
        return nBits == 4 && nPlaneChannels == 1;
    case COMPRESSION_NEXT:
        return nBits == 2 && nPlaneChannels == 1;
    case COMPRESSION_JPEG:
    case COMPRESSION_WEBP:
        return nBits == 8;
    case COMPRESSION_PIXARLOG:
        return nBits == 8 || nBits == 16 || nBits == 32;
    default:
        return true;
    }
}

} // namespace

std::uint32_t PageForm::GetStrileRows(std::uint32_t nStrileRow) const
{
    return mbTiled ? mnStrileHeight : std::min(mnStrileHeight, mnHeight - nStrileRow * mnStrileHeight);
}

StrileShape PageForm::GetShape() const
{
    const bool bOnlyStrips = !mbTiled && mnStrilesDown == 1 && GetStriles() <= StrileShape::MOST_ONLY_STRIPS;
    const bool bPlain = bOnlyStrips && mnCompression == COMPRESSION_NONE;
    return {GetStriles(), bOnlyStrips, bPlain ? GetStoredRowBytes(mnWidth) * mnHeight : 0};
}

bool PageForm::IsOwnCodec() const
{
    return IsOwnCompression(mnCompression) && !mbReversedBits;
}

int PageForm::GetAlphaChannel() const
{
    for (std::size_t nAt = 0; nAt < moExtraSamples.size(); ++nAt)
        if (moExtraSamples[nAt] == EXTRASAMPLE_ASSOCALPHA || moExtraSamples[nAt] == EXTRASAMPLE_UNASSALPHA)
            return static_cast<int>(mnChannels - moExtraSamples.size() + nAt);
    return -1;
}

bool PageForm::IsPremultiplied() const
{
    const int nChannel = GetAlphaChannel();
    return nChannel >= 0 && moExtraSamples[static_cast<std::size_t>(nChannel) - (mnChannels - moExtraSamples.size())] ==
                                EXTRASAMPLE_ASSOCALPHA;
}

Page::Page(std::shared_ptr<const support::File> poFile, const FileHeader& oHeader, std::uint64_t nDirectory,
           std::unique_ptr<PeekReader> poReader)
    : mpoFile(std::move(poFile)), moHeader(oHeader),
      mpoReader(poReader ? std::move(poReader) : std::make_unique<PeekReader>(*mpoFile)),
      moDirectory(*mpoReader, oHeader, nDirectory)
{
    CheckTagSizes();
    CheckNumbers();
    mbPlain = IsPlainDirectory(moDirectory, *mpoReader);
    ReadForm();
    ReadGeometry();
    CheckCodec();
    CheckPhotometric();
    CheckSizes();
    mpoStriles = std::make_unique<StrileTable>(*mpoFile, moDirectory, oHeader.mbBigEndian, moForm.GetShape());
}

Page::~Page() = default;

void Page::Fail(const std::string& what, const Place& oPlace) const
{
    ThrowDamaged(GetFileName(), what, oPlace);
}

void Page::Refuse(const std::string& what, const Place& oPlace) const
{
    throw FileFormatException(GetFileName(), GetFileName() + ": " + what + "; the file is of a kind that is not read",
                              oPlace);
}

void Page::Fail(const std::string& where, const TiffTrouble& oTrouble, const Place& oPlace) const
{
    if (oTrouble.mbUnknownKind)
        Refuse(where + "its compression " + CodecName(moForm.mnCompression), oPlace);
    Fail(where + (oTrouble.moCause.empty() ? "its data make no sense" : oTrouble.moCause), oPlace);
}

std::span<const unsigned char> Page::GetJpegTables() const
{
    std::uint32_t nBytes = 0;
    const void* pBytes = nullptr;
    if (TIFFGetField(GetTiff(), TIFFTAG_JPEGTABLES, &nBytes, &pBytes) != 1 || pBytes == nullptr)
        return {};
    return {static_cast<const unsigned char*>(pBytes), nBytes};
}

TiffHandle& Page::GetHandle() const
{
    if (!mpoHandle)
        mpoHandle = std::make_unique<TiffHandle>(*mpoReader, moHeader, moDirectory.GetOffset());
    return *mpoHandle;
}

template <typename T>
T Page::GetTag(std::uint16_t nTag, T nDefault) const
{
    if (mbPlain)
        return static_cast<T>(moDirectory.GetNumber(*mpoReader, nTag, nDefault));
    T nValue = nDefault;
    return TIFFGetFieldDefaulted(GetTiff(), nTag, &nValue) == 1 ? nValue : nDefault;
}

// libtiff reads every tag at once and bounds each alone only.
void Page::CheckTagSizes() const
{
    std::uint64_t nSum = 0;
    for (const DirectoryEntry& oEntry : moDirectory.GetEntries())
        if (!IsStrileTag(oEntry.mnTag))
        {
            if (oEntry.GetBytes() > MAXIMUM_TAG_BYTES)
                Fail("tag " + std::to_string(oEntry.mnTag) + " claims " + std::to_string(oEntry.mnCount) + " values");
            nSum += oEntry.GetBytes();
        }
    if (nSum > MAXIMUM_TAG_BYTES)
        Fail("the tags claim " + std::to_string(nSum) + " bytes");
}

// libtiff refuses these in words that tell a user nothing.
void Page::CheckNumbers() const
{
    const auto Number = [this](std::uint16_t nTag, std::uint64_t nDefault)
    {
        return moDirectory.GetNumber(*mpoReader, nTag, nDefault);
    };
    if (moDirectory.Find(TIFFTAG_IMAGEWIDTH) == nullptr || moDirectory.Find(TIFFTAG_IMAGELENGTH) == nullptr)
        Fail("the directory does not tell the image size");
    const std::uint64_t nWidth = Number(TIFFTAG_IMAGEWIDTH, 1);
    const std::uint64_t nTileWidth = Number(TIFFTAG_TILEWIDTH, 1);
    CheckExtent("image", nWidth, Number(TIFFTAG_IMAGELENGTH, 1));
    CheckExtent("tile", nTileWidth, Number(TIFFTAG_TILELENGTH, 1));
    if (Number(TIFFTAG_ROWSPERSTRIP, 1) == 0)
        Fail("its strips have no rows");
    const std::uint64_t nChannels = Number(TIFFTAG_SAMPLESPERPIXEL, 1);
    if (nChannels == 0 || nChannels > UINT16_MAX)
        Fail("the image has " + std::to_string(nChannels) + " channels");
    const auto oBits = moDirectory.GetNumbers(*mpoReader, TIFFTAG_BITSPERSAMPLE, nChannels);
    const auto oFormats = moDirectory.GetNumbers(*mpoReader, TIFFTAG_SAMPLEFORMAT, nChannels);
    for (const auto* poValues : {&oBits, &oFormats})
        if (std::adjacent_find(poValues->begin(), poValues->end(), std::not_equal_to()) != poValues->end())
            Refuse("the channels differ in their type");
    const std::uint64_t nBits = oBits.empty() ? 1 : oBits.front();
    if (nBits == 0 || nBits > UINT16_MAX)
        Refuse("samples of " + std::to_string(nBits) + " bits");
    const bool bSeparate = Number(TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG) == PLANARCONFIG_SEPARATE;
    const bool bTiled = moDirectory.Find(TIFFTAG_TILEWIDTH) != nullptr;
    CheckRow((bTiled ? nTileWidth : nWidth) * nBits / 8 * (bSeparate ? 1 : nChannels));
}

void Page::CheckExtent(const char* pWhat, std::uint64_t nWidth, std::uint64_t nHeight) const
{
    const std::string text = "the " + std::string(pWhat) + " size " + std::to_string(nWidth) + " x " +
                             std::to_string(nHeight) + " is out of range";
    if (nWidth == 0 || nHeight == 0)
        Fail(text);
    if (nWidth > INT_MAX || nHeight > INT_MAX)
        Refuse(text);
}

void Page::CheckRow(std::uint64_t nBytes) const
{
    if (nBytes > MAXIMUM_ROW_BYTES)
        Refuse("a row of " + std::to_string(nBytes) + " bytes is too long");
}

void Page::ReadForm()
{
    moForm.mbBigEndian = moHeader.mbBigEndian;
    moForm.mnChannels = GetTag<std::uint16_t>(TIFFTAG_SAMPLESPERPIXEL, 1);
    moForm.mbSeparate = moForm.mnChannels > 1 &&
                        GetTag<std::uint16_t>(TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG) == PLANARCONFIG_SEPARATE;
    moForm.mbReversedBits = GetTag<std::uint16_t>(TIFFTAG_FILLORDER, FILLORDER_MSB2LSB) == FILLORDER_LSB2MSB;
    moForm.mnCompression = GetTag<std::uint16_t>(TIFFTAG_COMPRESSION, COMPRESSION_NONE);
    if (HasPredictor(moForm.mnCompression))
        moForm.mnPredictor = GetTag<std::uint16_t>(TIFFTAG_PREDICTOR, PREDICTOR_NONE);
    moForm.mnPhotometric = GetTag<std::uint16_t>(TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
    if (mbPlain)
        for (const std::uint64_t nKind : moDirectory.GetNumbers(*mpoReader, TIFFTAG_EXTRASAMPLES, moForm.mnChannels))
            moForm.moExtraSamples.push_back(static_cast<std::uint16_t>(nKind));
    std::uint16_t nExtra = 0;
    std::uint16_t* pExtra = nullptr;
    if (!mbPlain && TIFFGetField(GetTiff(), TIFFTAG_EXTRASAMPLES, &nExtra, &pExtra) == 1 && nExtra <= moForm.mnChannels)
        moForm.moExtraSamples.assign(pExtra, pExtra + nExtra);
    std::string reason;
    if (!FindSampleForm(GetTag<std::uint16_t>(TIFFTAG_BITSPERSAMPLE, 1),
                        GetTag<std::uint16_t>(TIFFTAG_SAMPLEFORMAT, SAMPLEFORMAT_UINT), moForm.moSample, reason))
        Refuse(reason);
}

void Page::ReadGeometry()
{
    moForm.mnWidth = GetTag<std::uint32_t>(TIFFTAG_IMAGEWIDTH, 0);
    moForm.mnHeight = GetTag<std::uint32_t>(TIFFTAG_IMAGELENGTH, 0);
    moForm.mbTiled = mbPlain ? moDirectory.Find(TIFFTAG_TILEWIDTH) != nullptr : TIFFIsTiled(GetTiff()) != 0;
    CheckExtent("image", moForm.mnWidth, moForm.mnHeight);
    if (GetTag<std::uint32_t>(TIFFTAG_IMAGEDEPTH, 1) > 1 || GetTag<std::uint32_t>(TIFFTAG_TILEDEPTH, 1) > 1)
        Refuse("volumes (image depth above 1)");
    if (moForm.mbTiled)
    {
        moForm.mnStrileWidth = GetTag<std::uint32_t>(TIFFTAG_TILEWIDTH, 0);
        moForm.mnStrileHeight = GetTag<std::uint32_t>(TIFFTAG_TILELENGTH, 0);
    }
    else
    {
        moForm.mnStrileWidth = moForm.mnWidth;
        moForm.mnStrileHeight = std::min(moForm.mnHeight, GetTag<std::uint32_t>(TIFFTAG_ROWSPERSTRIP, UINT32_MAX));
    }
    CheckExtent(moForm.mbTiled ? "tile" : "strip", moForm.mnStrileWidth, moForm.mnStrileHeight);
    moForm.mnStrilesAcross = DivideUp(moForm.mnWidth, moForm.mnStrileWidth);
    moForm.mnStrilesDown = DivideUp(moForm.mnHeight, moForm.mnStrileHeight);
}

void Page::CheckCodec()
{
    const std::uint16_t nCompression = moForm.mnCompression;
    const SampleForm& oSample = moForm.moSample;
    if (nCompression == COMPRESSION_OJPEG)
        Refuse("old-style JPEG compression");
    if (TIFFIsCODECConfigured(nCompression) == 0)
        Refuse("the compression " + CodecName(nCompression));
    if (!FitsCodec(nCompression, oSample.GetBits(), moForm.GetPlaneChannels()))
        Refuse("the compression " + CodecName(nCompression) + " does not go with samples of " +
               std::to_string(oSample.GetBits()) + " bits and " + std::to_string(moForm.GetPlaneChannels()) +
               " channels");
    if (HasPredictor(nCompression))
        CheckPredictor();
    // The library turns samples round as a whole where their parts are meant.
    const bool bOddParts = oSample.mnParts == 2 && (oSample.mnPartBits <= 12 || oSample.meWidening == Widening::eHalf);
    if (bOddParts && moForm.mbBigEndian && oSample.GetBits() % 8 == 0 && !moForm.IsOwnCodec())
        Refuse("big-endian complex samples of " + std::to_string(oSample.GetBits()) + " bits in this compression");
}

void Page::CheckPredictor() const
{
    const SampleForm& oSample = moForm.moSample;
    const bool bWord =
        oSample.GetBits() == 8 || oSample.GetBits() == 16 || oSample.GetBits() == 32 || oSample.GetBits() == 64;
    const bool bReal = oSample.moNativeType.IsReal() && oSample.mnParts == 1;
    const std::string samples =
        oSample.moNativeType.Describe() + " samples of " + std::to_string(oSample.GetBits()) + " bits";
    switch (moForm.mnPredictor)
    {
    case PREDICTOR_NONE:
        return;
    case PREDICTOR_HORIZONTAL:
        if (!bWord)
            Refuse("predictor 2 (differences) with " + samples);
        return;
    case PREDICTOR_FLOATINGPOINT:
        if (!bReal)
            Refuse("predictor 3 (bytes of reals) with " + samples);
        return;
    default:
        Refuse("predictor " + std::to_string(moForm.mnPredictor) + ", which no reader knows,");
    }
}

void Page::CheckPhotometric()
{
    switch (moForm.mnPhotometric)
    {
    case PHOTOMETRIC_LOGL:
    case PHOTOMETRIC_LOGLUV:
        Refuse("logarithmic luminance (LogL, LogLuv)");
    case PHOTOMETRIC_YCBCR:
        if (moForm.mnCompression != COMPRESSION_JPEG || moForm.mbSeparate || moForm.mnChannels != 3)
            Refuse("YCbCr pixels that are not compressed by JPEG, or not pixel interleaved");
        TIFFSetField(GetTiff(), TIFFTAG_JPEGCOLORMODE, JPEGCOLORMODE_RGB);
        break;
    default:
        break;
    }
}

void Page::CheckSizes() const
{
    // The smallest part that is handled as a whole: a tile, or a row of a strip.
    CheckRow(std::max(moForm.GetRowBytes(moForm.mnStrileWidth), moForm.GetStoredRowBytes(moForm.mnStrileWidth)));
    if (moForm.GetStriles() > UINT32_MAX)
        Fail("there are too many strips or tiles");
    if (moForm.mnCompression == COMPRESSION_NONE || mbPlain)
        return;
    const std::uint64_t nExpected = moForm.GetStoredRowBytes(moForm.mnStrileWidth);
    const auto nClaimed = moForm.mbTiled ? TIFFTileRowSize64(GetTiff()) : TIFFScanlineSize64(GetTiff());
    if (nClaimed != nExpected)
        Refuse("rows of " + std::to_string(nClaimed) + " bytes instead of " + std::to_string(nExpected));
}

} // namespace krv::plugins::tif
