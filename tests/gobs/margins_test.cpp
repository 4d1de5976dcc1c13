#include "gobs/raster/margins.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"
#include "tools/conformance/referenceimage.h"

#include <gtest/gtest.h>

#include <random>
#include <string>
#include <vector>

using namespace krv;
using namespace krv::gobs;

namespace
{

// The values of a raster, of bits as bytes.
std::string Values(const Raster& oRaster)
{
    const bool bBits = oRaster.GetDataType().GetNativeCode() == eDT_BIT;
    std::string values;
    for (std::uint64_t n = 0; n < oRaster.GetFullWidth() * oRaster.GetFullHeight() * oRaster.GetChansCount(); ++n)
        values += bBits ? oRaster.GetBuffer()[n / 8] >> (7 - n % 8) & 1 : oRaster.GetBuffer()[n];
    return values;
}

} // namespace

// Of bytes and all wider values the readers' random inputs say what is right, of every behaviour and margin.
TEST(FillRasterMarginsTest, BitsAreMadeAsBytesAre)
{
    std::mt19937 oRandom(20240501);
    for (const unsigned int nChannels : {1u, 2u, 3u, 5u, 8u})
        for (const eMarginBehaviour eBehaviour : {eReplicate, eMirror, eMirror101, eConstant, eWrap})
            for (unsigned int nSides = 0; nSides < 16; ++nSides)
            {
                const unsigned int nWidth = 1 + oRandom() % 6, nHeight = 1 + oRandom() % 6;
                const RasterContext oContext(0, 0, oRandom() % 8, oRandom() % 8);
                Raster oBits({nWidth, nHeight, nChannels, eDT_BIT}, oContext);
                Raster oBytes({nWidth, nHeight, nChannels, eDT_8U}, oContext);
                for (std::uint64_t n = 0; n < oBits.GetBufferSize(); ++n)
                    oBits.GetBuffer()[n] = static_cast<unsigned char>(oRandom());
                const std::string values = Values(oBits);
                std::copy(values.begin(), values.end(), oBytes.GetBuffer());
                FillRasterMargins(&oBits, eBehaviour, nSides);
                FillRasterMargins(&oBytes, eBehaviour, nSides);
                EXPECT_EQ(Values(oBits), Values(oBytes)) << eBehaviour << ", sides " << nSides;
            }
}

TEST(FillRasterMarginsTest, RefusesWhatItCannotMake)
{
    Raster oRaster(RasterInfo(2, 2, 1, DataType(eDT_8U)), RasterContext(0, 0, 1, 1));
    for (int nBehaviour : {0, 5, 7, -1})
        EXPECT_THROW(FillRasterMargins(&oRaster, static_cast<eMarginBehaviour>(nBehaviour), 15), ParameterException);
    Raster oEmpty(RasterInfo(0, 2, 1, DataType(eDT_8U)), RasterContext(0, 0, 1, 1));
    EXPECT_THROW(FillRasterMargins(&oEmpty, eReplicate, 3), ParameterException);
    EXPECT_NO_THROW(FillRasterMargins(&oEmpty, eReplicate, 0));
    EXPECT_THROW(FillRasterMargins(nullptr, eReplicate, 0), DataException);
    EXPECT_THROW(FoldIndex(0, 0, eMirror), ParameterException);
    EXPECT_THROW(FoldIndex(0, 1, eConstant), ParameterException);
}

TEST(FoldIndexTest, FoldsFarIndices)
{
    for (eMarginBehaviour eBehaviour : {eReplicate, eMirror, eMirror101, eWrap})
        for (long long n = 1; n < 6; ++n)
            for (long long k = -30; k < 30; ++k)
                EXPECT_EQ(FoldIndex(k, n, eBehaviour), conformance::FoldNaively(k, n, eBehaviour)) << k << " of " << n;
    EXPECT_EQ(FoldIndex(-1, 1ll << 34, eMirror), 0);
    EXPECT_EQ(FoldIndex(-(1ll << 40), (1ll << 34) - 1, eWrap), (1ll << 34) - 1 - 64);
}
