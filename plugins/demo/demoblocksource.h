#pragma once

#include "plugins/support/file.h"
#include "plugins/support/iblocksource.h"

#include <memory>

namespace krv::plugins::demo
{

// The pixels: one plane per channel. Blocks are mere rectangles of it, which the file does not store as such.
class DemoBlockSource : public support::IBlockSource
{
public:
    // nOffset: of the first pixel. Throws krv::FileFormatException when the file ends before the last one.
    DemoBlockSource(std::unique_ptr<support::File> poFile, const support::ImageLayout& oLayout, std::uint64_t nOffset);

    const support::ImageLayout& GetLayout() const override { return moLayout; }
    std::string GetName() const override { return mpoFile->GetName(); }
    bool ReadsParts() const override { return true; }
    void ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override;

private:
    std::unique_ptr<support::File> mpoFile;
    support::ImageLayout moLayout;
    std::vector<std::uint64_t> moOffsets; // of each plane
    support::Scratch moScratch;
};

} // namespace krv::plugins::demo
