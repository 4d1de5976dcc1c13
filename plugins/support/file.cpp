#include "plugins/support/file.h"

#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstring>

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

namespace krv::plugins::support
{

namespace
{

// Rows are gathered from slices of this size, which stay in the processor's second cache.
constexpr std::size_t SLICE_BYTES = 256 * 1024;
// A call to the system costs about as much as copying this many bytes.
constexpr std::size_t CALL_BYTES = 4096;

int OpenFlags(File::Mode eMode)
{
    switch (eMode)
    {
    case File::Mode::eRead:
        return O_RDONLY | O_CLOEXEC | O_NONBLOCK;
    case File::Mode::eUpdate:
        return O_RDWR | O_CLOEXEC;
    case File::Mode::eCreate:
        break;
    }
    return O_RDWR | O_CREAT | O_TRUNC | O_CLOEXEC;
}

[[noreturn]] void ThrowOpenError(const std::string& fileName, int nError, const Place& oPlace)
{
    if (nError == ENOENT || nError == ENOTDIR)
        throw FileNotFoundException(fileName, fileName + ": " + SystemErrorText(nError), oPlace);
    throw IOException(fileName, fileName + ": cannot be opened: " + SystemErrorText(nError), oPlace);
}

void CopyRows(const unsigned char* pSource, std::size_t nSourcePitch, unsigned char* pTarget, std::size_t nTargetPitch,
              std::size_t nRowBytes, std::size_t nRows)
{
    for (std::size_t nRow = 0; nRow < nRows; ++nRow)
        std::memcpy(pTarget + nRow * nTargetPitch, pSource + nRow * nSourcePitch, nRowBytes);
}

} // namespace

std::string SystemErrorText(int nError)
{
    char aText[256];
    return strerror_r(nError, aText, sizeof(aText));
}

std::string MakeTemporaryName(const std::string& fileName, const Place& oPlace)
{
    struct stat oStatus = {};
    if (fileName.empty() || fileName.back() == '/')
        throw IOException(fileName, "\"" + fileName + "\": a new file has a name", oPlace);
    if (::stat(fileName.c_str(), &oStatus) == 0 && !S_ISREG(oStatus.st_mode))
        throw IOException(fileName, fileName + ": is not a plain file and is not replaced", oPlace);
    if (::access(fileName.c_str(), W_OK) != 0 && errno != ENOENT && errno != ENOTDIR)
        throw IOException(fileName, fileName + ": cannot be replaced: " + SystemErrorText(errno), oPlace);
    const std::size_t nSlash = fileName.rfind('/');
    const std::size_t nBegin = nSlash == std::string::npos ? 0 : nSlash + 1;
    const std::string folder = nBegin == 0 ? "." : fileName.substr(0, nBegin == 1 ? 1 : nBegin - 1);
    if (::access(folder.c_str(), W_OK | X_OK) != 0)
    {
        if (errno == ENOENT || errno == ENOTDIR)
            throw FileNotFoundException(fileName, fileName + ": there is no folder " + folder + " to create it in",
                                        oPlace);
        throw IOException(fileName, fileName + ": cannot be created: " + SystemErrorText(errno), oPlace);
    }
    static std::atomic<unsigned int> nCounter = 0;
    return fileName.substr(0, nBegin) + "." + fileName.substr(nBegin, 200) + "." + std::to_string(::getpid()) + "." +
           std::to_string(nCounter++) + ".part";
}

File::File(const std::string& fileName, Mode eMode, const Place& oPlace) : moName(fileName), moPath(fileName)
{
    mnDescriptor = ::open(fileName.c_str(), OpenFlags(eMode), 0666);
    if (mnDescriptor < 0)
        ThrowOpenError(fileName, errno, oPlace);
    struct stat oStatus = {};
    const bool bKnown = ::fstat(mnDescriptor, &oStatus) == 0;
    if (!bKnown || !S_ISREG(oStatus.st_mode))
    {
        ::close(mnDescriptor);
        throw IOException(fileName, fileName + ": is not a plain file", oPlace);
    }
    // Two writers that know nothing of each other would overwrite what the other added. Some file systems have no
    // locks.
    if (eMode != Mode::eRead && ::flock(mnDescriptor, LOCK_EX | LOCK_NB) != 0 && errno == EWOULDBLOCK)
    {
        ::close(mnDescriptor);
        throw IOException(fileName, fileName + ": is being written by another program or dataset", oPlace);
    }
    // The size as of now: whoever had the lock may have changed it.
    if (::fstat(mnDescriptor, &oStatus) != 0)
        oStatus.st_size = 0;
    mnSize = static_cast<std::uint64_t>(oStatus.st_size);
    mbLinked = oStatus.st_nlink != 0;
}

File::~File()
{
    ::close(mnDescriptor);
}

std::size_t File::ReadUpTo(std::uint64_t nOffset, void* pTarget, std::size_t nBytes, Location oLocation) const
{
    auto* pBytes = static_cast<unsigned char*>(pTarget);
    std::size_t nDone = 0;
    while (nDone < nBytes)
    {
        const auto nAt = nOffset + nDone;
        if (nAt > static_cast<std::uint64_t>(INT64_MAX))
            break;
        const ssize_t nRead = ::pread(mnDescriptor, pBytes + nDone, nBytes - nDone, static_cast<off_t>(nAt));
        if (nRead == 0)
            break;
        if (nRead > 0)
            nDone += static_cast<std::size_t>(nRead);
        else if (errno != EINTR)
            throw IOException(moName, moName + ": reading failed: " + SystemErrorText(errno),
                              Place::Current(oLocation));
    }
    return nDone;
}

void File::Read(std::uint64_t nOffset, void* pTarget, std::size_t nBytes, Location oLocation) const
{
    const auto nRead = ReadUpTo(nOffset, pTarget, nBytes, oLocation);
    if (nRead != nBytes)
        throw IOException(moName,
                          moName + ": the file is truncated: " + std::to_string(nBytes) + " bytes at offset " +
                              std::to_string(nOffset) + " are wanted, " + std::to_string(nRead) + " are there",
                          Place::Current(oLocation));
}

void File::ReadRows(std::uint64_t nOffset, std::size_t nStoredPitch, std::size_t nRowBytes, std::size_t nRows,
                    unsigned char* pTarget, std::size_t nPitch, Scratch& oScratch, Location oLocation) const
{
    if (nRows == 0 || nRowBytes == 0)
        return;
    if (nRows == 1 || (nRowBytes == nStoredPitch && nRowBytes == nPitch))
        return Read(nOffset, pTarget, nRows == 1 ? nRowBytes : nRowBytes * nRows, oLocation);
    if (nStoredPitch - nRowBytes >= CALL_BYTES || nStoredPitch > SLICE_BYTES)
    {
        for (std::size_t nRow = 0; nRow < nRows; ++nRow)
            Read(nOffset + static_cast<std::uint64_t>(nRow) * nStoredPitch, pTarget + nRow * nPitch, nRowBytes,
                 oLocation);
        return;
    }
    const std::size_t nSliceRows = std::max<std::size_t>(1, SLICE_BYTES / nStoredPitch);
    for (std::size_t nRow = 0; nRow < nRows; nRow += nSliceRows)
    {
        const std::size_t nCount = std::min(nSliceRows, nRows - nRow);
        const std::size_t nSpan = (nCount - 1) * nStoredPitch + nRowBytes;
        unsigned char* pSlice = oScratch.Get(nSpan);
        Read(nOffset + static_cast<std::uint64_t>(nRow) * nStoredPitch, pSlice, nSpan, oLocation);
        CopyRows(pSlice, nStoredPitch, pTarget + nRow * nPitch, nPitch, nRowBytes, nCount);
    }
}

void File::Write(std::uint64_t nOffset, const void* pSource, std::size_t nBytes, Location oLocation)
{
    const auto* pBytes = static_cast<const unsigned char*>(pSource);
    for (std::size_t nDone = 0; nDone < nBytes;)
    {
        const ssize_t nWritten =
            ::pwrite(mnDescriptor, pBytes + nDone, nBytes - nDone, static_cast<off_t>(nOffset + nDone));
        if (nWritten > 0)
        {
            nDone += static_cast<std::size_t>(nWritten);
            mnSize = std::max(mnSize, nOffset + nDone);
        }
        else if (nWritten == 0 || errno != EINTR)
            throw IOException(moName, moName + ": writing failed: " + SystemErrorText(nWritten == 0 ? ENOSPC : errno),
                              Place::Current(oLocation));
    }
}

void File::WriteRows(std::uint64_t nOffset, std::size_t nStoredPitch, std::size_t nRowBytes, std::size_t nRows,
                     const unsigned char* pSource, std::size_t nPitch, Location oLocation)
{
    if (nRowBytes == nStoredPitch && nRowBytes == nPitch)
        return Write(nOffset, pSource, nRowBytes * nRows, oLocation);
    for (std::size_t nRow = 0; nRow < nRows; ++nRow)
        Write(nOffset + static_cast<std::uint64_t>(nRow) * nStoredPitch, pSource + nRow * nPitch, nRowBytes, oLocation);
}

void File::Flush(const Place& oPlace)
{
    if (::fdatasync(mnDescriptor) != 0)
        throw IOException(moName, moName + ": writing failed: " + SystemErrorText(errno), oPlace);
    struct stat oStatus = {};
    if (mbLinked && ::fstat(mnDescriptor, &oStatus) == 0 && oStatus.st_nlink == 0)
        throw IOException(moName, moName + ": was removed or replaced while it was being written", oPlace);
}

void File::CutBack(std::uint64_t nBytes) noexcept
{
    struct stat oStatus = {};
    if (nBytes >= mnSize || ::fstat(mnDescriptor, &oStatus) != 0 ||
        static_cast<std::uint64_t>(oStatus.st_size) != mnSize)
        return;
    if (::ftruncate(mnDescriptor, static_cast<off_t>(nBytes)) == 0)
        mnSize = nBytes;
}

void File::EndWriting() noexcept
{
    ::flock(mnDescriptor, LOCK_UN);
}

// The folder is flushed as well as the system lets it: not every file system has that.
void File::Rename(const std::string& fileName, const Place& oPlace)
{
    // Who may read and write a file does not change with what it holds.
    struct stat oStatus = {};
    if (::stat(fileName.c_str(), &oStatus) == 0)
        ::fchmod(mnDescriptor, oStatus.st_mode & 07777);
    if (std::rename(moPath.c_str(), fileName.c_str()) != 0)
        throw IOException(fileName, fileName + ": cannot be put in its place: " + SystemErrorText(errno), oPlace);
    moPath = fileName;
    moName = fileName;
    const std::size_t nSlash = fileName.rfind('/');
    const std::string folder = nSlash == std::string::npos ? "." : fileName.substr(0, nSlash + 1);
    const int nFolder = ::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (nFolder < 0)
        return;
    ::fsync(nFolder);
    ::close(nFolder);
}

} // namespace krv::plugins::support
