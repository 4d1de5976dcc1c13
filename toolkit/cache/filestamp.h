#pragma once

#include "toolkit/api.h"

#include <cstdint>
#include <optional>
#include <string>

namespace krv::cache
{

// Which file it is, and of when: two stamps are equal only when nothing was written to it between them. This process's
// own changes count by a generation, as far as they were noted; those of others by the size and the times of the file.
// Example: whoever shares what it decoded compares FileStamp::Read(nDescriptor) with the stamp of the opening.
struct KRV_TOOLKIT_API FileStamp
{
    std::uint64_t mnDevice = 0;     // with the inode, which file it is, whatever its name
    std::uint64_t mnInode = 0;      // see mnDevice
    std::uint64_t mnSize = 0;       // bytes
    std::int64_t mnChanged = 0;     // the status, in nanoseconds since 1970
    std::int64_t mnModified = 0;    // the contents, in nanoseconds since 1970
    std::uint64_t mnGeneration = 0; // how often this process noted a change; no meaning in another one

    friend bool operator==(const FileStamp&, const FileStamp&) = default;

    // The stamp of an open file; nothing when the system does not tell.
    // nDescriptor: borrowed. One call of the system; nothing is read of the file.
    static std::optional<FileStamp> Read(int nDescriptor);
    // Notes that this process writes to the file, or just has: to be called before and after, by any thread.
    static void NoteChange(std::uint64_t nDevice, std::uint64_t nInode);

    // Whether the last change lies two seconds back or more. Times are coarse: a later change might show the same one
    // as a recent one does.
    bool IsSettled() const;
    // All of it, as the bytes of an identity.
    // Not for people: decimal numbers, a blank behind each.
    std::string GetText() const;
};

} // namespace krv::cache
