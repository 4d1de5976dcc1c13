#include "plugins/jp2/reading/decoder.h"

#include "plugins/jp2/reading/messages.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cstring>
#include <exception>

namespace krv::plugins::jp2
{

namespace
{

// Headers go through it, data of tiles pass it by.
constexpr OPJ_SIZE_T STREAM_BUFFER = 16384;

// The pieces as one stream. No exception passes through OpenJPEG: it is kept and thrown afterwards.
class PieceStream
{
public:
    PieceStream(support::File& oFile, const std::vector<Codestream::Piece>& oPieces) : moFile(oFile), moPieces(oPieces)
    {
        for (const Codestream::Piece& oPiece : moPieces)
        {
            moBegins.push_back(mnBytes);
            mnBytes += GetBytes(oPiece);
        }
        mpoStream.reset(opj_stream_create(STREAM_BUFFER, OPJ_TRUE));
        if (!mpoStream)
            throw std::bad_alloc();
        opj_stream_set_user_data(mpoStream.get(), this, nullptr);
        opj_stream_set_user_data_length(mpoStream.get(), mnBytes);
        opj_stream_set_read_function(mpoStream.get(), &Read);
        opj_stream_set_skip_function(mpoStream.get(), &Skip);
        opj_stream_set_seek_function(mpoStream.get(), &Seek);
    }

    opj_stream_t* Get() { return mpoStream.get(); }

    void Rethrow() const
    {
        if (mpoException)
            std::rethrow_exception(mpoException);
    }

private:
    struct StreamDeleter
    {
        void operator()(opj_stream_t* pStream) const { opj_stream_destroy(pStream); }
    };

    static std::uint64_t GetBytes(const Codestream::Piece& oPiece)
    {
        return oPiece.moBytes.empty() ? oPiece.mnBytes : oPiece.moBytes.size();
    }

    static OPJ_SIZE_T Read(void* pTarget, OPJ_SIZE_T nBytes, void* pThis) noexcept
    {
        auto& oThis = *static_cast<PieceStream*>(pThis);
        try
        {
            return oThis.ReadPieces(static_cast<unsigned char*>(pTarget), nBytes);
        }
        catch (...)
        {
            oThis.mpoException = std::current_exception();
        }
        return static_cast<OPJ_SIZE_T>(-1);
    }

    static OPJ_OFF_T Skip(OPJ_OFF_T nBytes, void* pThis) noexcept
    {
        auto& oThis = *static_cast<PieceStream*>(pThis);
        const auto nPosition = static_cast<OPJ_OFF_T>(oThis.mnPosition);
        return Seek(nPosition + nBytes, pThis) != 0 ? nBytes : -1;
    }

    static OPJ_BOOL Seek(OPJ_OFF_T nPosition, void* pThis) noexcept
    {
        auto& oThis = *static_cast<PieceStream*>(pThis);
        if (nPosition < 0 || static_cast<std::uint64_t>(nPosition) > oThis.mnBytes)
            return OPJ_FALSE;
        oThis.mnPosition = static_cast<std::uint64_t>(nPosition);
        return OPJ_TRUE;
    }

    OPJ_SIZE_T ReadPieces(unsigned char* pTarget, std::size_t nBytes)
    {
        std::size_t nDone = 0;
        while (nDone < nBytes && mnPosition < mnBytes)
        {
            const auto oNext = std::upper_bound(moBegins.begin(), moBegins.end(), mnPosition);
            const auto nPiece = static_cast<std::size_t>(oNext - moBegins.begin()) - 1;
            const Codestream::Piece& oPiece = moPieces[nPiece];
            const std::uint64_t nAt = mnPosition - moBegins[nPiece];
            const auto nCount =
                static_cast<std::size_t>(std::min<std::uint64_t>(nBytes - nDone, GetBytes(oPiece) - nAt));
            if (oPiece.moBytes.empty())
                moFile.Read(oPiece.mnOffset + nAt, pTarget + nDone, nCount);
            else
                std::memcpy(pTarget + nDone, oPiece.moBytes.data() + nAt, nCount);
            nDone += nCount;
            mnPosition += nCount;
        }
        return nDone == 0 ? static_cast<OPJ_SIZE_T>(-1) : nDone;
    }

    support::File& moFile;
    const std::vector<Codestream::Piece>& moPieces;
    std::vector<std::uint64_t> moBegins;
    std::uint64_t mnBytes = 0;
    std::uint64_t mnPosition = 0;
    std::exception_ptr mpoException;
    std::unique_ptr<opj_stream_t, StreamDeleter> mpoStream;
};

struct CodecDeleter
{
    void operator()(opj_codec_t* pCodec) const { opj_destroy_codec(pCodec); }
};

} // namespace

ImagePtr Decode(support::File& oFile, const std::vector<Codestream::Piece>& oPieces, const DecodeRequest& oRequest,
                const std::string& what)
{
    PieceStream oStream(oFile, oPieces);
    const std::unique_ptr<opj_codec_t, CodecDeleter> poCodec(opj_create_decompress(OPJ_CODEC_J2K));
    if (!poCodec)
        throw std::bad_alloc();
    Messages oMessages;
    oMessages.Watch(poCodec.get());
    opj_dparameters_t oParameters;
    opj_set_default_decoder_parameters(&oParameters);
    oParameters.cp_reduce = oRequest.mnReduce;

    ImagePtr poImage;
    const auto Run = [&]
    {
        if (opj_setup_decoder(poCodec.get(), &oParameters) == OPJ_FALSE)
            return false;
        opj_image_t* pImage = nullptr;
        const bool bHeader = opj_read_header(oStream.Get(), poCodec.get(), &pImage) != OPJ_FALSE;
        poImage.reset(pImage);
        if (!bHeader)
            return false;
        const auto nComponents = static_cast<OPJ_UINT32>(oRequest.moComponents.size());
        if (nComponents > 0 && opj_set_decoded_components(poCodec.get(), nComponents, oRequest.moComponents.data(),
                                                          OPJ_FALSE) == OPJ_FALSE)
            return false;
        if (oRequest.moArea)
        {
            const GridRect& oArea = *oRequest.moArea;
            if (opj_set_decode_area(poCodec.get(), pImage, static_cast<OPJ_INT32>(oArea.mnX0),
                                    static_cast<OPJ_INT32>(oArea.mnY0), static_cast<OPJ_INT32>(oArea.mnX1),
                                    static_cast<OPJ_INT32>(oArea.mnY1)) == OPJ_FALSE)
                return false;
        }
        return opj_decode(poCodec.get(), oStream.Get(), pImage) != OPJ_FALSE;
    };
    const bool bDone = Run();
    oStream.Rethrow();
    if (!bDone || oMessages.HasError())
        throw krv::FileFormatException(oFile.GetName(),
                                       oFile.GetName() + ": " + what + " cannot be decoded: " + oMessages.Get());
    return poImage;
}

} // namespace krv::plugins::jp2
