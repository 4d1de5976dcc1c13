#include "plugins/tif/reading/rowsource.h"

#include "plugins/tif/reading/strilesource.h"

#include <cstring>

namespace krv::plugins::tif
{

RowSource::RowSource(std::shared_ptr<Page> poPage, PixelUse eUse)
    : mpoPage(std::move(poPage)), meUse(eUse),
      moLayout(StrileSource::MakeLayout(mpoPage->GetForm(), eUse, StrileSource::GetSensibleRows(mpoPage->GetForm()))),
      moDecoder(*mpoPage), moStored(mpoPage->GetForm().GetStoredRowBytes(mpoPage->GetForm().mnWidth))
{
}

RowSource::~RowSource() = default;

bool RowSource::IsStored(unsigned int nPlane, std::uint32_t nRow)
{
    const PageForm& oForm = mpoPage->GetForm();
    return mpoPage->GetStriles()
        .Get(std::uint64_t{nPlane} * oForm.mnStrilesDown + nRow / oForm.mnStrileHeight)
        .IsStored();
}

// Codecs go forward only: rows before the wanted one are decoded too, from where the last call ended when it was in the
// same strip.
void RowSource::DecodeUpTo(unsigned int nPlane, std::uint32_t nRow)
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

void RowSource::ReadRow(unsigned int nPlane, std::uint32_t nRow, unsigned char* pTarget)
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

void RowSource::ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                          std::size_t nPitch)
{
    const std::uint32_t nFirst = oBlock.mnRow * moLayout.GetBlockHeight() + oPart.mnY;
    for (std::uint32_t nRow = 0; nRow < oPart.mnHeight; ++nRow)
        ReadRow(oBlock.mnPlane, nFirst + nRow, pTarget + nRow * nPitch);
}

} // namespace krv::plugins::tif
