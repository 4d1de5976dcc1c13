#include "plugins/support/recorddataset.h"

#include "datasources/metadata/droppedtags.h"
#include "datasources/metadata/levelbook.h"

#include <utility>

namespace krv::plugins::support
{

void RecordDataset::ShowRecord(RecordText oRecord)
{
    moRecord = std::move(oRecord);
    moGeocoding.reset();
}

Sidecars::Needs RecordDataset::GetNeeds() const
{
    return {true, !moRecord.HasGeocoding(), moRecord.GetDefinition().empty(), true};
}

const krv::ogc::cs::GeocodingInfo& RecordDataset::GetGeocoding() const
{
    if (!moGeocoding)
    {
        moGeocoding = moRecord.GetGeocoding();
        if (HasImage() && !moRecord.HasGeocoding())
            moGeocoding = GetSidecars().ReadGeocoding().value_or(*moGeocoding);
    }
    return *moGeocoding;
}

void RecordDataset::Change(RecordText oRecord) const
{
    StoreRecord(oRecord);
    moRecord = std::move(oRecord);
    mbForgotten = false;
}

krv::datasources::AuxiliaryData RecordDataset::ReadAuxiliaryData()
{
    GetImage();
    krv::datasources::AuxiliaryData oTags = moRecord.moTags;
    GetSidecars().AddTags(oTags);
    return oTags;
}

void RecordDataset::WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData)
{
    CheckWriting("metadata cannot be written", Place::Current());
    if (oData.GetChannelCount() != GetChanCount())
        Refuse("the metadata are those of " + std::to_string(oData.GetChannelCount()) + " channels, not of " +
               std::to_string(GetChanCount()));
    const krv::datasources::AuxiliaryData oShown = ReadAuxiliaryData();
    ForgetTagsBeside(oData);
    RecordText oRecord = moRecord;
    oRecord.moTags = oData;
    krv::datasources::DropRemoved(oRecord.moTags, oShown);
    for (const auto& [nLevel, nPlace] : moRecord.moLevels)
        CopyLevel(moRecord.moTags, oRecord.moTags, nLevel);
    Change(std::move(oRecord));
}

krv::ogc::cs::ICRS* RecordDataset::ReadCRS() const
{
    auto poCRS = moRecord.GetCRS();
    if (poCRS == nullptr && HasImage())
        poCRS = GetSidecars().ReadCRS();
    return poCRS.release();
}

void RecordDataset::UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const
{
    CheckWriting("the reference system cannot be written", Place::Current());
    RecordText oRecord = moRecord;
    oRecord.SetCRS(oCRS);
    Change(std::move(oRecord));
}

void RecordDataset::SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    CheckWriting("the geocoding cannot be written", Place::Current());
    if (!oInfo.IsInvertible())
        Refuse("a geocoding without an inverse cannot be written");
    RecordText oRecord = moRecord;
    oRecord.SetGeocoding(oInfo);
    Change(std::move(oRecord));
    moGeocoding = oInfo;
}

void RecordDataset::RemoveCRS()
{
    CheckWriting("the reference system cannot be removed", Place::Current());
    RecordText oRecord = moRecord;
    ForgetCRSBeside();
    oRecord.RemoveCRS();
    Change(std::move(oRecord));
}

void RecordDataset::RemoveGeocoding()
{
    CheckWriting("the geocoding cannot be removed", Place::Current());
    RecordText oRecord = moRecord;
    ForgetGeocodingBeside();
    oRecord.RemoveGeocoding();
    Change(std::move(oRecord));
    moGeocoding = {};
}

krv::datasources::IOverviewManager* RecordDataset::GetOverviewManager()
{
    GetImage();
    return new OverviewManager(*this, *this);
}

void RecordDataset::TakeChannels(const std::vector<unsigned int>& oSources)
{
    std::vector<unsigned int> oLevels;
    for (const auto& [nLevel, nPlace] : moRecord.moLevels)
        oLevels.push_back(nLevel);
    RecordText oRecord = moRecord;
    oRecord.moTags = krv::datasources::TakeChannels(moRecord.moTags, oSources, oLevels);
    Change(std::move(oRecord));
}

// On a copy: where the header has no room for it the pixels are refused, and so they are the next time. The record of a
// file that has no name yet is that of the pixels to come.
void RecordDataset::ForgetOldPixels()
{
    if (mbForgotten && (!IsNamed() || mbForgottenNamed))
        return;
    ForgetPixelsBeside();
    RecordText oRecord = moRecord;
    bool bNews = IsNamed() && krv::datasources::DropStatistics(oRecord.moTags);
    for (const auto& [nLevel, nPlace] : moRecord.moLevels)
        bNews = krv::datasources::SetLevelInvalid(oRecord.moTags, nLevel) || bNews;
    if (bNews)
        Change(std::move(oRecord));
    mbForgotten = true;
    mbForgottenNamed = IsNamed();
}

std::vector<LevelStore::Level> RecordDataset::GetLevels() const
{
    std::vector<Level> oLevels;
    for (const auto& [nLevel, nPlace] : moRecord.moLevels)
        oLevels.push_back(DescribeLevel(nLevel));
    return oLevels;
}

LevelStore::Level RecordDataset::DescribeLevel(unsigned int nLevel) const
{
    return {nLevel, (GetWidth() - 1) / nLevel + 1, (GetHeight() - 1) / nLevel + 1};
}

std::shared_ptr<BlockImage> RecordDataset::OpenLevel(unsigned int nLevel)
{
    std::shared_ptr<BlockImage>& poImage = moOpened[nLevel];
    if (!poImage)
        poImage = std::make_shared<BlockImage>(MakeLevelSource(nLevel, moRecord.moLevels.at(nLevel)), GetCache());
    return poImage;
}

void RecordDataset::MakeLevel(const Level& oLevel, const krv::datasources::AuxiliaryData& oBook, const Place&)
{
    RecordText oRecord = moRecord;
    oRecord.moTags = oBook;
    oRecord.moLevels[oLevel.mnNumber] = MakeRoom(oLevel.mnNumber);
    Change(std::move(oRecord));
}

void RecordDataset::DropLevel(unsigned int nLevel, const krv::datasources::AuxiliaryData& oBook, const Place&)
{
    RecordText oRecord = moRecord;
    oRecord.moTags = oBook;
    oRecord.moLevels.erase(nLevel);
    Change(std::move(oRecord));
    moOpened.erase(nLevel);
}

void RecordDataset::WriteBook(const krv::datasources::AuxiliaryData& oBook, bool, const Place&)
{
    RecordText oRecord = moRecord;
    oRecord.moTags = oBook;
    Change(std::move(oRecord));
}

} // namespace krv::plugins::support
