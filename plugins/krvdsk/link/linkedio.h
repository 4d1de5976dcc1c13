#pragma once

#include "datasources/interfaces/ioverviewio.h"
#include "datasources/interfaces/irasterio.h"
#include "plugins/krvdsk/link/link.h"
#include "plugins/support/file/scratch.h"
#include "plugins/support/image/iblocksource.h"
#include "toolkit/exceptions/place.h"

#include <exception>
#include <functional>
#include <memory>

namespace krv::plugins::krvdsk
{

// Windows of linked pixels, handed through to the other file. Made whether or not that file is there: then reading
// throws. Writing always does. Base is IRasterIO or IOverviewIO.
template <typename Base>
class LinkedIOBase : public Base
{
public:
    struct Size
    {
        unsigned int mnWidth;
        unsigned int mnHeight;
    };

    // oMake: an I/O object of the other file; it may throw. oSize: of the image or level.
    LinkedIOBase(std::shared_ptr<Link> poLink, const Size& oSize,
                 const std::function<krv::datasources::IRasterIO*()>& oMake);
    ~LinkedIOBase() override;

    unsigned int GetFileWidth() const override { return moSize.mnWidth; }
    unsigned int GetFileHeight() const override { return moSize.mnHeight; }
    unsigned int GetTileWidth() const override;
    unsigned int GetTileHeight() const override;
    void ReadWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX, unsigned int nPartY,
                    unsigned int nPartWidth, unsigned int nPartHeight, unsigned char* pBuffer) override;
    void ReadWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                    unsigned char* pBuffer) override;
    void WriteWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                     unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                     unsigned char* const pBuffer) override;
    void WriteWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                     unsigned char* const pBuffer) override;

    // Throws the DataException of linked pixels that are to be written.
    [[noreturn]] static void RefuseWriting(const Link& oLink, const Place& oPlace);

private:
    template <typename Action>
    void Read(const Action& oAction);

    std::shared_ptr<Link> mpoLink; // before the I/O object, which belongs to its dataset
    Size moSize;
    std::unique_ptr<krv::datasources::IRasterIO> mpoInner;
    std::exception_ptr mpoTrouble; // why there is none
};

// A part of a block of a layout.
struct BlockPart
{
    const support::ImageLayout& moLayout;
    const support::BlockAddress& moBlock;
    const support::PixelRect& moPart;
};

// Its pixels, in rows that lie nPitch bytes apart.
void ReadBlockWindow(krv::datasources::IRasterIO& oIO, const BlockPart& oPart, unsigned char* pTarget,
                     std::size_t nPitch, support::Scratch& oScratch);

extern template class LinkedIOBase<krv::datasources::IRasterIO>;
extern template class LinkedIOBase<krv::datasources::IOverviewIO>;

using LinkedIO = LinkedIOBase<krv::datasources::IRasterIO>;

class LinkedLevelIO : public LinkedIOBase<krv::datasources::IOverviewIO>
{
public:
    LinkedLevelIO(unsigned int nLevel, std::shared_ptr<Link> poLink, const Size& oSize,
                  const std::function<krv::datasources::IRasterIO*()>& oMake)
        : LinkedIOBase(std::move(poLink), oSize, oMake), mnLevel(nLevel)
    {
    }

    unsigned int GetLevel() const override { return mnLevel; }

private:
    unsigned int mnLevel;
};

} // namespace krv::plugins::krvdsk
