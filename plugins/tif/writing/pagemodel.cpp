#include "plugins/tif/writing/pagemodel.h"

#include "plugins/support/writing/narrowsamples.h"
#include "plugins/tif/reading/compression.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <string>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

constexpr std::uint32_t TILE_SIDE = 256;
constexpr std::uint64_t STRIP_BYTES = std::uint64_t{256} << 10;
constexpr std::uint32_t TILE_UNIT = 16;
constexpr std::uint16_t RANGES[] = {TIFFTAG_MINSAMPLEVALUE, TIFFTAG_MAXSAMPLEVALUE, TIFFTAG_SMINSAMPLEVALUE,
                                    TIFFTAG_SMAXSAMPLEVALUE};

std::uint64_t DivideUp(std::uint64_t nSize, std::uint64_t nPart)
{
    return (nSize + nPart - 1) / nPart;
}

std::uint32_t RoundToUnit(std::uint32_t nSize)
{
    return static_cast<std::uint32_t>(DivideUp(nSize, TILE_UNIT) * TILE_UNIT);
}

std::uint16_t GetSampleFormat(const krv::gobs::DataType& oType)
{
    if (oType.IsComplex() && oType.IsReal())
        return SAMPLEFORMAT_COMPLEXIEEEFP;
    if (oType.IsComplex())
        return SAMPLEFORMAT_COMPLEXINT;
    if (oType.IsReal())
        return SAMPLEFORMAT_IEEEFP;
    return oType.IsSigned() ? SAMPLEFORMAT_INT : SAMPLEFORMAT_UINT;
}

// The bits of one sample as it is stored: narrower than the type only where the type comes back when it is read.
unsigned int ChooseBits(const NewImage& oImage, const CreateOptions& oOptions, const Place& oPlace)
{
    const krv::gobs::DataType& oType = oImage.moType;
    const unsigned int nWhole = oType.GetValueBits();
    const unsigned int nBits = oOptions.mnSampleBits == 0 ? nWhole : oOptions.mnSampleBits;
    if (nBits != nWhole && !support::CanNarrow(oType, nBits))
        throw DataException("The option NBITS=" + std::to_string(nBits) + " does not go with values of type " +
                                oType.Describe(),
                            oPlace);
    return nBits;
}

std::uint16_t ChoosePredictor(const NewImage& oImage, const CreateOptions& oOptions, const Place& oPlace)
{
    if (!HasPredictor(oOptions.mnCompression))
        return PREDICTOR_NONE;
    const krv::gobs::DataType& oType = oImage.moType;
    const bool bPacked = !oType.IsReal() && ChooseBits(oImage, oOptions, oPlace) != oType.GetValueBits();
    // Differences of 64-bit integers are refused by other readers: who wants them asks for them.
    if (oOptions.mnPredictor == 0)
        return bPacked || oType.IsComplex()                 ? PREDICTOR_NONE
               : oType.IsReal()                             ? PREDICTOR_FLOATINGPOINT
               : ChooseBits(oImage, oOptions, oPlace) == 64 ? PREDICTOR_NONE
                                                            : PREDICTOR_HORIZONTAL;
    const bool bFits = oOptions.mnPredictor == PREDICTOR_NONE ||
                       (oOptions.mnPredictor == PREDICTOR_HORIZONTAL && !oType.IsComplex() && !bPacked) ||
                       (oOptions.mnPredictor == PREDICTOR_FLOATINGPOINT && oType.IsReal() && !oType.IsComplex());
    if (!bFits)
        throw DataException("The option PREDICTOR=" + std::to_string(oOptions.mnPredictor) +
                                " does not go with values of type " + oType.Describe(),
                            oPlace);
    return oOptions.mnPredictor;
}

void CheckCodec(const NewImage& oImage, const CreateOptions& oOptions, const Place& oPlace)
{
    if (oOptions.mnCompression != COMPRESSION_JPEG)
        return;
    const bool bBytes = oImage.moType == krv::gobs::DataType(krv::gobs::eDT_8U) && oOptions.mnSampleBits % 8 == 0;
    if (!bBytes || (!oOptions.mbSeparate && oImage.mnChannels != 1 && oImage.mnChannels != 3))
        throw DataException("JPEG compression takes 8U values of one or three channels, or band interleaving", oPlace);
}

std::uint16_t ChoosePhotometric(const NewImage& oImage, const CreateOptions& oOptions, const Place& oPlace)
{
    const bool bColours = oImage.moType == krv::gobs::DataType(krv::gobs::eDT_8U) ||
                          oImage.moType == krv::gobs::DataType(krv::gobs::eDT_16U);
    const std::uint16_t nOwn =
        oImage.mnChannels - (oOptions.mnAlpha != 0 ? 1 : 0) == 3 && bColours ? PHOTOMETRIC_RGB : PHOTOMETRIC_MINISBLACK;
    const std::uint16_t nChosen = oOptions.moPhotometric.value_or(nOwn);
    const unsigned int nColours = nChosen == PHOTOMETRIC_RGB ? 3 : 1;
    if (oImage.mnChannels < nColours + (oOptions.mnAlpha != 0 ? 1u : 0u))
        throw DataException(
            "The options PHOTOMETRIC and ALPHA want more channels than " + std::to_string(oImage.mnChannels), oPlace);
    return nChosen;
}

void SetColours(TagList& oTags, const NewImage& oImage, const CreateOptions& oOptions, const Place& oPlace)
{
    const std::uint16_t nPhotometric = ChoosePhotometric(oImage, oOptions, oPlace);
    const std::size_t nColours = nPhotometric == PHOTOMETRIC_RGB ? 3 : 1;
    const bool bBrightness =
        oOptions.mnCompression == COMPRESSION_JPEG && nPhotometric == PHOTOMETRIC_RGB && !oOptions.mbSeparate;
    oTags.SetNumber(TIFFTAG_PHOTOMETRIC, TIFF_SHORT, bBrightness ? PHOTOMETRIC_YCBCR : nPhotometric);
    if (bBrightness)
        oTags.SetNumbers(TIFFTAG_YCBCRSUBSAMPLING, TIFF_SHORT, {2, 2});
    if (oImage.mnChannels == nColours)
        return;
    std::vector<std::uint64_t> oExtra(oImage.mnChannels - nColours, EXTRASAMPLE_UNSPECIFIED);
    oExtra.back() = oOptions.mnAlpha;
    oTags.SetNumbers(TIFFTAG_EXTRASAMPLES, TIFF_SHORT, oExtra);
}

// Small images do not need tiles larger than they are.
void SetTiles(TagList& oTags, std::uint32_t nWidth, std::uint32_t nHeight, std::uint32_t nTileWidth,
              std::uint32_t nTileHeight)
{
    oTags.SetNumber(TIFFTAG_TILEWIDTH, TIFF_LONG, std::min(nTileWidth, RoundToUnit(nWidth)));
    oTags.SetNumber(TIFFTAG_TILELENGTH, TIFF_LONG, std::min(nTileHeight, RoundToUnit(nHeight)));
}

void SetGeometry(TagList& oTags, const NewImage& oImage, const CreateOptions& oOptions)
{
    oTags.SetNumber(TIFFTAG_IMAGEWIDTH, TIFF_LONG, oImage.mnWidth);
    oTags.SetNumber(TIFFTAG_IMAGELENGTH, TIFF_LONG, oImage.mnHeight);
    if (oOptions.mbTiled)
        return SetTiles(oTags, oImage.mnWidth, oImage.mnHeight,
                        oOptions.mnBlockWidth != 0 ? oOptions.mnBlockWidth : TILE_SIDE,
                        oOptions.mnBlockHeight != 0 ? oOptions.mnBlockHeight : TILE_SIDE);
    const std::uint64_t nRowBytes = std::uint64_t{oImage.mnWidth} * (oOptions.mbSeparate ? 1 : oImage.mnChannels) *
                                    (oImage.moType.GetValueBits() / 8);
    std::uint64_t nRows =
        oOptions.mnBlockHeight != 0 ? oOptions.mnBlockHeight : std::max<std::uint64_t>(1, STRIP_BYTES / nRowBytes);
    if (oOptions.mnCompression == COMPRESSION_JPEG)
        nRows = DivideUp(nRows, TILE_UNIT) * TILE_UNIT;
    oTags.SetNumber(TIFFTAG_ROWSPERSTRIP, TIFF_LONG, std::min<std::uint64_t>(nRows, oImage.mnHeight));
}

Tag CopyTag(const Tag& oTag)
{
    return {oTag.mnTag, oTag.mnType, oTag.mnCount, oTag.moBytes, {}};
}

} // namespace

PageModel::~PageModel() = default;

Strile PageModel::Get(std::uint64_t nIndex) const
{
    return {moOffsets.at(nIndex), moByteCounts.at(nIndex), true};
}

void PageModel::SetStriles(std::uint64_t nStriles)
{
    moOffsets = StrileList<std::uint64_t>(nStriles);
    moByteCounts = StrileList<std::uint64_t>(nStriles);
    moRoom = StrileList<std::uint64_t>(nStriles);
    moGenerations = StrileList<std::uint32_t>(nStriles);
}

std::uint64_t PageModel::CountStriles() const
{
    const std::uint64_t nWidth = moTags.GetNumber(TIFFTAG_IMAGEWIDTH, 0);
    const std::uint64_t nHeight = moTags.GetNumber(TIFFTAG_IMAGELENGTH, 0);
    const std::uint64_t nChannels = moTags.GetNumber(TIFFTAG_SAMPLESPERPIXEL, 1);
    const bool bSeparate = moTags.GetNumber(TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG) == PLANARCONFIG_SEPARATE;
    std::uint64_t nAcross = 1;
    std::uint64_t nRows = moTags.GetNumber(TIFFTAG_ROWSPERSTRIP, UINT32_MAX);
    if (IsTiled())
    {
        nAcross = DivideUp(nWidth, std::max<std::uint64_t>(1, moTags.GetNumber(TIFFTAG_TILEWIDTH, 0)));
        nRows = moTags.GetNumber(TIFFTAG_TILELENGTH, 0);
    }
    return nAcross * DivideUp(nHeight, std::max<std::uint64_t>(1, nRows)) * (bSeparate ? nChannels : 1);
}

// A number too large for its product is left to whoever checks the form.
StrileShape PageModel::GetShape() const
{
    const std::uint64_t nHeight = moTags.GetNumber(TIFFTAG_IMAGELENGTH, 0);
    const bool bSeparate = moTags.GetNumber(TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG) == PLANARCONFIG_SEPARATE;
    StrileShape oShape{CountStriles(), false, 0};
    oShape.mbOnlyStrips = !IsTiled() && moTags.GetNumber(TIFFTAG_ROWSPERSTRIP, UINT32_MAX) >= nHeight &&
                          oShape.mnCount <= StrileShape::MOST_ONLY_STRIPS;
    if (!oShape.mbOnlyStrips || moTags.GetNumber(TIFFTAG_COMPRESSION, COMPRESSION_NONE) != COMPRESSION_NONE)
        return oShape;
    std::uint64_t nBits = moTags.GetNumber(TIFFTAG_BITSPERSAMPLE, 1);
    const bool bTooLong =
        __builtin_mul_overflow(nBits, bSeparate ? 1 : moTags.GetNumber(TIFFTAG_SAMPLESPERPIXEL, 1), &nBits) ||
        __builtin_mul_overflow(nBits, moTags.GetNumber(TIFFTAG_IMAGEWIDTH, 0), &nBits) ||
        __builtin_mul_overflow(nBits / 8 + (nBits % 8 != 0 ? 1 : 0), nHeight, &oShape.mnPlainBytes);
    oShape.mnPlainBytes = bTooLong ? UINT64_MAX : oShape.mnPlainBytes;
    return oShape;
}

bool PageModel::HasRanges() const
{
    return std::any_of(std::begin(RANGES), std::end(RANGES), [this](std::uint16_t nTag) { return moTags.Find(nTag); });
}

void PageModel::DropRanges()
{
    for (const std::uint16_t nTag : RANGES)
        moTags.Remove(nTag);
}

PageSummary PageModel::Summarise() const
{
    PageSummary oPage;
    oPage.mnOffset = mnNumber;
    oPage.mnWidth = moTags.GetNumber(TIFFTAG_IMAGEWIDTH, 0);
    oPage.mnHeight = moTags.GetNumber(TIFFTAG_IMAGELENGTH, 0);
    oPage.mnChannels = moTags.GetNumber(TIFFTAG_SAMPLESPERPIXEL, 1);
    oPage.mnBits = moTags.GetNumber(TIFFTAG_BITSPERSAMPLE, 1);
    oPage.mnFormat = moTags.GetNumber(TIFFTAG_SAMPLEFORMAT, SAMPLEFORMAT_UINT);
    const std::uint64_t nKind = moTags.GetNumber(TIFFTAG_SUBFILETYPE, 0);
    oPage.mbReduced =
        (nKind & FILETYPE_REDUCEDIMAGE) != 0 || moTags.GetNumber(TIFFTAG_OSUBFILETYPE, 0) == OFILETYPE_REDUCEDIMAGE;
    oPage.mbMask = (nKind & FILETYPE_MASK) != 0;
    oPage.mbBelowFirst = mbBelowFirst;
    oPage.mbPage = (nKind & FILETYPE_PAGE) != 0;
    const Tag* const pText = moTags.Find(TIFFTAG_IMAGEDESCRIPTION);
    // One that is not in memory is long.
    oPage.mbDescribed = pText != nullptr && pText->mnType == TIFF_ASCII && pText->mnCount != 0 &&
                        (pText->moBytes.empty() || pText->moBytes.front() != 0);
    const Tag* pName = moTags.Find(TIFFTAG_PAGENAME);
    if (pName != nullptr && pName->mnType == TIFF_ASCII && pName->mnCount <= LONGEST_PAGE_NAME)
        oPage.mnNumber = ParsePageName(moTags.GetText(TIFFTAG_PAGENAME), oPage.mbReduced);
    return oPage;
}

std::shared_ptr<PageModel> MakeImagePage(const NewImage& oImage, const CreateOptions& oOptions, bool bBigEndian,
                                         const Place& oPlace)
{
    CheckCodec(oImage, oOptions, oPlace);
    auto poPage = std::make_shared<PageModel>(bBigEndian);
    TagList& oTags = poPage->moTags;
    SetGeometry(oTags, oImage, oOptions);
    oTags.SetNumbers(TIFFTAG_BITSPERSAMPLE, TIFF_SHORT,
                     std::vector<std::uint64_t>(oImage.mnChannels, ChooseBits(oImage, oOptions, oPlace)));
    oTags.SetNumbers(TIFFTAG_SAMPLEFORMAT, TIFF_SHORT,
                     std::vector<std::uint64_t>(oImage.mnChannels, GetSampleFormat(oImage.moType)));
    oTags.SetNumber(TIFFTAG_SAMPLESPERPIXEL, TIFF_SHORT, oImage.mnChannels);
    oTags.SetNumber(TIFFTAG_COMPRESSION, TIFF_SHORT, oOptions.mnCompression);
    oTags.SetNumber(TIFFTAG_PLANARCONFIG, TIFF_SHORT,
                    oOptions.mbSeparate && oImage.mnChannels > 1 ? PLANARCONFIG_SEPARATE : PLANARCONFIG_CONTIG);
    SetColours(oTags, oImage, oOptions, oPlace);
    const std::uint16_t nPredictor = ChoosePredictor(oImage, oOptions, oPlace);
    if (nPredictor != PREDICTOR_NONE)
        oTags.SetNumber(TIFFTAG_PREDICTOR, TIFF_SHORT, nPredictor);
    return poPage;
}

std::shared_ptr<PageModel> MakeReducedPage(const PageModel& oFull, std::uint32_t nWidth, std::uint32_t nHeight)
{
    constexpr std::uint16_t KEPT[] = {TIFFTAG_BITSPERSAMPLE, TIFFTAG_COMPRESSION,
                                      TIFFTAG_PHOTOMETRIC,   TIFFTAG_SAMPLESPERPIXEL,
                                      TIFFTAG_PLANARCONFIG,  TIFFTAG_PREDICTOR,
                                      TIFFTAG_COLORMAP,      TIFFTAG_EXTRASAMPLES,
                                      TIFFTAG_SAMPLEFORMAT,  TIFFTAG_YCBCRSUBSAMPLING,
                                      TIFFTAG_JPEGTABLES,    TIFFTAG_REFERENCEBLACKWHITE,
                                      TIFFTAG_INKSET,        42113};
    auto poPage = std::make_shared<PageModel>(oFull.moTags.IsBigEndian());
    TagList& oTags = poPage->moTags;
    for (const std::uint16_t nTag : KEPT)
        if (const Tag* pTag = oFull.moTags.Find(nTag))
            oTags.Set(CopyTag(*pTag));
    const std::uint64_t nCompression = oTags.GetNumber(TIFFTAG_COMPRESSION, COMPRESSION_NONE);
    if (!CanEncode(nCompression))
        oTags.SetNumber(TIFFTAG_COMPRESSION, TIFF_SHORT, COMPRESSION_ADOBE_DEFLATE); // that one is only read
    oTags.SetNumber(TIFFTAG_IMAGEWIDTH, TIFF_LONG, nWidth);
    oTags.SetNumber(TIFFTAG_IMAGELENGTH, TIFF_LONG, nHeight);
    if (oFull.IsTiled())
        SetTiles(oTags, nWidth, nHeight, static_cast<std::uint32_t>(oFull.moTags.GetNumber(TIFFTAG_TILEWIDTH, 0)),
                 static_cast<std::uint32_t>(oFull.moTags.GetNumber(TIFFTAG_TILELENGTH, 0)));
    else
        oTags.SetNumber(TIFFTAG_ROWSPERSTRIP, TIFF_LONG,
                        std::min<std::uint64_t>(oFull.moTags.GetNumber(TIFFTAG_ROWSPERSTRIP, UINT32_MAX), nHeight));
    return poPage;
}

void SetBitmapKind(PageModel& oPage, unsigned int nBitmap, const std::string& description)
{
    TagList& oTags = oPage.moTags;
    const bool bZone = !description.empty();
    oTags.SetNumber(TIFFTAG_SUBFILETYPE, TIFF_LONG, bZone ? FILETYPE_PAGE : FILETYPE_MASK);
    oTags.SetNumber(TIFFTAG_PHOTOMETRIC, TIFF_SHORT, bZone ? PHOTOMETRIC_MINISBLACK : PHOTOMETRIC_MASK);
    oTags.SetText(TIFFTAG_PAGENAME, MakePageName(nBitmap, false));
    oTags.SetText(TIFFTAG_IMAGEDESCRIPTION, description);
}

std::shared_ptr<PageModel> MakeBitmapPage(const PageModel& oImage, unsigned int nBitmap)
{
    auto poPage = std::make_shared<PageModel>(oImage.moTags.IsBigEndian());
    TagList& oTags = poPage->moTags;
    const std::uint64_t nCompression = oImage.moTags.GetNumber(TIFFTAG_COMPRESSION, COMPRESSION_NONE);
    const bool bKept = nCompression == COMPRESSION_NONE || nCompression == COMPRESSION_LZW ||
                       nCompression == COMPRESSION_ZSTD || nCompression == COMPRESSION_PACKBITS;
    const auto nWidth = static_cast<std::uint32_t>(oImage.moTags.GetNumber(TIFFTAG_IMAGEWIDTH, 0));
    const auto nHeight = static_cast<std::uint32_t>(oImage.moTags.GetNumber(TIFFTAG_IMAGELENGTH, 0));
    oTags.SetNumber(TIFFTAG_IMAGEWIDTH, TIFF_LONG, nWidth);
    oTags.SetNumber(TIFFTAG_IMAGELENGTH, TIFF_LONG, nHeight);
    oTags.SetNumber(TIFFTAG_BITSPERSAMPLE, TIFF_SHORT, 1);
    oTags.SetNumber(TIFFTAG_COMPRESSION, TIFF_SHORT, bKept ? nCompression : COMPRESSION_ADOBE_DEFLATE);
    oTags.SetNumber(TIFFTAG_SAMPLESPERPIXEL, TIFF_SHORT, 1);
    oTags.SetNumber(TIFFTAG_PLANARCONFIG, TIFF_SHORT, PLANARCONFIG_CONTIG);
    oTags.SetNumber(TIFFTAG_SAMPLEFORMAT, TIFF_SHORT, SAMPLEFORMAT_UINT);
    if (oImage.IsTiled())
        SetTiles(oTags, nWidth, nHeight, static_cast<std::uint32_t>(oImage.moTags.GetNumber(TIFFTAG_TILEWIDTH, 0)),
                 static_cast<std::uint32_t>(oImage.moTags.GetNumber(TIFFTAG_TILELENGTH, 0)));
    else
        oTags.SetNumber(TIFFTAG_ROWSPERSTRIP, TIFF_LONG,
                        std::min<std::uint64_t>(oImage.moTags.GetNumber(TIFFTAG_ROWSPERSTRIP, UINT32_MAX), nHeight));
    SetBitmapKind(*poPage, nBitmap, MakePageName(nBitmap, false));
    return poPage;
}

} // namespace krv::plugins::tif
