// The colour map of a TIFF file: the facet IPCTDataset of its dataset.
#include "gobs/pct/pct.h"
#include "plugins/tif/tifdataset.h"

#include <algorithm>

namespace krv::plugins::tif
{

namespace
{

// Colours are of 16 bits; some writers store 8 bits, which shows in that none is above 255.
krv::gobs::PCT MakeTable(std::size_t nColours, const std::uint16_t* pRed, const std::uint16_t* pGreen,
                         const std::uint16_t* pBlue)
{
    const auto IsNarrow = [nColours](const std::uint16_t* pColours)
    {
        return std::all_of(pColours, pColours + nColours, [](std::uint16_t nColour) { return nColour < 256; });
    };
    const unsigned int nFactor = IsNarrow(pRed) && IsNarrow(pGreen) && IsNarrow(pBlue) ? 257 : 1;
    std::vector<krv::gobs::RGBTuple<std::uint16_t>> oColours(nColours);
    for (std::size_t nAt = 0; nAt < nColours; ++nAt)
        oColours[nAt] = {static_cast<std::uint16_t>(pRed[nAt] * nFactor),
                         static_cast<std::uint16_t>(pGreen[nAt] * nFactor),
                         static_cast<std::uint16_t>(pBlue[nAt] * nFactor)};
    return krv::gobs::PCT::FromColours(oColours);
}

} // namespace

std::vector<unsigned int> TifDataset::GetPCTList() const
{
    const PageForm& oForm = GetPage().GetForm();
    std::uint16_t* pColours = nullptr;
    const bool bTable = oForm.mnPhotometric == PHOTOMETRIC_PALETTE && oForm.moSample.GetBits() <= 16 &&
                        TIFFGetField(mpoPage->GetTiff(), TIFFTAG_COLORMAP, &pColours, &pColours, &pColours) == 1;
    return bTable ? std::vector<unsigned int>{1} : std::vector<unsigned int>{};
}

void TifDataset::CheckPCT(unsigned int nPCT, const Place& oPlace) const
{
    if (nPCT != 1 || GetPCTList().empty())
        Refuse("pseudocolour table " + std::to_string(nPCT) + " does not exist", oPlace);
}

krv::gobs::PCT* TifDataset::GetPCT(unsigned int nPCT) const
{
    CheckPCT(nPCT, Place::Current());
    std::uint16_t* pRed = nullptr;
    std::uint16_t* pGreen = nullptr;
    std::uint16_t* pBlue = nullptr;
    TIFFGetField(mpoPage->GetTiff(), TIFFTAG_COLORMAP, &pRed, &pGreen, &pBlue);
    const std::size_t nColours = std::size_t{1} << mpoPage->GetForm().moSample.GetBits();
    return new krv::gobs::PCT(MakeTable(nColours, pRed, pGreen, pBlue));
}

unsigned int TifDataset::GetPCTChannel(unsigned int nPCT) const
{
    CheckPCT(nPCT, Place::Current());
    return 1;
}

std::string TifDataset::GetPCTDescription(unsigned int nPCT) const
{
    CheckPCT(nPCT, Place::Current());
    return {};
}

unsigned int TifDataset::CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel)
{
    const Place oPlace = Place::Current();
    GetEditor("pseudocolour tables cannot be written", oPlace);
    if (nChannel > 1 || !GetPCTList().empty())
        Refuse("TIFF holds one pseudocolour table, for channel 1", oPlace);
    StorePCT(oTable, oPlace);
    return 1;
}

void TifDataset::StorePCT(const krv::gobs::PCT& oTable, const Place& oPlace)
{
    const PageForm& oForm = GetPage(oPlace).GetForm();
    const SampleForm& oSample = oForm.moSample;
    const bool bIndex = oForm.mnChannels == 1 && oSample.mnParts == 1 && !oSample.IsSigned() &&
                        !oSample.moNativeType.IsReal() && oSample.GetBits() <= 16;
    if (!bIndex)
        Refuse("only a single channel of 8U or 16U can have a pseudocolour table", oPlace);
    const std::size_t nColours = std::size_t{1} << oSample.GetBits();
    std::vector<std::uint64_t> oColours(3 * nColours);
    for (std::size_t nAt = 0; nAt < nColours; ++nAt)
    {
        std::uint16_t nAlpha = 0;
        const krv::gobs::RGBTuple<std::uint16_t> oColour = oTable.GetValue16(static_cast<double>(nAt), nAlpha);
        oColours[nAt] = oColour.red;
        oColours[nColours + nAt] = oColour.green;
        oColours[2 * nColours + nAt] = oColour.blue;
    }
    Edit(
        [&]
        {
            TagList& oTags = mpoEditor->GetPages().front()->moTags;
            oTags.SetNumbers(TIFFTAG_COLORMAP, TIFF_SHORT, oColours);
            oTags.SetNumber(TIFFTAG_PHOTOMETRIC, TIFF_SHORT, PHOTOMETRIC_PALETTE);
            // Readers size the table by it, and take none for granted.
            oTags.SetNumber(TIFFTAG_BITSPERSAMPLE, TIFF_SHORT, oSample.GetBits());
        });
}

void TifDataset::UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable)
{
    const Place oPlace = Place::Current();
    GetEditor("pseudocolour tables cannot be written", oPlace);
    CheckPCT(nPCT, oPlace);
    StorePCT(oTable, oPlace);
}

void TifDataset::SetPCTDescription(unsigned int, const std::string&)
{
    Refuse("TIFF has no place for the description of a pseudocolour table");
}

void TifDataset::DeletePCT(unsigned int nPCT)
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("pseudocolour tables cannot be deleted", oPlace);
    CheckPCT(nPCT, oPlace);
    TagList& oTags = oEditor.GetPages().front()->moTags;
    Edit(
        [&oTags]
        {
            oTags.Remove(TIFFTAG_COLORMAP);
            oTags.SetNumber(TIFFTAG_PHOTOMETRIC, TIFF_SHORT, PHOTOMETRIC_MINISBLACK);
        });
}

} // namespace krv::plugins::tif
