#include "plugins/demo/demofile.h"

#include "toolkit/exceptions/exceptions.h"

#include <cstdio>

namespace krv::plugins::demo
{

DemoFile::DemoFile(const std::string& fileName)
    : mpoFile(std::make_unique<support::File>(fileName, support::File::Mode::eRead)), moFileName(fileName)
{
    std::string bytes(DemoHeader::MAX_BYTES, '\0');
    bytes.resize(mpoFile->ReadUpTo(0, bytes.data(), bytes.size()));
    moHeader = DemoHeader::Parse(fileName, bytes, mnPixelOffset);
}

DemoFile::DemoFile(const std::string& fileName, DemoHeader oHeader, bool bReplace)
    : moHeader(std::move(oHeader)), mnPixelOffset(DemoHeader::MAX_BYTES), moFileName(fileName), mbWritable(true),
      mbReplace(bReplace), mbMarked(true)
{
    std::string text = moHeader.ToText(fileName);
    const std::uint64_t nPixelBytes = moHeader.GetPixelBytes();
    text.replace(0, DemoHeader::UNFINISHED.size(), DemoHeader::UNFINISHED);
    moTemporary = support::MakeTemporaryName(fileName, bReplace);
    try
    {
        mpoFile = std::make_unique<support::File>(moTemporary, support::File::Mode::eCreate);
        mpoFile->ShowAs(fileName);
        mpoFile->Write(0, text.data(), text.size());
        mpoFile->Write(mnPixelOffset + nPixelBytes - 1, "", 1);
    }
    catch (...)
    {
        Discard();
        throw;
    }
}

DemoFile::~DemoFile()
{
    Discard();
}

void DemoFile::Discard() noexcept
{
    mbWritable = false;
    if (mpoFile != nullptr && !moTemporary.empty())
        std::remove(moTemporary.c_str());
    moTemporary.clear();
}

void DemoFile::CheckWritable() const
{
    if (!mbWritable)
        throw DataException(moFileName + ": the file is not open for writing");
}

void DemoFile::SetTags(const krv::datasources::AuxiliaryData& oTags)
{
    CheckWritable();
    DemoHeader oHeader = moHeader;
    oHeader.moTags = oTags;
    static_cast<void>(oHeader.ToText(moFileName));
    moHeader = std::move(oHeader);
    mbNewTags = true;
}

// The mark reaches the disk before anything that it warns of.
void DemoFile::BeginChange()
{
    if (mbMarked)
        return;
    mpoFile->Write(0, DemoHeader::UNFINISHED.data(), DemoHeader::UNFINISHED.size());
    mpoFile->Flush();
    mbMarked = true;
}

void DemoFile::WriteRows(std::uint64_t nOffset, std::size_t nStoredPitch, std::size_t nRowBytes, std::size_t nRows,
                         const unsigned char* pSource, std::size_t nPitch)
{
    CheckWritable();
    BeginChange();
    mpoFile->WriteRows(nOffset, nStoredPitch, nRowBytes, nRows, pSource, nPitch);
}

// A header can tear when the machine stops, so the mark stands until the rest of it is on the disk.
void DemoFile::Finish()
{
    CheckWritable();
    if (!mbMarked && !mbNewTags)
        return;
    BeginChange();
    if (mbNewTags)
    {
        const std::string text = moHeader.ToText(moFileName).substr(DemoHeader::SIGNATURE.size());
        mpoFile->Write(DemoHeader::SIGNATURE.size(), text.data(), text.size());
    }
    mpoFile->Flush();
    mpoFile->Write(0, DemoHeader::SIGNATURE.data(), DemoHeader::SIGNATURE.size());
    mpoFile->Flush();
    if (!moTemporary.empty())
        mpoFile->Rename(moFileName, mbReplace);
    moTemporary.clear();
    mbMarked = false;
    mbNewTags = false;
}

} // namespace krv::plugins::demo
