#pragma once

#include "datasources/interfaces/ioverviewio.h"
#include "plugins/support/image/imagelayout.h"
#include "plugins/support/image/scratch.h"

#include <memory>
#include <vector>

namespace krv::plugins::support
{

// Several one-channel I/O objects of the same image size and type, read and written as the channels of one.
class StackedIO : public krv::datasources::IOverviewIO
{
public:
    // nValueBytes: bytes of one value of the common type. nLevel: what GetLevel answers; 1 for full size.
    // Throws DataException for an empty list and for sizes that differ.
    StackedIO(std::vector<std::unique_ptr<krv::datasources::IRasterIO>> oParts, unsigned int nValueBytes,
              unsigned int nLevel);
    ~StackedIO() override;

    unsigned int GetFileWidth() const override;
    unsigned int GetFileHeight() const override;
    unsigned int GetTileWidth() const override;
    unsigned int GetTileHeight() const override;
    unsigned int GetLevel() const override { return mnLevel; }

    void ReadWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX, unsigned int nPartY,
                    unsigned int nPartWidth, unsigned int nPartHeight, unsigned char* pBuffer) override;
    void ReadWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                    unsigned char* pBuffer) override;
    void WriteWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                     unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                     unsigned char* const pBuffer) override;
    void WriteWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                     unsigned char* const pBuffer) override;

private:
    template <typename Action>
    void ForEachSlice(int nX, int nY, unsigned int nWidth, unsigned int nHeight, const PixelRect& oPart,
                      const unsigned char* pBuffer, Action oAction);

    std::vector<std::unique_ptr<krv::datasources::IRasterIO>> moParts;
    unsigned int mnValueBytes;
    unsigned int mnLevel;
    Scratch moScratch;
};

} // namespace krv::plugins::support
