#pragma once

#include "plugins/support/image/iblocksource.h"
#include "toolkit/exceptions/exceptions.h"

#include <atomic>
#include <cstdint>
#include <cstring>
#include <functional>
#include <memory>
#include <utility>
#include <vector>

namespace krv::tests
{

// What several sources of one image share: how often each of its blocks was decoded.
struct DecodeCounts
{
    explicit DecodeCounts(std::size_t nBlocks) : moCounts(nBlocks) {}

    std::vector<std::atomic<unsigned int>> moCounts;

    unsigned int GetMost() const
    {
        unsigned int nMost = 0;
        for (const auto& nCount : moCounts)
            nMost = std::max(nMost, nCount.load());
        return nMost;
    }
    unsigned int GetSum() const
    {
        unsigned int nSum = 0;
        for (const auto& nCount : moCounts)
            nSum += nCount;
        return nSum;
    }
};

// Blocks whose 16-bit values tell plane and place, decoded whole and counted. oOrigin: see IBlockSource.
class CountingSource : public krv::plugins::support::IBlockSource
{
public:
    using ImageLayout = krv::plugins::support::ImageLayout;

    CountingSource(ImageLayout oLayout, std::shared_ptr<DecodeCounts> poCounts,
                   krv::plugins::support::BlockOrigin oOrigin = {})
        : moLayout(std::move(oLayout)), mpoCounts(std::move(poCounts)), moOrigin(std::move(oOrigin))
    {
    }

    static std::uint16_t ValueAt(unsigned int nPlane, unsigned int nX, unsigned int nY)
    {
        return static_cast<std::uint16_t>(nX * 7 + nY * 1009 + nPlane * 31 + nX / 251);
    }

    const ImageLayout& GetLayout() const override { return moLayout; }
    std::string GetName() const override { return "counted"; }
    krv::plugins::support::BlockOrigin GetOrigin() const override { return moOrigin; }

    void ReadBlock(const krv::plugins::support::BlockAddress& oBlock, const krv::plugins::support::PixelRect& oPart,
                   unsigned char* pTarget, std::size_t nPitch) override
    {
        const std::uint64_t nBlocks = moLayout.GetBlocksAcross() * std::uint64_t{moLayout.GetBlocksDown()};
        ++mpoCounts->moCounts[oBlock.mnPlane * nBlocks + moLayout.GetBlockIndex(oBlock.mnColumn, oBlock.mnRow)];
        if (moBefore)
            moBefore(oBlock);
        const auto oRect = moLayout.GetBlockRect(oBlock.mnColumn, oBlock.mnRow);
        for (unsigned int nRow = 0; nRow < oPart.mnHeight; ++nRow)
            for (unsigned int nColumn = 0; nColumn < oPart.mnWidth; ++nColumn)
            {
                const std::uint16_t nValue =
                    ValueAt(oBlock.mnPlane, oRect.mnX + oPart.mnX + nColumn, oRect.mnY + oPart.mnY + nRow) + mnShift;
                std::memcpy(pTarget + nRow * nPitch + nColumn * 2, &nValue, 2);
            }
    }

    // Called before a block is decoded.
    std::function<void(const krv::plugins::support::BlockAddress&)> moBefore;
    // Added to all values.
    std::uint16_t mnShift = 0;

private:
    ImageLayout moLayout;
    std::shared_ptr<DecodeCounts> mpoCounts;
    krv::plugins::support::BlockOrigin moOrigin;
};

} // namespace krv::tests
