#pragma once

#include "plugins/demo/demofile.h"
#include "plugins/support/image/iblocksource.h"

#include <memory>

namespace krv::plugins::demo
{

// The pixels: one plane per channel. Blocks are mere rectangles of it, which the file does not store as such.
class DemoBlockSource : public support::IBlockSource
{
public:
    // Throws krv::FileFormatException when the file ends before the last pixel.
    explicit DemoBlockSource(std::shared_ptr<DemoFile> poFile);

    const support::ImageLayout& GetLayout() const override { return moLayout; }
    std::string GetName() const override { return mpoFile->GetFile().GetName(); }
    bool ReadsParts() const override { return true; }
    void ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override;
    void WriteBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, const unsigned char* pSource,
                    std::size_t nPitch) override;

private:
    static constexpr unsigned int BLOCK_SIZE = 256; // readers take it for their tiles

    static support::ImageLayout MakeLayout(const DemoHeader& oHeader);
    // Where the first pixel of a part lies in the file.
    std::uint64_t OffsetOf(const support::BlockAddress& oBlock, const support::PixelRect& oPart) const;

    std::shared_ptr<DemoFile> mpoFile;
    support::ImageLayout moLayout;
    std::vector<std::uint64_t> moOffsets; // of each plane
    support::Scratch moScratch;
};

} // namespace krv::plugins::demo
