// New TIFF files of any options, types and sizes, filled and changed by a random program beside a model of pixels and
// record.
#include "fuzz/support/edits.h"
#include "plugins/tif/tifbuilder.h"
#include "toolkit/exceptions/exceptions.h"

#include <filesystem>

#include <unistd.h>

namespace
{

std::filesystem::path MakeFolder()
{
    const std::filesystem::path memory = "/dev/shm"; // syncing to a disk would be most of the time
    const std::filesystem::path folder =
        (std::filesystem::is_directory(memory) ? memory : std::filesystem::temp_directory_path()) /
        ("krv_fuzz_create." + std::to_string(::getpid()));
    std::filesystem::create_directory(folder);
    return folder;
}

std::string PickOptions(krv::fuzz::Choices& oProgram)
{
    const std::vector<const char*> GROUPS[] = {
        {"COMPRESS=NONE", "COMPRESS=DEFLATE", "COMPRESS=LZW", "COMPRESS=ZSTD", "COMPRESS=PACKBITS", "COMPRESS=LZMA",
         "COMPRESS=JPEG"},
        {"TILED=NO", "TILED=NO BLOCKYSIZE=5", "BLOCKXSIZE=16 BLOCKYSIZE=16", "BLOCKXSIZE=48 BLOCKYSIZE=32"},
        {"INTERLEAVE=BAND"},
        {"BIGTIFF=YES"},
        {"PREDICTOR=NO", "PREDICTOR=2", "PREDICTOR=3"},
        {"NBITS=1", "NBITS=4", "NBITS=12", "NBITS=16", "NBITS=24"},
        {"LAYOUT=COG"},
        {"LEVEL=1", "LEVEL=9"},
        {"PHOTOMETRIC=MINISWHITE", "PHOTOMETRIC=RGB"},
        {"ALPHA=YES", "ALPHA=PREMULTIPLIED"}};
    std::string options;
    for (const std::vector<const char*>& oGroup : GROUPS)
        options += oProgram.OneIn(3) ? std::string(oProgram.Of(oGroup)) + " " : ""; // few of any go together
    return options;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* pBytes, std::size_t nBytes)
{
    static const std::filesystem::path FOLDER = MakeFolder();
    krv::fuzz::Choices oProgram(pBytes, nBytes);
    const std::string fileName = FOLDER / "new.tif";
    std::filesystem::remove(fileName);
    const std::string options = PickOptions(oProgram);
    const auto nWidth = 1 + oProgram.Below(53);
    const auto nHeight = 1 + oProgram.Below(41);
    const auto nChannels = 1 + oProgram.Below(4);
    const krv::gobs::DataType oType(static_cast<krv::gobs::NativeDataTypeCode>(oProgram.Below(15)));
    krv::fuzz::TifPointer poDataset;
    try
    {
        poDataset.reset(
            static_cast<krv::plugins::tif::TifDataset*>(krv::plugins::tif::TifBuilder().Create(fileName, options)));
        poDataset->Create(nWidth, nHeight, std::vector<krv::gobs::DataType>(nChannels, oType));
    }
    catch (const krv::DataException&)
    {
        return 0; // the options do not go together
    }
    if (krv::fuzz::Edits::IsSmall(*poDataset))
        krv::fuzz::Edits(fileName, oProgram).Run(std::move(poDataset));
    poDataset.reset();
    for (const auto& oEntry : std::filesystem::directory_iterator(FOLDER))
        if (oEntry.path() != fileName)
            std::abort(); // a temporary file was left behind
    return 0;
}
