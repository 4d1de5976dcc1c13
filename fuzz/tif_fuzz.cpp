// Any bytes as a file: opened through the manager by the loaded plug-in, described and read.
#include "fuzz/support/exercise.h"
#include "fuzz/support/inputfile.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* poBytes, std::size_t nBytes)
{
    const krv::fuzz::InputFile oFile(poBytes, nBytes);
    krv::fuzz::ExerciseFile(oFile.GetName());
    return 0;
}
