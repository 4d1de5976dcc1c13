// The record of a TIFF file, its reference system and geocoding.
#include "datasources/metadata/levelbook.h"
#include "plugins/tif/geo/geokeys.h"
#include "plugins/tif/geo/geowriter.h"
#include "plugins/tif/reading/metadata.h"
#include "plugins/tif/tifdataset.h"
#include "plugins/tif/writing/metadatawriter.h"

namespace krv::plugins::tif
{

krv::datasources::AuxiliaryData TifDataset::ReadPageMetadata(std::uint64_t nDirectory) const
{
    if (mpoEditor)
        return ReadMetadata(*mpoEditor->OpenPage(mpoEditor->GetPage(nDirectory)));
    Page oPage(mpoFile, GetPage().GetHeader(), nDirectory);
    return ReadMetadata(oPage);
}

krv::datasources::AuxiliaryData TifDataset::ReadRecord() const
{
    std::string trouble;
    krv::datasources::AuxiliaryData oRecord = ReadMetadata(GetPage(), &trouble);
    Complain(trouble);
    return oRecord;
}

krv::datasources::AuxiliaryData TifDataset::ReadAuxiliaryData()
{
    krv::datasources::AuxiliaryData oRecord = ReadRecord();
    GetSidecars().AddTags(oRecord);
    return oRecord;
}

void TifDataset::WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData)
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("metadata cannot be written", oPlace);
    krv::datasources::AuxiliaryData oRecord = oData;
    const krv::datasources::AuxiliaryData& oBook = GetBook(PixelUse::eImage);
    for (const PageLevel& oLevel : GetLevels(PixelUse::eImage))
        CopyLevel(oBook, oRecord, oLevel.mnLevel);
    ForgetTagsBeside(oData);
    Edit([&] { WriteMetadata(oEditor, oEditor.GetPages().front(), oRecord, oPlace); });
    WatchImage();
}

krv::ogc::cs::ICRS* TifDataset::ReadCRS() const
{
    std::string trouble;
    std::unique_ptr<krv::ogc::cs::ICRS> poCRS = tif::ReadCRS(GetPage().GetTiff(), &trouble);
    Complain(trouble);
    if (poCRS == nullptr)
        poCRS = GetSidecars().ReadCRS();
    return poCRS.release();
}

void TifDataset::UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("the reference system cannot be written", oPlace);
    Edit(
        [&]
        {
            oEditor.LoadTags(*oEditor.GetPages().front());
            GeoWriter(oEditor, oEditor.GetPages().front()).SetCRS(oCRS, oPlace);
        });
}

support::Sidecars::Needs TifDataset::GetNeeds() const
{
    krv::ogc::cs::GeocodingInfo oInfo;
    return {true, !ReadGeocoding(GetPage().GetTiff(), oInfo), tif::ReadCRS(GetPage().GetTiff()) == nullptr,
            !HasOwnMask()};
}

const krv::ogc::cs::GeocodingInfo& TifDataset::GetGeocoding() const
{
    if (!moGeocoding)
    {
        krv::ogc::cs::GeocodingInfo oInfo;
        if (!ReadGeocoding(GetPage().GetTiff(), oInfo))
            oInfo = GetSidecars().ReadGeocoding().value_or(oInfo);
        moGeocoding = oInfo;
    }
    return *moGeocoding;
}

void TifDataset::SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("the geocoding cannot be written", oPlace);
    if (!oInfo.IsInvertible())
        Refuse("a geocoding without an inverse cannot be written", oPlace);
    Edit(
        [&]
        {
            oEditor.LoadTags(*oEditor.GetPages().front());
            GeoWriter(oEditor, oEditor.GetPages().front()).SetGeocoding(oInfo);
        });
}

void TifDataset::RemoveCRS()
{
    FileEditor& oEditor = GetEditor("the reference system cannot be removed", Place::Current());
    ForgetCRSBeside();
    Edit(
        [&]
        {
            oEditor.LoadTags(*oEditor.GetPages().front());
            GeoWriter(oEditor, oEditor.GetPages().front()).RemoveCRS();
        });
}

void TifDataset::RemoveGeocoding()
{
    const Place oPlace = Place::Current();
    CheckWriting("the geocoding cannot be removed", oPlace);
    ForgetGeocodingBeside();
    SetGeocoding(krv::ogc::cs::GeocodingInfo());
}

} // namespace krv::plugins::tif
