#pragma once

#include "plugins/support/image/iblocksource.h"
#include "plugins/support/writing/heldblocks.h"
#include "plugins/tif/reading/strilesource.h"
#include "plugins/tif/writing/fileeditor.h"
#include "plugins/tif/writing/strileencoder.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>

namespace krv::plugins::tif
{

// Reads and writes the pixels of one page of a file that is being written. Strips and tiles that come whole are encoded
// at once; of others the pixels are held back, bounded in bytes, until they have to make room or the file is
// synchronised. One thread at a time.
class PageWriter : public support::IBlockSource
{
public:
    PageWriter(std::shared_ptr<FileEditor> poEditor, std::shared_ptr<PageModel> poModel, std::shared_ptr<Page> poPage,
               PixelUse eUse);
    ~PageWriter() override;
    PageWriter(const PageWriter&) = delete;
    PageWriter& operator=(const PageWriter&) = delete;

    const support::ImageLayout& GetLayout() const override { return moReader.GetLayout(); }
    bool ReadsParts() const override { return moReader.ReadsParts(); }
    bool SparesParts() const override { return moReader.SparesParts(); }
    std::string GetName() const override { return mpoEditor->GetFileName(); }

    void ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override;
    void WriteBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, const unsigned char* pSource,
                    std::size_t nPitch) override;
    // Takes the bytes of a strip or tile as they are.
    void StoreCoded(std::uint64_t nStrile, const unsigned char* pBytes, std::size_t nBytes);
    // The same of several, as another file has them.
    void CopyCoded(const support::File& oSource, const std::vector<CodedStrile>& oStriles);
    bool Holds() const { return !moHeld.IsEmpty(); }
    // Stores what is held back, as long as the page is there.
    void Flush();

    // Called before the first change after it is set, and again as long as it throws.
    void OnChange(std::function<void()> oCall) { moOnChange = std::move(oCall); }

private:
    // A strip or tile: its number, and the part of the image that it holds.
    struct Strile
    {
        std::uint64_t mnNumber;
        unsigned int mnPlane;
        support::PixelRect moRect;
        std::uint32_t mnStoredRows;
    };

    template <typename Action>
    void ForEach(unsigned int nPlane, const support::PixelRect& oRect, Action oAction) const;
    support::PixelRect ToImage(const support::BlockAddress& oBlock, const support::PixelRect& oPart) const;
    void NoteChange();
    void WritePart(const Strile& oStrile, const support::PixelRect& oPart, const unsigned char* pSource,
                   std::size_t nPitch);
    void WriteInPlace(const Strile& oStrile, const support::PixelRect& oPart, const unsigned char* pSource,
                      std::size_t nPitch);
    void Store(const support::HeldBlocks::Block& oBlock, const unsigned char* pPixels, std::size_t nPitch);
    std::span<const unsigned char> ReadForm(std::uint64_t nStrile);
    void ReadStored(const Strile& oStrile, unsigned char* pTarget, std::size_t nPitch);
    void CheckPage() const;
    std::size_t GetPixelBytes() const { return GetLayout().GetPixelBytes(0); }

    std::shared_ptr<FileEditor> mpoEditor;
    std::shared_ptr<PageModel> mpoModel;
    std::shared_ptr<Page> mpoPage;
    const PageForm& moForm;
    StrileSource moReader;
    StrileEncoder moEncoder;
    std::vector<unsigned char> moLike; // the begin of a strip or tile that others take their form of
    std::uint64_t mnLike = UINT64_MAX;
    support::HeldBlocks moHeld;
    std::function<void()> moOnChange;
};

} // namespace krv::plugins::tif
