#pragma once

#include "plugins/support/image/blocktiles.h"
#include "plugins/support/image/imagelayout.h"

#include <algorithm>

namespace krv::plugins::support
{

// Follows the windows of one reader, to tell which blocks it is done with in a pass along rows of tiles from top to
// bottom, and how far its windows reach into the blocks around their tiles. What it tells decides which blocks make
// room first, never what is read. Readers that take tiles in turn lag behind each other by a few: blocks are done with
// only when the windows are some blocks further.
// Without it a pass over a large image would push out of the store what other readers still want. One thread at a time.
class PassOrder
{
public:
    // oLayout: of the image; it outlives this.
    explicit PassOrder(const ImageLayout& oLayout)
        : moLayout(oLayout), mnLag(std::min(8u, oLayout.GetBlocksAcross() / 4))
    {
    }

    // What of a block is wanted by the windows beside those that want all of it: in order from left to right only rows
    // at its bottom, by the next row of windows.
    // As wide as the windows so far reached into the blocks around them.
    BlockTiles::Border GetBorder() const
    {
        return IsOrdered() ? BlockTiles::Border{0, 0, mnRows} : BlockTiles::Border{mnColumns, mnRows, mnRows};
    }
    // Whether the window that was noted last goes on along a row of windows.
    // Blocks ahead of it are worth fetching then.
    bool IsPassing() const { return mnWindows > 1; }

    // Notes a window. oDone(column, row, rows): called for each block that is done with, but for so many rows at its
    // bottom.
    // oWindow: inside the image. Constant time for each window, and for each block that is left.
    template <typename Done>
    void Note(const PixelRect& oWindow, const Done& oDone)
    {
        const unsigned int nColumn = oWindow.mnX / moLayout.GetBlockWidth();
        const bool bSameRow = mnWindows != 0 && oWindow.mnY == moLast.mnY && oWindow.mnHeight == moLast.mnHeight;
        const bool bWasPass = mnWindows > 1 || moLast.mnWidth == moLayout.GetWidth();
        const bool bNextRow = mnWindows != 0 && !bSameRow && bWasPass && oWindow.mnY > moLast.mnY;
        if (!bSameRow)
            mbLastOrdered = bNextRow && mbOrdered;
        if (!bSameRow && !bNextRow)
            mnStep = mnColumns = mnRows = 0;
        mnColumns = std::max(mnColumns, Reach(oWindow.mnX, oWindow.mnWidth, moLayout.GetBlockWidth()));
        mnRows = std::max(mnRows, Reach(oWindow.mnY, oWindow.mnHeight, moLayout.GetBlockHeight()));
        if (bNextRow)
        {
            mnStep = oWindow.mnY - moLast.mnY;
            Leave(moLayout.GetBlocksAcross(), oWindow.mnY, oDone);
        }
        if (!bSameRow)
        {
            mnWindows = 0;
            mnLeft = 0;
        }
        const unsigned int nBefore = mnWindows == 0 ? 0 : moLast.mnX / moLayout.GetBlockWidth();
        const unsigned int nOwn = oWindow.mnWidth / moLayout.GetBlockWidth();
        mbOrdered = (mnWindows == 0 || mbOrdered) && nColumn >= nBefore && nColumn - nBefore <= 2 * mnLag + 4 + nOwn;
        ++mnWindows;
        moLast = oWindow;
        if (IsOrdered() && nColumn > mnLag && (mnStep != 0 || mnRows != 0))
            Leave(nColumn - mnLag, GetNextTop(), oDone);
    }

private:
    // A few windows in order say nothing yet, a row of them does.
    bool IsOrdered() const { return mbOrdered && (mbLastOrdered || mnWindows > 3); }

    // The part of the outermost blocks that a window shows, where it is small.
    static unsigned int Reach(unsigned int nBegin, unsigned int nSize, unsigned int nBlock)
    {
        const unsigned int nEnd = nBegin + nSize;
        if (nBegin / nBlock == (nEnd - 1) / nBlock)
            return 0;
        const unsigned int nBefore = (nBlock - nBegin % nBlock) % nBlock;
        const unsigned int nBehind = nEnd % nBlock;
        return std::max(nBefore <= nBlock / 4 ? nBefore : 0, nBehind <= nBlock / 4 ? nBehind : 0);
    }

    // Where the windows of the next row begin.
    unsigned int GetNextTop() const
    {
        const unsigned int nEnd = moLast.mnY + moLast.mnHeight;
        return mnStep != 0 ? moLast.mnY + mnStep : nEnd - std::min(nEnd, 2 * mnRows);
    }

    // The blocks of the last windows to the left of a column.
    template <typename Done>
    void Leave(unsigned int nEnd, unsigned int nNextTop, const Done& oDone)
    {
        const unsigned int nBlock = moLayout.GetBlockHeight();
        const unsigned int nBottom = (moLast.mnY + moLast.mnHeight - 1) / nBlock;
        for (; mnLeft < nEnd; ++mnLeft)
            for (unsigned int nRow = moLast.mnY / nBlock; nRow <= nBottom; ++nRow)
            {
                const PixelRect oBlock = moLayout.GetBlockRect(mnLeft, nRow);
                const unsigned int nBlockEnd = oBlock.mnY + oBlock.mnHeight;
                const unsigned int nWanted = nBlockEnd - std::clamp(nNextTop, oBlock.mnY, nBlockEnd);
                if (nWanted <= oBlock.mnHeight / 2)
                    oDone(mnLeft, nRow, nWanted);
            }
    }

    const ImageLayout& moLayout; // borrowed
    unsigned int mnLag;          // windows that readers in turn may be behind, in blocks
    PixelRect moLast{};          // the window that was noted last
    unsigned int mnWindows = 0;  // in this row of windows
    bool mbOrdered = false;      // these come from left to right
    bool mbLastOrdered = false;  // those of the row before did
    unsigned int mnLeft = 0;     // columns of blocks that are done with in it
    unsigned int mnStep = 0;     // from one row of windows to the next; 0: not known yet
    // How far windows reach into the blocks around their own.
    unsigned int mnColumns = 0;
    unsigned int mnRows = 0; // see mnColumns
};

} // namespace krv::plugins::support
