#include "plugins/krvdsk/link/linkedio.h"

#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>

namespace krv::plugins::krvdsk
{

namespace
{

constexpr unsigned int USUAL_SIDE = 256; // of a block where nobody can be asked

} // namespace

template <typename Base>
LinkedIOBase<Base>::LinkedIOBase(std::shared_ptr<Link> poLink, const Size& oSize,
                                 const std::function<krv::datasources::IRasterIO*()>& oMake)
    : mpoLink(std::move(poLink)), moSize(oSize)
{
    try
    {
        mpoInner.reset(oMake());
    }
    catch (const krv::Exception&)
    {
        mpoTrouble = std::current_exception(); // for whoever reads
    }
}

template <typename Base>
LinkedIOBase<Base>::~LinkedIOBase() = default;

template <typename Base>
unsigned int LinkedIOBase<Base>::GetTileWidth() const
{
    return mpoInner ? mpoInner->GetTileWidth() : std::min(USUAL_SIDE, moSize.mnWidth);
}

template <typename Base>
unsigned int LinkedIOBase<Base>::GetTileHeight() const
{
    return mpoInner ? mpoInner->GetTileHeight() : std::min(USUAL_SIDE, moSize.mnHeight);
}

// What the other file says of itself does not tell which one the user asked for. A window that is not in the image is
// the caller's mistake, and the other file's words are enough.
template <typename Base>
template <typename Action>
void LinkedIOBase<Base>::Read(const Action& oAction)
{
    if (!mpoInner)
        std::rethrow_exception(mpoTrouble);
    try
    {
        oAction();
    }
    catch (const krv::FileException&)
    {
        mpoLink->Rethrow();
    }
}

template <typename Base>
void LinkedIOBase<Base>::ReadWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                                    unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                                    unsigned char* pBuffer)
{
    Read([&] { mpoInner->ReadWindow(nX, nY, nWidth, nHeight, nPartX, nPartY, nPartWidth, nPartHeight, pBuffer); });
}

template <typename Base>
void LinkedIOBase<Base>::ReadWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                                    unsigned char* pBuffer)
{
    Read([&] { mpoInner->ReadWindow(nX, nY, nWidth, nHeight, pBuffer); });
}

template <typename Base>
void LinkedIOBase<Base>::RefuseWriting(const Link& oLink, const Place& oPlace)
{
    throw DataException(oLink.GetOwner() + ": its pixels lie in " + oLink.GetName() + " and are not written from here",
                        oPlace);
}

template <typename Base>
void LinkedIOBase<Base>::WriteWindow(int, int, unsigned int, unsigned int, unsigned int, unsigned int, unsigned int,
                                     unsigned int, unsigned char* const)
{
    RefuseWriting(*mpoLink, Place::Current());
}

template <typename Base>
void LinkedIOBase<Base>::WriteWindow(unsigned int, unsigned int, unsigned int, unsigned int, unsigned char* const)
{
    RefuseWriting(*mpoLink, Place::Current());
}

void ReadBlockWindow(krv::datasources::IRasterIO& oIO, const BlockPart& oPart, unsigned char* pTarget,
                     std::size_t nPitch, support::Scratch& oScratch)
{
    const support::PixelRect oRect = oPart.moLayout.GetBlockRect(oPart.moBlock.mnColumn, oPart.moBlock.mnRow);
    const support::PixelRect& oWanted = oPart.moPart;
    const std::size_t nRow = oWanted.mnWidth * oPart.moLayout.GetPixelBytes(oPart.moBlock.mnPlane);
    unsigned char* const pRead = nPitch == nRow ? pTarget : oScratch.Get(nRow * oWanted.mnHeight);
    oIO.ReadWindow(oRect.mnX + oWanted.mnX, oRect.mnY + oWanted.mnY, oWanted.mnWidth, oWanted.mnHeight, pRead);
    if (pRead != pTarget)
        raster::CopyRows(pRead, nRow, pTarget, nPitch, nRow, oWanted.mnHeight);
}

template class LinkedIOBase<krv::datasources::IRasterIO>;
template class LinkedIOBase<krv::datasources::IOverviewIO>;

} // namespace krv::plugins::krvdsk
