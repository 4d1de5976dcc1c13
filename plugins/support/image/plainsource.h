#pragma once

#include "plugins/support/file/file.h"
#include "plugins/support/image/iblocksource.h"

#include <functional>
#include <memory>
#include <string>

namespace krv::plugins::support
{

// Pixels that lie in a file as they are handed out: plane after plane, rows top to bottom without gaps, values in this
// machine's byte order. Blocks are mere rectangles of it.
class PlainSource : public IBlockSource
{
public:
    // nOffset: of the first pixel. oBeforeWrite: called before each change; throws when there must be none; without it
    // the pixels are only read. Throws FileFormatException when the file ends before the last pixel.
    PlainSource(std::shared_ptr<File> poFile, std::uint64_t nOffset, ImageLayout oLayout,
                std::function<void()> oBeforeWrite = {});
    ~PlainSource() override;

    // Of all pixels. Throws DataException above 2^62.
    static std::uint64_t CountBytes(const ImageLayout& oLayout);

    const ImageLayout& GetLayout() const override { return moLayout; }
    std::string GetName() const override { return mpoFile->GetName(); }
    bool ReadsParts() const override { return true; }
    void ReadBlock(const BlockAddress& oBlock, const PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override;
    void WriteBlock(const BlockAddress& oBlock, const PixelRect& oPart, const unsigned char* pSource,
                    std::size_t nPitch) override;

private:
    std::uint64_t GetRowBytes(unsigned int nPlane) const
    {
        return moLayout.GetWidth() * moLayout.GetPixelBytes(nPlane);
    }
    // Where the first pixel of a part lies in the file.
    std::uint64_t GetOffset(const BlockAddress& oBlock, const PixelRect& oPart) const;

    std::shared_ptr<File> mpoFile;
    ImageLayout moLayout;
    std::function<void()> moBeforeWrite;
    std::vector<std::uint64_t> moOffsets; // of each plane
    Scratch moScratch;
};

} // namespace krv::plugins::support
