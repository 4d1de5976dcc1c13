#include "plugins/tif/writing/librarycodec.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <memory>

#include <tiffio.h>

namespace krv::plugins::tif
{

namespace
{

// A file in memory that libtiff writes a single strip or tile into. No exception may pass through libtiff.
struct Memory
{
    std::vector<unsigned char> moBytes;
    std::uint64_t mnPosition = 0;
    char moMessage[512] = {};

    static Memory& From(thandle_t pClient) { return *static_cast<Memory*>(pClient); }

    static tmsize_t Read(thandle_t pClient, void* pTarget, tmsize_t nBytes) noexcept
    {
        Memory& oMemory = From(pClient);
        const std::uint64_t nLeft =
            oMemory.moBytes.size() - std::min<std::uint64_t>(oMemory.mnPosition, oMemory.moBytes.size());
        const auto nRead = static_cast<std::size_t>(std::min<std::uint64_t>(nLeft, static_cast<std::uint64_t>(nBytes)));
        std::memcpy(pTarget, oMemory.moBytes.data() + oMemory.mnPosition, nRead);
        oMemory.mnPosition += nRead;
        return static_cast<tmsize_t>(nRead);
    }

    static tmsize_t Write(thandle_t pClient, void* pSource, tmsize_t nBytes) noexcept
    {
        Memory& oMemory = From(pClient);
        try
        {
            const auto nSize = static_cast<std::size_t>(nBytes);
            oMemory.moBytes.resize(std::max<std::size_t>(oMemory.moBytes.size(), oMemory.mnPosition + nSize));
            std::memcpy(oMemory.moBytes.data() + oMemory.mnPosition, pSource, nSize);
            oMemory.mnPosition += nSize;
            return nBytes;
        }
        catch (const std::exception&)
        {
            return -1;
        }
    }

    static toff_t Seek(thandle_t pClient, toff_t nOffset, int nWhence) noexcept
    {
        Memory& oMemory = From(pClient);
        const std::uint64_t nBase = nWhence == SEEK_CUR   ? oMemory.mnPosition
                                    : nWhence == SEEK_END ? oMemory.moBytes.size()
                                                          : 0;
        return oMemory.mnPosition = nBase + nOffset;
    }

    static int Close(thandle_t) noexcept { return 0; }
    static toff_t Size(thandle_t pClient) noexcept { return From(pClient).moBytes.size(); }
    static int OnError(TIFF*, void* pClient, const char*, const char* pFormat, va_list oArguments) noexcept
    {
        std::vsnprintf(From(pClient).moMessage, sizeof(moMessage), pFormat, oArguments);
        return 1;
    }
    static int OnWarning(TIFF*, void*, const char*, const char*, va_list) noexcept { return 1; }
};

using Handle = std::unique_ptr<TIFF, void (*)(TIFF*)>;

Handle Open(Memory& oMemory, bool bBigEndian)
{
    const std::unique_ptr<TIFFOpenOptions, void (*)(TIFFOpenOptions*)> poOptions(TIFFOpenOptionsAlloc(),
                                                                                 &TIFFOpenOptionsFree);
    if (!poOptions)
        throw std::bad_alloc();
    TIFFOpenOptionsSetErrorHandlerExtR(poOptions.get(), &Memory::OnError, &oMemory);
    TIFFOpenOptionsSetWarningHandlerExtR(poOptions.get(), &Memory::OnWarning, &oMemory);
    return {TIFFClientOpenExt("memory", bBigEndian ? "wb" : "wl", &oMemory, &Memory::Read, &Memory::Write,
                              &Memory::Seek, &Memory::Close, &Memory::Size, nullptr, nullptr, poOptions.get()),
            &TIFFClose};
}

// From 6 on presets differ in the size of their dictionary alone, which takes eleven times its size in memory: one
// larger than the block is of no use.
int ChoosePreset(std::optional<int> oLevel, std::uint64_t nBytes)
{
    constexpr int USUAL = 6;
    constexpr std::uint64_t USUAL_BYTES = std::uint64_t{8} << 20;
    int nEnough = USUAL;
    while (nEnough < 9 && nBytes > USUAL_BYTES << (nEnough - USUAL))
        ++nEnough;
    return std::min(oLevel.value_or(USUAL), nEnough);
}

void Describe(TIFF* poTiff, const PageForm& oForm, std::uint32_t nRows, std::optional<int> oLevel)
{
    TIFFSetField(poTiff, TIFFTAG_IMAGEWIDTH, oForm.mnStrileWidth);
    TIFFSetField(poTiff, TIFFTAG_IMAGELENGTH, nRows);
    TIFFSetField(poTiff, TIFFTAG_SAMPLESPERPIXEL, static_cast<int>(oForm.GetPlaneChannels()));
    TIFFSetField(poTiff, TIFFTAG_BITSPERSAMPLE, static_cast<int>(oForm.moSample.GetBits()));
    TIFFSetField(poTiff, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG);
    TIFFSetField(poTiff, TIFFTAG_COMPRESSION, static_cast<int>(oForm.mnCompression));
    TIFFSetField(poTiff, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_MINISBLACK);
    if (oForm.mbTiled)
    {
        TIFFSetField(poTiff, TIFFTAG_TILEWIDTH, oForm.mnStrileWidth);
        TIFFSetField(poTiff, TIFFTAG_TILELENGTH, nRows);
    }
    else
        TIFFSetField(poTiff, TIFFTAG_ROWSPERSTRIP, nRows);
    if (oForm.mnPredictor != PREDICTOR_NONE)
        TIFFSetField(poTiff, TIFFTAG_PREDICTOR, static_cast<int>(oForm.mnPredictor));
    // After the bits: by both libtiff knows which bytes of a sample are to be turned round.
    const bool bReal = oForm.moSample.moNativeType.IsReal();
    if (oForm.moSample.mnParts == 2)
        TIFFSetField(poTiff, TIFFTAG_SAMPLEFORMAT, bReal ? SAMPLEFORMAT_COMPLEXIEEEFP : SAMPLEFORMAT_COMPLEXINT);
    else if (bReal)
        TIFFSetField(poTiff, TIFFTAG_SAMPLEFORMAT, SAMPLEFORMAT_IEEEFP);
    if (oForm.mnCompression == COMPRESSION_LZMA)
        TIFFSetField(poTiff, TIFFTAG_LZMAPRESET,
                     ChoosePreset(oLevel, oForm.GetStoredRowBytes(oForm.mnStrileWidth) * nRows));
}

} // namespace

std::vector<unsigned char> EncodeByLibrary(const PageForm& oForm, std::optional<int> oLevel,
                                           const unsigned char* pStored, std::size_t nBytes, std::uint32_t nRows,
                                           const std::string& fileName)
{
    Memory oMemory;
    const Handle poTiff = Open(oMemory, oForm.mbBigEndian);
    if (!poTiff)
        throw IOException(fileName, fileName + ": encoding failed: " + oMemory.moMessage);
    Describe(poTiff.get(), oForm, nRows, oLevel);
    // libtiff works in the memory that it is given.
    std::vector<unsigned char> oRows(pStored, pStored + nBytes);
    const auto nSize = static_cast<tmsize_t>(nBytes);
    const tmsize_t nDone = oForm.mbTiled ? TIFFWriteEncodedTile(poTiff.get(), 0, oRows.data(), nSize)
                                         : TIFFWriteEncodedStrip(poTiff.get(), 0, oRows.data(), nSize);
    if (nDone < 0 || TIFFFlushData(poTiff.get()) != 1)
        throw IOException(fileName, fileName + ": encoding failed: " + oMemory.moMessage);
    const std::uint64_t nOffset = TIFFGetStrileOffset(poTiff.get(), 0);
    const std::uint64_t nCoded = TIFFGetStrileByteCount(poTiff.get(), 0);
    if (nCoded == 0 || nOffset + nCoded > oMemory.moBytes.size())
        throw IOException(fileName, fileName + ": encoding failed");
    const auto oBegin = oMemory.moBytes.begin() + static_cast<std::ptrdiff_t>(nOffset);
    return {oBegin, oBegin + static_cast<std::ptrdiff_t>(nCoded)};
}

} // namespace krv::plugins::tif
