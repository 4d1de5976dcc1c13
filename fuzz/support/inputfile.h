#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace krv::fuzz
{

// Bytes as a file that exists in memory only, for code that takes names. Ends the program when the system cannot.
class InputFile
{
public:
    InputFile(const std::uint8_t* poBytes, std::size_t nBytes);
    InputFile(const InputFile&) = delete;
    InputFile& operator=(const InputFile&) = delete;
    ~InputFile();

    const std::string& GetName() const { return moName; }

private:
    int mnDescriptor;
    std::string moName;
};

} // namespace krv::fuzz
