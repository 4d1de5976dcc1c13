#include "plugins/raw/rawwriter.h"

#include "plugins/support/writing/setaside.h"
#include "toolkit/exceptions/exceptions.h"

#include <utility>

namespace krv::plugins::raw
{

RawWriter::RawWriter(const std::string& fileName, const std::string& headerName)
    : FileWriter(fileName), moHeaderName(headerName)
{
}

RawWriter::RawWriter(std::shared_ptr<support::File> poFile, const std::string& headerName)
    : FileWriter(std::move(poFile)), moHeaderName(headerName)
{
}

RawWriter::~RawWriter() = default;

void RawWriter::Make(std::uint64_t nBytes)
{
    MakeFile();
    try
    {
        GetFile()->Write(nBytes - 1, "", 1);
        mbPixels = true;
    }
    catch (...)
    {
        RemoveFile();
        throw;
    }
}

void RawWriter::SetHeader(const std::string& text)
{
    CheckWritable();
    moHeader = text;
    mbHeader = true;
}

void RawWriter::BeginChange()
{
    CheckWritable();
    mbPixels = true;
}

std::unique_ptr<support::NewFile> RawWriter::MakeHeader() const
{
    auto poNew = std::make_unique<support::NewFile>(moHeaderName, true);
    poNew->GetFile()->Write(0, moHeader.data(), moHeader.size());
    poNew->GetFile()->Flush();
    return poNew;
}

void RawWriter::Store()
{
    if (mbPixels)
        GetFile()->Flush(GetWatch());
    mbPixels = false;
    if (!mbHeader || !IsNamed())
        return;
    MakeHeader()->TakeName(true);
    mbHeader = false;
}

// A header beside pixels of another file would be taken for theirs: the old one goes first, the new one comes last.
void RawWriter::GiveName()
{
    const auto poHeader = MakeHeader();
    support::SetAside oOld({moHeaderName});
    FileWriter::GiveName();
    oOld.Drop();
    poHeader->TakeName(true);
    mbHeader = false;
}

} // namespace krv::plugins::raw
