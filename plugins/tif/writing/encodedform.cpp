#include "plugins/tif/writing/encodedform.h"

#include "plugins/tif/reading/compression.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <sstream>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

using krv::datasources::EncodedForm;

// Tags that decoders go by.
struct Parameter
{
    const char* mpName;
    std::uint16_t mnTag;
    std::uint16_t mnType;
    std::uint16_t mnOnlyWith; // a codec, or 0
};

constexpr std::uint16_t LERC_PARAMETERS = 50674;
constexpr Parameter PARAMETERS[] = {{"BIT_ORDER", TIFFTAG_FILLORDER, TIFF_SHORT, 0},
                                    {"T4_OPTIONS", TIFFTAG_GROUP3OPTIONS, TIFF_LONG, COMPRESSION_CCITTFAX3},
                                    {"T6_OPTIONS", TIFFTAG_GROUP4OPTIONS, TIFF_LONG, COMPRESSION_CCITTFAX4},
                                    {"LERC_PARAMETERS", LERC_PARAMETERS, TIFF_LONG, COMPRESSION_LERC},
                                    {"PHOTOMETRIC", TIFFTAG_PHOTOMETRIC, TIFF_SHORT, COMPRESSION_JPEG},
                                    {"EXTRA_SAMPLES", TIFFTAG_EXTRASAMPLES, TIFF_SHORT, COMPRESSION_JPEG},
                                    {"SUBSAMPLING", TIFFTAG_YCBCRSUBSAMPLING, TIFF_SHORT, COMPRESSION_JPEG},
                                    {"POSITIONING", TIFFTAG_YCBCRPOSITIONING, TIFF_SHORT, COMPRESSION_JPEG},
                                    {"COEFFICIENTS", TIFFTAG_YCBCRCOEFFICIENTS, TIFF_RATIONAL, COMPRESSION_JPEG},
                                    {"BLACK_WHITE", TIFFTAG_REFERENCEBLACKWHITE, TIFF_RATIONAL, COMPRESSION_JPEG}};
constexpr std::size_t MOST_NUMBERS = 65535;
constexpr std::size_t MOST_TABLE_BYTES = std::size_t{1} << 20;

bool HasByteOrder(const PageForm& oForm)
{
    const unsigned int nBits = oForm.moSample.mnPartBits;
    return nBits > 8 && nBits % 8 == 0 && oForm.mnPredictor != PREDICTOR_FLOATINGPOINT;
}

// The values of a tag as they stand in the file; empty when there is none or it is out of reach.
std::vector<unsigned char> ReadBytes(Page& oPage, std::uint16_t nTag, std::size_t nMost)
{
    const DirectoryEntry* pEntry = oPage.GetDirectory().Find(nTag);
    if (pEntry == nullptr || pEntry->GetBytes() > nMost)
        return {};
    std::vector<unsigned char> oBytes(pEntry->GetBytes());
    oBytes.resize(
        oPage.GetReader().Read(pEntry->mnOffset, oBytes.data(), oBytes.size()) == oBytes.size() ? oBytes.size() : 0);
    return oBytes;
}

std::string ReadNumbers(Page& oPage, const Parameter& oParameter)
{
    std::vector<std::uint64_t> oNumbers;
    if (oParameter.mnType == TIFF_RATIONAL)
    {
        const std::vector<unsigned char> oBytes = ReadBytes(oPage, oParameter.mnTag, MOST_NUMBERS);
        for (std::size_t nAt = 0; nAt + 4 <= oBytes.size(); nAt += 4)
            oNumbers.push_back(ReadNumber(oBytes.data() + nAt, 4, oPage.GetHeader().mbBigEndian));
    }
    else
        oNumbers = oPage.GetDirectory().GetNumbers(oPage.GetReader(), oParameter.mnTag, MOST_NUMBERS);
    std::string text;
    for (const std::uint64_t nNumber : oNumbers)
        text += (text.empty() ? "" : " ") + std::to_string(nNumber);
    return text;
}

// False for anything but numbers that the tag's values can hold.
bool SetNumbers(TagList& oTags, const Parameter& oParameter, const std::string& text)
{
    std::vector<std::uint64_t> oNumbers;
    std::istringstream oWords(text);
    for (std::string word; oWords >> word;)
    {
        const std::optional<std::uint64_t> oNumber = ParseNumber<std::uint64_t>(word);
        if (!oNumber || *oNumber > (oParameter.mnType == TIFF_SHORT ? UINT16_MAX : UINT32_MAX))
            return false;
        oNumbers.push_back(*oNumber);
    }
    const std::size_t nParts = oParameter.mnType == TIFF_RATIONAL ? 2 : 1;
    if (oNumbers.empty() || oNumbers.size() % nParts != 0 || oNumbers.size() > MOST_NUMBERS)
        return false;
    Tag oTag{oParameter.mnTag, oParameter.mnType, oNumbers.size() / nParts, {}, {}};
    for (const std::uint64_t nNumber : oNumbers)
        AppendNumber(oTag.moBytes, nNumber, oParameter.mnType == TIFF_SHORT ? 2 : 4, oTags.IsBigEndian());
    oTags.Set(std::move(oTag));
    return true;
}

// Uncompressed blocks hold just their rows; writers that got that wrong are read leniently, but not passed on. What is
// wrong with the lists is told by whoever reads the pixels.
bool CanBeTold(Page& oPage)
try
{
    const PageForm& oForm = oPage.GetForm();
    for (std::uint64_t nStrile = 0; nStrile < oForm.GetStriles(); ++nStrile)
    {
        const Strile oStrile = oPage.GetStriles().Get(nStrile);
        const std::uint64_t nRows =
            oForm.GetStrileRows(static_cast<std::uint32_t>(nStrile / oForm.mnStrilesAcross % oForm.mnStrilesDown));
        const bool bShort = oForm.mnCompression == COMPRESSION_NONE && oStrile.mnBytes != 0 &&
                            oStrile.mnBytes < nRows * oForm.GetStoredRowBytes(oForm.mnStrileWidth);
        if (!oStrile.mbBytesKnown || bShort || (oStrile.mnBytes == 0) != (oStrile.mnOffset == 0))
            return false;
    }
    return true;
}
catch (const FileFormatException&)
{
    return false;
}

} // namespace

std::uint64_t GetLargestCoded(const PageForm& oForm, std::uint32_t nStoredRows)
{
    constexpr std::uint64_t SPARE_BYTES = std::uint64_t{1} << 20;
    const std::uint64_t nStored = nStoredRows * oForm.GetStoredRowBytes(oForm.mnStrileWidth);
    return oForm.mnCompression == COMPRESSION_NONE ? nStored : nStored + nStored / 8 + SPARE_BYTES;
}

EncodedForm DescribeBlocks(Page& oPage)
{
    const PageForm& oForm = oPage.GetForm();
    EncodedForm oBlocks;
    const Compression* const pCodec = FindCompression(oForm.mnCompression);
    if (pCodec != nullptr)
        oBlocks.moCodec = pCodec->moName;
    oBlocks.mbReadable = pCodec != nullptr && CanBeTold(oPage);
    oBlocks.mbLossy = pCodec == nullptr || pCodec->mbLossy;
    oBlocks.mnPredictor = oForm.mnPredictor;
    oBlocks.mbBigEndian = oForm.mbBigEndian && HasByteOrder(oForm);
    oBlocks.mbSeparate = oForm.mbSeparate;
    oBlocks.moType = oForm.moSample.moType;
    oBlocks.mnChannels = oForm.mnChannels;
    oBlocks.mnSampleBits = oForm.moSample.GetBits();
    oBlocks.mnWidth = oForm.mnWidth;
    oBlocks.mnHeight = oForm.mnHeight;
    oBlocks.mnBlockWidth = oForm.mnStrileWidth;
    oBlocks.mnBlockHeight = oForm.mnStrileHeight;
    oBlocks.mbWholeBlocks = oForm.mbTiled;
    for (const Parameter& oParameter : PARAMETERS)
    {
        if (oParameter.mnOnlyWith != 0 && oParameter.mnOnlyWith != oForm.mnCompression)
            continue;
        const std::string numbers = ReadNumbers(oPage, oParameter);
        const bool bUsual = oParameter.mnTag == TIFFTAG_FILLORDER && !oForm.mbReversedBits;
        if (!numbers.empty() && !bUsual)
            oBlocks.moParameters[oParameter.mpName] = numbers;
    }
    if (oForm.mnCompression == COMPRESSION_JPEG)
        oBlocks.moTables = ReadBytes(oPage, TIFFTAG_JPEGTABLES, MOST_TABLE_BYTES);
    return oBlocks;
}

std::shared_ptr<PageModel> MakeEncodedPage(const PageModel& oPage, const EncodedForm& oForm)
{
    const Compression* const pCodec = FindCompression(oForm.moCodec);
    if (pCodec == nullptr || oForm.mnBlockWidth == 0 || oForm.mnBlockHeight == 0 || oForm.mnChannels == 0 ||
        oForm.mnChannels > UINT16_MAX)
        return nullptr;
    auto poPage = std::make_shared<PageModel>(oPage.moTags.IsBigEndian());
    TagList& oTags = poPage->moTags;
    for (const Tag& oTag : oPage.moTags.GetTags())
        oTags.Set({oTag.mnTag, oTag.mnType, oTag.mnCount, oTag.moBytes, {}});
    for (const int nTag :
         {TIFFTAG_TILEWIDTH, TIFFTAG_TILELENGTH, TIFFTAG_ROWSPERSTRIP, TIFFTAG_PREDICTOR, TIFFTAG_JPEGTABLES})
        oTags.Remove(static_cast<std::uint16_t>(nTag));
    // The meaning of the channels stays the page's own where the codec does not go by it.
    for (const Parameter& oParameter : PARAMETERS)
        if (oParameter.mnTag != TIFFTAG_PHOTOMETRIC &&
            (oParameter.mnTag != TIFFTAG_EXTRASAMPLES || pCodec->mnCode == COMPRESSION_JPEG))
            oTags.Remove(oParameter.mnTag);
    oTags.SetNumber(TIFFTAG_IMAGEWIDTH, TIFF_LONG, oForm.mnWidth);
    oTags.SetNumber(TIFFTAG_IMAGELENGTH, TIFF_LONG, oForm.mnHeight);
    oTags.SetNumber(TIFFTAG_COMPRESSION, TIFF_SHORT, pCodec->mnCode);
    oTags.SetNumber(TIFFTAG_PLANARCONFIG, TIFF_SHORT, oForm.mbSeparate ? PLANARCONFIG_SEPARATE : PLANARCONFIG_CONTIG);
    oTags.SetNumbers(TIFFTAG_BITSPERSAMPLE, TIFF_SHORT,
                     std::vector<std::uint64_t>(oForm.mnChannels, oForm.mnSampleBits));
    if (oForm.mnPredictor != PREDICTOR_NONE)
        oTags.SetNumber(TIFFTAG_PREDICTOR, TIFF_SHORT, oForm.mnPredictor);
    if (oForm.mbWholeBlocks)
    {
        oTags.SetNumber(TIFFTAG_TILEWIDTH, TIFF_LONG, oForm.mnBlockWidth);
        oTags.SetNumber(TIFFTAG_TILELENGTH, TIFF_LONG, oForm.mnBlockHeight);
    }
    else
        oTags.SetNumber(TIFFTAG_ROWSPERSTRIP, TIFF_LONG, oForm.mnBlockHeight);
    for (const auto& [name, numbers] : oForm.moParameters)
    {
        const auto* const pParameter =
            std::find_if(std::begin(PARAMETERS), std::end(PARAMETERS),
                         [&name](const Parameter& oParameter) { return name == oParameter.mpName; });
        if (pParameter == std::end(PARAMETERS) || !SetNumbers(oTags, *pParameter, numbers))
            return nullptr;
    }
    if (!oForm.moTables.empty())
        oTags.Set({TIFFTAG_JPEGTABLES, TIFF_UNDEFINED, oForm.moTables.size(), oForm.moTables, {}});
    return poPage;
}

} // namespace krv::plugins::tif
