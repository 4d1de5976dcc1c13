#include "plugins/tif/reading/tiffhandle.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/debugger.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <string_view>

namespace krv::plugins::tif
{

// What libtiff's calls back stand on. No exception may pass through libtiff: messages have a place of fixed size.
struct TiffHandle::Client
{
    PeekReader& moReader;
    std::size_t mnHeaderBytes;
    unsigned char moHeader[FileHeader::BYTES] = {};
    std::uint64_t mnPosition = 0;
    char moLastCause[512] = {}; // of the reader below libtiff
    bool mbUnknownKind = false;
    bool mbLostData = false;

    Client(PeekReader& oReader, const FileHeader& oHeader, std::uint64_t nDirectory)
        : moReader(oReader), mnHeaderBytes(oHeader.GetBytes())
    {
        oHeader.Write(moHeader, nDirectory);
    }

    static Client& From(thandle_t pClient) { return *static_cast<Client*>(pClient); }

    static tmsize_t Write(thandle_t, void*, tmsize_t) noexcept { return -1; }
    static int Close(thandle_t) noexcept { return 0; }
    static toff_t Size(thandle_t pClient) noexcept { return From(pClient).moReader.GetFile().GetSize(); }
    static int Map(thandle_t, void**, toff_t*) noexcept { return 0; }
    static void Unmap(thandle_t, void*, toff_t) noexcept {}

    static tmsize_t Read(thandle_t pClient, void* pTarget, tmsize_t nBytes) noexcept
    {
        Client& oClient = From(pClient);
        try
        {
            auto* pBytes = static_cast<unsigned char*>(pTarget);
            std::size_t nLeft = static_cast<std::size_t>(std::max<tmsize_t>(nBytes, 0));
            const std::uint64_t nBegin = oClient.mnPosition;
            if (nBegin < oClient.mnHeaderBytes)
            {
                const auto nCopy = std::min<std::size_t>(nLeft, oClient.mnHeaderBytes - nBegin);
                std::memcpy(pBytes, oClient.moHeader + nBegin, nCopy);
                pBytes += nCopy;
                nLeft -= nCopy;
                oClient.mnPosition += nCopy;
            }
            if (nLeft > 0)
                oClient.mnPosition += oClient.moReader.Read(oClient.mnPosition, pBytes, nLeft);
            return static_cast<tmsize_t>(oClient.mnPosition - nBegin);
        }
        catch (const std::exception& oException)
        {
            if (oClient.moLastCause[0] == '\0')
                std::snprintf(oClient.moLastCause, sizeof(oClient.moLastCause), "%s", oException.what());
        }
        return -1;
    }

    static toff_t Seek(thandle_t pClient, toff_t nOffset, int nWhence) noexcept
    {
        Client& oClient = From(pClient);
        std::uint64_t nBase = 0;
        if (nWhence == SEEK_CUR)
            nBase = oClient.mnPosition;
        else if (nWhence == SEEK_END)
            nBase = Size(pClient);
        oClient.mnPosition = nBase + nOffset;
        return oClient.mnPosition;
    }

    void Note(const char* pText, bool bWarning) noexcept
    {
        const std::string_view text = pText;
        // Bytes that some writers pad a stream with; the decoder passes over them.
        if (bWarning && text.find("extraneous bytes before marker") != std::string_view::npos)
            return;
        mbLostData = true;
        for (const char* pWords : {"not supported", "nsupported", "not configured", "mplemented"})
            mbUnknownKind |= text.find(pWords) != std::string_view::npos;
        try
        {
            if (krv::nspio::Debugger::GetLevel() != 0)
                krv::nspio::Debugger::Debug(1, "libtiff", moReader.GetFile().GetName() + ": " + pText,
                                            "plugins/tif/reading/tiffhandle", __LINE__);
        }
        catch (...)
        {
            // No exception may pass through libtiff.
        }
    }

    static int OnError(TIFF*, void* pClient, const char*, const char* pFormat, va_list oArguments) noexcept
    {
        char aText[512];
        std::vsnprintf(aText, sizeof(aText), pFormat, oArguments);
        static_cast<Client*>(pClient)->Note(aText, false);
        return 1;
    }

    // Fax and JPEG go on after data that end early or make no sense, with pixels of their own, and only warn.
    static int OnWarning(TIFF*, void* pClient, const char* pModule, const char* pFormat, va_list oArguments) noexcept
    {
        const std::string_view module = pModule != nullptr ? pModule : "";
        if (!module.starts_with("Fax") && !module.starts_with("JPEG"))
            return 1;
        char aText[512];
        std::vsnprintf(aText, sizeof(aText), pFormat, oArguments);
        static_cast<Client*>(pClient)->Note(aText, true);
        return 1;
    }
};

void TiffHandle::Forget()
{
    mpoClient->moLastCause[0] = '\0';
    mpoClient->mbUnknownKind = false;
    mpoClient->mbLostData = false;
}

TiffHandle::TiffHandle(PeekReader& oReader, const FileHeader& oHeader, std::uint64_t nDirectory)
    : mpoClient(std::make_unique<Client>(oReader, oHeader, nDirectory))
{
    const std::string& fileName = oReader.GetFile().GetName();
    const std::unique_ptr<TIFFOpenOptions, void (*)(TIFFOpenOptions*)> poOptions(TIFFOpenOptionsAlloc(),
                                                                                 &TIFFOpenOptionsFree);
    if (!poOptions)
        throw std::bad_alloc();
    TIFFOpenOptionsSetMaxSingleMemAlloc(poOptions.get(), MAXIMUM_ALLOCATION);
    TIFFOpenOptionsSetErrorHandlerExtR(poOptions.get(), &Client::OnError, mpoClient.get());
    TIFFOpenOptionsSetWarningHandlerExtR(poOptions.get(), &Client::OnWarning, mpoClient.get());
    mpoTiff =
        TIFFClientOpenExt(fileName.c_str(), "rmcDO", mpoClient.get(), &Client::Read, &Client::Write, &Client::Seek,
                          &Client::Close, &Client::Size, &Client::Map, &Client::Unmap, poOptions.get());
    if (mpoTiff == nullptr)
    {
        const TiffTrouble oTrouble = TakeTrouble();
        ThrowDamaged(fileName, oTrouble.moCause.empty() ? "its directory makes no sense" : oTrouble.moCause,
                     Place::Current());
    }
    Forget();
}

TiffHandle::~TiffHandle()
{
    if (mpoTiff != nullptr)
        TIFFClose(mpoTiff);
}

TiffTrouble TiffHandle::TakeTrouble()
{
    const TiffTrouble oTrouble{mpoClient->moLastCause, mpoClient->mbUnknownKind, mpoClient->mbLostData};
    Forget();
    return oTrouble;
}

} // namespace krv::plugins::tif
