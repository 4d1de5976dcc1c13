#pragma once

#include "datasources/interfaces/iblockencoding.h"
#include "plugins/tif/reading/page.h"
#include "plugins/tif/writing/strileencoder.h"

#include <memory>
#include <optional>
#include <vector>

namespace krv::plugins::tif
{

// Encodes strips or tiles of a page for whoever stores them as bytes, just as PageWriter does for those that it stores.
class BlockEncoder : public krv::datasources::IBlockEncoder
{
public:
    // The page outlives its becoming another: what encoding takes was read of it. oLike: the begin of a strip or tile
    // that is stored, for codings that must be alike; empty when nothing is. Null when pixels cannot be written.
    static std::unique_ptr<BlockEncoder> Make(std::shared_ptr<Page> poPage, std::optional<int> oLevel,
                                              std::vector<unsigned char> oLike);
    ~BlockEncoder() override;

    void Encode(const krv::datasources::BlockNumber& oBlock, const unsigned char* pPixels, std::size_t nPitch,
                std::vector<unsigned char>& oBytes) override;

private:
    BlockEncoder(std::shared_ptr<Page> poPage, std::optional<int> oLevel, std::vector<unsigned char> oLike);

    std::shared_ptr<Page> mpoPage;
    StrileEncoder moEncoder;
    std::vector<unsigned char> moLike;
};

// The number of a block in the page's lists. Throws DataException for one outside the grid.
std::uint64_t GetStrile(const Page& oPage, const krv::datasources::BlockNumber& oBlock, const Place& oPlace);

} // namespace krv::plugins::tif
