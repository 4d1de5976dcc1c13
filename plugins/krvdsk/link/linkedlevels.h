#pragma once

#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "plugins/krvdsk/link/link.h"

#include <functional>
#include <memory>
#include <vector>

namespace krv::plugins::krvdsk
{

// The levels of a file some of whose channels are linked: those of the other file and its own, as if they were one.
// What is made here are levels of its own channels. Bitmaps count for channels where it is theirs.
class LinkedLevels : public krv::datasources::IOverviewManager
{
public:
    // The numbers of channels in the other file; 0 for the file's own.
    using Sources = std::function<unsigned int(unsigned int nChannel)>;

    // poOwn: of the file's own levels; poTheirs: of the other file's; either may be null. nChannels: of the file.
    LinkedLevels(std::shared_ptr<Link> poLink, std::unique_ptr<krv::datasources::IOverviewManager> poOwn,
                 std::unique_ptr<krv::datasources::IOverviewManager> poTheirs, Sources oSources,
                 unsigned int nChannels);
    ~LinkedLevels() override;

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
    static bool Has(const krv::datasources::IOverviewManager* poManager, unsigned int nLevel);
    krv::datasources::IOverviewManager& GetOwn(const char* pWhat, const Place& oPlace) const;
    // Whose size of a level counts.
    krv::datasources::IOverviewManager& FindLevel(unsigned int nLevel, const Place& oPlace) const;
    [[noreturn]] void Fail(const std::string& what, const Place& oPlace) const;

    std::shared_ptr<Link> mpoLink; // before the managers, which belong to its dataset
    std::unique_ptr<krv::datasources::IOverviewManager> mpoOwn;
    std::unique_ptr<krv::datasources::IOverviewManager> mpoTheirs;
    Sources moSources;
    unsigned int mnChannels;
};

} // namespace krv::plugins::krvdsk
