#pragma once

#include "plugins/krvdsk/link/link.h"
#include "plugins/krvdsk/store/tiletable.h"
#include "plugins/support/file/scratch.h"
#include "plugins/support/image/iblocksource.h"

#include <memory>
#include <vector>

namespace krv::plugins::krvdsk
{

// The pixels of a level of a file whose first channels are linked. A plane of theirs for each of them: as long as
// nothing was written into it, the other file's level is seen in its place, if that is of the same size.
class LinkedLevelSource : public support::IBlockSource
{
public:
    struct Channel
    {
        unsigned int mnNumber; // in the other file
        std::shared_ptr<TileTable> mpoTable;
    };

    // poOwn: of the file's own level, whose first planes are those of the linked channels.
    LinkedLevelSource(std::shared_ptr<Link> poLink, std::vector<Channel> oChannels, unsigned int nLevel,
                      std::shared_ptr<support::IBlockSource> poOwn);
    ~LinkedLevelSource() override;

    const support::ImageLayout& GetLayout() const override { return mpoOwn->GetLayout(); }
    void ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override;
    bool ReadsParts() const override { return mpoOwn->ReadsParts(); }
    void WriteBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, const unsigned char* pSource,
                    std::size_t nPitch) override;
    std::string GetName() const override { return mpoOwn->GetName(); }

private:
    struct Theirs
    {
        bool mbKnown = false;
        std::unique_ptr<krv::datasources::IRasterIO> mpoIO; // null: there is no such level
    };

    krv::datasources::IRasterIO* FindIO(std::size_t nChannel);

    std::shared_ptr<Link> mpoLink; // before the I/O objects
    std::vector<Channel> moChannels;
    unsigned int mnLevel;
    std::shared_ptr<support::IBlockSource> mpoOwn;
    std::vector<Theirs> moTheirs;
    support::Scratch moScratch;
};

} // namespace krv::plugins::krvdsk
