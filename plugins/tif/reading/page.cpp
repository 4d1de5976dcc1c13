#include "plugins/tif/reading/page.h"

#include "plugins/tif/reading/compression.h"
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
    struct Codec
    {
        std::uint16_t mnCode;
        unsigned int mnBits;
        bool mbOneChannel;
    };
    constexpr Codec CODECS[] = {
        {COMPRESSION_CCITTRLE, 1, true},  {COMPRESSION_CCITTRLEW, 1, true}, {COMPRESSION_CCITTFAX3, 1, true},
        {COMPRESSION_CCITTFAX4, 1, true}, {COMPRESSION_JBIG, 1, true},      {COMPRESSION_THUNDERSCAN, 4, true},
        {COMPRESSION_NEXT, 2, true},      {COMPRESSION_JPEG, 8, false},     {COMPRESSION_WEBP, 8, false}};
    for (const Codec& oCodec : CODECS)
        if (oCodec.mnCode == nCompression)
            return nBits == oCodec.mnBits && (nPlaneChannels == 1 || !oCodec.mbOneChannel);
    return nCompression != COMPRESSION_PIXARLOG || nBits == 8 || nBits == 16 || nBits == 32;
}

enum class Count
{
    eOne,
    eSamples,
    eAny
};

struct Rule
{
    std::uint16_t mnTag;
    bool mbLong; // of 32 bits too, not of 16 alone
    Count meCount;
    std::uint64_t mnLeast;
    std::uint64_t mnMost;
};

constexpr Rule RULES[] = {
    {TIFFTAG_IMAGEWIDTH, true, Count::eOne, 1, INT32_MAX},
    {TIFFTAG_IMAGELENGTH, true, Count::eOne, 1, INT32_MAX},
    {TIFFTAG_BITSPERSAMPLE, false, Count::eSamples, 1, 128},
    {TIFFTAG_COMPRESSION, false, Count::eOne, 1, UINT16_MAX},
    {TIFFTAG_PHOTOMETRIC, false, Count::eOne, PHOTOMETRIC_MINISWHITE, PHOTOMETRIC_MASK},
    {TIFFTAG_FILLORDER, false, Count::eOne, FILLORDER_MSB2LSB, FILLORDER_MSB2LSB},
    {TIFFTAG_SAMPLESPERPIXEL, false, Count::eOne, 1, UINT16_MAX},
    {TIFFTAG_ROWSPERSTRIP, true, Count::eOne, 1, UINT32_MAX},
    {TIFFTAG_PLANARCONFIG, false, Count::eOne, PLANARCONFIG_CONTIG, PLANARCONFIG_SEPARATE},
    {TIFFTAG_PREDICTOR, false, Count::eOne, PREDICTOR_NONE, PREDICTOR_FLOATINGPOINT},
    {TIFFTAG_TILEWIDTH, true, Count::eOne, 1, INT32_MAX},
    {TIFFTAG_TILELENGTH, true, Count::eOne, 1, INT32_MAX},
    {TIFFTAG_EXTRASAMPLES, false, Count::eAny, EXTRASAMPLE_UNSPECIFIED, EXTRASAMPLE_UNASSALPHA},
    {TIFFTAG_SAMPLEFORMAT, false, Count::eSamples, SAMPLEFORMAT_UINT, SAMPLEFORMAT_COMPLEXIEEEFP},
};

// libtiff refuses a directory for unusual values of these, or takes them for others.
constexpr std::uint16_t ODD_TAGS[] = {TIFFTAG_MINSAMPLEVALUE,  TIFFTAG_MAXSAMPLEVALUE, TIFFTAG_SMINSAMPLEVALUE,
                                      TIFFTAG_SMAXSAMPLEVALUE, TIFFTAG_DATATYPE,       TIFFTAG_IMAGEDEPTH,
                                      TIFFTAG_TILEDEPTH};

constexpr std::uint16_t WANTED_TAGS[] = {TIFFTAG_IMAGEWIDTH, TIFFTAG_IMAGELENGTH, TIFFTAG_COMPRESSION,
                                         TIFFTAG_PHOTOMETRIC};

bool Fits(const RawDirectory& oDirectory, PeekReader& oReader, const DirectoryEntry& oEntry, std::uint64_t nChannels)
{
    if (std::find(std::begin(ODD_TAGS), std::end(ODD_TAGS), oEntry.mnTag) != std::end(ODD_TAGS))
        return false;
    const auto oRule = std::find_if(std::begin(RULES), std::end(RULES),
                                    [&oEntry](const Rule& oOne) { return oOne.mnTag == oEntry.mnTag; });
    if (oRule == std::end(RULES))
        return true;
    if (oEntry.mnType != TIFF_SHORT && !(oEntry.mnType == TIFF_LONG && oRule->mbLong))
        return false;
    if (oRule->meCount != Count::eAny && oEntry.mnCount != (oRule->meCount == Count::eOne ? 1 : nChannels))
        return false;
    const auto InRange = [&oRule](std::uint64_t nValue)
    {
        return nValue >= oRule->mnLeast && nValue <= oRule->mnMost;
    };
    if (oEntry.mnCount == 1)
        return InRange(oDirectory.GetNumber(oReader, oEntry.mnTag, UINT64_MAX));
    if (oEntry.mnCount > nChannels)
        return false;
    const auto oValues = oDirectory.GetNumbers(oReader, oEntry.mnTag, oEntry.mnCount);
    return oValues.size() == oEntry.mnCount && std::all_of(oValues.begin(), oValues.end(), InRange);
}

// libtiff counts channels without a colour as extra ones, and looks for the colours of a palette.
bool HasItsColours(const RawDirectory& oDirectory, PeekReader& oReader, std::uint64_t nChannels)
{
    const std::uint64_t nPhotometric = oDirectory.GetNumber(oReader, TIFFTAG_PHOTOMETRIC, 0);
    const DirectoryEntry* pExtra = oDirectory.Find(TIFFTAG_EXTRASAMPLES);
    const std::uint64_t nExtra = pExtra != nullptr ? pExtra->mnCount : 0;
    if (nChannels != nExtra + (nPhotometric == PHOTOMETRIC_RGB ? 3 : 1))
        return false;
    if (nPhotometric != PHOTOMETRIC_PALETTE)
        return true;
    const std::uint64_t nBits = oDirectory.GetNumber(oReader, TIFFTAG_BITSPERSAMPLE, 1);
    const DirectoryEntry* pColours = oDirectory.Find(TIFFTAG_COLORMAP);
    return pColours != nullptr && nBits <= 16 && pColours->mnType == TIFF_SHORT &&
           pColours->mnCount == std::uint64_t{3} << nBits &&
           pColours->mnOffset + pColours->GetBytes() <= oReader.GetFile().GetSize();
}

// Whether the tags that decide how pixels are read stand in a directory just as the format wants them: each once, in
// order, of the usual type and count, with values that go together, and a compression that is decoded here. Such a
// directory says the same to everybody; what libtiff makes of any other, it has to be asked.
bool IsPlainDirectory(const RawDirectory& oDirectory, PeekReader& oReader)
{
    const auto& oEntries = oDirectory.GetEntries();
    const auto Has = [&oDirectory](std::uint16_t nTag)
    {
        return oDirectory.Find(nTag) != nullptr;
    };
    const bool bTiled = Has(TIFFTAG_TILEWIDTH);
    if (!std::all_of(std::begin(WANTED_TAGS), std::end(WANTED_TAGS), Has) || bTiled != Has(TIFFTAG_TILELENGTH) ||
        !Has(bTiled ? TIFFTAG_TILEOFFSETS : TIFFTAG_STRIPOFFSETS) ||
        !Has(bTiled ? TIFFTAG_TILEBYTECOUNTS : TIFFTAG_STRIPBYTECOUNTS))
        return false;
    const std::uint64_t nChannels = oDirectory.GetNumber(oReader, TIFFTAG_SAMPLESPERPIXEL, 1);
    for (std::size_t nAt = 0; nAt < oEntries.size(); ++nAt)
        if ((nAt > 0 && oEntries[nAt].mnTag <= oEntries[nAt - 1].mnTag) ||
            !Fits(oDirectory, oReader, oEntries[nAt], nChannels))
            return false;
    return IsOwnCompression(oDirectory.GetNumber(oReader, TIFFTAG_COMPRESSION, 0)) &&
           HasItsColours(oDirectory, oReader, nChannels);
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
    if (moForm.mnPredictor < PREDICTOR_NONE || moForm.mnPredictor > PREDICTOR_FLOATINGPOINT)
        Refuse("predictor " + std::to_string(moForm.mnPredictor) + ", which no reader knows,");
    if (moForm.mnPredictor == PREDICTOR_HORIZONTAL && !bWord)
        Refuse("predictor 2 (differences) with " + samples);
    if (moForm.mnPredictor == PREDICTOR_FLOATINGPOINT && !bReal)
        Refuse("predictor 3 (bytes of reals) with " + samples);
}

void Page::CheckPhotometric()
{
    if (moForm.mnPhotometric == PHOTOMETRIC_LOGL || moForm.mnPhotometric == PHOTOMETRIC_LOGLUV)
        Refuse("logarithmic luminance (LogL, LogLuv)");
    if (moForm.mnPhotometric != PHOTOMETRIC_YCBCR)
        return;
    if (moForm.mnCompression != COMPRESSION_JPEG || moForm.mbSeparate || moForm.mnChannels != 3)
        Refuse("YCbCr pixels that are not compressed by JPEG, or not pixel interleaved");
    TIFFSetField(GetTiff(), TIFFTAG_JPEGCOLORMODE, JPEGCOLORMODE_RGB);
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
