#include "plugins/krvdsk/store/storefile.h"

#include "plugins/krvdsk/store/bytes.h"
#include "plugins/support/codec/checksum.h"
#include "plugins/support/file/numbers.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cstring>
#include <utility>

namespace krv::plugins::krvdsk
{

static_assert(std::endian::native == std::endian::little, "values would have to be swapped");

namespace
{

constexpr std::string_view ROOT_NAME = "ROOT";
constexpr std::size_t CHECKED_BYTES = Root::BYTES - 4;
// What was read lies in the processor's second cache still.
constexpr std::size_t SUMMED_BYTES = std::size_t{256} << 10;

std::string VersionText(unsigned int nVersion, unsigned int nRevision)
{
    return std::to_string(nVersion) + "." + std::to_string(nRevision);
}

} // namespace

std::vector<unsigned char> Root::Make() const
{
    BytesWriter oWriter;
    oWriter.GetBytes().assign(ROOT_NAME.begin(), ROOT_NAME.end());
    oWriter.AddNumber(mnVersion, 2);
    oWriter.AddNumber(mnRevision, 2);
    oWriter.AddNumber(mnGeneration, 8);
    oWriter.AddNumber(mnFileBytes, 8);
    oWriter.AddEntry(moDirectory);
    oWriter.GetBytes().resize(CHECKED_BYTES);
    oWriter.AddNumber(codec::Checksum(0, oWriter.GetBytes().data(), CHECKED_BYTES), 4);
    return std::move(oWriter.GetBytes());
}

std::optional<Root> Root::Parse(const unsigned char* pBytes)
{
    if (std::memcmp(pBytes, ROOT_NAME.data(), ROOT_NAME.size()) != 0 ||
        support::ReadNumber(pBytes + CHECKED_BYTES, 4, false) != codec::Checksum(0, pBytes, CHECKED_BYTES))
        return std::nullopt;
    BytesReader oReader({pBytes + ROOT_NAME.size(), BYTES - ROOT_NAME.size()}, "", "");
    Root oRoot;
    oRoot.mnVersion = static_cast<std::uint16_t>(oReader.ReadNumber(2));
    oRoot.mnRevision = static_cast<std::uint16_t>(oReader.ReadNumber(2));
    oRoot.mnGeneration = oReader.ReadNumber(8);
    oRoot.mnFileBytes = oReader.ReadNumber(8);
    oRoot.moDirectory = oReader.ReadEntry();
    return oRoot;
}

Root Root::Read(const support::File& oFile)
{
    const std::string& name = oFile.GetName();
    std::array<unsigned char, SECOND_SLOT + BYTES> oBytes{};
    const std::size_t nBytes = oFile.ReadUpTo(0, oBytes.data(), oBytes.size());
    if (nBytes < SIGNATURE.size() || std::memcmp(oBytes.data(), SIGNATURE.data(), SIGNATURE.size()) != 0)
        throw FileFormatException(name, name + ": does not begin as a native file does");
    std::optional<Root> oNewest;
    for (const std::uint64_t nSlot : {FIRST_SLOT, SECOND_SLOT})
    {
        const std::optional<Root> oRoot = Parse(oBytes.data() + nSlot);
        if (oRoot && oRoot->GetSlot() == nSlot && (!oNewest || oRoot->mnGeneration > oNewest->mnGeneration))
            oNewest = oRoot;
    }
    if (!oNewest)
        throw FileFormatException(name, name + ": neither of its two roots is whole");
    if (oNewest->mnVersion > FORMAT_VERSION)
        throw FileFormatException(
            name, name + ": is of version " + VersionText(oNewest->mnVersion, oNewest->mnRevision) +
                      " of the format; this program reads those up to " + VersionText(FORMAT_VERSION, FORMAT_REVISION));
    return *oNewest;
}

std::shared_ptr<StoreFile> StoreFile::Open(const std::shared_ptr<support::File>& poFile)
{
    Root oRoot;
    const auto ReadRoot = [&]
    {
        oRoot = Root::Read(*poFile);
        return oRoot.mnGeneration;
    };
    support::HoldRoot(*poFile, ReadRoot);
    return std::make_shared<StoreFile>(poFile, oRoot);
}

// Asked for its last byte, since the file may have grown after it was opened.
StoreFile::StoreFile(std::shared_ptr<support::File> poFile, const Root& oRoot)
    : mpoFile(std::move(poFile)), moRoot(oRoot), mnEnd(oRoot.mnFileBytes)
{
    unsigned char nLast = 0;
    if (mnEnd < Root::FIRST_PIECE || mpoFile->ReadUpTo(mnEnd - 1, &nLast, 1) != 1)
        Fail("the file is truncated: " + std::to_string(mnEnd) + " bytes belong to it");
}

void StoreFile::Fail(const std::string& what) const
{
    throw FileFormatException(GetName(), GetName() + ": " + what);
}

void StoreFile::CheckPlace(const Entry& oEntry, const std::string& what) const
{
    if (oEntry.mnOffset < Root::FIRST_PIECE || oEntry.mnOffset > mnEnd || oEntry.mnBytes > mnEnd - oEntry.mnOffset ||
        oEntry.mnBytes == 0)
        Fail(what + " is damaged: " + std::to_string(oEntry.mnBytes) + " bytes at offset " +
             std::to_string(oEntry.mnOffset) + " lie outside of the file");
}

std::uint32_t StoreFile::ReadSummed(std::uint64_t nOffset, unsigned char* pTarget, std::size_t nBytes) const
{
    std::uint32_t nChecksum = 0;
    for (std::size_t nAt = 0; nAt < nBytes; nAt += SUMMED_BYTES)
    {
        const std::size_t nPart = std::min(SUMMED_BYTES, nBytes - nAt);
        mpoFile->Read(nOffset + nAt, pTarget + nAt, nPart);
        nChecksum = codec::Checksum(nChecksum, pTarget + nAt, nPart);
    }
    return nChecksum;
}

std::vector<unsigned char> StoreFile::Read(const Entry& oEntry, const std::string& what) const
{
    CheckPlace(oEntry, what);
    if (oEntry.mnBytes > LARGEST_RECORD)
        Fail(what + " is damaged: " + std::to_string(oEntry.mnBytes) + " bytes are too many");
    std::vector<unsigned char> oBytes(oEntry.mnBytes);
    if (ReadSummed(oEntry.mnOffset, oBytes.data(), oBytes.size()) != oEntry.mnChecksum)
        Fail(what + " is damaged: the checksum of the bytes at offset " + std::to_string(oEntry.mnOffset) +
             " is wrong");
    return oBytes;
}

} // namespace krv::plugins::krvdsk
