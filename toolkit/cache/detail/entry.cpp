#include "toolkit/cache/detail/entry.h"

#include "toolkit/core/detail/systemblock.h"

#include <cstring>
#include <new>
#include <utility>

namespace krv::cache::detail
{

Memory::Memory(Ledger& oLedger, std::size_t nBytes) : mpLedger(&oLedger), mnBytes(nBytes)
{
    mpBytes = static_cast<unsigned char*>(core::detail::NewSystemBlock(nBytes, nBytes));
    if (mpBytes == nullptr)
    {
        oLedger.Remove(Cost(nBytes));
        throw std::bad_alloc();
    }
}

Memory& Memory::operator=(Memory&& oOther) noexcept
{
    std::swap(mpLedger, oOther.mpLedger);
    std::swap(mpBytes, oOther.mpBytes);
    std::swap(mnBytes, oOther.mnBytes);
    return *this;
}

Memory::~Memory()
{
    if (mpBytes == nullptr)
        return;
    core::detail::DeleteSystemBlock(mpBytes, mnBytes);
    mpLedger->Remove(Cost(mnBytes));
}

// A frame lies as four blocks of rows: those at the top and at the bottom, and the ends of all rows, left and right.
const unsigned char* Entry::Locate(const TileArea& oArea, std::size_t& nPitch) const
{
    nPitch = moShape.mnRowBytes;
    const unsigned char* pBytes = moMemory.Get();
    if (!mbReduced)
        return pBytes + oArea.mnY * nPitch + oArea.mnX;
    if (oArea.mnY + oArea.mnRows <= moFrame.mnTop)
        return pBytes + oArea.mnY * nPitch + oArea.mnX;
    pBytes += moFrame.mnTop * moShape.mnRowBytes;
    if (oArea.mnY >= moShape.mnRows - moFrame.mnBottom)
        return pBytes + (oArea.mnY - (moShape.mnRows - moFrame.mnBottom)) * nPitch + oArea.mnX;
    pBytes += moFrame.mnBottom * moShape.mnRowBytes;
    if (oArea.mnX + oArea.mnRowBytes <= moFrame.mnLeft)
    {
        nPitch = moFrame.mnLeft;
        return pBytes + oArea.mnY * nPitch + oArea.mnX;
    }
    pBytes += moFrame.mnLeft * moShape.mnRows;
    if (oArea.mnX >= moShape.mnRowBytes - moFrame.mnRight)
    {
        nPitch = moFrame.mnRight;
        return pBytes + oArea.mnY * nPitch + (oArea.mnX - (moShape.mnRowBytes - moFrame.mnRight));
    }
    return nullptr;
}

std::size_t Entry::GetFrameBytes() const
{
    return (moFrame.mnTop + moFrame.mnBottom) * moShape.mnRowBytes +
           (moFrame.mnLeft + moFrame.mnRight) * moShape.mnRows;
}

bool Entry::HasFrame() const
{
    const std::size_t nFrame = GetFrameBytes();
    return nFrame != 0 && nFrame <= GetBytes() / 2;
}

Memory Entry::Reduce(Memory oFrame)
{
    unsigned char* pTarget = oFrame.Get();
    const unsigned char* const pBytes = moMemory.Get();
    const auto CopyBlock = [&](std::size_t nX, std::size_t nY, std::size_t nRowBytes, std::size_t nRows)
    {
        for (std::size_t nRow = 0; nRow < nRows && nRowBytes != 0; ++nRow, pTarget += nRowBytes)
            std::memcpy(pTarget, pBytes + (nY + nRow) * moShape.mnRowBytes + nX, nRowBytes);
    };
    CopyBlock(0, 0, moShape.mnRowBytes, moFrame.mnTop);
    CopyBlock(0, moShape.mnRows - moFrame.mnBottom, moShape.mnRowBytes, moFrame.mnBottom);
    CopyBlock(0, 0, moFrame.mnLeft, moShape.mnRows);
    CopyBlock(moShape.mnRowBytes - moFrame.mnRight, 0, moFrame.mnRight, moShape.mnRows);
    mbReduced = true;
    return std::exchange(moMemory, std::move(oFrame));
}

void UseList::AddNewest(Entry& oEntry)
{
    oEntry.mpoOlder = mpoNewest;
    oEntry.mpoNewer = nullptr;
    (mpoNewest != nullptr ? mpoNewest->mpoNewer : mpoOldest) = &oEntry;
    mpoNewest = &oEntry;
}

void UseList::AddOldest(Entry& oEntry)
{
    oEntry.mpoNewer = mpoOldest;
    oEntry.mpoOlder = nullptr;
    (mpoOldest != nullptr ? mpoOldest->mpoOlder : mpoNewest) = &oEntry;
    mpoOldest = &oEntry;
}

void UseList::Remove(Entry& oEntry)
{
    (oEntry.mpoOlder != nullptr ? oEntry.mpoOlder->mpoNewer : mpoOldest) = oEntry.mpoNewer;
    (oEntry.mpoNewer != nullptr ? oEntry.mpoNewer->mpoOlder : mpoNewest) = oEntry.mpoOlder;
    oEntry.mpoOlder = oEntry.mpoNewer = nullptr;
}

} // namespace krv::cache::detail
