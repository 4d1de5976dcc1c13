#include "gobs/mask/maskdecision.h"

#include "gobs/mask/exactmaskdecision.h"
#include "gobs/mask/mask.h"
#include "gobs/mask/samplematch.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <cstring>
#include <limits>
#include <memory>
#include <vector>

namespace krv::gobs
{

namespace
{

constexpr double NOT_A_NUMBER = std::numeric_limits<double>::quiet_NaN();

} // namespace

TEST(MaskDecision, RejectsWhatItCannotMeasure)
{
    EXPECT_THROW(MaskDecision(eAnyChannel, {1.0}, {}), krv::DataException);
    EXPECT_THROW(ExactMaskDecision(eAnyChannel, {}, {1}), krv::DataException);
    EXPECT_THROW(GetMaskDecisionImpl(eDT_8U, 1, eAnyChannel, {1.0}, {1, 2}), krv::DataException);
    EXPECT_THROW(MaskDecision(static_cast<BkgdRule>(2), {}, {}), krv::ParameterException);
    EXPECT_THROW(MaskDecision(eAnyChannel, {}, {}).GetImpl(DataType(), 1), krv::DataException);
    EXPECT_THROW(MaskDecisionBuilder(nullptr), krv::DataException);
    const std::unique_ptr<IMaskDecisionImpl> oImpl(MaskDecision(eAnyChannel, {}, {}).GetImpl(eDT_8U, 3));
    unsigned char nByte = 0;
    EXPECT_THROW(oImpl->Mark(&nByte, 1, 1, &nByte), krv::DataException);
}

TEST(MaskDecisionBuilder, CoversTheFullExtentAndOutlivesItsDecision)
{
    Raster oRaster(RasterInfo(5, 3, 2, eDT_16S), RasterContext(-2, 7, 2, 1));
    auto* pValues = reinterpret_cast<std::int16_t*>(oRaster.GetBuffer());
    for (int n = 0; n < 9 * 5 * 2; ++n)
        pValues[n] = static_cast<std::int16_t>(n % 7);
    auto oDecision = std::make_unique<MaskDecision>(eAllChannels, std::vector<double>{3}, std::vector<unsigned int>{2});
    auto oBuilder = std::make_unique<MaskDecisionBuilder>(oDecision.get());
    oDecision.reset();
    const MaskDecisionBuilder oCopy(*oBuilder);
    oBuilder.reset();
    const std::unique_ptr<Mask> oMask(oCopy.BuildMask(oRaster));
    EXPECT_EQ(oMask->GetX(), -2);
    EXPECT_EQ(oMask->GetFullWidth(), 9u);
    EXPECT_EQ(oMask->GetFullHeight(), 5u);
    for (unsigned int nRow = 0; nRow < 5; ++nRow)
    {
        for (unsigned int nColumn = 0; nColumn < 9; ++nColumn)
            EXPECT_EQ(oMask->GetBit(nColumn, nRow), pValues[(nRow * 9 + nColumn) * 2 + 1] == 3);
    }
}

} // namespace krv::gobs
