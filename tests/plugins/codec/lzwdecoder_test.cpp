#include "plugins/support/codec/lzw.h"

#include "tests/plugins/codec/blocks.h"

#include <gtest/gtest.h>

namespace
{

using krv::plugins::codec::LzwDecoder;
using krv::plugins::codec::Result;
using krv::plugins::codec::Status;
using krv::test::Bytes;
using krv::test::Exact;

// The coding as a textbook has it: strings in a list, a search through all of them.
struct Textbook
{
    std::vector<Bytes> moStrings;
    unsigned int mnWidth = 9;
    bool mbOld = false;

    void Clear()
    {
        moStrings.assign(258, {});
        for (unsigned int i = 0; i < 256; ++i)
            moStrings[i] = {static_cast<unsigned char>(i)};
        mnWidth = 9;
    }

    void Add(Bytes oString)
    {
        if (moStrings.size() < 4096)
            moStrings.push_back(std::move(oString));
    }

    void Grow()
    {
        if (moStrings.size() >= (1U << mnWidth) - (mbOld ? 0U : 1U) && mnWidth < 12)
            ++mnWidth;
    }
};

Bytes Encode(const Bytes& oData, bool bOld)
{
    constexpr unsigned char FIRST_EDITION[] = {0, 1};
    krv::plugins::codec::LzwEncoder oEncoder;
    Bytes oCoded(oEncoder.GetBound(oData.size()));
    if (bOld)
        oEncoder.TakeForm(FIRST_EDITION);
    oCoded.resize(oEncoder.Encode(oData.data(), oData.size(), oCoded.data(), oCoded.size()));
    return oCoded;
}

// The decoding as a textbook has it.
Result DecodePlainly(const Bytes& oInput, Bytes& oOutput, std::size_t nOutput)
{
    Textbook oBook;
    oBook.mbOld = LzwDecoder::IsOldStyle(oInput.data(), oInput.size());
    oBook.Clear();
    Bytes oPrevious;
    for (std::size_t nBit = 0; oOutput.size() < nOutput; nBit += 0)
    {
        if (nBit + oBook.mnWidth > oInput.size() * 8)
            return {Status::eTruncated, oOutput.size()};
        unsigned int nCode = 0;
        for (unsigned int i = 0; i < oBook.mnWidth; ++i, ++nBit)
            nCode |= oBook.mbOld ? ((oInput[nBit / 8] >> nBit % 8) & 1U) << i
                                 : ((oInput[nBit / 8] >> (7 - nBit % 8)) & 1U) << (oBook.mnWidth - 1 - i);
        if (nCode == 257)
            return {Status::eTruncated, oOutput.size()};
        if (nCode == 256)
        {
            oBook.Clear();
            oPrevious.clear();
            continue;
        }
        if (oPrevious.empty() ? nCode > 255 : nCode > oBook.moStrings.size())
            return {Status::eCorrupt, oOutput.size()};
        if (!oPrevious.empty())
        {
            oPrevious.push_back(nCode < oBook.moStrings.size() ? oBook.moStrings[nCode][0] : oPrevious[0]);
            oBook.Add(oPrevious);
            oBook.Grow();
        }
        oPrevious = oBook.moStrings[nCode];
        oOutput.insert(oOutput.end(), oPrevious.begin(), oPrevious.end());
    }
    oOutput.resize(nOutput);
    return {Status::eDone, nOutput};
}

// Decodes in memory of exactly the size, and expects what the textbook gives.
void ExpectAsTextbook(LzwDecoder& oDecoder, const Bytes& oInput, std::size_t nOutput, const std::string& what)
{
    Bytes oExpected;
    const Result oTruth = DecodePlainly(oInput, oExpected, nOutput);
    Exact oStored(oInput), oOutput(nOutput);
    const Result oResult = oDecoder.Decode(oStored.data(), oStored.size(), oOutput.data(), oOutput.size());
    ASSERT_EQ(oTruth.moStatus, oResult.moStatus) << what;
    ASSERT_EQ(oTruth.mnBytes, oResult.mnBytes) << what;
    ASSERT_TRUE(oExpected == oOutput.ToBytes(oResult.mnBytes)) << what;
}

TEST(LzwDecoder, TakesHostileInputAsTheTextbookDoes)
{
    LzwDecoder oDecoder;
    for (unsigned int nSeed = 0; nSeed < 1500; ++nSeed)
    {
        std::mt19937 oRandom(nSeed);
        const Bytes oData = krv::test::MakeData(oRandom, nSeed, 1 + oRandom() % (nSeed % 10 == 1 ? 9000 : 1200));
        Bytes oInput =
            nSeed % 3 == 0 ? krv::test::RandomBytes(oRandom, oRandom() % 3000) : Encode(oData, nSeed % 5 == 0);
        if (nSeed % 3 != 0) // sound as yet
        {
            Bytes oBack(oData.size());
            EXPECT_EQ(LzwDecoder::IsOldStyle(oInput.data(), oInput.size()), nSeed % 5 == 0);
            EXPECT_TRUE(oDecoder.Decode(oInput.data(), oInput.size(), oBack.data(), oBack.size()).IsDone());
            EXPECT_TRUE(oBack == oData) << "seed " << nSeed;
        }
        for (unsigned int nFlips = oRandom() % 4; nFlips > 0 && !oInput.empty(); --nFlips)
            oInput[oRandom() % oInput.size()] ^= static_cast<unsigned char>(1U << oRandom() % 8);
        if (nSeed % 4 == 0)
            oInput.resize(oRandom() % (oInput.size() + 1));
        ExpectAsTextbook(oDecoder, oInput, oRandom() % 4000, "seed " + std::to_string(nSeed));
    }
}

} // namespace
