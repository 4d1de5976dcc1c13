// krv_fuzz_seeds FOLDER: small TIFF files of every layout, byte order and compression, and of several types.
#include "tests/conformance/tiffile.h"

#include <cstdio>
#include <exception>
#include <filesystem>

namespace
{

void WriteSeeds(const std::filesystem::path& oFolder)
{
    const krv::gobs::NativeDataTypeCode TYPES[] = {krv::gobs::eDT_8U, krv::gobs::eDT_16U, krv::gobs::eDT_32R,
                                                   krv::gobs::eDT_C16S};
    const auto nVariants = static_cast<unsigned int>(krv::conformance::TifVariants().size());
    for (unsigned int nVariant = 0; nVariant < nVariants; ++nVariant)
    {
        for (const auto eType : TYPES)
        {
            krv::conformance::Image oImage;
            oImage.mnWidth = 37;
            oImage.mnHeight = 29;
            oImage.moTypes = {eType, eType};
            oImage.moTags = {{"SENSOR", "none"}, {"DefaultRed", "2"}};
            oImage.moLevels = {2};
            oImage.mnVariant = nVariant;
            const std::string name = "seed_" + std::to_string(nVariant) + "_" + std::to_string(eType) + ".tif";
            krv::conformance::WriteTifFile((oFolder / name).string(), oImage);
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
