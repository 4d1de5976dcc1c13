#include "plugins/support/writing/filewriter.h"

#include "plugins/support/file/scratchfile.h"
#include "plugins/support/sidecar/sidecarfile.h"
#include "plugins/support/writing/setaside.h"
#include "toolkit/exceptions/exceptions.h"

#include <utility>

#include <sys/stat.h>

namespace krv::plugins::support
{

FileWriter::FileWriter(const std::string& fileName) : moFileName(fileName), mbNamed(false) {}

FileWriter::FileWriter(std::shared_ptr<File> poFile)
    : moFileName(poFile->GetName()), mpoFile(std::move(poFile)), mbNamed(true)
{
}

FileWriter::~FileWriter() = default;

void FileWriter::CheckWritable(const Place& oPlace) const
{
    if (mbEnded)
        throw DataException(moFileName + ": the dataset is closed", oPlace);
}

void FileWriter::MakeFile()
{
    mpoNew = std::make_unique<NewFile>(moFileName, mbReplaces);
    mpoFile = mpoNew->GetFile();
}

void FileWriter::MakeScratch(const Place& oPlace)
{
    const NewFile oTrial(moFileName, mbReplaces, oPlace);
    mpoFile = MakeScratchFile(moFileName, oPlace);
}

void FileWriter::RemoveFile() noexcept
{
    mpoFile.reset();
    mpoNew.reset();
}

std::function<void(std::uint64_t nBytes)> FileWriter::WatchPart(std::uint64_t nTotal) const
{
    if (!moWatch)
        return {};
    moWatch(0, nTotal);
    return [this, nTotal, nDone = std::uint64_t{0}](std::uint64_t nBytes) mutable
    {
        nDone += nBytes;
        moWatch(nDone, nTotal);
    };
}

void FileWriter::StoreAnew(const std::function<void(File&)>& oWrite)
{
    NewFile oNew(moFileName, TakesPlace());
    oWrite(*oNew.GetFile());
    oNew.GetFile()->Flush(moWatch);
    TakeName(oNew);
}

void FileWriter::Synchronize()
{
    CheckWritable();
    if (!HasFile())
        return;
    Store();
    if (!mbNamed)
        GiveName();
}

void FileWriter::GiveName()
{
    TakeName(*mpoNew);
}

void FileWriter::TakeName(NewFile& oNew)
{
    struct stat oStatus = {};
    const bool bTaken = !TakesPlace() && ::lstat(moFileName.c_str(), &oStatus) == 0; // which is told below
    SetAside oOld(mbNamed || bTaken ? std::vector<std::string>() : ListCompanions(moFileName));
    oNew.TakeName(TakesPlace());
    oOld.Drop();
    mpoNew.reset();
    mbNamed = true;
}

void FileWriter::Finish()
{
    Synchronize();
    End();
}

void FileWriter::End()
{
    mbEnded = true;
    if (mpoFile)
        mpoFile->EndWriting();
}

void FileWriter::Discard() noexcept
{
    End();
    mpoNew.reset();
}

} // namespace krv::plugins::support
