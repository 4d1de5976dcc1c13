#include "fuzz/support/inputfile.h"

#include <cstdio>
#include <cstdlib>

#include <sys/mman.h>
#include <unistd.h>

namespace krv::fuzz
{

InputFile::InputFile(const std::uint8_t* poBytes, std::size_t nBytes)
    : mnDescriptor(memfd_create("input", MFD_CLOEXEC)), moName("/proc/self/fd/" + std::to_string(mnDescriptor))
{
    if (mnDescriptor < 0 || write(mnDescriptor, poBytes, nBytes) != static_cast<ssize_t>(nBytes))
    {
        std::perror("the input cannot be written to memory");
        std::abort();
    }
}

InputFile::~InputFile()
{
    close(mnDescriptor);
}

} // namespace krv::fuzz
