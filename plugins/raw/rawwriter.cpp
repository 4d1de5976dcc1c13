#include "plugins/raw/rawwriter.h"

#include "toolkit/exceptions/exceptions.h"

#include <cstdio>
#include <utility>

namespace krv::plugins::raw
{

namespace
{

// An old file out of the way of a new one: back in its place unless the new one is there.
class SetAside
{
public:
    explicit SetAside(const std::string& fileName) : moFileName(fileName), moAside(fileName + ".part")
    {
        mbMoved = std::rename(moFileName.c_str(), moAside.c_str()) == 0;
    }
    SetAside(const SetAside&) = delete;
    SetAside& operator=(const SetAside&) = delete;
    ~SetAside()
    {
        if (mbMoved)
            std::rename(moAside.c_str(), moFileName.c_str());
    }

    void Drop()
    {
        if (std::exchange(mbMoved, false))
            std::remove(moAside.c_str());
    }

private:
    std::string moFileName;
    std::string moAside;
    bool mbMoved;
};

} // namespace

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
        GetFile()->Flush();
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
    SetAside oOld(moHeaderName);
    FileWriter::GiveName();
    oOld.Drop();
    poHeader->TakeName(true);
    mbHeader = false;
}

} // namespace krv::plugins::raw
