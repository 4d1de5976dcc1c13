// Any bytes as a JPEG 2000 file or codestream: boxes, headers, tiles and levels, by all calls that read. What begins
// otherwise gets the first bytes of a codestream, so that the search does not have to find them.
#include "fuzz/support/exercise.h"
#include "fuzz/support/inputfile.h"

#include <algorithm>
#include <iterator>
#include <vector>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* poBytes, std::size_t nBytes)
{
    constexpr std::uint8_t CODESTREAM[] = {0xFF, 0x4F, 0xFF, 0x51};
    std::vector<std::uint8_t> oBytes(poBytes, poBytes + nBytes);
    if (nBytes > sizeof(CODESTREAM) && oBytes[0] != 0)
        std::copy(std::begin(CODESTREAM), std::end(CODESTREAM), oBytes.begin());
    const krv::fuzz::InputFile oFile(oBytes.data(), oBytes.size());
    krv::fuzz::ExerciseFile(oFile.GetName());
    return 0;
}
