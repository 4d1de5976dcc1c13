// krv_fuzz_seeds FOLDER: inputs to start from. FOLDER/tif: small TIFF files of every layout, byte order and
// compression, of several types, with levels, masks and palettes; FOLDER/update: those with programs that change them;
// FOLDER/krvdsk: native files of every coding with something of everything, as they are and to be sealed anew.
#include "tests/plugins/krvdsk/changes.h"
#include "tests/support/tiffwriter.h"

#include <cstdio>
#include <exception>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <random>
#include <set>
#include <string>
#include <vector>

namespace
{

// An image with a level below it, a mask and a palette, in several codecs.
void WritePages(const std::filesystem::path& oFolder)
{
    for (const std::uint16_t nCodec : {COMPRESSION_NONE, COMPRESSION_ADOBE_DEFLATE, COMPRESSION_LZW, COMPRESSION_ZSTD,
                                       COMPRESSION_PACKBITS, COMPRESSION_JPEG})
        for (const char* pMode : {"wl", "wb", "wb8"})
        {
            const std::string name = "pages_" + std::to_string(nCodec) + pMode + ".tif";
            const auto oFile = krv::test::NewTiff((oFolder / name).string(), pMode);
            const bool bJpeg = nCodec == COMPRESSION_JPEG;
            for (const std::uint32_t nKind : {0, FILETYPE_MASK, FILETYPE_REDUCEDIMAGE})
            {
                krv::test::TiffForm oForm{.mnWidth = 41, .mnHeight = 35, .mnCompression = nCodec};
                if (nKind == FILETYPE_REDUCEDIMAGE)
                    oForm.mnWidth = 21, oForm.mnHeight = 18;
                oForm.mnBits = nKind == FILETYPE_MASK ? 1 : 8;
                if (bJpeg && nKind == FILETYPE_MASK)
                    oForm.mnCompression = COMPRESSION_ADOBE_DEFLATE;
                oForm.mnPhotometric = nKind == FILETYPE_MASK ? PHOTOMETRIC_MASK
                                      : bJpeg                ? PHOTOMETRIC_MINISBLACK
                                                             : PHOTOMETRIC_PALETTE;
                oForm.mnTileWidth = pMode[1] == 'b' ? 16 : 0;
                SetForm(oFile.get(), oForm);
                TIFFSetField(oFile.get(), TIFFTAG_SUBFILETYPE, nKind);
                TIFFSetField(oFile.get(), TIFFTAG_SOFTWARE, "seeds");
                std::vector<std::uint16_t> oColours(256, 12345);
                if (oForm.mnPhotometric == PHOTOMETRIC_PALETTE)
                    TIFFSetField(oFile.get(), TIFFTAG_COLORMAP, oColours.data(), oColours.data(), oColours.data());
                const toff_t aBelow[1] = {0};
                if (nKind == FILETYPE_MASK) // what comes next lies below the image and not in the chain
                    TIFFSetField(oFile.get(), TIFFTAG_SUBIFD, 1, aBelow);
                krv::test::WriteBlocks(oFile.get());
                TIFFWriteDirectory(oFile.get());
            }
        }
}

// Each file with programs as krv_fuzz_update reads them: behind it, their length last.
void WriteUpdates(const std::filesystem::path& oFrom, const std::filesystem::path& oTo)
{
    constexpr unsigned int PROGRAM_BYTES = 120;
    std::mt19937 oRandom(1);
    std::set<std::filesystem::path> oFiles;
    for (const auto& oEntry : std::filesystem::directory_iterator(oFrom))
        oFiles.insert(oEntry.path());
    for (const std::filesystem::path& oFile : oFiles)
    {
        std::ifstream oSource(oFile, std::ios::binary);
        std::string bytes{std::istreambuf_iterator<char>(oSource), {}};
        for (unsigned int nAt = 0; nAt < PROGRAM_BYTES; ++nAt)
            bytes += static_cast<char>(oRandom());
        bytes += static_cast<char>(PROGRAM_BYTES);
        bytes += '\0';
        std::ofstream(oTo / oFile.filename(), std::ios::binary) << bytes;
    }
}

void WriteNative(const std::filesystem::path& oFolder)
{
    for (const char* pCoding : {"NONE", "DEFLATE", "ZSTD", "LZ4", "LZW"})
        for (const char* pInterleave : {"PIXEL", "BAND"})
        {
            const std::string name = std::string(pCoding) + pInterleave, file = (oFolder / name).string();
            std::mt19937 oRandom(3);
            {
                const krv::test::NativePointer poNew = krv::test::CreateNative(
                    file, "BLOCKXSIZE=16 BLOCKYSIZE=16 COMPRESS=" + std::string(pCoding) + " INTERLEAVE=" + pInterleave,
                    40, 30, {krv::gobs::eDT_8U, krv::gobs::eDT_8U, krv::gobs::eDT_32R});
                for (const krv::test::Change eChange : krv::test::CHANGES)
                    krv::test::Make(*poNew, eChange, oRandom);
                poNew->Close();
            }
            const std::string bytes = krv::conformance::ReadFile(file);
            std::filesystem::remove(file);
            for (const char nWay : {'0', '1'}) // an even one: sealed anew
                std::ofstream(oFolder / (name + nWay), std::ios::binary) << nWay << bytes;
        }
}

} // namespace

int main(int nArguments, char** pArguments)
try
{
    if (nArguments != 2)
    {
        std::fprintf(stderr, "usage: krv_fuzz_seeds FOLDER\n");
        return 2;
    }
    const std::filesystem::path oFolder = pArguments[1];
    std::filesystem::create_directories(oFolder / "tif");
    std::filesystem::create_directories(oFolder / "update");
    std::filesystem::create_directories(oFolder / "krvdsk");
    WritePages(oFolder / "tif");
    WriteNative(oFolder / "krvdsk");
    WriteUpdates(oFolder / "tif", oFolder / "update");
    return 0;
}
catch (const std::exception& oError)
{
    std::fprintf(stderr, "krv_fuzz_seeds: %s\n", oError.what());
    return 1;
}
