#pragma once

#include "datasources/interfaces/ipctdataset.h"
#include "datasources/metadata/auxiliarydata.h"
#include "plugins/jp2/reading/boxes.h"
#include "plugins/jp2/reading/codestream.h"
#include "plugins/jp2/reading/imageheader.h"
#include "plugins/support/dataset.h"
#include "plugins/support/overviewmanager.h"

#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

namespace krv::plugins::jp2
{

// A JPEG 2000 image. Its resolutions are its levels, which are always valid; a palette is its pseudocolour table
// (number 1).
class Jp2Dataset : public support::Dataset, public krv::datasources::IPCTDataset, private support::LevelStore
{
public:
    // Throws krv::FileException kinds that name file and cause; nothing stays open then.
    Jp2Dataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat);
    ~Jp2Dataset() override;

    krv::datasources::AuxiliaryData ReadAuxiliaryData() override;
    krv::datasources::IChannelInfo* GetChannelInfo(unsigned int nChannel) const override;
    krv::datasources::IOverviewManager* GetOverviewManager() override;
    void Close() override;

    std::vector<unsigned int> GetPCTList() const override;
    krv::gobs::PCT* GetPCT(unsigned int nPCT) const override;
    unsigned int GetPCTChannel(unsigned int nPCT) const override;
    std::string GetPCTDescription(unsigned int nPCT) const override;
    unsigned int CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel) override;
    void UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable) override;
    void SetPCTDescription(unsigned int nPCT, const std::string& oDescription) override;
    void DeletePCT(unsigned int nPCT) override;

private:
    // As a store of levels.
    std::vector<Level> GetLevels() const override;
    std::shared_ptr<support::BlockImage> OpenLevel(unsigned int nLevel) override;
    const krv::datasources::AuxiliaryData& GetBook() const override;
    void MakeLevel(const Level& oLevel, const krv::datasources::AuxiliaryData& oBook, const Place& oPlace) override;
    void DropLevel(unsigned int nLevel, const krv::datasources::AuxiliaryData& oBook, const Place& oPlace) override;
    void WriteBook(const krv::datasources::AuxiliaryData& oBook, bool bValid, const Place& oPlace) override;

    void FindCodestream(const std::shared_ptr<support::File>& poFile);
    void CheckPCT(unsigned int nPCT, const Place& oPlace) const;
    [[noreturn]] void RefusePCT(const Place& oPlace) const;
    void Complain(const std::string& trouble) const;

    std::shared_ptr<Codestream> mpoStream;
    std::vector<Box> moBoxes; // of the file
    ImageHeader moHeader;
    std::map<unsigned int, std::shared_ptr<support::BlockImage>> moLevels; // that are open
    krv::datasources::AuxiliaryData moBook;                                // empty: no level is invalid
    mutable std::set<std::string> moComplaints;
};

} // namespace krv::plugins::jp2
