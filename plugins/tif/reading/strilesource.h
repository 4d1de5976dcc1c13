#pragma once

#include "plugins/support/image/iblocksource.h"
#include "plugins/tif/reading/page.h"
#include "plugins/tif/reading/striledecoder.h"

#include <memory>
#include <optional>

namespace krv::plugins::tif
{

// What the pixels of a page are read for.
enum class PixelUse
{
    eImage,
    eBitmap // every value but 0 becomes 1
};

// The pixels of a page from its strips and tiles. A block is a tile, or several strips; of strips without compression
// it is any number of rows, and any part of it is read alone. A strip or tile that is not stored reads as 0.
class StrileSource : public support::IBlockSource
{
public:
    // Throws FileFormatException for a page whose compressed strips or tiles are too large to be decoded.
    StrileSource(std::shared_ptr<Page> poPage, PixelUse eUse);
    ~StrileSource() override;

    // The largest strip or tile, as handed out or as stored, that is decoded as a whole.
    static constexpr std::uint64_t MAXIMUM_STRILE_BYTES = std::uint64_t{96} << 20;
    static std::uint64_t GetStrileBytes(const PageForm& oForm);
    // How many rows of an image in strips make a block of a sensible size.
    static std::uint32_t GetSensibleRows(const PageForm& oForm);
    static support::ImageLayout MakeLayout(const PageForm& oForm, PixelUse eUse, std::uint32_t nBlockRows);

    const support::ImageLayout& GetLayout() const override { return moLayout; }
    void ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override;
    bool ReadsParts() const override { return mbPlain; }
    // A block may be several strips.
    bool SparesParts() const override { return !moForm.mbTiled; }
    std::string GetName() const override { return mpoPage->GetFileName(); }
    support::BlockOrigin GetOrigin() const override { return MakeOrigin(*mpoPage, meUse); }
    void Expect(const support::BlockAddress& oFirst, unsigned int nBlocks) override;
    void Foresee(const support::BlockAddress& oFirst, unsigned int nBlocks) override;

    static support::BlockOrigin MakeOrigin(const Page& oPage, PixelUse eUse);

    // To be called after the file was written: what was read ahead is read anew.
    void Forget() { mnRawBytes = 0; }

private:
    // What is wanted of one strip or tile, or of strips that follow each other in the file.
    struct Piece
    {
        std::uint32_t mnStrile;
        std::uint32_t mnStoredRows;
        unsigned int mnX; // of the first wanted pixel, inside the strip or tile
        unsigned int mnY;
        WantedPixels moWanted;
        std::uint32_t mnFollowing; // strips or tiles that will be asked for next
    };

    void ReadStrips(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                    std::size_t nPitch);
    // Reads what it can at once and returns the number of rows: all of the first strip at least.
    std::uint32_t ReadPiece(const Piece& oPiece, std::uint32_t nRowsWanted);
    void ReadRows(std::uint64_t nOffset, unsigned int nX, const WantedPixels& oWanted);
    std::uint32_t ReadPlain(Piece oPiece, const Strile& oStrile, std::uint32_t nRowsWanted);
    void ReadCoded(const Piece& oPiece, const Strile& oStrile);
    unsigned char* ReadRaw(const Piece& oPiece, const Strile& oStrile);
    std::uint64_t FindEnd(std::uint32_t nStrile, std::uint32_t nFollowing, std::uint64_t nMost);
    std::uint32_t GetFirstStrile(const support::BlockAddress& oBlock) const;
    void CheckPlainBytes(const Piece& oPiece, const Strile& oStrile) const;

    std::shared_ptr<Page> mpoPage;
    const PageForm& moForm;
    PixelUse meUse;
    bool mbPlain;
    support::ImageLayout moLayout;
    StrileDecoder moDecoder;
    support::Scratch moRows;
    support::Scratch moPacked;
    support::Scratch moWide;
    // Tiles that will be asked for.
    std::uint64_t mnExpected = 0;
    std::uint64_t mnExpectedEnd = 0;
    // Stored bytes, read together with those of the strips or tiles that follow.
    support::Scratch moRaw;
    std::uint64_t mnRawOffset = 0;
    std::size_t mnRawBytes = 0;
};

} // namespace krv::plugins::tif
