#include "datasources/overviews/detail/samplevalidity.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/reader/idatasetaccess.h"
#include "datasources/reader/validitysource.h"
#include "datasources/writer/irasterwriter.h"
#include "gobs/mask/exactmaskdecision.h"
#include "gobs/mask/mask.h"
#include "toolkit/nspio/warning.h"

#include <algorithm>
#include <cstring>
#include <limits>

namespace krv::datasources::detail
{

namespace
{

using krv::gobs::ExactMaskDecision;
using krv::gobs::IMaskBuilder;
using krv::gobs::Mask;

std::unique_ptr<ValiditySource> MakeSource(IRasterWriter& oWriter, bool bNoData)
{
    const auto* const poAccess = dynamic_cast<const IDatasetAccess*>(&oWriter);
    if (poAccess != nullptr && poAccess->GetDataset() != nullptr)
        return std::make_unique<ValiditySource>(poAccess->GetDataset(), poAccess->GetChannels(),
                                                krv::gobs::eAllChannels, bNoData);
    krv::nspio::Warning::Warn("Overviews: the writer does not show its dataset, so that a validity mask and an alpha "
                              "channel that is not among the written ones take no part");
    return std::make_unique<ValiditySource>(oWriter);
}

bool IsSet(const unsigned char* pBits, std::size_t nBit)
{
    return (pBits[nBit / 8] & 128u >> nBit % 8) != 0;
}

} // namespace

SampleValidity::SampleValidity(IRasterWriter& oWriter, const OverviewOptions& oOptions)
    : mpoPixels(oOptions.mpoValidity)
{
    const AuxiliaryData oMetadata = oWriter.GetAuxiliaryData();
    std::unique_ptr<ValiditySource> oSource = mpoPixels == nullptr ? MakeSource(oWriter, !oOptions.moNoData) : nullptr;
    for (unsigned int nChannel = 1; nChannel <= oWriter.GetChansCount(); ++nChannel)
        moNoData.push_back(oOptions.moNoData ? oOptions.moNoData : GetTypedNoData(oMetadata, nChannel));
    if (oSource != nullptr)
    {
        mnBitmap = oSource->GetBitmap();
        // Where every channel has a value of its own, its samples say all that the pixels could.
        const bool bAllSaid =
            std::all_of(moNoData.begin(), moNoData.end(), [](const auto& oValue) { return oValue.has_value(); });
        if (oSource->HasBitmap() || oSource->HasAlpha() || (oSource->HasNoData() && !bAllSaid))
        {
            for (unsigned int nPosition = 0; nPosition < oWriter.GetChansCount(); ++nPosition)
                if (const IMaskBuilder* const poMask = oSource->GetChannelMask(nPosition))
                    moChannels.push_back({nPosition, poMask});
            mpoOwned = std::move(oSource);
            mpoPixels = mpoOwned.get();
        }
    }
    AddChannels(oWriter.GetDataType(), oOptions.mbNaNIsNoData);
}

SampleValidity::~SampleValidity() = default;

void SampleValidity::AddChannels(const krv::gobs::DataType& oType, bool bNaN)
{
    if (!oType.IsComplex())
    {
        mpoTest = krv::gobs::MakeSampleTest(oType, moNoData, bNaN);
        return;
    }
    const bool bAddNaN = bNaN && oType.IsReal();
    for (unsigned int nChannel = 1; nChannel <= moNoData.size(); ++nChannel)
    {
        std::optional<NoDataValue> oValue = moNoData[nChannel - 1];
        if (!oValue && !bAddNaN)
            continue;
        if (!oValue)
            oValue = NoDataValue::FromReal(std::numeric_limits<double>::quiet_NaN());
        const ExactMaskDecision oDecision(krv::gobs::eAnyChannel, {*oValue}, {nChannel}, bAddNaN);
        moComplex.push_back(std::make_unique<krv::gobs::MaskDecisionBuilder>(&oDecision));
        moChannels.push_back({nChannel - 1, moComplex.back().get()});
    }
}

const unsigned char* SampleValidity::Mark(const krv::gobs::Raster& oRaster)
{
    mnValues = std::size_t{oRaster.GetWidth()} * oRaster.GetChansCount();
    moRows.assign(oRaster.GetHeight(), 0);
    if (mpoTest != nullptr)
        MarkSamples(oRaster);
    if (mpoPixels != nullptr)
        MarkPixels(oRaster);
    for (const Channel& oChannel : moChannels)
        MarkChannel(oRaster, oChannel);
    return std::find(moRows.begin(), moRows.end(), 1) != moRows.end() ? FillRows() : nullptr;
}

// Rows without anything invalid are written last, and only when there are others.
const unsigned char* SampleValidity::FillRows()
{
    moBytes.resize(std::max(moBytes.size(), mnValues * moRows.size()));
    for (std::size_t nRow = 0; nRow < moRows.size(); ++nRow)
        if (moRows[nRow] == 0)
            std::memset(moBytes.data() + nRow * mnValues, 1, mnValues);
    return moBytes.data();
}

unsigned char* SampleValidity::GetRow(std::size_t nRow)
{
    moBytes.resize(std::max(moBytes.size(), mnValues * moRows.size()));
    unsigned char* const pRow = moBytes.data() + nRow * mnValues;
    if (moRows[nRow] == 0)
        std::memset(pRow, 1, mnValues);
    moRows[nRow] = 1;
    return pRow;
}

void SampleValidity::MarkSamples(const krv::gobs::Raster& oRaster)
{
    const std::size_t nRowBytes = mnValues * (oRaster.GetDataType().GetValueBits() / 8);
    for (std::size_t nRow = 0; nRow < moRows.size(); ++nRow)
    {
        const unsigned char* const pSamples = oRaster.GetBuffer() + nRow * nRowBytes;
        if (mpoTest->FindsAny(pSamples, mnValues))
            mpoTest->Mark(pSamples, mnValues, GetRow(nRow));
    }
}

void SampleValidity::MarkPixels(const krv::gobs::Raster& oRaster)
{
    const std::unique_ptr<Mask> oMask(mpoPixels->BuildMask(oRaster));
    const std::size_t nPixels = oRaster.GetWidth();
    if (oMask->CountSet() == nPixels * moRows.size())
        return;
    const std::size_t nChannels = oRaster.GetChansCount();
    for (std::size_t nRow = 0; nRow < moRows.size(); ++nRow)
    {
        unsigned char* pRow = moRows[nRow] != 0 ? GetRow(nRow) : nullptr;
        for (std::size_t n = 0, nBit = nRow * nPixels; n < nPixels;)
        {
            if ((nBit + n) % 8 == 0 && n + 8 <= nPixels && oMask->GetBits()[(nBit + n) / 8] == 0xFF)
            {
                n += 8;
                continue;
            }
            if (!IsSet(oMask->GetBits(), nBit + n))
            {
                pRow = pRow != nullptr ? pRow : GetRow(nRow);
                std::memset(pRow + n * nChannels, 0, nChannels);
            }
            ++n;
        }
    }
}

void SampleValidity::MarkChannel(const krv::gobs::Raster& oRaster, const Channel& oChannel)
{
    const std::unique_ptr<Mask> oMask(oChannel.mpoBackground->BuildMask(oRaster));
    const std::size_t nPixels = oRaster.GetWidth();
    for (std::size_t n = 0; n < nPixels * moRows.size(); ++n)
        if (IsSet(oMask->GetBits(), n))
            GetRow(n / nPixels)[n % nPixels * oRaster.GetChansCount() + oChannel.mnPosition] = 0;
}

} // namespace krv::datasources::detail
