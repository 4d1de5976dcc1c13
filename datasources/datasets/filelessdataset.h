#pragma once

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "toolkit/exceptions/place.h"

#include <string>
#include <vector>

namespace krv::datasources
{

// The base of datasets that no file lies behind: they have a descriptive name, no format, and nothing that could be
// deleted. What a derived class does not override is refused with a DataException that names the dataset.
// A program's own source of pixels derives from it: name, size, types and an IRasterIO are all that it needs.
class KRV_DATASOURCES_API FilelessDataset : public IDataset, public IRasterDataset, public IGeocodedDataset
{
public:
    ~FilelessDataset() override;
    FilelessDataset& operator=(const FilelessDataset&) = delete;

    // Null: there is no format.
    IFileFormat* GetFileFormat() const override { return nullptr; }
    // Deletes nothing.
    FileAccessState Delete() override { return eDone; }

    // True, since there is nothing that could be missing; a derived class without an image yet says otherwise.
    bool Exists() const override { return true; }
    // A text for messages; no path.
    std::string GetName() override { return moName; }

    // A derived class over other datasets says true.
    bool IsLinked() const override { return false; }

    // Nothing is pending here. Throws DataException after Close.
    void Synchronize() override { CheckOpen(); }
    bool IsOpen() const override { return mbOpen; }
    // From then on reading and writing throw DataException.
    void Close() override { mbOpen = false; }

    // All of these throw DataException here.
    void AddNewChannel(const krv::gobs::RasterInfo& oInfo) override;
    void DeleteChannel(unsigned int nChannel) override;
    void Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes) override;
    void Create(const krv::gobs::RasterInfo& oInfo) override;
    // Null: there are no levels and no histories.
    IHistoryIO* GetHistoryIO(unsigned int) override { return nullptr; }
    IOverviewManager* GetOverviewManager() override { return nullptr; }
    // Read only.
    AccessCapabilities GetRasterCapabilities() override { return {true, false, false}; }

protected:
    // name: what messages call it.
    explicit FilelessDataset(std::string name);
    FilelessDataset(const FilelessDataset&) = default;

    // Throws DataException after Close.
    void CheckOpen(const Place& oPlace = Place::Current()) const;
    // Throws the DataException that names the dataset. what: the operation, as a user would call it.
    [[noreturn]] void Refuse(const std::string& what, const Place& oPlace = Place::Current()) const;
    // Throws the DataException of a record with another number of channels than the image has.
    void CheckRecord(const AuxiliaryData& oData, const Place& oPlace = Place::Current()) const;

private:
    std::string moName; // for messages
    bool mbOpen = true;
};

} // namespace krv::datasources
