#pragma once

#include "plugins/support/file/file.h"
#include "plugins/support/file/newfile.h"

#include <functional>
#include <memory>
#include <string>
#include <utility>

namespace krv::plugins::support
{

// The life of a file that is written. What changes is the file's after Synchronize or Finish; a new file has its name
// only then, so that it is whole or absent, and one that is discarded before is removed. A format derives from it and
// says what there is to store. One thread at a time.
// Belongs to a Dataset, whose Synchronize, Close and destructor call Synchronize, Finish and Discard.
class FileWriter
{
public:
    // A new file, which MakeFile makes.
    explicit FileWriter(const std::string& fileName);
    // An existing one, open for it.
    explicit FileWriter(std::shared_ptr<File> poFile);
    // A derived class discards what it has not stored.
    virtual ~FileWriter();
    FileWriter(const FileWriter&) = delete;
    FileWriter& operator=(const FileWriter&) = delete;

    const std::string& GetFileName() const { return moFileName; }
    // Null before a new file is made.
    const std::shared_ptr<File>& GetFile() const { return mpoFile; }

    // False for a new file before its image is laid out.
    bool HasFile() const { return mpoFile != nullptr; }
    // Whether the file lies under its own name.
    bool IsNamed() const { return mbNamed; }

    // Nothing can be written any more.
    bool IsEnded() const { return mbEnded; }
    // A new file takes its name only when nobody has it.
    void KeepExisting() { mbReplaces = false; }
    // Asked while what was written is brought to the disk, as long as that can be undone.
    void SetWatch(File::Watch oWatch) { moWatch = std::move(oWatch); }
    // Throws DataException when writing has ended.
    void CheckWritable(const Place& oPlace = Place::Current()) const;
    // Whether something would be lost if the writer went now.
    bool HasUnsaved() const { return !mbEnded && HasFile() && (!mbNamed || HoldsChanges()); }

    // Stores, and gives a new file its name. Throws what Store throws, and may be called again then.
    void Synchronize();
    // The same for the last time.
    virtual void Finish();
    // Ends writing, and removes a new file that has not got its name. Reading goes on.
    virtual void Discard() noexcept;

protected:
    // Brings what changed, and what is held back, into the file and to the disk. Not called without a file.
    virtual void Store() = 0;
    // Whether Store would have anything to do.
    virtual bool HoldsChanges() const = 0;
    const File::Watch& GetWatch() const { return moWatch; }
    // Begins a part of what is watched; takes bytes of it that are done. Empty when nobody watches.
    std::function<void(std::uint64_t nBytes)> WatchPart(std::uint64_t nTotal) const;
    // Gives a new file that is whole its name.
    virtual void GiveName();
    // For a format that makes its file anew each time: oWrite fills a new one, which is flushed and takes the name.
    // What GetFile gives stays.
    void StoreAnew(const std::function<void(File&)>& oWrite);

    // Throws as NewFile.
    void MakeFile();
    // In place of it: a file without a name for what is written, in the folder of scratch files, of which Store makes
    // that which takes the name. Throws as NewFile when that could not be made.
    void MakeScratch(const Place& oPlace = Place::Current());
    // Back to before MakeFile.
    void RemoveFile() noexcept;
    // Ends writing, without storing anything.
    void End();

private:
    // Whether a file of the name gives way to this one.
    bool TakesPlace() const { return mbNamed || mbReplaces; }
    // Gives one that takes the place of this file, or of an older one of the name, that name. The levels, masks and
    // tags that lie beside the name of an older one go with it: they would be taken for this one's.
    void TakeName(NewFile& oNew);

    std::string moFileName;
    std::shared_ptr<File> mpoFile;   // null before a new one is made
    std::unique_ptr<NewFile> mpoNew; // until it has its name
    File::Watch moWatch;
    bool mbNamed;           // the file lies under its own name
    bool mbReplaces = true; // an older file of the name gives way
    bool mbEnded = false;
};

} // namespace krv::plugins::support
