// Any bytes as a file: opened through the manager by the loaded plug-in, described and read.
#include "datasources/iomanager/datasetmanager.h"
#include "fuzz/support/exercise.h"
#include "fuzz/support/inputfile.h"
#include "toolkit/nspio/warning.h"

extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    krv::nspio::Warning::SetSink([](const std::string&, const std::string&, unsigned int) {});
    krv::datasources::DatasetManager::GetInstance();
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* poBytes, std::size_t nBytes)
{
    const krv::fuzz::InputFile oFile(poBytes, nBytes);
    krv::fuzz::ExerciseFile(oFile.GetName());
    return 0;
}
