#pragma once

#include "plugins/demo/demoheader.h"
#include "plugins/support/file/file.h"

#include <memory>

namespace krv::plugins::demo
{

// A file of the format: opened for reading, or new. A new file lies under a temporary name in its folder and takes its
// own name, and the place of a file that had it, at the first Finish. Pixels that are written after a Finish go into
// the file itself, which is marked as unfinished until the next one.
class DemoFile
{
public:
    // Throws krv::FileFormatException when the header is not whole.
    explicit DemoFile(const std::string& fileName);
    // Pixels that are never written are 0. bReplace: takes the place of a file of the name.
    DemoFile(const std::string& fileName, DemoHeader oHeader, bool bReplace);
    // As Discard.
    ~DemoFile();
    DemoFile(const DemoFile&) = delete;
    DemoFile& operator=(const DemoFile&) = delete;

    const DemoHeader& GetHeader() const { return moHeader; }
    bool IsWritable() const { return mbWritable; }
    // Whether the file has its own name.
    bool IsNamed() const { return moTemporary.empty(); }
    // Whether something is not finished.
    bool IsChanged() const { return mbWritable && (mbMarked || mbNewTags); }
    // Of the first pixel.
    std::uint64_t GetPixelOffset() const { return mnPixelOffset; }
    const support::File& GetFile() const { return *mpoFile; }

    // Throw krv::DataException when the file is not writable. SetTags: also when they do not fit; nothing changes then.
    void SetTags(const krv::datasources::AuxiliaryData& oTags);
    void WriteRows(std::uint64_t nOffset, std::size_t nStoredPitch, std::size_t nRowBytes, std::size_t nRows,
                   const unsigned char* pSource, std::size_t nPitch);
    // Brings all that was written to the disk, then makes the file valid.
    void Finish();
    // No more writing. What has no name yet is removed; what was written since the last Finish leaves the file marked.
    void Discard() noexcept;

private:
    void CheckWritable() const;
    void BeginChange();

    std::unique_ptr<support::File> mpoFile;
    DemoHeader moHeader;
    std::uint64_t mnPixelOffset = 0;
    std::string moFileName;
    std::string moTemporary; // empty when the file has its own name
    bool mbWritable = false;
    bool mbReplace = true;
    bool mbMarked = false;  // the file says that it is unfinished
    bool mbNewTags = false; // the header in the file is not moHeader
};

} // namespace krv::plugins::demo
