#pragma once

#include "plugins/gdball/pictures/vips/decoder.h"
#include "plugins/support/file/scratch.h"
#include "plugins/support/image/iblocksource.h"

#include <memory>

namespace krv::plugins::gdball
{

// The pixels of a picture in blocks of whole rows. In order from the top they are decoded as they are wanted. As soon
// as rows are wanted that have passed, decoding begins anew, and what is decoded from then on stays in a scratch file:
// no row is decoded more than twice.
class PictureSource : public support::IBlockSource
{
public:
    // Reads the head of the picture.
    explicit PictureSource(Picture oPicture);
    ~PictureSource() override;

    const support::ImageLayout& GetLayout() const override { return *mpoLayout; }
    std::string GetName() const override { return moPicture.mpoFile->GetName(); }
    support::BlockOrigin GetOrigin() const override;
    void ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override;

    const Picture& GetPicture() const { return moPicture; }
    // What its head says, as long as nothing was decoded.
    VipsImage& GetHead() const { return mpoDecoder->GetImage(); }

private:
    void KeepRows(unsigned int nBefore);
    Decoder& GetDecoder(unsigned int nRow);

    Picture moPicture;
    std::unique_ptr<Decoder> mpoDecoder;
    std::unique_ptr<support::ImageLayout> mpoLayout;
    bool mbChecked = false;
    std::shared_ptr<support::File> mpoKept; // the rows before mnKept
    unsigned int mnKept = 0;
    support::Scratch moScratch;
};

} // namespace krv::plugins::gdball
