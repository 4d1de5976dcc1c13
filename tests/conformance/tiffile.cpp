#include "tests/conformance/tiffile.h"

#include "tests/support/recipe.h"
#include "tools/conformance/referenceimage.h"

#include <tiffio.h>

#include <memory>
#include <stdexcept>

namespace krv::conformance
{

namespace
{

constexpr std::uint32_t METADATA_TAG = 42112;

struct Variant
{
    const char* mpName;
    const char* mpMode;
    bool mbTiles;
    bool mbBands; // a plane for each channel
    std::uint16_t mnCompression;
    bool mbPredictor; // where the codec and the type have one
};

constexpr Variant VARIANTS[] = {
    {"strips, little-endian", "wl", false, false, COMPRESSION_NONE, false},
    {"tiles by band, big-endian", "wb", true, true, COMPRESSION_NONE, false},
    {"tiles, deflate, predictor, BigTIFF", "wl8", true, false, COMPRESSION_ADOBE_DEFLATE, true},
    {"strips by band, deflate, predictor, big-endian", "wb", false, true, COMPRESSION_ADOBE_DEFLATE, true},
    {"strips, LZW, big-endian BigTIFF", "wb8", false, false, COMPRESSION_LZW, false},
    {"tiles by band, LZW, predictor", "wl", true, true, COMPRESSION_LZW, true},
    {"tiles, zstd, predictor", "wl", true, false, COMPRESSION_ZSTD, true},
    {"strips, PackBits", "wl", false, false, COMPRESSION_PACKBITS, false},
};

std::uint16_t SampleFormat(const krv::gobs::DataType& oType)
{
    if (oType.IsComplex())
        return oType.IsReal() ? SAMPLEFORMAT_COMPLEXIEEEFP : SAMPLEFORMAT_COMPLEXINT;
    if (oType.IsReal())
        return SAMPLEFORMAT_IEEEFP;
    return oType.IsSigned() ? SAMPLEFORMAT_INT : SAMPLEFORMAT_UINT;
}

void SetFields(TIFF* pFile, const Variant& oVariant, const krv::gobs::DataType& oType, unsigned int nWidth,
               unsigned int nHeight, unsigned int nChannels)
{
    TIFFSetField(pFile, TIFFTAG_IMAGEWIDTH, nWidth);
    TIFFSetField(pFile, TIFFTAG_IMAGELENGTH, nHeight);
    TIFFSetField(pFile, TIFFTAG_SAMPLESPERPIXEL, nChannels);
    TIFFSetField(pFile, TIFFTAG_BITSPERSAMPLE, static_cast<int>(oType.GetValueBits()));
    TIFFSetField(pFile, TIFFTAG_SAMPLEFORMAT, SampleFormat(oType));
    TIFFSetField(pFile, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
    TIFFSetField(pFile, TIFFTAG_PLANARCONFIG, oVariant.mbBands ? PLANARCONFIG_SEPARATE : PLANARCONFIG_CONTIG);
    TIFFSetField(pFile, TIFFTAG_COMPRESSION, oVariant.mnCompression);
    const std::vector<std::uint16_t> oExtra(nChannels - 1, EXTRASAMPLE_UNSPECIFIED);
    if (!oExtra.empty())
        TIFFSetField(pFile, TIFFTAG_EXTRASAMPLES, static_cast<int>(oExtra.size()), oExtra.data());
    // The library writes the floating-point predictor wrongly in the other byte order: it does not read it back.
    const bool bOtherOrder = oVariant.mpMode[1] == 'b';
    if (oVariant.mbPredictor && !oType.IsComplex() && !(oType.IsReal() && bOtherOrder))
        TIFFSetField(pFile, TIFFTAG_PREDICTOR, oType.IsReal() ? PREDICTOR_FLOATINGPOINT : PREDICTOR_HORIZONTAL);
    if (oVariant.mbTiles)
    {
        TIFFSetField(pFile, TIFFTAG_TILEWIDTH, 64);
        TIFFSetField(pFile, TIFFTAG_TILELENGTH, 48);
    }
    else
        TIFFSetField(pFile, TIFFTAG_ROWSPERSTRIP, 17);
}

// All blocks of a plane, one after the other; those of tiles are filled up with zeros.
void WritePlane(TIFF* pFile, const ReferenceImage& oImage, bool bTiles, unsigned int& nBlock)
{
    const unsigned int nBlockWidth = bTiles ? 64 : oImage.mnWidth;
    const unsigned int nBlockHeight = bTiles ? 48 : 17;
    for (unsigned int nY = 0; nY < oImage.mnHeight; nY += nBlockHeight)
    {
        for (unsigned int nX = 0; nX < oImage.mnWidth; nX += nBlockWidth)
        {
            const unsigned int nRows = bTiles ? nBlockHeight : std::min(nBlockHeight, oImage.mnHeight - nY);
            std::string block(oImage.mnPixelBytes * nBlockWidth * nRows, '\0');
            block = oImage.Part(std::move(block), nX, nY, nBlockWidth, nRows, 0, 0, nBlockWidth, nRows);
            const auto nBytes = static_cast<tmsize_t>(block.size());
            const tmsize_t nWritten = bTiles ? TIFFWriteEncodedTile(pFile, nBlock, block.data(), nBytes)
                                             : TIFFWriteEncodedStrip(pFile, nBlock, block.data(), nBytes);
            if (nWritten != nBytes)
                throw std::runtime_error("the TIFF library cannot write a block");
            ++nBlock;
        }
    }
}

void WritePage(TIFF* pFile, const Image& oImage, unsigned int nLevel)
{
    const Variant& oVariant = VARIANTS[oImage.mnVariant];
    const krv::gobs::DataType& oType = oImage.moTypes.at(0);
    const unsigned int nWidth = (oImage.mnWidth + nLevel - 1) / nLevel;
    const unsigned int nHeight = (oImage.mnHeight + nLevel - 1) / nLevel;
    SetFields(pFile, oVariant, oType, nWidth, nHeight, static_cast<unsigned int>(oImage.moTypes.size()));
    if (nLevel > 1)
        TIFFSetField(pFile, TIFFTAG_SUBFILETYPE, FILETYPE_REDUCEDIMAGE);
    if (nLevel == 1 && !oImage.moTags.empty())
    {
        std::string xml = "<GDALMetadata>";
        for (const auto& [key, value] : oImage.moTags)
            xml += "<Item name=\"" + key + "\">" + value + "</Item>";
        TIFFSetField(pFile, METADATA_TAG, (xml + "</GDALMetadata>").c_str());
    }
    std::vector<std::vector<unsigned int>> oPlanes(1);
    for (unsigned int nChannel = 1; nChannel <= oImage.moTypes.size(); ++nChannel)
    {
        if (oVariant.mbBands && nChannel > 1)
            oPlanes.emplace_back();
        oPlanes.back().push_back(nLevel == 1 ? nChannel : nChannel + 1000 * nLevel);
    }
    unsigned int nBlock = 0;
    for (const auto& oChannels : oPlanes)
        WritePlane(pFile,
                   {nWidth, nHeight, oType.GetValueBits() / 8 * oChannels.size(),
                    krv::test::RecipeImage(nWidth, nHeight, oChannels, oType)},
                   oVariant.mbTiles, nBlock);
    if (TIFFWriteDirectory(pFile) == 0)
        throw std::runtime_error("the TIFF library cannot write a directory");
}

} // namespace

void WriteTifFile(const std::string& fileName, const Image& oImage)
{
    static const TIFFFieldInfo METADATA = {METADATA_TAG, -1, -1, TIFF_ASCII,
                                           FIELD_CUSTOM, 1,  0,  const_cast<char*>("tags")};
    const std::unique_ptr<TIFF, decltype(&TIFFClose)> oFile(
        TIFFOpen(fileName.c_str(), VARIANTS[oImage.mnVariant].mpMode), &TIFFClose);
    if (oFile == nullptr)
        throw std::runtime_error("cannot write " + fileName);
    TIFFMergeFieldInfo(oFile.get(), &METADATA, 1);
    WritePage(oFile.get(), oImage, 1);
    for (const unsigned int nLevel : oImage.moLevels)
        WritePage(oFile.get(), oImage, nLevel);
}

std::vector<const char*> TifVariants()
{
    std::vector<const char*> oNames;
    for (const Variant& oVariant : VARIANTS)
        oNames.push_back(oVariant.mpName);
    return oNames;
}

} // namespace krv::conformance
