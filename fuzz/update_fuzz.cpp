// Any bytes as a TIFF file that is opened for update and changed by a random program, beside a model of pixels and
// record. An input is the file, the program, and the length of the program in its last two bytes.
#include "fuzz/support/edits.h"
#include "fuzz/support/inputfile.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* pBytes, std::size_t nBytes)
{
    if (nBytes < 10)
        return 0;
    nBytes -= 2;
    const std::size_t nProgram = std::min<std::size_t>(nBytes, pBytes[nBytes] + 256U * (pBytes[nBytes + 1] % 4));
    const krv::fuzz::InputFile oFile(pBytes, nBytes - nProgram);
    krv::fuzz::TifPointer poDataset = krv::fuzz::OpenTif(oFile.GetName(), eUpdate);
    krv::fuzz::Choices oProgram(pBytes + nBytes - nProgram, nProgram);
    try
    {
        if (poDataset && krv::fuzz::Edits::IsSmall(*poDataset))
            krv::fuzz::Edits(oFile.GetName(), oProgram).Run(std::move(poDataset));
    }
    catch (const krv::FileException&)
    {
    }
    return 0;
}
