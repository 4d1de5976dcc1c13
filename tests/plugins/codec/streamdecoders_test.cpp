// Deflate and zstandard keep the same promises about streams that end early, late or never.
#include "plugins/support/codec/deflate.h"
#include "plugins/support/codec/zstd.h"
#include "tests/plugins/codec/blocks.h"

#include <gtest/gtest.h>
#include <zlib.h>
#include <zstd.h>

namespace
{

using namespace krv::plugins::codec;
using krv::test::Bytes;
using krv::test::Exact;

struct Deflate
{
    using Decoder = DeflateDecoder;

    static Bytes Encode(const Bytes& oData)
    {
        uLongf nSize = compressBound(oData.size());
        Bytes oStream(nSize);
        compress2(oStream.data(), &nSize, oData.data(), oData.size(), 6);
        oStream.resize(nSize);
        return oStream;
    }
};

struct Zstd
{
    using Decoder = ZstdDecoder;

    static Bytes Encode(const Bytes& oData)
    {
        Bytes oStream(ZSTD_compressBound(oData.size()));
        ZSTD_CCtx* context = ZSTD_createCCtx();
        ZSTD_CCtx_setParameter(context, ZSTD_c_checksumFlag, 1);
        ZSTD_CCtx_setParameter(context, ZSTD_c_contentSizeFlag, oData.size() % 2 == 0 ? 1 : 0);
        oStream.resize(ZSTD_compress2(context, oStream.data(), oStream.size(), oData.data(), oData.size()));
        ZSTD_freeCCtx(context);
        return oStream;
    }
};

template <typename Kind>
class StreamDecoder : public ::testing::Test
{
protected:
    // Decodes in memory of exactly the sizes; what came out goes to moOutput.
    Result Decode(const Bytes& oStream, std::size_t nOutput)
    {
        Exact oInput(oStream), oOutput(nOutput);
        const Result oResult = moDecoder.Decode(oInput.data(), oInput.size(), oOutput.data(), nOutput);
        moOutput = oOutput.ToBytes(oResult.mnBytes);
        return oResult;
    }

    static Bytes MakeData(unsigned int nSeed)
    {
        std::mt19937 oRandom(nSeed);
        return krv::test::MakeData(oRandom, nSeed, 1 + oRandom() % 60000);
    }

    typename Kind::Decoder moDecoder;
    Bytes moOutput;
};

using Kinds = ::testing::Types<Deflate, Zstd>;
TYPED_TEST_SUITE(StreamDecoder, Kinds);

TYPED_TEST(StreamDecoder, DecodesWhatTheLibraryWroteAsFarAsBothReach)
{
    for (unsigned int nSeed = 0; nSeed < 30; ++nSeed)
    {
        SCOPED_TRACE(nSeed);
        const Bytes oData = this->MakeData(nSeed);
        Bytes oStream = TypeParam::Encode(oData);
        for (const std::size_t nOutput : {oData.size(), std::size_t{0}, oData.size() / 3, oData.size() - 1})
        {
            ASSERT_TRUE(this->Decode(oStream, nOutput).IsDone()) << nOutput;
            ASSERT_TRUE(Bytes(oData.begin(), oData.begin() + static_cast<std::ptrdiff_t>(nOutput)) == this->moOutput);
        }
        ASSERT_EQ(Status::eTruncated, this->Decode(oStream, oData.size() + 7).moStatus);
        ASSERT_TRUE(oData == this->moOutput);
        for (std::size_t nCut = 0; nCut < oStream.size();
             nCut += nCut + 8 < oStream.size() ? 1 + (oStream.size() - 8) / 20 : 1)
        {
            const Bytes oPart(oStream.begin(), oStream.begin() + static_cast<std::ptrdiff_t>(nCut));
            const Result oResult = this->Decode(oPart, oData.size());
            ASSERT_EQ(oResult.mnBytes == oData.size() ? Status::eDone : Status::eTruncated, oResult.moStatus)
                << "cut at " << nCut;
            ASSERT_TRUE(std::equal(this->moOutput.begin(), this->moOutput.end(), oData.begin()));
        }
        oStream.insert(oStream.end(), 9, 0xA5);
        ASSERT_TRUE(this->Decode(oStream, oData.size()).IsDone()) << "bytes behind the end";
        ASSERT_TRUE(oData == this->moOutput);
    }
}

TEST(StreamEnds, MayBeCutOffButNotChanged)
{
    std::mt19937 oRandom(1);
    const Bytes oData = krv::test::MakeData(oRandom, 4, 3000);
    const Bytes oSound = Deflate::Encode(oData);
    Bytes oFlushed(4000), oNoLast = oSound, oWrongSum = oSound;
    z_stream oStream{};
    deflateInit(&oStream, 6);
    oStream.next_in = const_cast<unsigned char*>(oData.data());
    oStream.avail_in = static_cast<unsigned int>(oData.size());
    oStream.next_out = oFlushed.data();
    oStream.avail_out = static_cast<unsigned int>(oFlushed.size());
    deflate(&oStream, Z_SYNC_FLUSH);
    oFlushed.resize(oStream.total_out);
    deflateEnd(&oStream);
    oNoLast[2] ^= 1;
    oWrongSum.back() ^= 1;
    const struct
    {
        const char* name;
        const Bytes& input;
        std::size_t output;
        Status status;
        bool more;
    } CASES[] = {{"flushed, not ended", oFlushed, oData.size(), Status::eDone, false},
                 {"flushed, not ended, longer", oFlushed, oData.size() - 1, Status::eCorrupt, false},
                 {"the last part is not marked so", oNoLast, oData.size(), Status::eCorrupt, false},
                 {"longer", oSound, oData.size() / 2, Status::eDone, false},
                 {"longer, wrong sum", oWrongSum, oData.size() / 2, Status::eCorrupt, false},
                 {"much longer", Deflate::Encode(Bytes(3000000, 1)), 100, Status::eDone, true}};
    for (const auto& oCase : CASES)
    {
        Bytes oOutput(oCase.output);
        const Result oResult =
            DeflateDecoder().Decode(oCase.input.data(), oCase.input.size(), oOutput.data(), oOutput.size());
        EXPECT_EQ(oCase.status, oResult.moStatus) << oCase.name;
        EXPECT_EQ(oCase.more, oResult.mbMore) << oCase.name;
    }
}

} // namespace
