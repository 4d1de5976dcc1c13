#pragma once

#include "plugins/support/file/scratch.h"
#include "toolkit/cache/filestamp.h"
#include "toolkit/exceptions/place.h"

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <source_location>
#include <string>
#include <vector>

namespace krv::plugins::support
{

// An open file that is read and written at given offsets, without mapping and without a position of its own. A file is
// written by one object at a time, of all programs; readers are not held up. Every
// failure is an exception that names the file and the cause, a file that became shorter meanwhile included. A file may
// be read by several threads.
// Example: File oFile("a.tif", File::Mode::eRead); unsigned char aHeader[8]; oFile.Read(0, aHeader, sizeof aHeader);
class File
{
public:
    // eUpdate and eCreate lock the file against other writers for as long as the object lives, or until EndWriting.
    enum class Mode
    {
        eRead,   // an existing file
        eUpdate, // an existing file, to be written too
        eCreate, // a new or emptied file
        eScratch // a new file without a name, in the folder of the given name: it goes with the object, or the program
    };

    // Throws FileNotFoundException when there is no such file, IOException when it cannot be opened, is no plain file
    // or is being written by somebody else.
    File(const std::string& fileName, Mode eMode, const Place& oPlace = Place::Current());
    ~File();
    File(const File&) = delete;
    File& operator=(const File&) = delete;

    // What transfers take in place of a Place, which costs memory and is made only when something is thrown.
    using Location = std::source_location;

    // As it was given, or as ShowAs says.
    const std::string& GetName() const { return moName; }
    // The size at the moment of opening; writing beyond the end raises it.
    // Offsets from files are compared with this before anything is read or allocated.
    std::uint64_t GetSize() const { return mnSize; }

    // What the file was when it was opened for reading; nothing when others that open it may not go by that: it is
    // written here, or was changed less than two seconds before.
    const std::optional<krv::cache::FileStamp>& GetStamp() const { return moStamp; }
    // Whether it is still that.
    // One call of the system.
    bool IsAsOpened() const;

    // Reads exactly nBytes. Throws IOException when the file ends before.
    // nOffset: bytes from the beginning. Several threads may read one object.
    void Read(std::uint64_t nOffset, void* pTarget, std::size_t nBytes, Location oLocation = Location::current()) const;

    // Reads up to nBytes and returns how many there were: fewer only at the end of the file.
    // Throws IOException for failures other than the end of the file.
    std::size_t ReadUpTo(std::uint64_t nOffset, void* pTarget, std::size_t nBytes,
                         Location oLocation = Location::current()) const;

    // Reads nRows rows of nRowBytes that lie nStoredPitch bytes apart in the file, into rows nPitch bytes apart, with
    // as few calls to the system as pays; what lies between the rows of the target stays untouched.
    void ReadRows(std::uint64_t nOffset, std::size_t nStoredPitch, std::size_t nRowBytes, std::size_t nRows,
                  unsigned char* pTarget, std::size_t nPitch, Scratch& oScratch,
                  Location oLocation = Location::current()) const;

    // Throws IOException when the disk is full, the file may not be written or it is not open for it. May write a part
    // before.
    void Write(std::uint64_t nOffset, const void* pSource, std::size_t nBytes,
               Location oLocation = Location::current());

    // Rows of nRowBytes, nPitch bytes apart at pSource, are written nStoredPitch bytes apart; what lies between stays.
    void WriteRows(std::uint64_t nOffset, std::size_t nStoredPitch, std::size_t nRowBytes, std::size_t nRows,
                   const unsigned char* pSource, std::size_t nPitch, Location oLocation = Location::current());

    // Whether reading waits for a disk or a network, as far as the last transfer of some size tells.
    bool IsSlow() const { return mbSlow.load(std::memory_order_relaxed); }
    // Tells the system what will be read soon: it may fetch it meanwhile.
    void Foresee(std::uint64_t nOffset, std::uint64_t nBytes) const noexcept;

    // Makes sure that what was written reaches the disk. Throws when the file lost its name meanwhile: nobody would
    // find it again.
    // Takes as long as the disk needs, so that formats call it for whole states and not for blocks.
    void Flush(const Place& oPlace = Place::Current());
    // The same in pieces, after each of which oWatch gets the bytes that are there and all. What it throws passes; then
    // nothing is certain to be on the disk.
    using Watch = std::function<void(std::uint64_t nDone, std::uint64_t nTotal)>;
    void Flush(const Watch& oWatch, const Place& oPlace = Place::Current());
    // Has the system begin with what was written there: Flush has the less to wait for.
    void BeginFlush(std::uint64_t nOffset, std::uint64_t nBytes) const noexcept;

    // Cuts off what this object wrote behind nBytes, unless somebody else wrote there too. Failures leave the file as
    // it is.
    void CutBack(std::uint64_t nBytes) noexcept;

    // Tells writers that this object reads the state of the file that a root names: its place, or another number below
    // 2^62. Until another one is held, or the object goes. Returns false where the file system has no locks. What is
    // read is of that state if the root is the file's still after the call; see HoldRoot.
    bool Hold(std::uint64_t nRoot) noexcept;
    // The roots that others hold, in this process or another; no value where that cannot be known.
    std::optional<std::vector<std::uint64_t>> FindHeld() const;

    // Nothing more is written: others may. Reading goes on.
    void EndWriting() noexcept;

    // From now on messages, and GetName, name the file otherwise.
    void ShowAs(const std::string& fileName) { moName = fileName; }

    // Gives the file another name in the same file system and makes sure that it reaches the disk. A file of that name
    // is replaced, and its permissions are taken over; unless bReplace is set it stays, and IOException says so.
    void Rename(const std::string& fileName, bool bReplace, const Place& oPlace = Place::Current());

private:
    // Tells the process of a change, before and after.
    class Change;

    bool CanSeeLocks() const;

    std::string moName;
    std::string moPath;       // the file's, whatever messages call it
    int mnDescriptor = -1;    // owned
    std::uint64_t mnSize = 0; // bytes
    std::uint64_t mnDevice = 0;
    std::uint64_t mnInode = 0;
    std::optional<krv::cache::FileStamp> moStamp;
    mutable std::atomic<bool> mbSlow{false};
    bool mbLinked = false;               // some file systems do not count names
    std::optional<std::uint64_t> moHeld; // the root that is held
    mutable std::optional<bool> moSeesLocks;
};

// Holds the state that a file is in. oReadRoot: reads the root from the file, as often as a writer changes it just now;
// what was read last is held.
template <typename ReadRoot>
void HoldRoot(File& oFile, ReadRoot oReadRoot)
{
    std::uint64_t nRoot = oReadRoot();
    while (oFile.Hold(nRoot))
    {
        const std::uint64_t nNow = oReadRoot();
        if (nNow == nRoot)
            return;
        nRoot = nNow;
    }
}

// Throws the IOException that a file has the name, which is not to be replaced.
[[noreturn]] void ThrowNameTaken(const std::string& fileName, const Place& oPlace);

// The text of an error number, in the C locale.
std::string SystemErrorText(int nError);

} // namespace krv::plugins::support
