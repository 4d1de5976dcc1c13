#include "plugins/krvdsk/store/bytes.h"

#include "plugins/support/file/numbers.h"
#include "toolkit/exceptions/exceptions.h"

#include <bit>

namespace krv::plugins::krvdsk
{

namespace
{

constexpr std::size_t NAME_BYTES = 4;

} // namespace

void BytesWriter::AddNumber(std::uint64_t nValue, std::size_t nBytes)
{
    support::AppendNumber(moBytes, nValue, nBytes, false);
}

void BytesWriter::AddReal(double nValue)
{
    AddNumber(std::bit_cast<std::uint64_t>(nValue), 8);
}

void BytesWriter::AddText(const std::string& text)
{
    AddNumber(text.size(), 8);
    moBytes.insert(moBytes.end(), text.begin(), text.end());
}

void BytesWriter::AddEntry(const Entry& oEntry)
{
    AddNumber(oEntry.mnOffset, 8);
    AddNumber(oEntry.mnBytes, 4);
    AddNumber(oEntry.mnChecksum, 4);
}

void BytesWriter::AddItem(std::string_view name, const std::vector<unsigned char>& oBytes)
{
    if (oBytes.size() > UINT32_MAX)
        throw DataException("A part of the file's directory would be larger than 4 GiB");
    moBytes.insert(moBytes.end(), name.begin(), name.end());
    AddNumber(oBytes.size(), 4);
    moBytes.insert(moBytes.end(), oBytes.begin(), oBytes.end());
}

BytesReader::BytesReader(std::span<const unsigned char> oBytes, const std::string& fileName, const std::string& what)
    : moLeft(oBytes), moFileName(fileName), moWhat(what)
{
}

void BytesReader::Fail(const std::string& cause) const
{
    throw FileFormatException(moFileName, moFileName + ": " + moWhat + " is damaged: " + cause);
}

std::span<const unsigned char> BytesReader::ReadBytes(std::size_t nBytes)
{
    if (nBytes > moLeft.size())
        Fail("it ends too early");
    const auto oBytes = moLeft.first(nBytes);
    moLeft = moLeft.subspan(nBytes);
    return oBytes;
}

std::uint64_t BytesReader::ReadNumber(std::size_t nBytes)
{
    return support::ReadNumber(ReadBytes(nBytes).data(), nBytes, false);
}

double BytesReader::ReadReal()
{
    return std::bit_cast<double>(ReadNumber(8));
}

std::string BytesReader::ReadText()
{
    const std::uint64_t nBytes = ReadNumber(8);
    const auto oBytes = ReadBytes(nBytes);
    return {oBytes.begin(), oBytes.end()};
}

Entry BytesReader::ReadEntry()
{
    Entry oEntry;
    oEntry.mnOffset = ReadNumber(8);
    oEntry.mnBytes = ReadCount();
    oEntry.mnChecksum = ReadCount();
    return oEntry;
}

BytesReader BytesReader::ReadItem(std::string& name)
{
    const auto oName = ReadBytes(NAME_BYTES);
    name.assign(oName.begin(), oName.end());
    const std::uint32_t nBytes = ReadCount();
    return {ReadBytes(nBytes), moFileName, moWhat};
}

} // namespace krv::plugins::krvdsk
