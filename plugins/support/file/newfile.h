#pragma once

#include "plugins/support/file/file.h"

#include <memory>
#include <string>

namespace krv::plugins::support
{

// A name in the folder of a file, of this process alone and of no length that a folder does not take.
// Another one with each call. Nothing is made.
std::string MakeTemporaryName(const std::string& fileName);

// A file that comes into being: under a temporary name in its folder, of this process alone, until it is whole and
// takes its own. One that goes before is removed. The temporary name is .NAME.PROCESS.COUNT.part: so it lies on the
// file system of its name, is cleared away by hand after a crash, and is taken for an image by nobody.
// Not moved, not copied: it removes what it made.
class NewFile
{
public:
    // bReplaces: whether a file of the name may be replaced. Throws FileNotFoundException when there is no such folder,
    // and IOException when the folder must not be written, when a folder, a device or the like has the name, or a file
    // that must not be written or replaced.
    NewFile(const std::string& fileName, bool bReplaces, const Place& oPlace = Place::Current());
    ~NewFile();
    NewFile(const NewFile&) = delete;
    NewFile& operator=(const NewFile&) = delete;

    // Open for writing and empty at first. Whoever shares it may go on reading after this object went.
    const std::shared_ptr<File>& GetFile() const { return mpoFile; }
    // As File::Rename. After a failure the file is as it was before.
    void TakeName(bool bReplaces, const Place& oPlace = Place::Current());

private:
    std::string moFileName;
    std::string moTemporary;       // empty when it has its name
    std::shared_ptr<File> mpoFile; // open since the constructor
};

} // namespace krv::plugins::support
