#include "plugins/support/codec/blockcodec.h"
#include "tests/plugins/codec/blocks.h"

#include <gtest/gtest.h>

#include <climits>

using namespace krv::plugins::codec;
using krv::test::Bytes;

// Every level that the table names, and those beyond, makes blocks that come back by the same entry.
TEST(BlockCodec, BothDirectionsOfAnEntryAgree)
{
    std::mt19937 oRandom(7);
    for (const char* pName : {"DEFLATE", "LZ4", "LZW", "ZSTD"})
    {
        const BlockCodec* const pCodec = FindBlockCodec(pName);
        ASSERT_TRUE(pCodec != nullptr && pCodec->mpMakeEncoder != nullptr) << pName;
        for (const std::optional<int> oLevel : {std::optional<int>(), std::optional(1), std::optional(INT_MAX)})
        {
            const auto poEncoder = pCodec->mpMakeEncoder(oLevel);
            const auto poDecoder = pCodec->mpMakeDecoder();
            for (unsigned int nKind = 0; nKind < 6; ++nKind)
            {
                const Bytes oData = krv::test::MakeData(oRandom, nKind, 5000);
                Bytes oCoded(poEncoder->GetBound(oData.size())), oBack(oData.size());
                oCoded.resize(poEncoder->Encode(oData.data(), oData.size(), oCoded.data(), oCoded.size()));
                EXPECT_TRUE(poDecoder->Decode(oCoded.data(), oCoded.size(), oBack.data(), oBack.size()).IsDone());
                EXPECT_TRUE(oBack == oData) << pName << ", data " << nKind;
            }
        }
    }
    ASSERT_NE(FindBlockCodec("PACKBITS"), nullptr);
    EXPECT_EQ(FindBlockCodec("PACKBITS")->mpMakeEncoder, nullptr);
    for (const char* pName : {"NONE", "deflate", "", "LZMA"})
        EXPECT_EQ(FindBlockCodec(pName), nullptr) << pName;
}
