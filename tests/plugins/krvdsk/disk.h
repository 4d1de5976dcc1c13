#pragma once

#include <cstddef>
#include <cstdint>
#include <random>
#include <string>
#include <vector>

namespace krv::test
{

// What this process asked the system to do with a file while a Recording lived: the calls themselves are taken over by
// functions of the same names in disk.cpp, which pass them on.
struct DiskCall
{
    enum class Kind
    {
        eWrite,
        eCut,
        eSync
    };

    Kind meKind;
    std::uint64_t mnOffset = 0; // of a write, or the size that is left
    std::string moBytes;
};

class Recording
{
public:
    Recording();
    ~Recording();
    Recording(const Recording&) = delete;
    Recording& operator=(const Recording&) = delete;

    const std::vector<DiskCall>& GetCalls() const;
};

// What a disk may hold when the power fails after so many calls: all up to the last call that synchronised, and of
// those behind it any, in any order, writes in part as well, by 512 bytes. before: what the file was.
std::string Crash(const std::string& before, const std::vector<DiskCall>& oCalls, std::size_t nCalls,
                  std::mt19937& oRandom);

} // namespace krv::test
