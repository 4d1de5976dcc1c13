#pragma once

#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/iplaceremoval.h"
#include "plugins/support/dataset.h"
#include "plugins/support/overviewmanager.h"
#include "plugins/support/writing/recordtext.h"

#include <map>
#include <optional>

namespace krv::plugins::support
{

// A dataset whose metadata, reference system, geocoding and directory of levels are one record: a format says where
// that is kept, as text or in another form, and where the pixels are. Files beside add what the record lacks. Levels
// can be made as long as the file is written.
// For formats of a header and pixels. One with metadata in another form derives from Dataset.
class RecordDataset : public Dataset,
                      public krv::datasources::IGeocodedDataset,
                      public krv::datasources::IPlaceRemoval,
                      protected LevelStore
{
public:
    // The record with what files beside add; a copy.
    krv::datasources::AuxiliaryData ReadAuxiliaryData() override;
    // Which levels are valid is not taken from the record: their manager keeps that.
    void WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData) override;
    krv::ogc::cs::ICRS* ReadCRS() const override;
    void UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const override;

    // Valid until it is set anew.
    const krv::ogc::cs::GeocodingInfo& GetGeocoding() const override;
    void SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo) override;

    // A file beside may say another afterwards.
    void RemoveCRS() override;
    void RemoveGeocoding() override;

    // A new one, owned by the caller.
    krv::datasources::IOverviewManager* GetOverviewManager() override;

protected:
    using Dataset::Dataset;

    Sidecars::Needs GetNeeds() const override;
    // What the file says when it is opened, or an empty one of so many channels as it has.
    void ShowRecord(RecordText oRecord);

    // As it will be stored, changes included.
    const RecordText& GetRecord() const { return moRecord; }
    // Channels came or went: their tags, by the numbers of those that they were, 0 for new ones, whose levels are not
    // valid.
    void TakeChannels(const std::vector<unsigned int>& oSources);
    // For the format to call before pixels of the image change: makes the levels outdated, and once the file has its
    // name what is recorded of their values. Costs nothing when it did so already.
    void ForgetOldPixels();
    // One of those that there are.
    std::shared_ptr<BlockImage> OpenLevel(unsigned int nLevel) override;
    // A level is opened anew when it is wanted next.
    void ForgetOpened() { moOpened.clear(); }

    // Makes a record the file's. Throws DataException when that cannot be, and changes nothing.
    // Called for each change of the record, within the operation that changes it.
    virtual void StoreRecord(const RecordText& oRecord) const = 0;
    // Room for a level that is not there, by the number that will find it.
    virtual std::uint64_t MakeRoom(unsigned int nLevel) = 0;
    // A level that is there: of the size that its number gives, unless overridden.
    virtual Level DescribeLevel(unsigned int nLevel) const;
    // The pixels of a level.
    virtual std::shared_ptr<IBlockSource> MakeLevelSource(unsigned int nLevel, std::uint64_t nPlace) = 0;

private:
    std::vector<Level> GetLevels() const override;
    const krv::datasources::AuxiliaryData& GetBook() const override { return moRecord.moTags; }
    void MakeLevel(const Level& oLevel, const krv::datasources::AuxiliaryData& oBook, const Place& oPlace) override;
    void DropLevel(unsigned int nLevel, const krv::datasources::AuxiliaryData& oBook, const Place& oPlace) override;
    void WriteBook(const krv::datasources::AuxiliaryData& oBook, bool bValid, const Place& oPlace) override;

    void Change(RecordText oRecord) const;

    mutable RecordText moRecord;      // as the file is to hold it
    mutable bool mbForgotten = false; // what was known of the pixels before the last change
    bool mbForgottenNamed = false;    // while the file had its name
    mutable std::optional<krv::ogc::cs::GeocodingInfo> moGeocoding; // the record's or that of a file beside
    std::map<unsigned int, std::shared_ptr<BlockImage>> moOpened;   // levels
};

} // namespace krv::plugins::support
