// krv_fuzz_seeds FOLDER: small TIFF files of every layout, byte order and compression, and of several types.
#include "tests/support/tiffwriter.h"

#include <cstdio>
#include <exception>
#include <filesystem>

namespace
{

void WriteSeeds(const std::filesystem::path& oFolder)
{
    struct Sample
    {
        std::uint16_t mnBits;
        std::uint16_t mnFormat;
    };
    constexpr Sample SAMPLES[] = {{8, 1}, {16, 1}, {32, 3}, {32, 5}};
    constexpr std::uint16_t CODECS[] = {COMPRESSION_NONE, COMPRESSION_ADOBE_DEFLATE, COMPRESSION_LZW, COMPRESSION_ZSTD,
                                        COMPRESSION_PACKBITS};
    unsigned int nSeed = 0;
    for (const Sample& oSample : SAMPLES)
        for (const std::uint16_t nCodec : CODECS)
            for (const char* pMode : {"wl", "wb8"})
            {
                const std::string name = "seed_" + std::to_string(++nSeed) + ".tif";
                const auto oFile = krv::test::NewTiff((oFolder / name).string(), pMode);
                krv::test::TiffForm oForm{37, 29, 2, oSample.mnBits, oSample.mnFormat, nCodec};
                oForm.mbSeparate = nSeed % 3 == 0;
                oForm.mnTileWidth = nSeed % 4 < 2 ? 0 : 16;
                for (const std::uint32_t nReduced : {0, FILETYPE_REDUCEDIMAGE})
                {
                    SetForm(oFile.get(), oForm);
                    TIFFSetField(oFile.get(), TIFFTAG_SUBFILETYPE, nReduced);
                    krv::test::WriteBlocks(oFile.get());
                    TIFFWriteDirectory(oFile.get());
                    oForm.mnWidth = 19;
                    oForm.mnHeight = 15;
                }
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
    std::filesystem::create_directories(pArguments[1]);
    WriteSeeds(pArguments[1]);
    return 0;
}
catch (const std::exception& oError)
{
    std::fprintf(stderr, "krv_fuzz_seeds: %s\n", oError.what());
    return 1;
}
