#include "datasources/interfaces/filekind.h"

#include <string_view>

namespace krv::datasources
{

namespace
{

using namespace std::string_view_literals;

struct Kind
{
    std::size_t offset;
    std::string_view signature;
    const char* pName;
};

constexpr char RSC[] = "a header of the kind .rsc, which is not read: write an ENVI header for the pixels beside it";
constexpr char PAR[] = "a header of the kind .par, which is not read: write an ENVI header for the pixels beside it";

constexpr Kind KINDS[] = {
    {0, "II*\0"sv, "a TIFF file, little-endian"},
    {0, "MM\0*"sv, "a TIFF file, big-endian"},
    {0, "II+\0"sv, "a BigTIFF file, little-endian"},
    {0, "MM\0+"sv, "a BigTIFF file, big-endian"},
    {0, "\x89PNG\r\n\x1a\n"sv, "a PNG image"},
    {0, "\xff\xd8\xff"sv, "a JPEG image"},
    {4, "jP  "sv, "a JPEG 2000 image"},
    {0, "\xff\x4f\xff\x51"sv, "a JPEG 2000 codestream"},
    {0, "GIF8"sv, "a GIF image"},
    {0, "BM"sv, "a BMP image"},
    {0, "RIFF"sv, "a RIFF container, such as WebP"},
    {0, "\x89HDF\r\n\x1a\n"sv, "an HDF5 or netCDF-4 file"},
    {0, "\x0e\x03\x13\x01"sv, "an HDF4 file"},
    {0, "CDF"sv, "a netCDF file"},
    {0, "NITF"sv, "a NITF file"},
    {0, "GRIB"sv, "a GRIB file"},
    {0, "SIMPLE  ="sv, "a FITS file"},
    {0, "ENVI"sv, "an ENVI header: name the data file beside it"},
    {0, "PK\x03\x04"sv, "a ZIP archive: unpack it first"},
    {0, "\x1f\x8b"sv, "gzip data: unpack it first"},
    {0, "BZh"sv, "bzip2 data: unpack it first"},
    {0,
     "\xfd"
     "7zXZ"sv,
     "xz data: unpack it first"},
    {0, "\x28\xb5\x2f\xfd"sv, "zstd data: unpack it first"},
    {0, "%PDF"sv, "a PDF document"},
    {0, "ncols "sv, "an ASCII grid (numbers as text), which is not read: convert it to a binary one (.flt with .hdr)"},
    {0, "NCOLS "sv, "an ASCII grid (numbers as text), which is not read: convert it to a binary one (.flt with .hdr)"},
    {0, "WIDTH "sv, RSC},
    {0, "WIDTH\t"sv, RSC},
    {0, "Gamma DIFF&GEO"sv, PAR},
    {0, "Gamma Interferometric SAR Processor"sv, PAR},
    {0, "DEMO1\n"sv, "a DEMO file"},
    {0, "<?xml"sv, "an XML document"},
    {0, "<!DOCTYPE html"sv, "a web page: was the download redirected?"},
    {0, "<html"sv, "a web page: was the download redirected?"},
    {0, "version https://git-lfs"sv, "a Git LFS pointer: fetch the real file with `git lfs pull`"}};

const Kind* FindKind(const unsigned char* pHeader, std::size_t nBytes)
{
    const std::string_view header(reinterpret_cast<const char*>(pHeader), nBytes);
    for (const Kind& oKind : KINDS)
    {
        if (header.size() >= oKind.offset && header.substr(oKind.offset).starts_with(oKind.signature))
            return &oKind;
    }
    return nullptr;
}

} // namespace

std::string GuessFileKind(const unsigned char* pHeader, std::size_t nBytes)
{
    const Kind* const pKind = FindKind(pHeader, nBytes);
    return pKind != nullptr ? pKind->pName : "";
}

bool HasSignature(const unsigned char* pHeader, std::size_t nBytes)
{
    constexpr std::size_t LEAST_BYTES = 4;
    const Kind* const pKind = FindKind(pHeader, nBytes);
    return pKind != nullptr && pKind->signature.size() >= LEAST_BYTES;
}

} // namespace krv::datasources
