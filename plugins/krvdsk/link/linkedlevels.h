#pragma once

#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "plugins/krvdsk/link/link.h"

#include <functional>
#include <memory>
#include <vector>

namespace krv::plugins::krvdsk
{

// The levels of a file some of whose channels are linked: those of the other file and its own, as if they were one. The
// other file is not written: what is made or changed here is the file's own. Bitmaps count for channels where it is
// theirs.
class LinkedLevels : public krv::datasources::IOverviewManager
{
public:
    struct Owner
    {
        // The number that a channel has in the other file, when its level is seen from there; 0 when the file has that
        // itself.
        std::function<unsigned int(unsigned int nChannel, unsigned int nLevel)> moFindSource;
        // Makes it the file's own, since it is to be changed. 0 for a channel: a level is to be made for all of them.
        std::function<void(unsigned int nChannel, unsigned int nLevel)> moTakeOver;
        // Whether a level of the file's own was made of pixels that the other one no longer has, and that it was made
        // of those that it has; empty where that does not matter.
        std::function<bool(unsigned int nChannel, unsigned int nLevel)> moIsOutdated;
        std::function<void(unsigned int nChannel, unsigned int nLevel)> moNoteMade;
        // Whether the file's own levels have room for the linked channels too.
        bool mbForAll;
        unsigned int mnChannels;
    };

    // poOwn: of the file's own levels; poTheirs: of the other file's, or null.
    LinkedLevels(std::shared_ptr<Link> poLink, std::unique_ptr<krv::datasources::IOverviewManager> poOwn,
                 std::unique_ptr<krv::datasources::IOverviewManager> poTheirs, Owner oOwner);
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
    // As Owner says, where the other file has such a level and the file itself none of another size; else 0.
    unsigned int FindSource(unsigned int nChannel, unsigned int nLevel) const;
    // Whose size of a level counts.
    krv::datasources::IOverviewManager& FindLevel(unsigned int nLevel, const Place& oPlace) const;
    [[noreturn]] void Fail(const std::string& what, const Place& oPlace) const;

    std::shared_ptr<Link> mpoLink; // before the managers, which belong to its dataset
    std::unique_ptr<krv::datasources::IOverviewManager> mpoOwn;
    std::unique_ptr<krv::datasources::IOverviewManager> mpoTheirs;
    Owner moOwner;
};

} // namespace krv::plugins::krvdsk
