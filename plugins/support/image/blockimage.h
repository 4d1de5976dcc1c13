#pragma once

#include "plugins/support/file/scratch.h"
#include "plugins/support/image/blockcache.h"
#include "plugins/support/image/blocktiles.h"
#include "plugins/support/image/iblocksource.h"
#include "plugins/support/image/passorder.h"
#include "plugins/support/image/rowcache.h"
#include "toolkit/exceptions/place.h"
#include "toolkit/raster/interleave.h"

#include <cstddef>
#include <memory>
#include <utility>
#include <vector>

namespace krv::plugins::support
{

// A list of channels of one type, in the order of the caller's pixels, repeats allowed.
// Made once for a list, and used for every window. Any thread may read it.
class ChannelSelection
{
public:
    // Channels from 1. Throws DataException for an empty list, a channel that does not exist and several types.
    ChannelSelection(const ImageLayout& oLayout, const std::vector<unsigned int>& oChannels,
                     const Place& oPlace = Place::Current());

    // In the order of the list.
    const std::vector<ChannelPlace>& GetPlaces() const { return moPlaces; }
    std::size_t GetCount() const { return moPlaces.size(); }
    const krv::gobs::DataType& GetDataType() const { return moType; }

    // Both parts of a complex value; a pixel has as many values as the list has channels.
    std::size_t GetValueBytes() const { return mnValueBytes; }
    std::size_t GetPixelBytes() const { return mnValueBytes * moPlaces.size(); }

    // Whether all come from one plane; whether they are just that plane's pixels.
    bool IsOnePlane() const { return mbOnePlane; }
    bool IsWholePlane() const { return mbWholePlane; }
    // Whether no channel of a plane is missing.
    // nPlaneChannels: as the layout says. Then blocks can be replaced without reading them.
    bool CoversPlane(unsigned int nPlane, unsigned int nPlaneChannels) const;
    // Whether every plane that takes part has one channel.
    bool IsSinglePlanes() const { return mbSinglePlanes; }
    // The positions within the plane, for a selection of one plane.
    const std::vector<std::size_t>& GetPositions() const { return moPositions; }

private:
    std::vector<ChannelPlace> moPlaces; // in the order of the list
    std::vector<std::size_t> moPositions;
    krv::gobs::DataType moType;
    std::size_t mnValueBytes = 0; // both parts of a complex value
    bool mbOnePlane = true;       // all channels come from one plane
    bool mbWholePlane = false;    // they are its channels, in its order
    bool mbSinglePlanes = true;   // every plane has one channel
};

// An image made of blocks, read and written in rectangles. Blocks that are wanted whole are decoded straight into the
// caller's memory; others go through the process's store, so that neighbouring windows, of whatever reader, decode each
// block once. A block that another thread is decoding is taken last, when everything else of the window is done.
// Sources that read parts are asked for just the rows that a window touches, unless consecutive windows share blocks.
// One thread at a time.
// Between a format, which knows blocks, and IRasterIO, which knows windows. Several I/O objects share one.
class BlockImage
{
public:
    // poCache: of the dataset.
    // poSource: taken over with its other owners; the file stays open as long as the image.
    BlockImage(std::shared_ptr<IBlockSource> poSource, const std::shared_ptr<BlockCache>& poCache);
    ~BlockImage();
    BlockImage(const BlockImage&) = delete;
    BlockImage& operator=(const BlockImage&) = delete;

    // The source's.
    const ImageLayout& GetLayout() const { return moLayout; }

    // It belongs to the image.
    IBlockSource& GetSource() { return *mpoSource; }

    // A rectangle inside the image; row r goes to pTarget + r * nPitch.
    // Pixels are interleaved in the order of the selection; bytes between rows stay untouched. Throws what the source
    // throws, the target's contents undefined.
    void Read(const ChannelSelection& oChannels, const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch);

    // Parts of blocks are passed on as such: whether blocks are read for that is the source's affair. pSource is not
    // kept.
    void Write(const ChannelSelection& oChannels, const PixelRect& oRect, const unsigned char* pSource,
               std::size_t nPitch);

    // Forgets decoded blocks, when the file changed.
    // For all that share them: other datasets of the origin decode anew.
    void DropBlocks();

private:
    struct Range;
    struct Pixels;
    struct Job;

    // What is kept of a block of which a part is wanted.
    enum class Keep
    {
        eNothing,
        eRows, // the wanted rows in all their width
        eBlock
    };

    using Wait = BlockTiles::Wait;

    // False: a block that another thread decodes was left out, since eWait says not to wait.
    [[nodiscard]] bool ReadPart(const Job& oJob, unsigned int nColumn, unsigned int nRow, Wait eWait);
    [[nodiscard]] bool ReadOnePlane(const Job& oJob, const BlockAddress& oBlock, const PixelRect& oPart, Keep eKeep,
                                    unsigned char* pTarget, Wait eWait);
    [[nodiscard]] bool ReadPlanes(const Job& oJob, const BlockAddress& oBlock, const PixelRect& oPart, Keep eKeep,
                                  unsigned char* pTarget, Wait eWait);
    static void InterleaveParts(const std::vector<Pixels>& oParts, unsigned char* pTarget, std::size_t nPitch,
                                const raster::PixelArea& oArea);
    void CopyChannel(const unsigned char* pSource, std::size_t nSourcePitch, std::size_t nSourceChannel,
                     std::size_t nSourceChannels, unsigned char* pTarget, std::size_t nTargetPitch,
                     std::size_t nTargetChannel, std::size_t nTargetChannels, const raster::PixelArea& oArea);
    void WritePart(const ChannelSelection& oChannels, const PixelRect& oRect, const BlockAddress& oBlock,
                   const unsigned char* pSource, std::size_t nPitch);
    void ForgetBlock(const BlockAddress& oBlock);
    void ReserveRowCache(const Job& oJob);
    bool IsThin(unsigned int nRows) const;
    unsigned int CountThinRows(const Job& oJob) const;
    Pixels ObtainPart(const BlockAddress& oBlock, const PixelRect& oPart, Keep eKeep, Scratch& oScratch,
                      unsigned int nFollowing, Wait eWait);
    Pixels ObtainKept(const BlockAddress& oBlock, const PixelRect& oPart, Keep eKeep, unsigned int nFollowing,
                      Wait eWait);
    Pixels FindBlock(const BlockAddress& oBlock, const PixelRect& oPart);
    Pixels LoadBlock(const BlockAddress& oBlock, const PixelRect& oPart, unsigned int nFollowing, Wait eWait);
    Pixels LoadPlainBlock(const BlockAddress& oBlock, const PixelRect& oPart);
    Pixels TryLoad(const BlockAddress& oBlock, const PixelRect& oPart, unsigned int nFollowing, Wait eWait);
    Pixels GetRows(const BlockAddress& oBlock, const PixelRect& oPart);
    void FillEntry(RowCache& oCache, const RowCache::Key& oKey, const BlockAddress& oBlock, const PixelRect& oPart,
                   unsigned char* pTarget);
    void Announce(const BlockAddress& oBlock, unsigned int nFollowing);
    Keep ChooseKeep(const Job& oJob, unsigned int nColumn, unsigned int nRow, const PixelRect& oPart) const;
    void NoteWindow(const Range& oRange, unsigned int nPlane);
    void NotePass(const Job& oJob);

    std::shared_ptr<IBlockSource> mpoSource;
    const ImageLayout& moLayout;                                // the source's
    BlockTiles moTiles;                                         // decoded blocks in the process's store
    PassOrder moPass;                                           // which of them are done with
    std::vector<std::pair<unsigned int, unsigned int>> moLater; // blocks of a window that another thread decodes
    BlockAddress moForeseen;                                    // the first block behind those that were foreseen last
    // For sources that read parts.
    std::unique_ptr<RowCache> mpoRowCache;
    std::unique_ptr<RowCache> mpoThinCache;
    bool mbParts;       // the source reads parts
    bool mbSmallBlocks; // many blocks make a row cache's worth
    Scratch moScratch;  // of blocks
    Scratch moChannelScratch;
    std::vector<Scratch> moPlaneScratch;

    // The blocks of the last window and how often windows shared blocks with the one before.
    unsigned int moLastRange[4] = {1, 1, 0, 0};
    unsigned int mnLastPlane = 0;
    int mnSharing = 0;
};

} // namespace krv::plugins::support
