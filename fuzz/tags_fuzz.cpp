// Any contents in the tags that say something of a sound image: metadata, no-data, geographic keys, sensor model. The
// same texts go to the functions that read tags of the metadata.
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/referencetag.h"
#include "datasources/metadata/typednodata.h"
#include "fuzz/support/exercise.h"
#include "fuzz/support/inputfile.h"
#include "fuzz/support/rawtiff.h"
#include "toolkit/nspio/warning.h"

#include <fuzzer/FuzzedDataProvider.h>

#include <cstdlib>

namespace
{

using krv::fuzz::RawTiff;

struct Tag
{
    std::uint16_t mnNumber;
    RawTiff::Type meType;
};

constexpr Tag TAGS[] = {{270, RawTiff::eText},     {42112, RawTiff::eText},   {42113, RawTiff::eText},
                        {33550, RawTiff::eDouble}, {33922, RawTiff::eDouble}, {34264, RawTiff::eDouble},
                        {34735, RawTiff::eShort},  {34736, RawTiff::eDouble}, {34737, RawTiff::eText},
                        {50844, RawTiff::eDouble}};

// What a tag was built from comes back.
void CheckReferences(const std::string& text, unsigned int nNumber)
{
    std::string file, layer;
    unsigned int nFound = 0;
    krv::datasources::ParseRefMetadataTag(text, file, layer, nFound);
    const std::string tag = krv::datasources::BuildRefMetadataTag("file.tif", "layer", nNumber);
    if (!krv::datasources::ParseRefMetadataTag(tag, file, layer, nFound) || file != "file.tif" || layer != "layer" ||
        nFound != nNumber)
        std::abort();
}

} // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    krv::nspio::Warning::SetSink([](const std::string&, const std::string&, unsigned int) {});
    krv::datasources::DatasetManager::GetInstance();
    krv::fuzz::ReportSystems();
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* poBytes, std::size_t nBytes)
{
    FuzzedDataProvider oData(poBytes, nBytes);
    RawTiff oTiff;
    const auto nWanted = oData.ConsumeIntegral<std::uint16_t>();
    for (std::size_t n = 0; n < std::size(TAGS); ++n)
    {
        if ((nWanted >> n & 1U) == 0)
            continue;
        const std::string bytes = oData.ConsumeRandomLengthString();
        oTiff.Add(TAGS[n].mnNumber, TAGS[n].meType, bytes);
        krv::datasources::ParseNoData(bytes);
        CheckReferences(bytes, nWanted);
    }
    const std::string file = oTiff.GetBytes();
    const krv::fuzz::InputFile oFile(reinterpret_cast<const std::uint8_t*>(file.data()), file.size());
    krv::fuzz::ExerciseFile(oFile.GetName());
    return 0;
}
