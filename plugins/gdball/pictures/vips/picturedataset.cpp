#include "plugins/gdball/pictures/vips/picturedataset.h"

#include "plugins/support/file/iccprofile.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <algorithm>
#include <utility>

namespace krv::plugins::gdball
{

using krv::datasources::AuxiliaryData;

namespace
{

constexpr char INTERPRETATION[] = "ColorInterp";
constexpr char OPACITY[] = "Alpha";

void DescribeChannels(VipsInterpretation eMeaning, AuxiliaryData& oTags)
{
    static constexpr const char* COLOURS[] = {"Red", "Green", "Blue"};
    const bool bColours = eMeaning == VIPS_INTERPRETATION_sRGB || eMeaning == VIPS_INTERPRETATION_RGB16 ||
                          eMeaning == VIPS_INTERPRETATION_scRGB;
    const bool bGrey = eMeaning == VIPS_INTERPRETATION_B_W || eMeaning == VIPS_INTERPRETATION_GREY16;
    const unsigned int nColours = bColours ? 3 : bGrey ? 1 : 0;
    if (eMeaning == VIPS_INTERPRETATION_CMYK)
        oTags.SetFileMetadataValue("Photometric", "Separated");
    for (unsigned int nAt = 0; nAt < std::min(nColours, oTags.GetChannelCount()); ++nAt)
        oTags.SetChanMetadataValue(INTERPRETATION, bColours ? COLOURS[nAt] : "Gray", nAt + 1);
    if (nColours != 0 && oTags.GetChannelCount() == nColours + 1)
    {
        oTags.SetChanMetadataValue(INTERPRETATION, OPACITY, nColours + 1);
        oTags.SetChanMetadataValue("AlphaKind", eMeaning == VIPS_INTERPRETATION_scRGB ? "Premultiplied" : "Straight",
                                   nColours + 1);
    }
}

// What the picture says beside its pixels. Orientation and colour profile are told, not applied.
AuxiliaryData ReadTags(VipsImage& oImage, PictureKind eKind)
{
    AuxiliaryData oTags(static_cast<unsigned int>(oImage.Bands));
    oTags.SetFileMetadataValue("PictureFormat", GetPictureName(eKind));
    const void* pBytes = nullptr;
    std::size_t nBytes = 0;
    int nValue = 0;
    if (vips_image_get_typeof(&oImage, VIPS_META_ORIENTATION) != 0 &&
        vips_image_get_int(&oImage, VIPS_META_ORIENTATION, &nValue) == 0)
        oTags.SetFileMetadataValue("Orientation", std::to_string(nValue));
    if (vips_image_get_typeof(&oImage, VIPS_META_ICC_NAME) != 0 &&
        vips_image_get_blob(&oImage, VIPS_META_ICC_NAME, &pBytes, &nBytes) == 0)
    {
        const std::string name = support::ReadProfileName(static_cast<const unsigned char*>(pBytes), nBytes);
        oTags.SetFileMetadataValue("ICCProfile", name.empty() ? "without a name" : name);
    }
    if (vips_image_get_typeof(&oImage, VIPS_META_XMP_NAME) != 0 &&
        vips_image_get_blob(&oImage, VIPS_META_XMP_NAME, &pBytes, &nBytes) == 0)
    {
        const std::string text(static_cast<const char*>(pBytes), nBytes);
        oTags.SetFileMetadataValue("XMP", text.c_str());
    }
    if (vips_image_get_typeof(&oImage, VIPS_META_RESOLUTION_UNIT) != 0)
    {
        constexpr double MILLIMETRES = 10.0;
        oTags.SetFileMetadataValue("XResolution", NumberText(oImage.Xres * MILLIMETRES));
        oTags.SetFileMetadataValue("YResolution", NumberText(oImage.Yres * MILLIMETRES));
        oTags.SetFileMetadataValue("ResolutionUnit", "centimetre");
    }
    DescribeChannels(oImage.Type, oTags);
    return oTags;
}

// Levels, masks and tags of a page are its own.
std::string NamePage(const std::string& fileName, unsigned int nPage)
{
    return nPage == 1 ? fileName : fileName + "[page=" + std::to_string(nPage) + "]";
}

} // namespace

PictureDataset::PictureDataset(const std::string& fileName, Picture oPicture, krv::datasources::IFileFormat* poFormat)
    : Dataset(NamePage(fileName, oPicture.mnPage), poFormat), FacetsBeside(this)
{
    const PictureKind eKind = oPicture.meKind;
    const unsigned int nPage = oPicture.mnPage;
    auto poSource = std::make_shared<PictureSource>(std::move(oPicture));
    VipsImage& oHead = poSource->GetHead();
    moTags = ReadTags(oHead, eKind);
    if (vips_image_get_typeof(&oHead, VIPS_META_N_PAGES) != 0)
        mnFurther = static_cast<unsigned int>(std::max(0, vips_image_get_n_pages(&oHead) - static_cast<int>(nPage)));
    if (nPage != 1)
        mpoOfFile = std::make_unique<support::Sidecars>(fileName, static_cast<unsigned int>(oHead.Xsize),
                                                        static_cast<unsigned int>(oHead.Ysize),
                                                        static_cast<unsigned int>(oHead.Bands), false);
    SetImage(std::move(poSource));
}

PictureDataset::PictureDataset(krv::datasources::IFileFormat* poFormat, std::shared_ptr<PictureWriter> poWriter)
    : Dataset(poFormat, poWriter), FacetsBeside(this), mpoWriter(std::move(poWriter))
{
}

PictureDataset::~PictureDataset()
{
    Abandon();
}

void PictureDataset::Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes)
{
    const Place oPlace = Place::Current();
    CheckCreate(nWidth, nHeight, oTypes, oPlace);
    mpoWriter->Make(nWidth, nHeight, oTypes, oPlace);
    moTags = AuxiliaryData(static_cast<unsigned int>(oTypes.size()));
    moTags.SetFileMetadataValue("PictureFormat", GetPictureName(mpoWriter->GetKind()));
    DescribeChannels(mpoWriter->GetMeaning(), moTags);
    SetImage(mpoWriter->GetPixels());
}

AuxiliaryData PictureDataset::ReadAuxiliaryData()
{
    GetImage();
    AuxiliaryData oTags = moTags;
    GetSidecars().AddTags(oTags);
    return oTags;
}

support::AuxXml PictureDataset::GetBeside(const char* pWhat, const Place& oPlace) const
{
    CheckWriting(pWhat, oPlace);
    return GetSidecars().GetAuxXml();
}

void PictureDataset::StoreBeside(support::AuxXml oAuxXml) const
{
    mpoWriter->Change();
    GetSidecars().SetAuxXml(std::move(oAuxXml));
}

void PictureDataset::WriteAuxiliaryData(const AuxiliaryData& oData)
{
    support::AuxXml oAuxXml = GetBeside("metadata cannot be written", Place::Current());
    if (oData.GetChannelCount() != GetChanCount())
        Refuse("the metadata are those of " + std::to_string(oData.GetChannelCount()) + " channels, not of " +
               std::to_string(GetChanCount()));
    AuxiliaryData oRest = oData;
    for (const auto& [key, value] : moTags.GetFileMetadata())
        if (oData.GetFileMetadataValue(key) == value)
            oRest.RemoveFileMetadataValue(key);
    for (unsigned int nChannel = 1; nChannel <= GetChanCount(); ++nChannel)
        for (const auto& [key, value] : moTags.GetChanMetadata(nChannel))
            if (oData.GetChanMetadataValue(key, nChannel) == value)
                oRest.RemoveChanMetadataValue(key, nChannel);
    mbOpacityMeant = oData.GetChanMetadataValue(INTERPRETATION, GetChanCount()) == OPACITY;
    oAuxXml.SetTags(oRest);
    StoreBeside(std::move(oAuxXml));
}

bool PictureDataset::KeepsPixels() const
{
    GetImage();
    return !mpoWriter || mpoWriter->IsLossless();
}

krv::ogc::cs::ICRS* PictureDataset::ReadCRS() const
{
    std::unique_ptr<krv::ogc::cs::ICRS> poCRS = GetSidecars().ReadCRS();
    if (!poCRS && mpoOfFile)
        poCRS = mpoOfFile->ReadCRS();
    return poCRS.release();
}

void PictureDataset::UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const
{
    support::AuxXml oAuxXml = GetBeside("the reference system cannot be written", Place::Current());
    oAuxXml.SetCRS(oCRS.GetWKT());
    StoreBeside(std::move(oAuxXml));
}

const krv::ogc::cs::GeocodingInfo& PictureDataset::GetGeocoding() const
{
    if (!moGeocoding)
        moGeocoding = GetSidecars().ReadGeocoding();
    if (!moGeocoding && mpoOfFile)
        moGeocoding = mpoOfFile->ReadGeocoding();
    if (!moGeocoding)
        moGeocoding.emplace();
    return *moGeocoding;
}

void PictureDataset::SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    const Place oPlace = Place::Current();
    support::AuxXml oAuxXml = GetBeside("the geocoding cannot be written", oPlace);
    if (!oInfo.IsInvertible())
        Refuse("a geocoding without an inverse cannot be written", oPlace);
    oAuxXml.SetGeocoding(oInfo);
    StoreBeside(std::move(oAuxXml));
    moGeocoding = oInfo;
}

void PictureDataset::Synchronize()
{
    if (IsWritten() && HasImage() && !mbOpacityMeant &&
        moTags.GetChanMetadataValue(INTERPRETATION, GetChanCount()) == OPACITY)
    {
        krv::nspio::Warning::Warn(GetFileName() + ": in a picture of " + std::to_string(GetChanCount()) +
                                  " channels the last one is opacity");
        mbOpacityMeant = true;
    }
    Dataset::Synchronize();
    if (IsWritten() && HasImage())
        GetSidecars().Store();
}

void PictureDataset::Close()
{
    if (mpoWriter && !mpoWriter->IsEnded())
        Synchronize();
    Dataset::Close();
}

} // namespace krv::plugins::gdball
