// Masks from polygons and from values, each beside a decision pixel by pixel.
#include "datasources/maskbuilder/polygonmaskbuilder.h"
#include "datasources/metadata/typednodata.h"
#include "fuzz/support/choices.h"
#include "gobs/mask/exactmaskdecision.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "tests/support/conversionmodel.h"
#include "tests/support/nodatatexts.h"
#include "toolkit/core/gglshape.h"

#include <memory>
#include <set>

namespace
{

using namespace krv::gobs;
using krv::datasources::PolygonMaskBuilder;
using krv::fuzz::Check;
using krv::fuzz::Choices;
using Ring = std::vector<GDBVertex>;

constexpr double INFINITE = std::numeric_limits<double>::infinity();
constexpr double NOT_A_NUMBER = std::numeric_limits<double>::quiet_NaN();

// Counts, spare bits and rasters of a mask agree with its bits.
void CheckMask(const Mask& oMask)
{
    const RasterInfo oInfo(oMask.GetWidth(), oMask.GetHeight(), 1, eDT_8U);
    Raster oBytes(oInfo, oMask.GetContext());
    oMask.RetrieveRaster(oBytes);
    std::uint64_t nSet = 0, nCentre = 0;
    for (std::uint64_t nRow = 0; nRow < oMask.GetFullHeight(); ++nRow)
        for (std::uint64_t nColumn = 0; nColumn < oMask.GetFullWidth(); ++nColumn)
        {
            const bool bSet = oMask.GetBit(nColumn, nRow);
            Check(oBytes.GetBuffer()[nRow * oMask.GetFullWidth() + nColumn] == (bSet ? 1 : 0), "bytes of a mask");
            nSet += bSet;
            nCentre += bSet && nColumn - oMask.GetXMargin() < oMask.GetWidth() &&
                       nRow - oMask.GetYMargin() < oMask.GetHeight();
        }
    Check(oMask.CountSet() == nSet && oMask.CountSetInCentre() == nCentre, "counts of a mask");
    const Mask oPacked(oInfo, oMask.GetContext(), oBytes.GetBuffer(), false);
    Check(std::memcmp(oPacked.GetBits(), oMask.GetBits(), oMask.GetBitsSize()) == 0, "bits of a mask");
}

// The columns that a row of a polygon sets, from the rule alone in extended precision, and those that rounding decides.
struct ModelRow
{
    std::vector<bool> moSet;
    std::set<long long> moUncertain;

    ModelRow(const std::vector<Ring>& oRings, long long nRow, long long nFirst, long long nColumns)
        : moSet(static_cast<std::size_t>(nColumns))
    {
        const long double nCentre = static_cast<long double>(nRow) + 0.5L;
        std::vector<long double> oCrossings;
        for (const Ring& oRing : oRings)
            for (std::size_t i = 0; i < oRing.size(); ++i)
            {
                const GDBVertex &oA = oRing[i], &oB = oRing[(i + 1) % oRing.size()];
                if ((oA.y <= nCentre) != (oB.y <= nCentre))
                    AddCrossing(oCrossings, oA, oB, nCentre);
            }
        std::sort(oCrossings.begin(), oCrossings.end());
        for (std::size_t i = 0; i < oCrossings.size(); i += 2)
        {
            if (oCrossings[i + 1] < static_cast<long double>(nFirst))
                continue;
            const long double nStart = std::trunc(oCrossings[i] + 0.5L);
            const long double nEnd = std::max(nStart, std::trunc(oCrossings[i + 1] - 0.5L));
            for (long long nColumn = 0; nColumn < nColumns; ++nColumn)
                if (nFirst + nColumn >= nStart && nFirst + nColumn <= nEnd)
                    moSet[static_cast<std::size_t>(nColumn)] = true;
        }
    }

private:
    void AddCrossing(std::vector<long double>& oCrossings, const GDBVertex& oA, const GDBVertex& oB,
                     long double nCentre)
    {
        const long double nX =
            oA.x + (nCentre - oA.y) * (static_cast<long double>(oB.x) - oA.x) / (static_cast<long double>(oB.y) - oA.y);
        oCrossings.push_back(nX);
        const long double nEdge = std::round(nX + 0.5L);
        // What doubles lose grows with the edge, not with the place where it crosses.
        const long double nLost =
            1e-12L * (std::fabs(oA.x) + std::fabs(oB.x) + std::fabs(oA.y) + std::fabs(oB.y)) + 1e-7L;
        if (std::fabs(nX + 0.5L - nEdge) < nLost || std::fabs(nX) < nLost)
            for (long long k = -2; k <= 2; ++k)
                moUncertain.insert(static_cast<long long>(std::min(std::max(nEdge, -1e9L), 1e9L)) + k);
    }
};

double ChooseCoordinate(Choices& oChoices, unsigned int nGrid, std::mt19937& oRandom)
{
    switch (nGrid)
    {
    case 0:
        return oChoices.Between(-20, 60);
    case 1:
        return oChoices.Between(-80, 240) / 4.0;
    case 2:
        return std::uniform_real_distribution<double>(-30, 80)(oRandom);
    default:
        return oChoices.Of(std::vector<double>{-1e5, 1e5, 20, 33.3, 0, -3000, 5000.5, NOT_A_NUMBER, INFINITE});
    }
}

std::vector<Ring> ChooseRings(Choices& oChoices)
{
    const unsigned int nGrid = oChoices.Below(4);
    std::mt19937 oRandom = oChoices.Random();
    std::vector<Ring> oRings(oChoices.Below(4) + 1);
    for (Ring& oRing : oRings)
    {
        // Some have so many crossings that these are not sorted.
        oRing.resize(oChoices.OneIn(6) ? 40 + oChoices.Below(300) : oChoices.Below(9));
        for (GDBVertex& oVertex : oRing)
        {
            const unsigned int nOwnGrid = nGrid == 3 || !oChoices.OneIn(16) ? nGrid : 3;
            oVertex.x = ChooseCoordinate(oChoices, oChoices.IsAtEnd() ? 2 : nOwnGrid, oRandom);
            oVertex.y = ChooseCoordinate(oChoices, oChoices.IsAtEnd() ? 2 : nOwnGrid, oRandom);
        }
    }
    return oRings;
}

RasterContext ChooseContext(Choices& oChoices)
{
    return {oChoices.Between(-30, 70), oChoices.Between(-30, 70), oChoices.Below(2) * oChoices.Below(9),
            oChoices.Below(2) * oChoices.Below(9)};
}

void TryPolygons(Choices& oChoices)
{
    struct Polygon
    {
        std::vector<Ring> moRings;
        int mnFirstRow;
        int mnRows;
    };
    std::vector<Polygon> oPolygons(1 + oChoices.Below(2));
    std::unique_ptr<PolygonMaskBuilder> oBuilder;
    for (Polygon& oPolygon : oPolygons)
    {
        oPolygon = {ChooseRings(oChoices), oChoices.Between(-5, 5), oChoices.Between(-1, 30)};
        GGLShape oShape;
        for (const Ring& oRing : oPolygon.moRings)
            oShape.AddRing(oRing);
        if (oBuilder == nullptr)
            oBuilder = std::make_unique<PolygonMaskBuilder>(oShape, oPolygon.mnFirstRow, oPolygon.mnRows);
        else
        {
            // As plain arrays, whose rows begin at 0.
            const std::vector<int> oStarts(oShape.GetRingStarts().begin(), oShape.GetRingStarts().end());
            oPolygon.mnFirstRow = 0;
            oBuilder->AddPolygon(oShape.GetVertices().data(), static_cast<int>(oShape.GetVertices().size()),
                                 oStarts.data(), static_cast<int>(oStarts.size()), oPolygon.mnRows);
        }
        for (Ring& oRing : oPolygon.moRings)
            std::erase_if(oRing, [](const GDBVertex& o) { return !std::isfinite(o.x) || !std::isfinite(o.y); });
    }
    GGLTIntRect<int> oClip;
    if (oChoices.OneIn(2))
        oClip = {oChoices.Between(-20, 60), oChoices.Between(-20, 60), oChoices.Between(-3, 40),
                 oChoices.Between(-3, 40)};
    oBuilder->SetClipRect(oClip);
    const bool bClips = oClip.x != 0 || oClip.y != 0 || oClip.width != 0 || oClip.height != 0;
    const RasterContext oContext = ChooseContext(oChoices);
    const Raster oRaster({oChoices.Below(90), oChoices.Below(40), 1, eDT_BIT}, oContext);
    const std::unique_ptr<Mask> oMask(oBuilder->BuildMask(oRaster));
    CheckMask(*oMask);
    const long long nFirst = oContext.GetX() - static_cast<long long>(oContext.GetXMargin());
    const auto nColumns = static_cast<long long>(oMask->GetFullWidth());
    for (std::uint64_t nLine = 0; nLine < oMask->GetFullHeight(); ++nLine)
    {
        const long long nRow =
            oContext.GetY() - static_cast<long long>(oContext.GetYMargin()) + static_cast<long long>(nLine);
        std::vector<bool> oSet(static_cast<std::size_t>(nColumns));
        std::set<long long> oUncertain;
        const long long nClipped = bClips ? std::max(nFirst, 0ll + oClip.x) : nFirst;
        for (const Polygon& oPolygon : oPolygons)
        {
            if (oPolygon.mnRows >= 1 &&
                (nRow < oPolygon.mnFirstRow || nRow >= 0ll + oPolygon.mnFirstRow + oPolygon.mnRows))
                continue;
            // The first column that may be set is where a pair counts as left of the area.
            const ModelRow oModel(oPolygon.moRings, nRow, nClipped, std::max(0ll, nFirst + nColumns - nClipped));
            oUncertain.insert(oModel.moUncertain.begin(), oModel.moUncertain.end());
            for (std::size_t i = 0; i < oModel.moSet.size(); ++i)
                if (oModel.moSet[i])
                    oSet[i + static_cast<std::size_t>(nClipped - nFirst)] = true;
        }
        for (long long i = 0; i < nColumns; ++i)
        {
            const long long nColumn = nFirst + i;
            const bool bArea = !bClips || (nColumn >= oClip.x && nColumn < 0ll + oClip.x + oClip.width &&
                                           nRow >= oClip.y && nRow < 0ll + oClip.y + oClip.height);
            const bool bExpected = bArea && oSet[static_cast<std::size_t>(i)];
            if (oMask->GetBit(static_cast<std::uint64_t>(i), nLine) != bExpected &&
                (!bArea || oUncertain.count(nColumn) == 0))
                Check(false, "polygon, column " + std::to_string(nColumn) + ", row " + std::to_string(nRow));
        }
    }
}

// What a sample must be to equal a value, by the rules alone.
bool Equals(const unsigned char* pSample, const krv::test::Type& oType, const SampleValue& oValue, bool bNaN)
{
    const krv::test::Part& oPart = *oType.mpoPart;
    const long double nReal = oPart.Load(pSample);
    const long double nImaginary = oType.mnParts == 2 ? oPart.Load(pSample + oPart.mnBytes) : 0;
    if ((oValue.IsNaN() || bNaN) && std::isnan(nReal) && (oType.mnParts == 1 || std::isnan(nImaginary)))
        return true;
    long double nValue = oValue.GetKind() == SampleValue::eUnsigned   ? oValue.GetUnsigned()
                         : oValue.GetKind() == SampleValue::eNegative ? oValue.GetNegative()
                                                                      : static_cast<long double>(oValue.GetReal());
    // A double next to the largest integers of 64 bits stands for them.
    if (!oPart.mbReal && oPart.mnBytes == 8 && oValue.GetKind() == SampleValue::eReal && nValue == oPart.mnHigh + 1)
        nValue = oPart.mnHigh;
    if (oPart.mbReal && std::isfinite(nValue))
    {
        if (oPart.mnBytes == 4 && std::fabs(nValue) > oPart.mnHigh)
        {
            if (std::fabs(nValue) > static_cast<long double>(std::numeric_limits<float>::max()) + std::ldexp(1.0L, 103))
                return false;
            nValue = std::copysign(oPart.mnHigh, nValue);
        }
        unsigned char oRounded[8];
        oPart.Store(oRounded, nValue);
        nValue = oPart.Load(oRounded);
    }
    return nReal == nValue && nImaginary == 0;
}

SampleValue ChooseValue(Choices& oChoices, const krv::test::Type& oType)
{
    static const std::vector<std::string> TEXTS = krv::test::NoDataTexts();
    const auto oText = krv::datasources::ParseNoData(oChoices.Of(TEXTS));
    switch (oChoices.Below(4))
    {
    case 0:
        return SampleValue::FromReal(oChoices.Below(3));
    case 1:
        return oChoices.OneIn(2) ? *oText : SampleValue::FromReal(oText->GetReal());
    case 2:
        return SampleValue::FromUnsigned(
            oChoices.OneIn(2) ? static_cast<std::uint64_t>(oType.mpoPart->mnHigh > 1e20L ? 7 : oType.mpoPart->mnHigh)
                              : ~std::uint64_t{oChoices.Below(3)});
    default:
        return SampleValue::FromSigned(oChoices.OneIn(2) ? std::numeric_limits<std::int64_t>::min()
                                                         : -1 - std::int64_t{oChoices.Below(300)});
    }
}

void TryValues(Choices& oChoices)
{
    // One-bit pixels are chosen as bytes of 0 and 1, and packed in the end.
    const auto eType = static_cast<NativeDataTypeCode>(oChoices.Below(16));
    const krv::test::Type oType(eType == eDT_BIT ? eDT_8U : eType);
    const unsigned int nChannels = oChoices.OneIn(8) ? 1 + oChoices.Below(40) : 1 + oChoices.Below(5);
    const std::size_t nPixels = oChoices.OneIn(4) ? oChoices.Below(400) : oChoices.Below(70);
    const BkgdRule eRule = oChoices.OneIn(2) ? eAnyChannel : eAllChannels;
    const bool bNaN = oChoices.OneIn(3), bEvery = oChoices.OneIn(2), bSame = oChoices.OneIn(2);
    std::vector<SampleValue> oValues;
    std::vector<unsigned int> oChannels;
    for (unsigned int n = 0, nListed = bEvery ? nChannels : oChoices.Below(4); n < nListed; ++n)
    {
        oValues.push_back(bSame && n > 0 ? oValues[0] : ChooseValue(oChoices, oType));
        oChannels.push_back(bEvery ? n + 1 : oChoices.Below(nChannels + 2));
    }
    // Pixels of the values themselves, as the type holds them, and of what lies beside them.
    const auto nPart = static_cast<std::size_t>(oType.mpoPart->mnBytes);
    std::unique_ptr<unsigned char[]> oPixels(new unsigned char[nPixels * nChannels * oType.Bytes()]);
    std::mt19937 oRandom = oChoices.Random();
    const std::vector<unsigned char> oBoundary = krv::test::BoundaryValues(*oType.mpoPart);
    for (std::size_t i = 0; i < nPixels * nChannels * oType.Bytes(); i += nPart)
    {
        const auto nKind = oRandom() % 8;
        if (nKind < 4 && !oValues.empty())
            oType.mpoPart->Store(&oPixels[i],
                                 krv::test::ModelPart(oValues[oRandom() % oValues.size()].GetReal(), *oType.mpoPart));
        else if (nKind == 7)
            std::memcpy(&oPixels[i], &oBoundary[oRandom() % (oBoundary.size() / nPart) * nPart], nPart);
        else
            oType.mpoPart->Store(&oPixels[i], oRandom() % 3);
        if (eType == eDT_BIT)
            oPixels[i] &= 1;
    }
    std::unique_ptr<unsigned char[]> oPacked(new unsigned char[(nPixels * nChannels + 7) / 8]());
    for (std::size_t i = 0; eType == eDT_BIT && i < nPixels * nChannels; ++i)
        oPacked[i / 8] |= oPixels[i] != 0 ? 128 >> i % 8 : 0;
    const ExactMaskDecision oDecision(eRule, oValues, oChannels, bNaN);
    const std::unique_ptr<IMaskDecisionImpl> oImpl(oDecision.GetImpl(eType, nChannels));
    std::unique_ptr<unsigned char[]> oBits(new unsigned char[(nPixels + 7) / 8]);
    oImpl->Mark(eType == eDT_BIT ? oPacked.get() : oPixels.get(), nPixels, nChannels, oBits.get());
    for (std::size_t n = 0; n < (nPixels + 7) / 8 * 8; ++n)
    {
        unsigned int nListed = 0, nEqual = 0;
        for (std::size_t i = 0; i < oChannels.size() && n < nPixels; ++i)
        {
            if (oChannels[i] < 1 || oChannels[i] > nChannels)
                continue;
            ++nListed;
            nEqual += Equals(&oPixels[(n * nChannels + oChannels[i] - 1) * oType.Bytes()], oType, oValues[i], bNaN);
        }
        const bool bExpected = eRule == eAnyChannel ? nEqual > 0 : nListed > 0 && nEqual == nListed;
        if (((oBits[n / 8] & 128 >> n % 8) != 0) != bExpected)
            Check(false, "no-data decision for type " + DataType(eType).Describe() + ", pixel " + std::to_string(n) +
                             (oValues.empty() ? "" : ", first value " + oValues[0].GetText()));
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* poBytes, std::size_t nBytes)
{
    Choices oChoices(poBytes, nBytes);
    if (oChoices.OneIn(2))
        TryPolygons(oChoices);
    else
        TryValues(oChoices);
    return 0;
}
