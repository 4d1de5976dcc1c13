#pragma once

#include "plugins/support/image/iblocksource.h"
#include "plugins/tif/reading/page.h"
#include "plugins/tif/reading/striledecoder.h"

#include <memory>
#include <vector>

namespace krv::plugins::tif
{

enum class PixelUse;

// The pixels of a page whose compressed strips are too large to be decoded as a whole: libtiff decodes them row by row.
// Blocks are some rows; reading them in the order of the file is quick, going back decodes the strip from its begin.
class RowSource : public support::IBlockSource
{
public:
    RowSource(std::shared_ptr<Page> poPage, PixelUse eUse);
    ~RowSource() override;

    const support::ImageLayout& GetLayout() const override { return moLayout; }
    void ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override;
    std::string GetName() const override { return mpoPage->GetFileName(); }

private:
    void DecodeUpTo(unsigned int nPlane, std::uint32_t nRow);
    bool IsStored(unsigned int nPlane, std::uint32_t nRow);
    void ReadRow(unsigned int nPlane, std::uint32_t nRow, unsigned char* pTarget);

    std::shared_ptr<Page> mpoPage;
    PixelUse meUse;
    support::ImageLayout moLayout;
    StrileDecoder moDecoder;
    std::vector<unsigned char> moStored;
    // Where the next row begins to be decoded.
    unsigned int mnPlane = 0;
    std::uint32_t mnNextRow = 0;
};

} // namespace krv::plugins::tif
