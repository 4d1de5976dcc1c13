#include "plugins/tif/reading/pagesource.h"

#include <cstring>

namespace krv::plugins::tif
{

namespace
{

// The pixels of a page whose compressed strips are too large to be decoded as a whole: libtiff decodes them row by row.
// Blocks are some rows; reading them in the order of the file is quick, going back decodes the strip from its begin.
class RowSource : public support::IBlockSource
{
public:
    RowSource(std::shared_ptr<Page> poPage, PixelUse eUse)
        : mpoPage(std::move(poPage)), meUse(eUse),
          moLayout(
              StrileSource::MakeLayout(mpoPage->GetForm(), eUse, StrileSource::GetSensibleRows(mpoPage->GetForm()))),
          moDecoder(*mpoPage), moStored(mpoPage->GetForm().GetStoredRowBytes(mpoPage->GetForm().mnWidth))
    {
    }

    const support::ImageLayout& GetLayout() const override { return moLayout; }
    std::string GetName() const override { return mpoPage->GetFileName(); }
    support::BlockOrigin GetOrigin() const override { return StrileSource::MakeOrigin(*mpoPage, meUse); }

    void ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override
    {
        const std::uint32_t nFirst = oBlock.mnRow * moLayout.GetBlockHeight() + oPart.mnY;
        for (std::uint32_t nRow = 0; nRow < oPart.mnHeight; ++nRow)
            ReadRow(oBlock.mnPlane, nFirst + nRow, pTarget + nRow * nPitch);
    }

private:
    bool IsStored(unsigned int nPlane, std::uint32_t nRow)
    {
        const PageForm& oForm = mpoPage->GetForm();
        return mpoPage->GetStriles()
            .Get(std::uint64_t{nPlane} * oForm.mnStrilesDown + nRow / oForm.mnStrileHeight)
            .IsStored();
    }

    // Codecs go forward only: rows before the wanted one are decoded too, from where the last call ended when it was in
    // the same strip.
    void DecodeUpTo(unsigned int nPlane, std::uint32_t nRow)
    {
        const std::uint32_t nFirst = nRow - nRow % mpoPage->GetForm().mnStrileHeight;
        const bool bFurther = nPlane == mnPlane && mnNextRow > nFirst && mnNextRow <= nRow;
        TiffHandle& oHandle = mpoPage->GetHandle();
        for (mnNextRow = bFurther ? mnNextRow : nFirst; mnNextRow <= nRow; ++mnNextRow)
        {
            const int nDone =
                TIFFReadScanline(oHandle.Get(), moStored.data(), mnNextRow, static_cast<std::uint16_t>(nPlane));
            if (nDone == 1)
                continue;
            const TiffTrouble oTrouble = oHandle.TakeTrouble();
            const std::uint32_t nFailed = mnNextRow;
            mnNextRow = 0;
            mpoPage->Fail("row " + std::to_string(nFailed) + ": ", oTrouble);
        }
        mnPlane = nPlane;
    }

    void ReadRow(unsigned int nPlane, std::uint32_t nRow, unsigned char* pTarget)
    {
        const PageForm& oForm = mpoPage->GetForm();
        const std::size_t nBytes = oForm.GetRowBytes(oForm.mnWidth);
        if (!IsStored(nPlane, nRow))
        {
            std::memset(pTarget, 0, nBytes);
            return;
        }
        DecodeUpTo(nPlane, nRow);
        moDecoder.ConvertDecoded(moStored.data(), moStored.size(), {oForm.mnWidth, 1, pTarget, nBytes});
        for (std::size_t nAt = 0; meUse == PixelUse::eBitmap && nAt < nBytes; ++nAt)
            pTarget[nAt] = pTarget[nAt] != 0;
    }

    std::shared_ptr<Page> mpoPage;
    PixelUse meUse;
    support::ImageLayout moLayout;
    StrileDecoder moDecoder;
    std::vector<unsigned char> moStored;
    // Where the next row begins to be decoded.
    unsigned int mnPlane = 0;
    std::uint32_t mnNextRow = 0;
};

} // namespace

std::unique_ptr<support::IBlockSource> MakePageSource(std::shared_ptr<Page> poPage, PixelUse eUse)
{
    const PageForm& oForm = poPage->GetForm();
    const bool bCoded = oForm.mnCompression != COMPRESSION_NONE || oForm.mbReversedBits;
    if (bCoded && !oForm.mbTiled && StrileSource::GetStrileBytes(oForm) > StrileSource::MAXIMUM_STRILE_BYTES)
        return std::make_unique<RowSource>(std::move(poPage), eUse);
    return std::make_unique<StrileSource>(std::move(poPage), eUse);
}

} // namespace krv::plugins::tif
