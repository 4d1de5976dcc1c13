#pragma once

#include "datasources/interfaces/ilevelstates.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "toolkit/exceptions/place.h"

#include <compare>
#include <string>
#include <vector>

namespace krv::datasources
{

// The levels of one image, as a dataset keeps them. What is known of each beside its pixels stands in the book of
// levels (levelbook.h), which a record holds. Belongs to the dataset.
// For authors of formats: what differs between them is where a level lies, not what a level is. One thread at a time.
class KRV_DATASOURCES_API LevelStore
{
public:
    struct Level
    {
        unsigned int mnNumber; // the reduction factor, from 2
        unsigned int mnWidth;  // pixels, as the file has them
        unsigned int mnHeight;

        friend auto operator<=>(const Level&, const Level&) = default;
    };

    virtual ~LevelStore();

    // Ascending.
    virtual std::vector<Level> GetLevels() const = 0;
    // What is recorded of the level's own; nothing unless overridden.
    virtual AuxiliaryData ReadLevelRecord(unsigned int nLevel);
    // The channel of the levels' images that has the number outside, unless overridden the same; 0 when there is none.
    virtual unsigned int FindChannel(unsigned int nChannel) const;
    // The record that holds the book.
    virtual const AuxiliaryData& GetBook() const = 0;

    // Lays out the images of a level, all 0. oBook, here and below: the book as it is afterwards, to be stored with it.
    virtual void MakeLevel(const Level& oLevel, const AuxiliaryData& oBook, const Place& oPlace) = 0;
    // Takes the images of a level out of the file.
    virtual void DropLevel(unsigned int nLevel, const AuxiliaryData& oBook, const Place& oPlace) = 0;
    // bValid: a level became valid, and is to become invalid with the next change of the image.
    // Throws what writing the record throws; the book on the disk is as before then.
    virtual void WriteBook(const AuxiliaryData& oBook, bool bValid, const Place& oPlace) = 0;

    // The method of levels to come, in capitals; empty as long as nobody said it. Kept between managers.
    virtual std::string& GetMethod() { return moMethod; }

private:
    std::string moMethod;
};

// The overview manager over them: what is refused, how large a level is and what the book says of it. A derived class
// says of whose image the levels are and how their pixels are reached.
// The operations are IOverviewManager's, with errors in one wording for all formats.
class KRV_DATASOURCES_API LevelManager : public IOverviewManager, public ILevelStates
{
public:
    // The store outlives it.
    explicit LevelManager(LevelStore& oLevels) : moLevels(oLevels) {}
    ~LevelManager() override;

    std::vector<unsigned int> GetLevels() const override;
    IRasterIO* GetOverviewIO(unsigned int nLevel, const std::vector<unsigned int>& oChannels) override;
    void CreateLevel(unsigned int nLevel) override;
    bool IsValid(unsigned int nChannel, unsigned int nLevel) const override;
    void DeleteLevel(unsigned int nLevel) override;
    std::string GetResamplingName() const override;
    void SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid) override;
    void SetChannelsValid(const std::vector<unsigned int>& oChannels, unsigned int nLevel, bool bValid) override;
    unsigned int GetLevelWidth(unsigned int nLevel) const override;
    unsigned int GetLevelHeight(unsigned int nLevel) const override;
    AuxiliaryData GetAuxiliaryData(unsigned int nLevel) override;
    void SetResamplingName(const std::string& oName) override;

private:
    // What messages begin with.
    virtual std::string GetImageName() const = 0;
    // The size of the image that the levels are of, in pixels.
    virtual unsigned int GetImageWidth() const = 0;
    // Rows of it.
    virtual unsigned int GetImageHeight() const = 0;
    // Throws DataException unless the dataset may be changed. pWhat: such as "overviews cannot be written".
    virtual void CheckWriting(const char* pWhat, const Place& oPlace) const = 0;
    // A new I/O object over a level that there is. oChannels: as FindChannel gave them.
    virtual IRasterIO* OpenLevelIO(unsigned int nLevel, const std::vector<unsigned int>& oChannels) = 0;

    void StoreStates(const std::vector<unsigned int>& oChannels, unsigned int nLevel, bool bValid, const Place& oPlace);
    bool Has(unsigned int nLevel) const;
    LevelStore::Level Get(unsigned int nLevel, const Place& oPlace) const;
    unsigned int GetChannel(unsigned int nChannel, const Place& oPlace) const;

    [[noreturn]] void Fail(const std::string& what, const Place& oPlace) const;

    LevelStore& moLevels;
};

} // namespace krv::datasources
