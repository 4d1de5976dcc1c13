#pragma once

#include "plugins/krvdsk/link/link.h"
#include "plugins/support/file/scratch.h"
#include "plugins/support/image/iblocksource.h"

#include <memory>
#include <vector>

namespace krv::plugins::krvdsk
{

// The pixels of an image whose first channels are linked: theirs from the other file, all others from the file's own
// source. Linked blocks cannot be written.
class LinkedSource : public support::IBlockSource
{
public:
    // oChannels: those that are linked, in their order; neighbours of one type make a plane.
    LinkedSource(std::shared_ptr<Link> poLink, const std::vector<Link::Channel>& oChannels,
                 std::shared_ptr<support::IBlockSource> poOwn);
    ~LinkedSource() override;

    // Planes that linked channels make.
    static unsigned int CountPlanes(const std::vector<Link::Channel>& oChannels);

    const support::ImageLayout& GetLayout() const override { return moLayout; }
    void ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override;
    bool ReadsParts() const override { return mpoOwn->ReadsParts(); }
    void WriteBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, const unsigned char* pSource,
                    std::size_t nPitch) override;
    std::string GetName() const override { return mpoOwn->GetName(); }

private:
    struct LinkedPlane
    {
        support::Plane moPlane;
        std::vector<unsigned int> moNumbers; // of its channels in the other file
        std::unique_ptr<krv::datasources::IRasterIO> mpoIO;
    };

    static std::vector<LinkedPlane> MakePlanes(const std::vector<Link::Channel>& oChannels);
    support::ImageLayout MakeLayout() const;
    krv::datasources::IRasterIO& GetIO(LinkedPlane& oPlane);

    std::shared_ptr<Link> mpoLink; // before the I/O objects of the planes
    std::shared_ptr<support::IBlockSource> mpoOwn;
    std::vector<LinkedPlane> moPlanes;
    support::ImageLayout moLayout;
    support::Scratch moScratch;
};

} // namespace krv::plugins::krvdsk
