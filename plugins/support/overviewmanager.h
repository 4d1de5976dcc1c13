#pragma once

#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "plugins/support/dataset.h"
#include "toolkit/exceptions/place.h"

#include <compare>
#include <memory>
#include <string>
#include <vector>

namespace krv::plugins::support
{

// The levels of one image, as a format has them. What is known of each beside its pixels stands in the book of levels
// (datasources/metadata/levelbook.h), which a record holds. Belongs to the dataset.
class LevelStore
{
public:
    struct Level
    {
        unsigned int mnNumber;
        unsigned int mnWidth;
        unsigned int mnHeight;

        friend auto operator<=>(const Level&, const Level&) = default;
    };

    virtual ~LevelStore();

    // Ascending.
    virtual std::vector<Level> GetLevels() const = 0;
    // Of those that there are.
    virtual std::shared_ptr<BlockImage> OpenLevel(unsigned int nLevel) = 0;
    // What is recorded of the level's own; nothing unless overridden.
    virtual krv::datasources::AuxiliaryData ReadLevelRecord(unsigned int nLevel);
    // The channel of the levels' images that has the number outside, unless overridden the same; 0 when there is none.
    virtual unsigned int FindChannel(unsigned int nChannel) const;
    // The record that holds the book.
    virtual const krv::datasources::AuxiliaryData& GetBook() const = 0;

    // These take the book as it is after them.
    virtual void MakeLevel(const Level& oLevel, const krv::datasources::AuxiliaryData& oBook, const Place& oPlace) = 0;
    virtual void DropLevel(unsigned int nLevel, const krv::datasources::AuxiliaryData& oBook, const Place& oPlace) = 0;
    // bValid: a level became valid, and is to become invalid with the next change of the image.
    virtual void WriteBook(const krv::datasources::AuxiliaryData& oBook, bool bValid, const Place& oPlace) = 0;

    // The method of levels to come, in capitals; empty as long as nobody said it. Kept between managers.
    virtual std::string& GetMethod() { return moMethod; }

private:
    std::string moMethod;
};

// The overview manager over them.
class OverviewManager : public krv::datasources::IOverviewManager
{
public:
    // Both outlive it.
    OverviewManager(const Dataset& oDataset, LevelStore& oLevels) : moDataset(oDataset), moLevels(oLevels) {}
    ~OverviewManager() override;

    std::vector<unsigned int> GetLevels() const override;
    krv::datasources::IRasterIO* GetOverviewIO(unsigned int nLevel,
                                               const std::vector<unsigned int>& oChannels) override;
    void CreateLevel(unsigned int nLevel) override;
    bool IsValid(unsigned int nChannel, unsigned int nLevel) const override;
    void DeleteLevel(unsigned int nLevel) override;
    std::string GetResamplingName() const override;
    void SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid) override;
    unsigned int GetLevelWidth(unsigned int nLevel) const override;
    unsigned int GetLevelHeight(unsigned int nLevel) const override;
    krv::datasources::AuxiliaryData GetAuxiliaryData(unsigned int nLevel) override;
    void SetResamplingName(const std::string& oName) override;

private:
    bool Has(unsigned int nLevel) const;
    LevelStore::Level Get(unsigned int nLevel, const Place& oPlace) const;
    unsigned int GetChannel(unsigned int nChannel, const Place& oPlace) const;

    [[noreturn]] void Fail(const std::string& what, const Place& oPlace) const;

    const Dataset& moDataset;
    LevelStore& moLevels;
};

} // namespace krv::plugins::support
