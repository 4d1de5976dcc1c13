#include "plugins/tif/reading/compression.h"

#include <algorithm>

#include <tiffio.h>

namespace krv::plugins::tif
{

namespace
{

Compression Own(std::uint16_t nCode, std::string_view name, bool bPredictor)
{
    const codec::BlockCodec* const pCodec = codec::FindBlockCodec(name);
    return {nCode, name, false, bPredictor, true, pCodec->mnMaximumLevel, pCodec};
}

template <typename Test>
const Compression* Find(Test oTest)
{
    const std::span<const Compression> oAll = GetCompressions();
    const auto oFound = std::find_if(oAll.begin(), oAll.end(), oTest);
    return oFound == oAll.end() ? nullptr : &*oFound;
}

} // namespace

std::span<const Compression> GetCompressions()
{
    static const Compression COMPRESSIONS[] = {
        {COMPRESSION_NONE, "NONE", false, false, true, 0, nullptr},
        Own(COMPRESSION_ADOBE_DEFLATE, "DEFLATE", true),
        Own(COMPRESSION_DEFLATE, "DEFLATE", true),
        Own(COMPRESSION_LZW, "LZW", true),
        Own(COMPRESSION_ZSTD, "ZSTD", true),
        Own(COMPRESSION_PACKBITS, "PACKBITS", false),
        {COMPRESSION_LZMA, "LZMA", false, true, true, 9, nullptr},
        {COMPRESSION_JPEG, "JPEG", true, false, true, 100, nullptr},
        {COMPRESSION_WEBP, "WEBP", true, false, false, 0, nullptr},
        {COMPRESSION_LERC, "LERC", true, false, false, 0, nullptr},
        {COMPRESSION_PIXARLOG, "PIXARLOG", true, false, false, 0, nullptr},
        {COMPRESSION_CCITTRLE, "CCITTRLE", false, false, false, 0, nullptr},
        {COMPRESSION_CCITTRLEW, "CCITTRLEW", false, false, false, 0, nullptr},
        {COMPRESSION_CCITTFAX3, "CCITTFAX3", false, false, false, 0, nullptr},
        {COMPRESSION_CCITTFAX4, "CCITTFAX4", false, false, false, 0, nullptr},
        {COMPRESSION_JBIG, "JBIG", false, false, false, 0, nullptr},
        {COMPRESSION_NEXT, "NEXT", false, false, false, 0, nullptr},
        {COMPRESSION_THUNDERSCAN, "THUNDERSCAN", false, false, false, 0, nullptr}};
    return COMPRESSIONS;
}

const Compression* FindCompression(std::uint64_t nCode)
{
    return Find([nCode](const Compression& oOne) { return oOne.mnCode == nCode; });
}

const Compression* FindCompression(std::string_view name)
{
    return Find([name](const Compression& oOne) { return oOne.moName == name; });
}

bool HasPredictor(std::uint64_t nCode)
{
    const Compression* const pCompression = FindCompression(nCode);
    return pCompression != nullptr && pCompression->mbPredictor;
}

bool IsOwnCompression(std::uint64_t nCode)
{
    const Compression* const pCompression = FindCompression(nCode);
    return nCode == COMPRESSION_NONE || (pCompression != nullptr && pCompression->mpCodec != nullptr);
}

bool CanEncode(std::uint64_t nCode)
{
    const Compression* const pCompression = FindCompression(nCode);
    if (pCompression == nullptr || !pCompression->mbWritten)
        return false;
    const bool bOwn = pCompression->mpCodec != nullptr && pCompression->mpCodec->mpMakeEncoder != nullptr;
    return nCode == COMPRESSION_NONE || bOwn || TIFFIsCODECConfigured(pCompression->mnCode) != 0;
}

} // namespace krv::plugins::tif
