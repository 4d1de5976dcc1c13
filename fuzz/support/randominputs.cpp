// PROGRAM ROUNDS [FILE...]: a fuzzer's own check on random inputs and on files, without the fuzzer; made with any
// compiler.
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <fstream>
#include <iterator>
#include <random>
#include <string>
#include <vector>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* poBytes, std::size_t nBytes);
extern "C" [[gnu::weak]] int LLVMFuzzerInitialize(int*, char***); // not every fuzzer has one

int main(int nArguments, char** pArguments)
{
    if (LLVMFuzzerInitialize != nullptr)
        LLVMFuzzerInitialize(&nArguments, &pArguments);
    std::string input;
    try
    {
        for (int nArgument = 2; nArgument < nArguments; ++nArgument)
        {
            input = pArguments[nArgument];
            std::ifstream oFile(input, std::ios::binary);
            const std::vector<char> oBytes(std::istreambuf_iterator<char>(oFile), {});
            LLVMFuzzerTestOneInput(reinterpret_cast<const std::uint8_t*>(oBytes.data()), oBytes.size());
        }
        const int nRounds = nArguments < 2 ? 0 : std::atoi(pArguments[1]);
        for (int nSeed = 1; nSeed <= nRounds; ++nSeed)
        {
            input = "seed " + std::to_string(nSeed);
            std::mt19937 oRandom(static_cast<unsigned int>(nSeed));
            std::vector<std::uint8_t> oBytes(16 + oRandom() % 500);
            for (std::uint8_t& nByte : oBytes)
                nByte = static_cast<std::uint8_t>(oRandom());
            LLVMFuzzerTestOneInput(oBytes.data(), oBytes.size());
        }
    }
    catch (const std::exception& oError)
    {
        std::fprintf(stderr, "%s: %s\n", input.c_str(), oError.what());
        return 1;
    }
    return 0;
}
