#include "plugins/support/writing/headedfile.h"

#include "toolkit/exceptions/exceptions.h"

#include <utility>

namespace krv::plugins::support
{

namespace
{

constexpr std::size_t MOST_HEADER_BYTES = 65536;

} // namespace

HeadedFile::HeadedFile(const std::string& fileName, const FirstLines& oFirstLines)
    : FileWriter(fileName), moFirstLines(oFirstLines), mnHeaderBytes(MOST_HEADER_BYTES)
{
}

HeadedFile::HeadedFile(std::shared_ptr<File> poFile, const FirstLines& oFirstLines)
    : FileWriter(std::move(poFile)), moFirstLines(oFirstLines)
{
    std::string bytes(MOST_HEADER_BYTES, '\0');
    bytes.resize(GetFile()->ReadUpTo(0, bytes.data(), bytes.size()));
    const std::size_t nEnd = bytes.find("\n\n");
    if (bytes.starts_with(moFirstLines.moUnfinished))
        throw FileFormatException(GetFileName(), GetFileName() + " was not written to its end");
    if (!bytes.starts_with(moFirstLines.moFinished) || nEnd == std::string::npos)
        throw FileFormatException(GetFileName(), GetFileName() + " has no complete header");
    mnHeaderBytes = nEnd + 2;
    moHeader = bytes.substr(moFirstLines.moFinished.size(), nEnd + 1 - moFirstLines.moFinished.size());
}

HeadedFile::~HeadedFile() = default;

std::istringstream HeadedFile::ReadHeader() const
{
    std::istringstream oLines(moHeader);
    oLines.imbue(std::locale::classic());
    return oLines;
}

void HeadedFile::Make(const std::string& header, std::uint64_t nBytes)
{
    MakeFile();
    try
    {
        SetHeader(header);
        GetFile()->Write(mnHeaderBytes - 1, "", 1);
        Append(nBytes);
    }
    catch (...)
    {
        RemoveFile();
        throw;
    }
}

void HeadedFile::SetHeader(const std::string& header)
{
    const std::size_t nBytes = moFirstLines.moFinished.size() + header.size();
    if (nBytes > mnHeaderBytes - 3)
        throw DataException(GetFileName() + ": channels and metadata take " + std::to_string(nBytes) +
                            " bytes, more than the " + std::to_string(mnHeaderBytes) + " of a header");
    BeginChange();
    moHeader = header + std::string(mnHeaderBytes - 2 - nBytes, ' ') + "\n\n";
}

void HeadedFile::BeginChange()
{
    CheckWritable();
    if (mbMarked)
        return;
    mbChanged = true; // a mark that did not reach the disk for certain is still one to take away
    GetFile()->Write(0, moFirstLines.moUnfinished.data(), moFirstLines.moUnfinished.size());
    GetFile()->Flush();
    mbMarked = true;
}

std::uint64_t HeadedFile::Append(std::uint64_t nBytes)
{
    BeginChange();
    const std::uint64_t nOffset = GetFile()->GetSize();
    GetFile()->Write(nOffset + nBytes - 1, "", 1);
    return nOffset;
}

// A header can tear when the machine stops, so the mark stands until the rest of it is on the disk.
void HeadedFile::Store()
{
    if (!mbChanged)
        return;
    GetFile()->Write(moFirstLines.moFinished.size(), moHeader.data(), moHeader.size());
    GetFile()->Flush(GetWatch());
    GetFile()->Write(0, moFirstLines.moFinished.data(), moFirstLines.moFinished.size());
    GetFile()->Flush();
    mbMarked = false;
    mbChanged = false;
}

} // namespace krv::plugins::support
