#include "datasources/reader/exacthaloreader.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/reader/checkrastercompatible.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "datasources/reader/rasteriterator.h"
#include "gobs/mask/samplematch.h"
#include "gobs/raster/buffertype.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cstring>
#include <optional>

namespace krv::datasources
{

namespace
{

constexpr long long OUTSIDE = -1;

// For each of nCount positions from nBegin on a line of nLength pixels: the pixel that stands for it, or OUTSIDE.
std::vector<long long> MakeIndices(long long nBegin, std::uint64_t nCount, unsigned int nLength,
                                   eMarginBehaviour eBehaviour)
{
    const bool bValue = eBehaviour == eConstant || eBehaviour == eNoData;
    std::vector<long long> oIndices(nCount);
    for (std::uint64_t nAt = 0; nAt < nCount; ++nAt)
    {
        const long long nIndex = nBegin + static_cast<long long>(nAt);
        if (nIndex >= 0 && nIndex < static_cast<long long>(nLength))
            oIndices[nAt] = nIndex;
        else
            oIndices[nAt] = bValue ? OUTSIDE : krv::gobs::FoldIndex(nIndex, nLength, eBehaviour);
    }
    return oIndices;
}

struct Span
{
    unsigned int mnBegin;
    unsigned int mnEnd;
};

// The pixels of a line that the indices name, as spans without gaps: one, or two when both ends of the image are
// needed.
std::vector<Span> MakeSpans(std::vector<long long> oIndices)
{
    std::sort(oIndices.begin(), oIndices.end());
    oIndices.erase(std::unique(oIndices.begin(), oIndices.end()), oIndices.end());
    std::vector<Span> oSpans;
    for (const long long nIndex : oIndices)
    {
        if (nIndex == OUTSIDE)
            continue;
        const auto nPixel = static_cast<unsigned int>(nIndex);
        if (!oSpans.empty() && oSpans.back().mnEnd == nPixel)
            ++oSpans.back().mnEnd;
        else
            oSpans.push_back({nPixel, nPixel + 1});
    }
    return oSpans;
}

bool Contains(const Span& oSpan, long long nIndex)
{
    return nIndex >= static_cast<long long>(oSpan.mnBegin) && nIndex < static_cast<long long>(oSpan.mnEnd);
}

// Copies the pixels of one row that lie in the span, run by run.
void CopyRow(const unsigned char* pSource, const Span& oColumns, unsigned char* pTarget,
             const std::vector<long long>& oIndices, std::size_t nPixelBytes)
{
    for (std::size_t nAt = 0; nAt < oIndices.size();)
    {
        if (!Contains(oColumns, oIndices[nAt]))
        {
            ++nAt;
            continue;
        }
        std::size_t nRun = 1;
        while (nAt + nRun < oIndices.size() && oIndices[nAt + nRun] == oIndices[nAt] + static_cast<long long>(nRun) &&
               Contains(oColumns, oIndices[nAt + nRun]))
            ++nRun;
        const auto nFrom = static_cast<std::size_t>(oIndices[nAt]) - oColumns.mnBegin;
        std::memcpy(pTarget + nAt * nPixelBytes, pSource + nFrom * nPixelBytes, nRun * nPixelBytes);
        nAt += nRun;
    }
}

} // namespace

ExactHaloReader::ExactHaloReader(IRasterReader* poSource, bool bTakeOwnership) : mpoSource(poSource), moTiles(0, 0)
{
    if (poSource == nullptr)
        throw krv::DataException("The source reader is NULL");
    if (poSource->GetWidth() == 0 || poSource->GetHeight() == 0)
        throw krv::DataException("The source reader has no pixels");
    if (poSource->GetDataType().GetValueBits() % 8 != 0)
        throw krv::DataException("The source reader has the data type " + poSource->GetDataType().Describe() +
                                 ", which has no whole bytes");
    mnPixelBytes = poSource->GetDataType().GetValueBits() / 8 * poSource->GetChansCount();
    moTiles = krv::gobs::TileIterator(poSource->GetWidth(), poSource->GetHeight());
    ExactHaloReader::SetOptimalTileSize();
    if (bTakeOwnership)
        mpoOwnedSource.reset(poSource);
}

ExactHaloReader::~ExactHaloReader() = default;

void ExactHaloReader::SetConstant(const std::vector<double>& oValues)
{
    if (oValues.size() != GetChansCount())
        throw krv::DataException(std::to_string(oValues.size()) + " values for " + std::to_string(GetChansCount()) +
                                 " channels");
    moConstant = oValues;
}

void ExactHaloReader::SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour)
{
    if (eBehaviour < eException || eBehaviour > eWrap)
        throw krv::ParameterException("Unknown margin behaviour", krv::ParameterException::eInvalidValue, "eBehaviour");
    meMarginBehaviour = eBehaviour;
    mnXMargin = nXMargin;
    mnYMargin = nYMargin;
}

krv::gobs::Raster* ExactHaloReader::GetRaster(unsigned int nIndex)
{
    const krv::gobs::Tile oTile = moTiles.GetTile(nIndex);
    return ReadRaster(oTile.GetX(), oTile.GetY(), oTile.GetWidth(), oTile.GetHeight());
}

krv::gobs::Raster* ExactHaloReader::ReadRaster(unsigned int nX, unsigned int nY, unsigned int nWidth,
                                               unsigned int nHeight)
{
    const Place oPlace = Place::Current();
    auto oRaster = std::make_unique<krv::gobs::Raster>(
        krv::gobs::RasterInfo(nWidth, nHeight, GetChansCount(), GetDataType()),
        krv::gobs::RasterContext(detail::ToPosition(nX, oPlace), detail::ToPosition(nY, oPlace), mnXMargin, mnYMargin));
    ReadRaster(oRaster.get());
    return oRaster.release();
}

void ExactHaloReader::ReadRaster(krv::gobs::Raster* poRaster)
{
    const Place oPlace = Place::Current();
    krv::gobs::CheckRasterCompatible(poRaster, this, oPlace);
    const long long nLeft = static_cast<long long>(poRaster->GetX()) - poRaster->GetXMargin();
    const long long nTop = static_cast<long long>(poRaster->GetY()) - poRaster->GetYMargin();
    const bool bInside = nLeft >= 0 && nTop >= 0 &&
                         nLeft + static_cast<long long>(poRaster->GetFullWidth()) <= GetWidth() &&
                         nTop + static_cast<long long>(poRaster->GetFullHeight()) <= GetHeight();
    if (bInside)
    {
        // The same buffer as one window without margins: the source reads straight into it.
        krv::gobs::Raster oWhole(
            krv::gobs::RasterInfo(static_cast<unsigned int>(poRaster->GetFullWidth()),
                                  static_cast<unsigned int>(poRaster->GetFullHeight()), GetChansCount(), GetDataType()),
            krv::gobs::RasterContext(static_cast<int>(nLeft), static_cast<int>(nTop)), poRaster->GetBuffer(), false);
        mpoSource->ReadRaster(&oWhole);
        return;
    }
    if (meMarginBehaviour == eException)
        throw krv::DataException("Margin behaviour is eException", oPlace);
    ReadAcrossBorder(*poRaster);
}

void ExactHaloReader::ReadAcrossBorder(krv::gobs::Raster& oRaster)
{
    const std::uint64_t nFullWidth = oRaster.GetFullWidth();
    const auto oColumns = MakeIndices(static_cast<long long>(oRaster.GetX()) - oRaster.GetXMargin(), nFullWidth,
                                      GetWidth(), meMarginBehaviour);
    const auto oRows = MakeIndices(static_cast<long long>(oRaster.GetY()) - oRaster.GetYMargin(),
                                   oRaster.GetFullHeight(), GetHeight(), meMarginBehaviour);
    const std::size_t nRowBytes = nFullWidth * mnPixelBytes;
    if (meMarginBehaviour == eConstant || meMarginBehaviour == eNoData)
    {
        const std::vector<unsigned char> oPixel = MakeOutsidePixel();
        for (std::uint64_t nPixel = 0; nPixel < nFullWidth * oRaster.GetFullHeight(); ++nPixel)
            std::memcpy(oRaster.GetBuffer() + nPixel * mnPixelBytes, oPixel.data(), mnPixelBytes);
    }
    for (const Span& oRowSpan : MakeSpans(oRows))
    {
        for (const Span& oColumnSpan : MakeSpans(oColumns))
        {
            krv::gobs::Raster oPatch(
                krv::gobs::RasterInfo(oColumnSpan.mnEnd - oColumnSpan.mnBegin, oRowSpan.mnEnd - oRowSpan.mnBegin,
                                      GetChansCount(), GetDataType()),
                krv::gobs::RasterContext(static_cast<int>(oColumnSpan.mnBegin), static_cast<int>(oRowSpan.mnBegin)));
            mpoSource->ReadRaster(&oPatch);
            const std::size_t nPatchRowBytes = oPatch.GetFullWidth() * mnPixelBytes;
            for (std::size_t nRow = 0; nRow < oRows.size(); ++nRow)
            {
                if (Contains(oRowSpan, oRows[nRow]))
                    CopyRow(oPatch.GetBuffer() +
                                (static_cast<std::size_t>(oRows[nRow]) - oRowSpan.mnBegin) * nPatchRowBytes,
                            oColumnSpan, oRaster.GetBuffer() + nRow * nRowBytes, oColumns, mnPixelBytes);
            }
        }
    }
}

// The bytes of one pixel outside the image under eConstant and eNoData. A no-data value that no sample can equal is
// none.
std::vector<unsigned char> ExactHaloReader::MakeOutsidePixel() const
{
    const krv::gobs::DataType& oType = GetDataType();
    const unsigned int nChannels = GetChansCount();
    std::vector<unsigned char> oPixel(mnPixelBytes);
    const AuxiliaryData oMetadata = meMarginBehaviour == eNoData ? GetAuxiliaryData() : AuxiliaryData();
    for (unsigned int nChannel = 0; nChannel < nChannels; ++nChannel)
    {
        unsigned char* const pValue = oPixel.data() + mnPixelBytes / nChannels * nChannel;
        if (meMarginBehaviour == eConstant)
        {
            const double nConstant = moConstant.empty() ? 0 : moConstant[nChannel];
            krv::raster::CopyData(&nConstant, krv::raster::eBT_64R, 1, pValue,
                                  krv::gobs::QRFDataType2RasterBufferType(oType), 1, 1);
            continue;
        }
        const std::optional<NoDataValue> oValue = GetTypedNoData(oMetadata, nChannel + 1);
        if (!oValue)
            throw krv::DataException("Channel " + std::to_string(nChannel + 1) +
                                     " has no no-data value for the pixels outside the image");
        if (!krv::gobs::StoreSample(*oValue, oType, pValue))
            throw krv::DataException("Channel " + std::to_string(nChannel + 1) + ": no value of type " +
                                     oType.Describe() + " equals the no-data value " + oValue->GetText() +
                                     " for the pixels outside the image");
    }
    return oPixel;
}

RasterIterator ExactHaloReader::FindRaster(unsigned int nX, unsigned int nY)
{
    return RasterIterator(this, moTiles.GetTileIndex(nX, nY));
}

RasterIterator ExactHaloReader::Begin()
{
    return RasterIterator(this);
}

RasterIterator ExactHaloReader::End()
{
    return RasterIterator(this, GetTileCount());
}

unsigned int ExactHaloReader::GetTileCount() const
{
    return moTiles.GetTileRange() + 1;
}

void ExactHaloReader::SetOptimalTileSize()
{
    SetTileSize(mpoSource->GetTileWidth(), mpoSource->GetTileHeight());
}

void ExactHaloReader::SetTileSize(unsigned int nWidth, unsigned int nHeight)
{
    moTiles.SetChunkSize(nWidth, nHeight);
    mnTileWidth = nWidth;
    mnTileHeight = nHeight;
}

const std::vector<IChannelInfo*>& ExactHaloReader::GetChannelsInfo() const
{
    return mpoSource->GetChannelsInfo();
}

IFileFormat* ExactHaloReader::GetFileFormat() const
{
    return mpoSource->GetFileFormat();
}

AuxiliaryData ExactHaloReader::GetAuxiliaryData() const
{
    return mpoSource->GetAuxiliaryData();
}

krv::ogc::cs::ICRS* ExactHaloReader::GetCRS() const
{
    return mpoSource->GetCRS();
}

krv::ogc::cs::GeocodingInfo* ExactHaloReader::GetGeocodingInfo() const
{
    return mpoSource->GetGeocodingInfo();
}

IOverviewReaderAccessor* ExactHaloReader::GetOverviewReaderAccessor()
{
    return mpoSource->GetOverviewReaderAccessor();
}

unsigned int ExactHaloReader::GetWidth() const
{
    return mpoSource->GetWidth();
}

unsigned int ExactHaloReader::GetHeight() const
{
    return mpoSource->GetHeight();
}

unsigned int ExactHaloReader::GetChansCount() const
{
    return mpoSource->GetChansCount();
}

const krv::gobs::DataType& ExactHaloReader::GetDataType() const
{
    return mpoSource->GetDataType();
}

} // namespace krv::datasources
