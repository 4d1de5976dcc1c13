#include "toolkit/cache/filestamp.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>

#include <sys/stat.h>

namespace krv::cache
{

namespace
{

constexpr std::int64_t SECOND = 1000000000;

// Files share generations by chance: one that was not written seems so then, which costs no more than a block that is
// not shared.
constinit std::array<std::atomic<std::uint64_t>, 4096> gaGenerations{};

std::atomic<std::uint64_t>& FindGeneration(std::uint64_t nDevice, std::uint64_t nInode)
{
    const std::uint64_t nHash = (nInode ^ nDevice << 32) * 0x9E3779B97F4A7C15ull;
    return gaGenerations[nHash >> 52];
}

std::int64_t Nanoseconds(const timespec& oTime)
{
    return oTime.tv_sec * SECOND + oTime.tv_nsec;
}

} // namespace

// The generation last: whoever has it reads all that was written before it.
std::optional<FileStamp> FileStamp::Read(int nDescriptor)
{
    struct stat oStatus = {};
    if (::fstat(nDescriptor, &oStatus) != 0)
        return std::nullopt;
    FileStamp oStamp;
    oStamp.mnDevice = oStatus.st_dev;
    oStamp.mnInode = oStatus.st_ino;
    oStamp.mnSize = static_cast<std::uint64_t>(oStatus.st_size);
    oStamp.mnChanged = Nanoseconds(oStatus.st_ctim);
    oStamp.mnModified = Nanoseconds(oStatus.st_mtim);
    oStamp.mnGeneration = FindGeneration(oStamp.mnDevice, oStamp.mnInode).load();
    return oStamp;
}

void FileStamp::NoteChange(std::uint64_t nDevice, std::uint64_t nInode)
{
    FindGeneration(nDevice, nInode).fetch_add(1);
}

bool FileStamp::IsSettled() const
{
    const auto nNow =
        std::chrono::duration_cast<std::chrono::nanoseconds>(std::chrono::system_clock::now().time_since_epoch())
            .count();
    return std::max(mnChanged, mnModified) <= nNow - 2 * SECOND;
}

std::string FileStamp::GetText() const
{
    std::string text;
    for (const std::uint64_t nPart : {mnDevice, mnInode, mnSize, static_cast<std::uint64_t>(mnChanged),
                                      static_cast<std::uint64_t>(mnModified), mnGeneration})
        text += std::to_string(nPart) + " ";
    return text;
}

} // namespace krv::cache
