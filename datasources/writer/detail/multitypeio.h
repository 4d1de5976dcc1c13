#pragma once

#include "datasources/datasets/detail/memorytiles.h"
#include "datasources/interfaces/windowedio.h"
#include "datasources/writer/irasterwriter.h"
#include "gobs/raster/datatype.h"
#include "toolkit/raster/merger.h"
#include "toolkit/raster/splitter.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <vector>

namespace krv::datasources::detail
{

// Channels of one type, which a writer of their own writes.
struct WriterGroup
{
    std::unique_ptr<IRasterWriter> mpoWriter;
    std::vector<unsigned int> moPositions;    // of its channels in the raster, from 0
    MemoryIO<IRasterIO>* mpoMemory = nullptr; // the writer's, when its pixels are in memory
};

// How conversion changed samples; the writer's, which outlives its I/O.
struct SampleChanges
{
    bool mbStrict = false;                // refuse them
    std::vector<std::uint64_t> moCounts;  // of each channel
    std::vector<unsigned int> moChannels; // their numbers in the file, for messages
};

// The transfer of windows of channels of several types as one type, over a writer for each type.
class MultiTypeIO : public WindowedIO<IRasterIO>
{
public:
    // The groups place every channel of the raster, each once; all are of one size.
    MultiTypeIO(std::vector<WriterGroup> oGroups, const krv::gobs::DataType& oType,
                std::shared_ptr<SampleChanges> poChanges);
    ~MultiTypeIO() override;

    unsigned int GetFileWidth() const override { return First().GetWidth(); }
    unsigned int GetFileHeight() const override { return First().GetHeight(); }
    unsigned int GetTileWidth() const override { return First().GetTileWidth(); }
    unsigned int GetTileHeight() const override { return First().GetTileHeight(); }

private:
    class Parts;

    // Part of a row of tiles, and where its pixels go in each group.
    struct Piece
    {
        std::uint64_t mnFirst;  // pixel of the row
        std::uint64_t mnPixels; // in a run
        std::vector<unsigned char*> moTargets;
        std::vector<std::size_t> moPitches;
    };

    const IRasterWriter& First() const { return *moGroups.front().mpoWriter; }
    std::uint64_t SumOwnBytes() const;
    std::size_t GetPixelBytes() const override { return mnPixelBytes; }
    void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override;
    void WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch) override;
    bool WriteInPlace(const PixelRect& oBand, const unsigned char* pSource, std::size_t nPitch, bool bStream);
    void StreamRun(const std::vector<Piece>& oPieces, const unsigned char* pSource, std::uint64_t nPixels,
                   std::vector<std::uint64_t>& oChanged);
    void WriteBand(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch);
    void TakeChanges(const PixelRect& oRect, const std::vector<std::uint64_t>& oChanged);

    std::vector<WriterGroup> moGroups;   // ascending by data type
    std::vector<std::size_t> moOwnBytes; // of a pixel in each
    krv::gobs::DataType moType;
    std::size_t mnPixelBytes = 0;
    std::uint64_t mnStreamed = 0;   // pixels
    unsigned int mnBlockHeight = 1; // of the highest blocks
    bool mbMemory = true;           // all groups lie in memory
    std::shared_ptr<SampleChanges> mpoChanges;
    std::vector<unsigned int> moSplitPositions; // of the splitter's channels, in its order
    std::optional<krv::raster::Splitter> moSplitter;
    std::optional<krv::raster::Merger> moMerger;        // made by the first reading
    std::vector<std::vector<unsigned char>> moStreamed; // for each group in memory
    std::vector<unsigned char*> moStreamTargets;        // the beginnings of moStreamed
};

} // namespace krv::datasources::detail
