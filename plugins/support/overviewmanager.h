#pragma once

#include "datasources/metadata/levelmanager.h"
#include "plugins/support/dataset.h"

#include <memory>
#include <string>
#include <vector>

namespace krv::plugins::support
{

// The levels of one image, as a format has them.
// A format with levels derives from it and says where the images of a level are.
class LevelStore : public krv::datasources::LevelStore
{
public:
    ~LevelStore() override;

    // The pixels of a level that there is.
    // Opened once and shared by all I/O objects over the level. Throws what reading the file throws.
    virtual std::shared_ptr<BlockImage> OpenLevel(unsigned int nLevel) = 0;
};

// The overview manager over them.
// GetOverviewManager of a dataset gives a new one to the caller.
class OverviewManager : public krv::datasources::LevelManager
{
public:
    // Both outlive it.
    OverviewManager(const Dataset& oDataset, LevelStore& oLevels)
        : LevelManager(oLevels), moDataset(oDataset), moLevels(oLevels)
    {
    }
    ~OverviewManager() override;

private:
    std::string GetImageName() const override { return moDataset.GetFileName(); }
    unsigned int GetImageWidth() const override { return moDataset.GetWidth(); }
    unsigned int GetImageHeight() const override { return moDataset.GetHeight(); }
    void CheckWriting(const char* pWhat, const Place& oPlace) const override { moDataset.CheckWriting(pWhat, oPlace); }
    krv::datasources::IRasterIO* OpenLevelIO(unsigned int nLevel, const std::vector<unsigned int>& oChannels) override;

    const Dataset& moDataset; // borrowed
    LevelStore& moLevels;     // borrowed
};

} // namespace krv::plugins::support
