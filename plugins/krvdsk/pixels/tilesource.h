#pragma once

#include "plugins/krvdsk/pixels/tilecodec.h"
#include "plugins/krvdsk/store/storewriter.h"
#include "plugins/support/image/iblocksource.h"
#include "plugins/support/writing/heldblocks.h"

#include <functional>
#include <memory>
#include <vector>

namespace krv::plugins::krvdsk
{

// The pixels of an image, a level or a bitmap from the tiles of its planes, and into them. The checksum of a tile is
// looked at when it is read first. Tiles that come whole are stored at once; of others the pixels are held back,
// bounded in bytes, until they have to make room or the file is synchronised. One thread at a time.
class TileSource : public support::IBlockSource, public ITileHolder
{
public:
    // What is read or written: planes of a file, one of its levels or 1, a writer or none. oBeforeWrite: called before
    // each change.
    struct Origin
    {
        std::shared_ptr<StoreFile> mpoStore;
        std::shared_ptr<StoreWriter> mpoWriter;
        std::vector<std::shared_ptr<Plane>> moPlanes;
        unsigned int mnLevel = 1;
        ImageSize moSize; // of that
        std::function<void()> moBeforeWrite;
    };

    TileSource(const Catalogue& oCatalogue, Origin oOrigin);
    ~TileSource() override;
    TileSource(const TileSource&) = delete;
    TileSource& operator=(const TileSource&) = delete;

    const support::ImageLayout& GetLayout() const override { return moLayout; }
    std::string GetName() const override { return moOrigin.mpoStore->GetName(); }
    bool ReadsParts() const override { return mbPlain; }
    support::BlockOrigin GetOrigin() const override;
    void ReadBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, unsigned char* pTarget,
                   std::size_t nPitch) override;
    void WriteBlock(const support::BlockAddress& oBlock, const support::PixelRect& oPart, const unsigned char* pSource,
                    std::size_t nPitch) override;

    bool Holds() const override;
    void StoreHeld() override;

private:
    // A plane at work.
    struct Work
    {
        std::shared_ptr<Plane> mpoPlane;
        std::shared_ptr<TileTable> mpoTable;
        TileCodec moCodec;
        support::HeldBlocks moHeld;
    };
    // A tile at work: what of it lies in the image.
    struct Spot
    {
        std::uint64_t mnTile;
        support::PixelRect moRect;
    };

    static support::ImageLayout MakeLayout(const Catalogue& oCatalogue, const Origin& oOrigin);
    std::unique_ptr<Work> MakeWork(std::size_t nPlane);
    Spot GetSpot(const support::BlockAddress& oBlock) const;
    void CheckPlane(const Work& oWork) const;
    void ReadStored(Work& oWork, const Spot& oSpot, const support::PixelRect& oPart, unsigned char* pTarget,
                    std::size_t nPitch);
    void ReadPlain(Work& oWork, const Spot& oSpot, const TileTable::Tile& oTile, const support::PixelRect& oPart,
                   unsigned char* pTarget, std::size_t nPitch);
    void ReadPlainRows(const Work& oWork, const Spot& oSpot, const TileTable::Tile& oTile,
                       const support::PixelRect& oPart, unsigned char* pTarget, std::size_t nPitch);
    void ReadCoded(Work& oWork, const Spot& oSpot, const TileTable::Tile& oTile, unsigned char* pTarget,
                   std::size_t nPitch);
    void Verify(Work& oWork, const Spot& oSpot, const TileTable::Tile& oTile, std::uint32_t nChecksum) const;
    void StoreTile(Work& oWork, const Spot& oSpot, const unsigned char* pPixels, std::size_t nPitch);
    [[noreturn]] void Fail(const Work& oWork, const Spot& oSpot, const std::string& cause) const;

    Origin moOrigin;
    support::ImageLayout moLayout;
    bool mbPlain = true;
    std::vector<std::unique_ptr<Work>> moWorks;
    support::Scratch moStored;
    support::Scratch moRows;
};

} // namespace krv::plugins::krvdsk
