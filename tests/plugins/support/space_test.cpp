#include "plugins/support/file/space.h"

#include <algorithm>
#include <map>
#include <random>

#include <gtest/gtest.h>

namespace
{

using krv::plugins::support::Extent;
using krv::plugins::support::Space;

bool Overlap(const Extent& oFirst, const Extent& oSecond)
{
    return oFirst.mnOffset < oSecond.mnOffset + oSecond.mnBytes && oSecond.mnOffset < oFirst.mnOffset + oFirst.mnBytes;
}

// Pieces come and go, states are written and read: no piece is ever handed out that somebody else has.
TEST(Space, NothingThatAStateNeedsIsTakenWhileItIsHeld)
{
    for (unsigned int nSeed = 0; nSeed < 40; ++nSeed)
    {
        SCOPED_TRACE("seed " + std::to_string(nSeed));
        std::mt19937 oRandom(nSeed);
        const bool bLocks = nSeed % 5 != 4;
        std::uint64_t nEnd = 1000;
        Space oSpace("file", nEnd, INT64_MAX, "full");
        std::vector<Extent> oNow = {{100, 200, 0}, {300, 100, 0}, {500, 200, 0}}, oKept = {{300, 100, 0}};
        oSpace.Keep(300, 100);
        oSpace.AddUnused(700, 300);
        std::map<std::uint64_t, std::vector<Extent>> oHeld; // root, what its state has
        // A reader of what was there before knows of pieces that are given up, and of none that came since.
        if (nSeed % 2 == 0)
            oHeld[1] = {{100, 500, 0}, {700, 300, 0}};
        oSpace.Age(2);
        std::vector<std::pair<std::uint64_t, std::vector<Extent>>> oStates = {{2, oNow}};
        std::uint64_t nTaken = 0;
        for (std::uint64_t nRoot = 3; nRoot < 60; ++nRoot)
        {
            std::uint64_t nLive = 0;
            for (int nStep = 0; nStep < 12; ++nStep)
            {
                const std::size_t nAt = oRandom() % 12;
                if (nAt < oNow.size())
                {
                    oSpace.Release(oNow[nAt]);
                    oNow.erase(oNow.begin() + static_cast<std::ptrdiff_t>(nAt));
                    continue;
                }
                const Extent oNew = oSpace.Allocate(2 * (1 + oRandom() % 100));
                nEnd = std::max(nEnd, oNew.mnOffset + oNew.mnBytes);
                ASSERT_TRUE(oSpace.IsFresh(oNew));
                oHeld[0] = oNow;
                oHeld[99] = oKept;
                oHeld[100] = oStates.back().second;
                for (const auto& [nHeldRoot, oPieces] : oHeld)
                    for (const Extent& oPiece : oPieces)
                        ASSERT_FALSE(Overlap(oPiece, oNew)) << "state " << nHeldRoot << ", next is " << nRoot;
                oNow.push_back(oNew);
                nLive += oNew.mnBytes;
            }
            nTaken += nLive;
            oSpace.Age(nRoot);
            oStates.emplace_back(nRoot, oNow);
            for (const std::uint64_t nPseudo : {0, 99, 100})
                oHeld.erase(nPseudo);
            if (oRandom() % 3 == 0 && nRoot > 20)
                oHeld.clear();
            if (oRandom() % 3 == 0)
                oHeld[nRoot - 1] = oStates[oStates.size() - 2].second;
            std::vector<std::uint64_t> oRoots;
            for (const auto& [nHeldRoot, oPieces] : oHeld)
                oRoots.push_back(nHeldRoot);
            if (bLocks)
                oSpace.Reuse(oRoots);
            else
                oSpace.Reuse(std::nullopt);
        }
        EXPECT_EQ(nEnd < 1000 + nTaken / 2, bLocks) << "room is used again when it is known who reads";
    }
}

} // namespace
