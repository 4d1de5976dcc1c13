#pragma once

#include "datasources/interfaces/ioverviewmanager.h"
#include "plugins/tif/reading/strilesource.h"

namespace krv::plugins::tif
{

class TifDataset;
struct PageLevel;

// The reduced pages of the image, or of its first bitmap, as levels. The dataset outlives it.
class TifOverviewManager : public krv::datasources::IOverviewManager
{
public:
    TifOverviewManager(TifDataset& oDataset, PixelUse eUse);
    ~TifOverviewManager() override;

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
    const PageLevel* Find(unsigned int nLevel) const;
    const PageLevel& Get(unsigned int nLevel, const Place& oPlace) const;
    unsigned int FindChannel(unsigned int nChannel) const; // 0 when there is none
    unsigned int GetChannel(unsigned int nChannel, const Place& oPlace) const;

    TifDataset& moDataset;
    PixelUse meUse;
};

} // namespace krv::plugins::tif
