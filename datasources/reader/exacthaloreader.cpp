#include "datasources/reader/exacthaloreader.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/checkrastercompatible.h"
#include "datasources/reader/detail/rasterchannels.h"
#include "datasources/reader/readervalidity.h"
#include "gobs/mask/mask.h"
#include "gobs/mask/samplematch.h"
#include "gobs/raster/buffertype.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <climits>
#include <cstring>
#include <optional>
#include <typeinfo>

namespace krv::datasources
{

namespace
{

// One direction of a raster with its margins, held against the image.
struct Axis
{
    Axis(int nPosition, unsigned int nMargin, std::uint64_t nCount, unsigned int nLength)
        : mnBegin(static_cast<long long>(nPosition) - nMargin), mnCount(static_cast<long long>(nCount)),
          mnLength(nLength), mnBefore(std::clamp(-mnBegin, 0LL, mnCount)),
          mnBehind(std::clamp(mnBegin + mnCount - mnLength, 0LL, mnCount)),
          mnInside(std::max(0LL, mnCount - mnBefore - mnBehind))
    {
    }

    bool IsInside() const { return mnBegin >= 0 && mnBegin + mnCount <= mnLength; }
    bool IsInt() const { return mnBegin >= INT_MIN && mnBegin + mnCount <= INT_MAX && mnCount <= INT_MAX; }
    // Whether the pixels that stand for those outside the image are among those inside.
    bool HasSources(eMarginBehaviour eBehaviour) const
    {
        const long long nReach = std::max(mnBefore, mnBehind);
        return mnInside > 0 &&
               (nReach == 0 || mnInside == mnLength || eBehaviour == eReplicate ||
                (eBehaviour == eMirror && nReach <= mnInside) || (eBehaviour == eMirror101 && nReach < mnInside));
    }

    long long mnBegin; // in the image
    long long mnCount;
    long long mnLength; // of the image
    long long mnBefore; // positions outside the image
    long long mnBehind;
    long long mnInside;
};

Axis ColumnsOf(const krv::gobs::Raster& oRaster, const IRasterReader& oReader)
{
    return {oRaster.GetX(), oRaster.GetXMargin(), oRaster.GetFullWidth(), oReader.GetWidth()};
}

Axis RowsOf(const krv::gobs::Raster& oRaster, const IRasterReader& oReader)
{
    return {oRaster.GetY(), oRaster.GetYMargin(), oRaster.GetFullHeight(), oReader.GetHeight()};
}

// A raster that lies inside the image as one without margins, over the same buffer.
krv::gobs::Raster AsWindow(krv::gobs::Raster& oRaster)
{
    return {krv::gobs::RasterInfo(static_cast<unsigned int>(oRaster.GetFullWidth()),
                                  static_cast<unsigned int>(oRaster.GetFullHeight()), oRaster.GetChansCount(),
                                  oRaster.GetDataType()),
            krv::gobs::RasterContext(static_cast<int>(static_cast<long long>(oRaster.GetX()) - oRaster.GetXMargin()),
                                     static_cast<int>(static_cast<long long>(oRaster.GetY()) - oRaster.GetYMargin())),
            oRaster.GetBuffer(), false};
}

// For each position the pixel of the image that stands for it.
std::vector<long long> MakeIndices(const Axis& oAxis, eMarginBehaviour eBehaviour)
{
    std::vector<long long> oIndices(static_cast<std::size_t>(oAxis.mnCount));
    for (std::size_t nAt = 0; nAt < oIndices.size(); ++nAt)
        oIndices[nAt] = krv::gobs::FoldIndex(oAxis.mnBegin + static_cast<long long>(nAt), oAxis.mnLength, eBehaviour);
    return oIndices;
}

// Puts one pixel wherever the raster lies outside the image.
void FillOutside(krv::gobs::Raster& oRaster, const Axis& oColumns, const Axis& oRows,
                 const std::vector<unsigned char>& oPixel)
{
    const auto nRowBytes = static_cast<std::size_t>(oColumns.mnCount) * oPixel.size();
    const auto nLeftBytes = static_cast<std::size_t>(oColumns.mnBefore) * oPixel.size();
    const auto nRightBytes = static_cast<std::size_t>(oColumns.mnBehind) * oPixel.size();
    std::vector<unsigned char> oLine;
    oLine.reserve(nRowBytes);
    while (oLine.size() < nRowBytes)
        oLine.insert(oLine.end(), oPixel.begin(), oPixel.end());
    unsigned char* pRow = oRaster.GetBuffer();
    for (long long nRow = 0; nRow < oRows.mnCount; ++nRow, pRow += nRowBytes)
    {
        const bool bInside = nRow >= oRows.mnBefore && nRow < oRows.mnCount - oRows.mnBehind;
        std::copy_n(oLine.begin(), bInside ? nLeftBytes : nRowBytes, pRow);
        std::copy_n(oLine.begin(), nRightBytes, pRow + nRowBytes - nRightBytes);
    }
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

// The validity of a reader as one 8-bit channel: 1 where it is valid.
class ExactHaloReader::ValidityChannel : public DerivedReader
{
public:
    explicit ValidityChannel(IRasterReader& oReader) { SetSource({&oReader, {false}}); }

    unsigned int GetChansCount() const override { return 1; }
    const krv::gobs::DataType& GetDataType() const override { return moType; }
    using DerivedReader::ReadRaster;
    void ReadRaster(krv::gobs::Raster* poRaster) override
    {
        const IRasterReader& oSource = GetSource();
        krv::gobs::Raster oPixels(
            {poRaster->GetWidth(), poRaster->GetHeight(), oSource.GetChansCount(), oSource.GetDataType()},
            poRaster->GetContext());
        if (const auto poMask = GetSourceValidity().Read(oPixels))
            poMask->RetrieveRaster(*poRaster);
        else
            std::fill_n(poRaster->GetBuffer(), poRaster->GetBufferSize(), static_cast<unsigned char>(1));
    }

private:
    krv::gobs::DataType moType = krv::gobs::eDT_8U;
};

ExactHaloReader::ExactHaloReader(IRasterReader* poSource, bool bTakeOwnership)
{
    if (poSource == nullptr)
        throw krv::DataException("The source reader is NULL");
    const IRasterReader& oSource = *poSource;
    if (oSource.GetWidth() == 0 || oSource.GetHeight() == 0)
        throw krv::DataException("The source reader has no pixels");
    if (oSource.GetDataType().GetValueBits() % 8 != 0)
        throw krv::DataException("The source reader has the data type " + oSource.GetDataType().Describe() +
                                 ", which has no whole bytes");
    mnPixelBytes = oSource.GetDataType().GetValueBits() / 8 * oSource.GetChansCount();
    if (typeid(oSource) == typeid(BasicReader))
        mpoPlainSource = dynamic_cast<BasicReader*>(poSource);
    SetSource({poSource, {bTakeOwnership}});
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
    KeepMargins(nXMargin, nYMargin, eBehaviour);
}

LevelWrapper ExactHaloReader::GetLevelWrapper() const
{
    return [](std::unique_ptr<IRasterReader> poLevel)
    {
        auto oReader = std::make_unique<ExactHaloReader>(poLevel.get(), true);
        static_cast<void>(poLevel.release());
        return oReader;
    };
}

void ExactHaloReader::ReadRaster(krv::gobs::Raster* poRaster)
{
    const Place oPlace = Place::Current();
    krv::gobs::CheckRasterCompatible(poRaster, this, oPlace);
    const eMarginBehaviour eBehaviour = GetMarginBehaviour();
    const Axis oColumns = ColumnsOf(*poRaster, *this);
    const Axis oRows = RowsOf(*poRaster, *this);
    if (IsInside(*poRaster))
        return ReadInside(*poRaster);
    if (eBehaviour == eException)
        throw krv::DataException("Margin behaviour is eException", oPlace);
    if (eBehaviour == eConstant || eBehaviour == eNoData)
    {
        const std::vector<unsigned char> oPixel = MakeOutsidePixel();
        if (oColumns.mnInside > 0 && oRows.mnInside > 0)
            ReadInside(*poRaster);
        return FillOutside(*poRaster, oColumns, oRows, oPixel);
    }
    if (!oColumns.HasSources(eBehaviour) || !oRows.HasSources(eBehaviour))
        return ReadScattered(*poRaster);
    ReadInside(*poRaster);
    krv::gobs::FillRasterSides(*poRaster, eBehaviour, static_cast<std::uint64_t>(oColumns.mnBefore),
                               static_cast<std::uint64_t>(oColumns.mnBehind),
                               static_cast<std::uint64_t>(oRows.mnBefore), static_cast<std::uint64_t>(oRows.mnBehind));
}

bool ExactHaloReader::IsInside(const krv::gobs::Raster& oRaster) const
{
    return ColumnsOf(oRaster, *this).IsInside() && RowsOf(oRaster, *this).IsInside();
}

std::unique_ptr<krv::gobs::Mask> ExactHaloReader::ReadValid(krv::gobs::Raster& oRaster)
{
    krv::gobs::CheckRasterCompatible(&oRaster, this);
    if (IsInside(oRaster))
    {
        // As one window without margins, as ReadInside has it.
        krv::gobs::Raster oWindow = AsWindow(oRaster);
        const std::unique_ptr<krv::gobs::Mask> poWindow = GetSourceValidity().Read(oWindow);
        if (poWindow == nullptr)
            return nullptr;
        auto poMask = std::make_unique<krv::gobs::Mask>(oRaster.GetInfo(), oRaster.GetContext());
        std::copy_n(poWindow->GetBits(), poMask->GetBitsSize(), poMask->GetBits());
        return poMask;
    }
    if (mpoValidity == nullptr)
    {
        auto poChannel = std::make_unique<ValidityChannel>(GetSource());
        mpoValidity = std::make_unique<ExactHaloReader>(poChannel.get(), true);
        static_cast<void>(poChannel.release());
    }
    const eMarginBehaviour eBehaviour = GetMarginBehaviour();
    mpoValidity->SetMargins(0, 0, eBehaviour == eNoData ? eConstant : eBehaviour);
    ReadRaster(&oRaster);
    krv::gobs::Raster oValid({oRaster.GetWidth(), oRaster.GetHeight(), 1, krv::gobs::eDT_8U}, oRaster.GetContext());
    mpoValidity->ReadRaster(&oValid);
    return std::make_unique<krv::gobs::Mask>(oValid.GetInfo(), oValid.GetContext(), oValid.GetBuffer(), false);
}

// What lies in the image, as one window. It comes straight into the raster when it is all of the raster's rows, and
// from a plain source in any case.
void ExactHaloReader::ReadInside(krv::gobs::Raster& oRaster)
{
    const Axis oColumns = ColumnsOf(oRaster, *this);
    const Axis oRows = RowsOf(oRaster, *this);
    if (!oColumns.IsInside() && mpoPlainSource != nullptr && oColumns.IsInt() && oRows.IsInt())
        return mpoPlainSource->mpoChannels->ReadInside(oRaster, Place::Current());
    const auto nRowBytes = static_cast<std::size_t>(oColumns.mnCount) * mnPixelBytes;
    unsigned char* const pFirst = oRaster.GetBuffer() + static_cast<std::size_t>(oRows.mnBefore) * nRowBytes;
    const krv::gobs::RasterInfo oInfo(static_cast<unsigned int>(oColumns.mnInside),
                                      static_cast<unsigned int>(oRows.mnInside), GetChansCount(), GetDataType());
    const krv::gobs::RasterContext oContext(static_cast<int>(std::max(0LL, oColumns.mnBegin)),
                                            static_cast<int>(std::max(0LL, oRows.mnBegin)));
    if (oColumns.IsInside())
    {
        krv::gobs::Raster oPart(oInfo, oContext, pFirst, false);
        return GetSource().ReadRaster(&oPart);
    }
    krv::gobs::Raster oPart(oInfo, oContext);
    GetSource().ReadRaster(&oPart);
    const std::size_t nPartBytes = oPart.GetFullWidth() * mnPixelBytes;
    for (std::size_t nRow = 0; nRow < oPart.GetFullHeight(); ++nRow)
        std::memcpy(pFirst + nRow * nRowBytes + static_cast<std::size_t>(oColumns.mnBefore) * mnPixelBytes,
                    oPart.GetBuffer() + nRow * nPartBytes, nPartBytes);
}

// Patches of the image, each read once, of which every pixel takes the one that stands for it: when margins are wide
// beside the window, or pixels come from the other end of the image.
void ExactHaloReader::ReadScattered(krv::gobs::Raster& oRaster)
{
    const auto oColumns = MakeIndices(ColumnsOf(oRaster, *this), GetMarginBehaviour());
    const auto oRows = MakeIndices(RowsOf(oRaster, *this), GetMarginBehaviour());
    const std::size_t nRowBytes = oColumns.size() * mnPixelBytes;
    for (const Span& oRowSpan : MakeSpans(oRows))
    {
        for (const Span& oColumnSpan : MakeSpans(oColumns))
        {
            krv::gobs::Raster oPatch(
                krv::gobs::RasterInfo(oColumnSpan.mnEnd - oColumnSpan.mnBegin, oRowSpan.mnEnd - oRowSpan.mnBegin,
                                      GetChansCount(), GetDataType()),
                krv::gobs::RasterContext(static_cast<int>(oColumnSpan.mnBegin), static_cast<int>(oRowSpan.mnBegin)));
            GetSource().ReadRaster(&oPatch);
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
    const AuxiliaryData oMetadata = GetMarginBehaviour() == eNoData ? GetAuxiliaryData() : AuxiliaryData();
    for (unsigned int nChannel = 0; nChannel < nChannels; ++nChannel)
    {
        unsigned char* const pValue = oPixel.data() + mnPixelBytes / nChannels * nChannel;
        if (GetMarginBehaviour() == eConstant)
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

} // namespace krv::datasources
