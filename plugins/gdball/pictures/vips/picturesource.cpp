#include "plugins/gdball/pictures/vips/picturesource.h"

#include "plugins/support/file/scratchfile.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <optional>
#include <utility>

namespace krv::plugins::gdball
{

namespace
{

std::optional<krv::gobs::DataType> FindType(VipsBandFormat eFormat)
{
    using namespace krv::gobs;
    switch (eFormat)
    {
    case VIPS_FORMAT_UCHAR:
        return DataType(eDT_8U);
    case VIPS_FORMAT_CHAR:
        return DataType(eDT_8S);
    case VIPS_FORMAT_USHORT:
        return DataType(eDT_16U);
    case VIPS_FORMAT_SHORT:
        return DataType(eDT_16S);
    case VIPS_FORMAT_UINT:
        return DataType(eDT_32U);
    case VIPS_FORMAT_INT:
        return DataType(eDT_32S);
    case VIPS_FORMAT_FLOAT:
        return DataType(eDT_32R);
    case VIPS_FORMAT_DOUBLE:
        return DataType(eDT_64R);
    default:
        return std::nullopt;
    }
}

// Rows of about a mebibyte, in steps that decoders like.
unsigned int ChooseRows(const VipsImage& oImage)
{
    constexpr std::uint64_t BLOCK_BYTES = std::uint64_t{1} << 20;
    constexpr std::uint64_t STEP = 16, MOST = 512;
    const std::uint64_t nRows = BLOCK_BYTES / std::max<std::uint64_t>(1, VIPS_IMAGE_SIZEOF_LINE(&oImage));
    return static_cast<unsigned int>(std::clamp(nRows / STEP * STEP, STEP, MOST));
}

} // namespace

PictureSource::PictureSource(Picture oPicture)
    : moPicture(std::move(oPicture)), mpoDecoder(std::make_unique<Decoder>(moPicture))
{
    const VipsImage& oImage = mpoDecoder->GetImage();
    const auto oType = FindType(oImage.BandFmt);
    if (!oType)
        throw FileFormatException(GetName(), GetName() + ": samples of the kind that libvips calls " +
                                                 vips_enum_nick(VIPS_TYPE_BAND_FORMAT, oImage.BandFmt) +
                                                 " are not read");
    const support::Plane oPlane{*oType, static_cast<unsigned int>(oImage.Bands), {}};
    mpoLayout = std::make_unique<support::ImageLayout>(
        static_cast<unsigned int>(oImage.Xsize), static_cast<unsigned int>(oImage.Ysize),
        static_cast<unsigned int>(oImage.Xsize), ChooseRows(oImage), std::vector<support::Plane>{oPlane});
}

PictureSource::~PictureSource() = default;

support::BlockOrigin PictureSource::GetOrigin() const
{
    return {moPicture.mpoFile, "GDBALL page " + std::to_string(moPicture.mnPage)};
}

// Decoding goes on, or begins anew when the row has passed.
Decoder& PictureSource::GetDecoder(unsigned int nRow)
{
    if (!mbChecked)
        CheckWhole(*moPicture.mpoFile, moPicture.meKind);
    mbChecked = true;
    if (mpoDecoder && mpoDecoder->GetNext() <= nRow)
        return *mpoDecoder;
    if (mpoDecoder && !mpoKept)
        mpoKept = support::MakeScratchFile(GetName());
    mpoDecoder.reset();
    mpoDecoder = std::make_unique<Decoder>(moPicture);
    const VipsImage& oImage = mpoDecoder->GetImage();
    if (static_cast<unsigned int>(oImage.Xsize) != mpoLayout->GetWidth() ||
        static_cast<unsigned int>(oImage.Ysize) != mpoLayout->GetHeight() ||
        VIPS_IMAGE_SIZEOF_PEL(&oImage) != mpoLayout->GetPixelBytes(0))
        throw FileFormatException(GetName(), GetName() + ": the picture changed while it was open");
    return *mpoDecoder;
}

// All rows before one of them, in order.
void PictureSource::KeepRows(unsigned int nBefore)
{
    if (mnKept >= nBefore)
        return;
    const std::size_t nRowBytes = mpoLayout->GetWidth() * mpoLayout->GetPixelBytes(0);
    Decoder& oDecoder = GetDecoder(mnKept);
    oDecoder.Skip(mnKept - oDecoder.GetNext());
    while (mnKept < nBefore)
    {
        const unsigned int nRows = std::min(mpoLayout->GetBlockHeight(), nBefore - mnKept);
        unsigned char* const pRows = moScratch.Get(nRowBytes * nRows);
        oDecoder.Read(nRows, pRows, nRowBytes);
        mpoKept->Write(std::uint64_t{mnKept} * nRowBytes, pRows, nRowBytes * nRows);
        mnKept += nRows;
    }
    if (mnKept == mpoLayout->GetHeight())
        mpoDecoder.reset();
}

void PictureSource::ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart,
                              unsigned char* pTarget, std::size_t nPitch)
{
    const unsigned int nFirst = mpoLayout->GetBlockRect(oBlock.mnColumn, oBlock.mnRow).mnY + oPart.mnY;
    try
    {
        if (!mpoKept)
        {
            Decoder& oDecoder = GetDecoder(nFirst);
            if (!mpoKept)
            {
                oDecoder.Skip(nFirst - oDecoder.GetNext());
                return oDecoder.Read(oPart.mnHeight, pTarget, nPitch);
            }
        }
        KeepRows(std::max(mnKept, nFirst + oPart.mnHeight));
    }
    catch (...)
    {
        // What follows in the picture is not to be trusted.
        mpoDecoder.reset();
        throw;
    }
    const std::size_t nRowBytes = mpoLayout->GetWidth() * mpoLayout->GetPixelBytes(0);
    mpoKept->ReadRows(std::uint64_t{nFirst} * nRowBytes, nRowBytes, oPart.mnWidth * mpoLayout->GetPixelBytes(0),
                      oPart.mnHeight, pTarget, nPitch, moScratch);
}

} // namespace krv::plugins::gdball
