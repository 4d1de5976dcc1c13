#include "plugins/support/writing/filewriter.h"

#include "plugins/support/file/scratchfile.h"
#include "toolkit/exceptions/exceptions.h"

#include <utility>

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

void FileWriter::SetNamed()
{
    mpoNew.reset();
    mbNamed = true;
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
    mpoNew->TakeName(mbReplaces);
    SetNamed();
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
