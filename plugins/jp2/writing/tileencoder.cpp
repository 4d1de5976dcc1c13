#include "plugins/jp2/writing/tileencoder.h"

#include "plugins/jp2/reading/messages.h"
#include "plugins/support/file/numbers.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <bit>
#include <cstring>
#include <memory>
#include <new>

#include <openjpeg.h>

namespace krv::plugins::jp2
{

namespace
{

constexpr OPJ_SIZE_T STREAM_BUFFER = std::size_t{1} << 20;
constexpr std::uint32_t USUAL_SMALLEST = 256; // the largest side of the smallest level
constexpr unsigned int USUAL_LEVELS = 5;

struct ImageDeleter
{
    void operator()(opj_image_t* pImage) const { opj_image_destroy(pImage); }
};

struct CodecDeleter
{
    void operator()(opj_codec_t* pCodec) const { opj_destroy_codec(pCodec); }
};

struct StreamDeleter
{
    void operator()(opj_stream_t* pStream) const { opj_stream_destroy(pStream); }
};

// What is written goes to memory. No exception passes through OpenJPEG: it is told that writing failed.
struct Memory
{
    std::vector<unsigned char> moBytes;
    std::size_t mnAt = 0;

    static OPJ_SIZE_T Write(void* pSource, OPJ_SIZE_T nBytes, void* pThis) noexcept
    {
        auto& oThis = *static_cast<Memory*>(pThis);
        try
        {
            oThis.moBytes.resize(std::max(oThis.moBytes.size(), oThis.mnAt + nBytes));
        }
        catch (...)
        {
            return static_cast<OPJ_SIZE_T>(-1);
        }
        std::memcpy(oThis.moBytes.data() + oThis.mnAt, pSource, nBytes);
        oThis.mnAt += nBytes;
        return nBytes;
    }

    static OPJ_OFF_T Skip(OPJ_OFF_T nBytes, void* pThis) noexcept
    {
        static_cast<Memory*>(pThis)->mnAt += static_cast<std::size_t>(nBytes);
        return nBytes;
    }

    static OPJ_BOOL Seek(OPJ_OFF_T nAt, void* pThis) noexcept
    {
        static_cast<Memory*>(pThis)->mnAt = static_cast<std::size_t>(nAt);
        return OPJ_TRUE;
    }
};

template <typename T>
void TakeSamples(const support::PixelRect& oTile, const unsigned char* pPixels, std::size_t nPitch, OPJ_INT32 nMinimum,
                 OPJ_INT32 nMaximum, opj_image_t& oImage)
{
    for (OPJ_UINT32 nChannel = 0; nChannel < oImage.numcomps; ++nChannel)
        for (std::uint32_t nRow = 0; nRow < oTile.mnHeight; ++nRow)
        {
            const T* pSource = reinterpret_cast<const T*>(pPixels + nRow * nPitch) + nChannel;
            OPJ_INT32* pTarget = oImage.comps[nChannel].data + std::size_t{nRow} * oTile.mnWidth;
            for (std::uint32_t nAt = 0; nAt < oTile.mnWidth; ++nAt)
                pTarget[nAt] = std::clamp<OPJ_INT32>(pSource[std::size_t{nAt} * oImage.numcomps], nMinimum, nMaximum);
        }
}

// Values beyond the bits that are stored become the nearest that fit.
void TakeSamples(const support::PixelRect& oTile, const unsigned char* pPixels, std::size_t nPitch,
                 const ImageForm& oForm, opj_image_t& oImage)
{
    const bool bSigned = oForm.moType.IsSigned();
    const OPJ_INT32 nMaximum = (1 << (oForm.mnBits - (bSigned ? 1 : 0))) - 1;
    const OPJ_INT32 nMinimum = bSigned ? -nMaximum - 1 : 0;
    if (oForm.moType.GetBits() == 8 && bSigned)
        TakeSamples<std::int8_t>(oTile, pPixels, nPitch, nMinimum, nMaximum, oImage);
    else if (oForm.moType.GetBits() == 8)
        TakeSamples<std::uint8_t>(oTile, pPixels, nPitch, nMinimum, nMaximum, oImage);
    else if (bSigned)
        TakeSamples<std::int16_t>(oTile, pPixels, nPitch, nMinimum, nMaximum, oImage);
    else
        TakeSamples<std::uint16_t>(oTile, pPixels, nPitch, nMinimum, nMaximum, oImage);
}

// Where the first tile begins; 0 when there is none.
std::size_t FindTile(const std::vector<unsigned char>& oBytes)
{
    constexpr std::uint64_t SOT = 0xFF90;
    std::size_t nAt = 2;
    while (nAt + 4 <= oBytes.size() && support::ReadNumber(oBytes.data() + nAt, 2, true) != SOT)
        nAt += 2 + static_cast<std::size_t>(support::ReadNumber(oBytes.data() + nAt + 2, 2, true));
    return nAt + 4 <= oBytes.size() ? nAt : 0;
}

} // namespace

TileEncoder::TileEncoder(std::string fileName, const CreateOptions& oOptions, const ImageForm& oForm)
    : moFileName(std::move(fileName)), moOptions(oOptions), moForm(oForm)
{
    moOptions.mnTileWidth = std::min(moOptions.mnTileWidth, moForm.mnWidth);
    moOptions.mnTileHeight = std::min(moOptions.mnTileHeight, moForm.mnHeight);
    const bool bColours = moForm.moType == krv::gobs::DataType(krv::gobs::eDT_8U) && moForm.mnChannels >= 3;
    mbColourTransform =
        moForm.mnChannels >= 3 && moOptions.moColourTransform.value_or(bColours && moForm.mnChannels <= 4);
    mnLevels = ChooseLevels();
}

unsigned int TileEncoder::ChooseLevels() const
{
    const std::uint32_t nSmallest = std::min(moOptions.mnTileWidth, moOptions.mnTileHeight);
    const auto nMost = static_cast<unsigned int>(std::bit_width(nSmallest)) - 1;
    if (moOptions.moLevels)
        return *moOptions.moLevels;
    const std::uint32_t nLargest = std::max(moForm.mnWidth, moForm.mnHeight);
    const auto nWanted = static_cast<unsigned int>(std::bit_width((nLargest - 1) / USUAL_SMALLEST));
    return std::min(nMost, std::max(nWanted, USUAL_LEVELS));
}

EncodedTile TileEncoder::Encode(const support::PixelRect& oTile, const unsigned char* pPixels, std::size_t nPitch) const
{
    std::vector<opj_image_cmptparm_t> oComponents(moForm.mnChannels);
    for (opj_image_cmptparm_t& oOne : oComponents)
    {
        std::memset(&oOne, 0, sizeof(oOne));
        oOne.dx = oOne.dy = 1;
        oOne.w = oTile.mnWidth;
        oOne.h = oTile.mnHeight;
        oOne.x0 = oTile.mnX;
        oOne.y0 = oTile.mnY;
        oOne.prec = moForm.mnBits;
        oOne.sgnd = moForm.moType.IsSigned() ? 1 : 0;
    }
    const std::unique_ptr<opj_image_t, ImageDeleter> poImage(
        opj_image_create(moForm.mnChannels, oComponents.data(), mbColourTransform ? OPJ_CLRSPC_SRGB : OPJ_CLRSPC_GRAY));
    if (!poImage)
        throw std::bad_alloc();
    poImage->x0 = oTile.mnX;
    poImage->y0 = oTile.mnY;
    poImage->x1 = oTile.mnX + oTile.mnWidth;
    poImage->y1 = oTile.mnY + oTile.mnHeight;
    TakeSamples(oTile, pPixels, nPitch, moForm, *poImage);

    opj_cparameters_t oParameters;
    opj_set_default_encoder_parameters(&oParameters);
    oParameters.tile_size_on = OPJ_TRUE;
    oParameters.cp_tx0 = static_cast<int>(oTile.mnX);
    oParameters.cp_ty0 = static_cast<int>(oTile.mnY);
    oParameters.cp_tdx = static_cast<int>(moOptions.mnTileWidth);
    oParameters.cp_tdy = static_cast<int>(moOptions.mnTileHeight);
    oParameters.numresolution = static_cast<int>(mnLevels) + 1;
    oParameters.prog_order = static_cast<OPJ_PROG_ORDER>(moOptions.mnProgression);
    oParameters.tcp_mct = mbColourTransform ? 1 : 0;
    oParameters.irreversible = moOptions.IsLossless() ? 0 : 1;
    oParameters.tcp_numlayers = 1;
    oParameters.cp_disto_alloc = moOptions.moQuality ? 0 : 1;
    oParameters.cp_fixed_quality = moOptions.moQuality ? OPJ_TRUE : OPJ_FALSE;
    oParameters.tcp_rates[0] = static_cast<float>(moOptions.moRatio.value_or(0));
    oParameters.tcp_distoratio[0] = static_cast<float>(moOptions.moQuality.value_or(0));

    Memory oMemory;
    Messages oMessages;
    const std::unique_ptr<opj_codec_t, CodecDeleter> poCodec(opj_create_compress(OPJ_CODEC_J2K));
    const std::unique_ptr<opj_stream_t, StreamDeleter> poStream(opj_stream_create(STREAM_BUFFER, OPJ_FALSE));
    if (!poCodec || !poStream)
        throw std::bad_alloc();
    oMessages.Watch(poCodec.get());
    opj_stream_set_user_data(poStream.get(), &oMemory, nullptr);
    opj_stream_set_write_function(poStream.get(), &Memory::Write);
    opj_stream_set_skip_function(poStream.get(), &Memory::Skip);
    opj_stream_set_seek_function(poStream.get(), &Memory::Seek);
    const bool bDone = opj_setup_encoder(poCodec.get(), &oParameters, poImage.get()) != OPJ_FALSE &&
                       opj_start_compress(poCodec.get(), poImage.get(), poStream.get()) != OPJ_FALSE &&
                       opj_encode(poCodec.get(), poStream.get()) != OPJ_FALSE &&
                       opj_end_compress(poCodec.get(), poStream.get()) != OPJ_FALSE;
    EncodedTile oEncoded;
    oEncoded.mnHeaderBytes = bDone ? FindTile(oMemory.moBytes) : 0;
    if (oEncoded.mnHeaderBytes == 0 || oMemory.moBytes.size() < oEncoded.mnHeaderBytes + END_BYTES)
        throw krv::IOException(moFileName, moFileName + ": a tile cannot be encoded: " + oMessages.Get());
    oEncoded.moBytes = std::move(oMemory.moBytes);
    return oEncoded;
}

} // namespace krv::plugins::jp2
