#include "plugins/support/file/file.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
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

// Reading so many bytes or more that takes longer than this waits for a disk or a network.
constexpr std::size_t TIMED_BYTES = 16 * 1024;
constexpr std::chrono::microseconds SLOW_READ{1500};

// Locks on bytes from here on stand for the roots of states; no file reaches so far.
constexpr std::uint64_t FIRST_ROOT = std::uint64_t{1} << 62;
constexpr std::uint64_t ROOTS = std::uint64_t{1} << 62;
// No state's: whether locks work is tried on it.
constexpr std::uint64_t TRIED_ROOT = ROOTS - 1;
// More states than any use has at one time are not told apart.
constexpr std::size_t MAXIMUM_HELD = 1000;

// Locks that belong to the open file, not to the process: opening and closing the file elsewhere does not touch them.
struct flock MakeLock(short nType, std::uint64_t nRoot, std::uint64_t nRoots)
{
    struct flock oLock = {};
    oLock.l_type = nType;
    oLock.l_whence = SEEK_SET;
    oLock.l_start = static_cast<off_t>(FIRST_ROOT + nRoot);
    oLock.l_len = static_cast<off_t>(nRoots);
    return oLock;
}

bool SetLock(int nDescriptor, short nType, std::uint64_t nRoot)
{
    struct flock oLock = MakeLock(nType, nRoot, 1);
    return ::fcntl(nDescriptor, F_OFD_SETLK, &oLock) == 0;
}

// Adds the roots from nBegin to before nEnd that others hold. The system tells one of them at a time, any.
bool CollectHeld(int nDescriptor, std::uint64_t nBegin, std::uint64_t nEnd, std::vector<std::uint64_t>& oHeld)
{
    if (nBegin >= nEnd)
        return true;
    struct flock oLock = MakeLock(F_WRLCK, nBegin, nEnd - nBegin);
    if (oHeld.size() == MAXIMUM_HELD || ::fcntl(nDescriptor, F_OFD_GETLK, &oLock) != 0)
        return false;
    if (oLock.l_type == F_UNLCK)
        return true;
    // Whatever is larger than one byte is not of this library.
    const std::uint64_t nFound = static_cast<std::uint64_t>(oLock.l_start) - FIRST_ROOT;
    if (oLock.l_len != 1 || nFound < nBegin || nFound >= nEnd)
        return false;
    oHeld.push_back(nFound);
    return CollectHeld(nDescriptor, nBegin, nFound, oHeld) && CollectHeld(nDescriptor, nFound + 1, nEnd, oHeld);
}

int OpenFlags(File::Mode eMode)
{
    switch (eMode)
    {
    case File::Mode::eRead:
        return O_RDONLY | O_CLOEXEC | O_NONBLOCK;
    case File::Mode::eUpdate:
        return O_RDWR | O_CLOEXEC;
    case File::Mode::eScratch:
        return O_RDWR | O_TMPFILE | O_CLOEXEC;
    case File::Mode::eCreate:
        break;
    }
    return O_RDWR | O_CREAT | O_TRUNC | O_CLOEXEC;
}

// Where the file system has no files without a name, one loses it at once.
int OpenUnnamed(const std::string& folder)
{
    std::string name = folder + "/.krvXXXXXX";
    const int nDescriptor = ::mkostemp(name.data(), O_CLOEXEC);
    if (nDescriptor >= 0)
        ::unlink(name.c_str());
    return nDescriptor;
}

[[noreturn]] void ThrowOpenError(const std::string& fileName, int nError, const Place& oPlace)
{
    if (nError == ENOENT || nError == ENOTDIR)
        throw FileNotFoundException(fileName, fileName + ": " + SystemErrorText(nError), oPlace);
    throw IOException(fileName, fileName + ": cannot be opened: " + SystemErrorText(nError), oPlace);
}

bool IsUnknownCall(int nError)
{
    return nError == EINVAL || nError == ENOSYS || nError == EOPNOTSUPP || nError == EPERM;
}

// Renames to a name that nobody has; returns 0, or the error number.
int RenameToFree(const char* pFrom, const char* pTo)
{
    if (::renameat2(AT_FDCWD, pFrom, AT_FDCWD, pTo, RENAME_NOREPLACE) == 0)
        return 0;
    if (!IsUnknownCall(errno))
        return errno;
    if (::link(pFrom, pTo) == 0)
        return ::unlink(pFrom) == 0 ? 0 : errno;
    if (!IsUnknownCall(errno))
        return errno;
    // An empty file takes the name first where there is neither of them.
    const int nTaken = ::open(pTo, O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
    if (nTaken < 0)
        return errno;
    ::close(nTaken);
    if (std::rename(pFrom, pTo) == 0)
        return 0;
    const int nError = errno;
    ::unlink(pTo);
    return nError;
}

} // namespace

std::string SystemErrorText(int nError)
{
    char aText[256];
    return strerror_r(nError, aText, sizeof(aText));
}

void ThrowNameTaken(const std::string& fileName, const Place& oPlace)
{
    throw IOException(fileName, fileName + ": there is a file of that name meanwhile, which is not replaced", oPlace);
}

class File::Change
{
public:
    explicit Change(const File& oFile) : moFile(oFile) { Note(); }
    ~Change() { Note(); }
    Change(const Change&) = delete;
    Change& operator=(const Change&) = delete;

private:
    void Note() const { krv::cache::FileStamp::NoteChange(moFile.mnDevice, moFile.mnInode); }

    const File& moFile;
};

File::File(const std::string& fileName, Mode eMode, const Place& oPlace) : moName(fileName), moPath(fileName)
{
    mnDescriptor = ::open(fileName.c_str(), OpenFlags(eMode), eMode == Mode::eScratch ? 0600 : 0666);
    if (mnDescriptor < 0 && eMode == Mode::eScratch && (errno == EOPNOTSUPP || errno == EISDIR))
        mnDescriptor = OpenUnnamed(fileName);
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
    if (eMode != Mode::eRead && ::fstat(mnDescriptor, &oStatus) != 0)
        oStatus.st_size = 0;
    mnSize = static_cast<std::uint64_t>(oStatus.st_size);
    mnDevice = oStatus.st_dev;
    mnInode = oStatus.st_ino;
    mbLinked = oStatus.st_nlink != 0;
    if (eMode != Mode::eRead)
        const Change oOpened(*this);
    else if (const auto oStamp = krv::cache::FileStamp::Read(mnDescriptor); oStamp && oStamp->IsSettled())
        moStamp = oStamp;
}

File::~File()
{
    ::close(mnDescriptor);
}

bool File::IsAsOpened() const
{
    return moStamp && krv::cache::FileStamp::Read(mnDescriptor) == moStamp;
}

void File::Foresee(std::uint64_t nOffset, std::uint64_t nBytes) const noexcept
{
    if (nOffset < mnSize)
        ::posix_fadvise(mnDescriptor, static_cast<off_t>(nOffset),
                        static_cast<off_t>(std::min(nBytes, mnSize - nOffset)), POSIX_FADV_WILLNEED);
}

std::size_t File::ReadUpTo(std::uint64_t nOffset, void* pTarget, std::size_t nBytes, Location oLocation) const
{
    using Clock = std::chrono::steady_clock;
    auto* pBytes = static_cast<unsigned char*>(pTarget);
    std::size_t nDone = 0;
    const bool bTimed = nBytes >= TIMED_BYTES;
    const Clock::time_point oBegin = bTimed ? Clock::now() : Clock::time_point();
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
    if (bTimed)
        mbSlow.store(Clock::now() - oBegin > SLOW_READ * (1 + nDone / (std::size_t{1} << 20)),
                     std::memory_order_relaxed);
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
        raster::CopyRows(pSlice, nStoredPitch, pTarget + nRow * nPitch, nPitch, nRowBytes, nCount);
    }
}

void File::Write(std::uint64_t nOffset, const void* pSource, std::size_t nBytes, Location oLocation)
{
    const Change oChange(*this);
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

// An error that waiting tells would not be told again by the call that makes sure of all.
void File::Flush(const Watch& oWatch, const Place& oPlace)
{
    constexpr std::uint64_t PIECE = std::uint64_t{8} << 20, AHEAD = 8 * PIECE;
    const bool bPieces = oWatch && mnSize > PIECE;
    if (bPieces)
        BeginFlush(0, AHEAD);
    for (std::uint64_t nDone = 0; bPieces && nDone < mnSize; nDone += PIECE)
    {
        oWatch(nDone, mnSize);
        BeginFlush(nDone + AHEAD, PIECE);
        if (::sync_file_range(mnDescriptor, static_cast<off_t>(nDone), static_cast<off_t>(PIECE),
                              SYNC_FILE_RANGE_WAIT_BEFORE | SYNC_FILE_RANGE_WRITE | SYNC_FILE_RANGE_WAIT_AFTER) != 0 &&
            (errno == EIO || errno == ENOSPC || errno == EDQUOT))
            throw IOException(moName, moName + ": writing failed: " + SystemErrorText(errno), oPlace);
    }
    if (bPieces)
        oWatch(mnSize, mnSize);
    Flush(oPlace);
}

void File::BeginFlush(std::uint64_t nOffset, std::uint64_t nBytes) const noexcept
{
    ::sync_file_range(mnDescriptor, static_cast<off_t>(nOffset), static_cast<off_t>(nBytes), SYNC_FILE_RANGE_WRITE);
}

void File::CutBack(std::uint64_t nBytes) noexcept
{
    struct stat oStatus = {};
    if (nBytes >= mnSize || ::fstat(mnDescriptor, &oStatus) != 0 ||
        static_cast<std::uint64_t>(oStatus.st_size) != mnSize)
        return;
    const Change oChange(*this);
    if (::ftruncate(mnDescriptor, static_cast<off_t>(nBytes)) == 0)
        mnSize = nBytes;
}

bool File::Hold(std::uint64_t nRoot) noexcept
{
    if (nRoot >= TRIED_ROOT || !SetLock(mnDescriptor, F_RDLCK, nRoot))
        return false;
    if (moHeld && *moHeld != nRoot)
        SetLock(mnDescriptor, F_UNLCK, *moHeld);
    moHeld = nRoot;
    return true;
}

std::optional<std::vector<std::uint64_t>> File::FindHeld() const
{
    std::vector<std::uint64_t> oHeld;
    if (!CanSeeLocks() || !CollectHeld(mnDescriptor, 0, TRIED_ROOT, oHeld))
        return std::nullopt;
    return oHeld;
}

// Tried with a second opening of the file: some file systems take locks and tell nobody, on some the lock of writers
// keeps readers from theirs.
bool File::CanSeeLocks() const
{
    if (!moSeesLocks)
    {
        const std::string path = "/proc/self/fd/" + std::to_string(mnDescriptor);
        const int nReader = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
        struct flock oLock = MakeLock(F_WRLCK, TRIED_ROOT, 1);
        moSeesLocks = nReader >= 0 && SetLock(nReader, F_RDLCK, TRIED_ROOT) &&
                      ::fcntl(mnDescriptor, F_OFD_GETLK, &oLock) == 0 && oLock.l_type == F_RDLCK;
        if (nReader >= 0)
            ::close(nReader);
    }
    return *moSeesLocks;
}

void File::EndWriting() noexcept
{
    const Change oChange(*this);
    ::flock(mnDescriptor, LOCK_UN);
}

// The folder is flushed as well as the system lets it: not every file system has that.
void File::Rename(const std::string& fileName, bool bReplace, const Place& oPlace)
{
    // Who may read and write a file does not change with what it holds.
    struct stat oStatus = {};
    if (bReplace && ::stat(fileName.c_str(), &oStatus) == 0)
        ::fchmod(mnDescriptor, oStatus.st_mode & 07777);
    int nError = 0;
    if (!bReplace)
        nError = RenameToFree(moPath.c_str(), fileName.c_str());
    else if (std::rename(moPath.c_str(), fileName.c_str()) != 0)
        nError = errno;
    if (nError == EEXIST && !bReplace)
        ThrowNameTaken(fileName, oPlace);
    if (nError != 0)
        throw IOException(fileName, fileName + ": cannot be put in its place: " + SystemErrorText(nError), oPlace);
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
