#pragma once

#include "plugins/support/file/scratch.h"
#include "plugins/support/image/imagelayout.h"

#include <memory>
#include <vector>

namespace krv::plugins::support
{

// Several one-channel I/O objects of the same image size and type, read and written as the channels of one.
// For formats whose channels, masks or levels are images of their own.
class StackedIO : public krv::datasources::WindowedIO<krv::datasources::IOverviewIO>
{
public:
    // nValueBytes: bytes of one value of the common type. nLevel: what GetLevel answers; 1 for full size.
    // Throws DataException for an empty list and for sizes that differ.
    // oParts: not empty, each of one channel and of the common type; taken over.
    StackedIO(std::vector<std::unique_ptr<krv::datasources::IRasterIO>> oParts, unsigned int nValueBytes,
              unsigned int nLevel);
    ~StackedIO() override;

    unsigned int GetFileWidth() const override;
    unsigned int GetFileHeight() const override;
    unsigned int GetTileWidth() const override;
    unsigned int GetTileHeight() const override;
    unsigned int GetLevel() const override { return mnLevel; }

private:
    std::size_t GetPixelBytes() const override { return moParts.size() * mnValueBytes; }
    void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override;
    void WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch) override;
    template <typename Action>
    void ForEachSlice(const PixelRect& oRect, const Action& oAction);

    std::vector<std::unique_ptr<krv::datasources::IRasterIO>> moParts;
    unsigned int mnValueBytes; // of one part
    unsigned int mnLevel;
    Scratch moScratch; // a slice of one part
};

} // namespace krv::plugins::support
