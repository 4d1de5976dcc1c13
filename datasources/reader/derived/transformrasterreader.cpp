#include "datasources/reader/derived/transformrasterreader.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/droppedtags.h"
#include "datasources/metadata/levelbook.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/reader/checkrastercompatible.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/readervalidity.h"
#include "gobs/mask/exactmaskdecision.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/pixelvalue.h"
#include "gobs/raster/raster.h"
#include "gobs/resampling/gridmap.h"
#include "gobs/resampling/gridrows.h"
#include "gobs/resampling/interpolator.h"
#include "gobs/resampling/nodatasamples.h"
#include "toolkit/core/hblock.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <limits>
#include <map>
#include <string>
#include <utility>

namespace krv::datasources
{

namespace
{

using krv::gobs::IGridMap;
using krv::gobs::InterpolationRule;
using krv::gobs::InterpolationWindow;
using krv::gobs::Mask;
using krv::gobs::NoDataNumbers;
using krv::gobs::Raster;
using krv::gobs::Resampling;
using krv::ogc::cs::GeocodingInfo;

constexpr std::uint64_t LARGEST_WINDOW = std::uint64_t{64} << 20;
constexpr unsigned int TILE = 512;
constexpr const char* PLACED[] = {"GroundControlPoints", "RPC"};

// A rectangle of pixels of the result.
struct Part
{
    long long mnX;
    long long mnY;
    std::size_t mnWidth;
    std::size_t mnHeight;
};

NoDataNumbers NumbersOf(const AuxiliaryData& oRecord, unsigned int nChannels)
{
    NoDataNumbers oNumbers(nChannels);
    for (unsigned int n = 1; n <= std::min(nChannels, oRecord.GetChannelCount()); ++n)
        oNumbers[n - 1] = ParseNoData(GetNoDataText(oRecord, n));
    return oNumbers;
}

// The source, or a level of it, and which of its samples count.
class Samples
{
public:
    Samples(IRasterReader& oReader, double nXFactor, double nYFactor)
        : moReader(oReader), mnXFactor(nXFactor), mnYFactor(nYFactor), moValidity(oReader),
          mnChannels(oReader.GetChansCount())
    {
        const NoDataNumbers oNumbers = NumbersOf(oReader.GetAuxiliaryData(), mnChannels);
        if (!oReader.GetDataType().IsComplex())
            mpoTest = krv::gobs::MakeSampleTest(oReader.GetDataType(), oNumbers, true);
        for (unsigned int n = 0; oReader.GetDataType().IsComplex() && n < mnChannels; ++n)
            AddComplex(oNumbers[n], n);
        for (unsigned int n = 0; n < mnChannels; ++n)
            if (const krv::gobs::IMaskBuilder* const poMask = moValidity.GetChannelMask(n))
                moBackgrounds.push_back({n, poMask});
    }

    IRasterReader& GetReader() const { return moReader; }
    double GetXFactor() const { return mnXFactor; }
    double GetYFactor() const { return mnYFactor; }
    bool NeedsValidity() const { return moValidity.IsNeeded(); }

    // Reads a part of the image into the window; what it points to is good until the next call.
    void Read(InterpolationWindow& oWindow)
    {
        const krv::gobs::RasterInfo oInfo(static_cast<unsigned int>(oWindow.mnWidth),
                                          static_cast<unsigned int>(oWindow.mnHeight), mnChannels,
                                          moReader.GetDataType());
        const krv::gobs::RasterContext oContext(static_cast<int>(oWindow.mnX), static_cast<int>(oWindow.mnY));
        const std::uint64_t nBytes =
            krv::gobs::BufferBytes(oWindow.mnWidth, oWindow.mnHeight, mnChannels, moReader.GetDataType());
        mpoPixels.reset();
        mpoPixels.reset(static_cast<unsigned char*>(HMalloc(nBytes + InterpolationWindow::PADDING)));
        Raster oPixels(oInfo, oContext, mpoPixels.get(), false);
        const std::unique_ptr<Mask> poMask = moValidity.Read(oPixels);
        oWindow.mpPixels = mpoPixels.get();
        oWindow.mpValid = Mark(oPixels, poMask.get());
    }

private:
    // Where a channel alone has no data.
    struct ChannelBackground
    {
        unsigned int mnChannel;
        const krv::gobs::IMaskBuilder* mpoBuilder;
    };

    void AddComplex(const std::optional<krv::gobs::SampleValue>& oNumber, unsigned int nChannel)
    {
        const auto oValue = oNumber.value_or(krv::gobs::SampleValue::FromReal(std::nan("")));
        const krv::gobs::ExactMaskDecision oDecision(krv::gobs::eAnyChannel, {oValue}, {nChannel + 1}, true);
        moComplex.push_back(std::make_unique<krv::gobs::MaskDecisionBuilder>(&oDecision));
        moBackgrounds.push_back({nChannel, moComplex.back().get()});
    }

    static bool IsFull(const Mask& oMask) { return oMask.CountSet() == oMask.GetFullWidth() * oMask.GetFullHeight(); }

    // A byte per value, or null when all are valid.
    const unsigned char* Mark(const Raster& oPixels, const Mask* poMask)
    {
        const std::size_t nPixels = oPixels.GetFullWidth() * oPixels.GetFullHeight();
        const std::size_t nValues = nPixels * mnChannels;
        const bool bMasked = poMask != nullptr && !IsFull(*poMask);
        const bool bValues = mpoTest != nullptr && mpoTest->FindsAny(oPixels.GetBuffer(), nValues);
        if (!bMasked && !bValues && moBackgrounds.empty())
            return nullptr;
        if (bValues)
        {
            moValid.resize(nValues);
            mpoTest->Mark(oPixels.GetBuffer(), nValues, moValid.data());
        }
        else
            moValid.assign(nValues, 1);
        bool bAny = bMasked || bValues;
        for (const ChannelBackground& oChannel : moBackgrounds)
            bAny = MarkChannel(oPixels, oChannel) || bAny;
        for (std::size_t n = 0; bMasked && n < nPixels; ++n)
        {
            if ((poMask->GetBits()[n / 8] & 128u >> n % 8) == 0)
                std::fill_n(&moValid[n * mnChannels], mnChannels, static_cast<unsigned char>(0));
        }
        return bAny ? moValid.data() : nullptr;
    }

    bool MarkChannel(const Raster& oPixels, const ChannelBackground& oChannel)
    {
        const std::unique_ptr<Mask> poBackground(oChannel.mpoBuilder->BuildMask(oPixels));
        if (poBackground->CountSet() == 0)
            return false;
        const std::size_t nPixels = oPixels.GetFullWidth() * oPixels.GetFullHeight();
        for (std::size_t n = 0; n < nPixels; ++n)
        {
            if ((poBackground->GetBits()[n / 8] & 128u >> n % 8) != 0)
                moValid[n * mnChannels + oChannel.mnChannel] = 0;
        }
        return true;
    }

    IRasterReader& moReader;
    double mnXFactor; // pixels of the source for one of this
    double mnYFactor;
    ReaderValidity moValidity;
    unsigned int mnChannels;
    std::unique_ptr<const krv::gobs::ISampleTest> mpoTest; // of plain types
    std::vector<std::unique_ptr<const krv::gobs::IMaskBuilder>> moComplex;
    std::vector<ChannelBackground> moBackgrounds; // of moComplex and moValidity
    HBlock mpoPixels;
    std::vector<unsigned char> moValid;
};

// Whether levels made by a method stand for what this one asks of the image.
bool Suits(Resampling eMethod, const std::string& made)
{
    const bool bSingle = made == "NEAREST" || made == "MODE";
    if (eMethod == Resampling::eMode)
        return bSingle;
    return !bSingle && made != "MIN" && made != "MAX" && made != "RMS" && made != "NONE";
}

bool IsCeilingOf(unsigned int nLevelSize, unsigned int nSize, unsigned int nFactor)
{
    return nLevelSize == nSize / nFactor + (nSize % nFactor != 0 ? 1 : 0);
}

} // namespace

class TransformRasterReader::Implementation
{
public:
    Implementation(IRasterReader& oSource, std::shared_ptr<const IGridMap> poMap, const TransformRequest& oRequest)
        : moSource(oSource), mpoMap(std::move(poMap)),
          mpoAffine(dynamic_cast<const krv::gobs::AffineMap*>(mpoMap.get())), moRequest(oRequest),
          mnChannels(oSource.GetChansCount()), moFull(oSource, 1, 1)
    {
        moNumbers = NumbersOf(oSource.GetAuxiliaryData(), mnChannels);
        for (unsigned int n = 0; n < mnChannels && !oRequest.moBackground.empty(); ++n)
            moNumbers[n] =
                krv::gobs::SampleValue::FromReal(oRequest.moBackground[oRequest.moBackground.size() == 1 ? 0 : n]);
        mbMayMiss = moFull.NeedsValidity() || !IsWithin();
        mpoFinisher = krv::gobs::MakeValueFinisher(oSource.GetDataType(), moNumbers, true);
        mbListed = std::any_of(moNumbers.begin(), moNumbers.end(), [](const auto& o) { return o.has_value(); });
        CheckMethod();
    }

    const TransformRequest& GetRequest() const { return moRequest; }
    const krv::gobs::AffineMap* GetAffine() const { return mpoAffine; }
    bool MayMiss() const { return mbMayMiss; }

    // Fills a rectangle of the result; pValid gets a byte per pixel unless it is null.
    void Fill(const Part& oPart, unsigned char* pPixels, unsigned char* pValid)
    {
        FillPart(oPart, pPixels, pValid, oPart.mnWidth);
    }

    AuxiliaryData MakeRecord() const
    {
        AuxiliaryData oRecord = moSource.GetAuxiliaryData().GetCleanedMeta();
        DropStatistics(oRecord);
        MetadataMap oFileMap = oRecord.GetFileMetadata();
        for (const char* const pKey : PLACED)
            oFileMap.erase(pKey);
        const bool bOwn = !moRequest.moBackground.empty();
        if (bOwn)
            oFileMap.erase("NO_DATA_VALUE");
        oRecord.SetFileMetadata(oFileMap);
        const bool bNaN = mbMayMiss && moSource.GetDataType().IsReal();
        for (unsigned int n = 1; n <= std::min(mnChannels, oRecord.GetChannelCount()); ++n)
        {
            if (bOwn)
                oRecord.SetChanMetadataValue("NO_DATA_VALUE", moNumbers[n - 1]->GetText(), n);
            else if (!moNumbers[n - 1] && bNaN && GetNoDataText(oRecord, n).empty())
                oRecord.SetChanMetadataValue("NO_DATA_VALUE", "nan", n);
        }
        return oRecord;
    }

    std::unique_ptr<ExactHaloReader> mpoBordered; // over the reader itself, for rasters that reach outside

private:
    // Throws for a method that nothing interpolates by.
    void CheckMethod() { static_cast<void>(GetInterpolator(MakeRule({1, 0, 0, 1}, moFull))); }

    // Whether no pixel of the result lies at the border of the source or outside.
    bool IsWithin() const
    {
        if (mpoAffine == nullptr)
            return false;
        for (const double nColumn : {0.5, moRequest.mnWidth - 0.5})
        {
            for (const double nRow : {0.5, moRequest.mnHeight - 0.5})
            {
                double nX = 0, nY = 0;
                mpoAffine->GetTerms().RasterToMap(nColumn, nRow, nX, nY);
                const bool bInside =
                    nX >= 0.5 && nX <= moSource.GetWidth() - 0.5 && nY >= 0.5 && nY <= moSource.GetHeight() - 0.5;
                if (!bInside)
                    return false;
            }
        }
        return true;
    }

    // How much coarser the result is than the source along its axes, never below 1.
    static std::array<double, 2> ReductionOf(const std::array<double, 4>& oFootprint)
    {
        return {std::max(1.0, std::hypot(oFootprint[0], oFootprint[2])),
                std::max(1.0, std::hypot(oFootprint[1], oFootprint[3]))};
    }

    InterpolationRule MakeRule(std::array<double, 4> oFootprint, const Samples& oSamples) const
    {
        oFootprint[0] /= oSamples.GetXFactor();
        oFootprint[2] /= oSamples.GetXFactor();
        oFootprint[1] /= oSamples.GetYFactor();
        oFootprint[3] /= oSamples.GetYFactor();
        // A whole number within the accuracy of the terms is one.
        constexpr double ACCURACY = 1e-9;
        const auto [nX, nY] = ReductionOf(oFootprint);
        return {moRequest.meMethod, nX < 1 + ACCURACY ? 1 : nX, nY < 1 + ACCURACY ? 1 : nY, oFootprint,
                moRequest.mbClamp};
    }

    const krv::gobs::IInterpolator& GetInterpolator(const InterpolationRule& oRule)
    {
        const bool bSame = mpoInterpolator != nullptr && moRule.mnXStretch == oRule.mnXStretch &&
                           moRule.mnYStretch == oRule.mnYStretch && moRule.moFootprint == oRule.moFootprint;
        if (!bSame)
        {
            mpoInterpolator = krv::gobs::MakeInterpolator(moSource.GetDataType(), mnChannels, oRule);
            moRule = oRule;
        }
        return *mpoInterpolator;
    }

    // The coarsest level that is not coarser than the result, else the source.
    Samples& ChooseSamples(const std::array<double, 4>& oFootprint)
    {
        const auto [nX, nY] = ReductionOf(oFootprint);
        const double nMost = std::min(nX, nY) * (1 + 1e-9);
        if (moRequest.mbExact || moRequest.meMethod == Resampling::eNearest || nMost < 2)
            return moFull;
        FindLevels();
        const auto oAbove = std::upper_bound(moLevelFactors.begin(), moLevelFactors.end(), nMost);
        for (auto oLevel = oAbove; oLevel != moLevelFactors.begin();)
        {
            --oLevel;
            if (Samples* const poLevel = OpenLevel(*oLevel))
                return *poLevel;
        }
        return moFull;
    }

    void FindLevels()
    {
        if (mbLevelsKnown)
            return;
        mpoLevels.reset(moSource.GetOverviewReaderAccessor());
        mbLevelsKnown = true;
        const AuxiliaryData oBook = moSource.GetAuxiliaryData();
        for (const unsigned int nLevel : mpoLevels != nullptr ? mpoLevels->GetLevels() : std::vector<unsigned int>())
        {
            if (mpoLevels->IsLevelValid(nLevel) && Suits(moRequest.meMethod, GetLevelMethod(oBook, nLevel)))
                moLevelFactors.push_back(nLevel);
        }
        std::sort(moLevelFactors.begin(), moLevelFactors.end());
    }

    // Null for a level of another kind than the source.
    Samples* OpenLevel(unsigned int nLevel)
    {
        Level& oLevel = moLevels[nLevel];
        if (oLevel.mpoReader == nullptr)
        {
            oLevel.mpoReader.reset(mpoLevels->CreateRasterReader(nLevel));
            if (oLevel.mpoReader == nullptr)
                return nullptr;
            const IRasterReader& oReader = *oLevel.mpoReader;
            if (oReader.GetWidth() == 0 || oReader.GetHeight() == 0 || oReader.GetChansCount() != mnChannels ||
                oReader.GetDataType() != moSource.GetDataType())
                return nullptr;
            const bool bBoxes = IsCeilingOf(oReader.GetWidth(), moSource.GetWidth(), nLevel) &&
                                IsCeilingOf(oReader.GetHeight(), moSource.GetHeight(), nLevel);
            const double nX = bBoxes ? nLevel : static_cast<double>(moSource.GetWidth()) / oReader.GetWidth();
            const double nY = bBoxes ? nLevel : static_cast<double>(moSource.GetHeight()) / oReader.GetHeight();
            oLevel.mpoSamples = std::make_unique<Samples>(*oLevel.mpoReader, nX, nY);
        }
        return oLevel.mpoSamples.get();
    }

    // The pixels of the samples that a part can be made of; empty when it lies outside.
    InterpolationWindow FindWindow(const Part& oPart, const Samples& oSamples, const InterpolationRule& oRule) const
    {
        double nLeft = std::numeric_limits<double>::infinity(), nTop = nLeft, nRight = -nLeft, nBottom = -nLeft;
        const auto Add = [&](double nX, double nY)
        {
            nLeft = std::min(nLeft, nX);
            nRight = std::max(nRight, nX);
            nTop = std::min(nTop, nY);
            nBottom = std::max(nBottom, nY);
        };
        std::vector<double> oX(oPart.mnWidth), oY(oPart.mnWidth);
        for (std::size_t nRow = 0; nRow < oPart.mnHeight; nRow += NextRow(nRow, oPart.mnHeight))
        {
            mpoMap->MapRow(oPart.mnX, oPart.mnY + static_cast<long long>(nRow), oPart.mnWidth, oX.data(), oY.data());
            for (std::size_t n = 0; n < oPart.mnWidth; n += NextRow(n, oPart.mnWidth))
                Add(oX[n] / oSamples.GetXFactor(), oY[n] / oSamples.GetYFactor());
        }
        const auto [nXReach, nYReach] = krv::gobs::GetReach(oRule);
        InterpolationWindow oWindow;
        Cut(nLeft - nXReach - 2, nRight + nXReach + 2, oSamples.GetReader().GetWidth(), oWindow.mnX, oWindow.mnWidth);
        Cut(nTop - nYReach - 2, nBottom + nYReach + 2, oSamples.GetReader().GetHeight(), oWindow.mnY, oWindow.mnHeight);
        return oWindow;
    }

    // The corners of an affine map bound everything.
    std::size_t NextRow(std::size_t nAt, std::size_t nCount) const
    {
        return mpoAffine != nullptr && nAt + 1 < nCount ? nCount - 1 - nAt : 1;
    }

    static void Cut(double nBegin, double nEnd, unsigned int nSize, long long& nFirst, std::size_t& nCount)
    {
        const double nFrom = std::max(0.0, std::floor(nBegin)), nTo = std::min<double>(nSize, std::ceil(nEnd));
        nFirst = 0;
        nCount = 0;
        if (!(nFrom < nTo))
            return;
        nFirst = static_cast<long long>(nFrom);
        nCount = static_cast<std::size_t>(nTo - nFrom);
    }

    // Parts whose window is too large are halved.
    void FillPart(const Part& oPart, unsigned char* pPixels, unsigned char* pValid, std::size_t nPitch)
    {
        const std::array<double, 4> oFootprint =
            mpoMap->GetFootprint(static_cast<double>(oPart.mnX) + static_cast<double>(oPart.mnWidth) / 2,
                                 static_cast<double>(oPart.mnY) + static_cast<double>(oPart.mnHeight) / 2);
        Samples& oSamples = ChooseSamples(oFootprint);
        const InterpolationRule oRule = MakeRule(oFootprint, oSamples);
        InterpolationWindow oWindow = FindWindow(oPart, oSamples, oRule);
        const std::uint64_t nPixelBytes = GetPixelBytes();
        const bool bLarge = static_cast<double>(oWindow.mnWidth) * static_cast<double>(oWindow.mnHeight) *
                                static_cast<double>(nPixelBytes) >
                            static_cast<double>(LARGEST_WINDOW);
        if (bLarge && oPart.mnWidth * oPart.mnHeight > 1)
        {
            const bool bAcross = oPart.mnWidth >= oPart.mnHeight;
            const std::size_t nWidth = bAcross ? oPart.mnWidth / 2 : oPart.mnWidth;
            const std::size_t nHeight = bAcross ? oPart.mnHeight : oPart.mnHeight / 2;
            const std::size_t nSkip = bAcross ? nWidth : nHeight * nPitch;
            FillPart({oPart.mnX, oPart.mnY, nWidth, nHeight}, pPixels, pValid, nPitch);
            const Part oRest =
                bAcross
                    ? Part{oPart.mnX + static_cast<long long>(nWidth), oPart.mnY, oPart.mnWidth - nWidth, nHeight}
                    : Part{oPart.mnX, oPart.mnY + static_cast<long long>(nHeight), nWidth, oPart.mnHeight - nHeight};
            return FillPart(oRest, pPixels + nSkip * nPixelBytes, pValid != nullptr ? pValid + nSkip : nullptr, nPitch);
        }
        if (oWindow.mnWidth == 0 || oWindow.mnHeight == 0)
            return FillBackground(oPart, pPixels, pValid, nPitch);
        oSamples.Read(oWindow);
        MakePixels(oPart, oSamples, GetInterpolator(oRule), oWindow, pPixels, pValid, nPitch);
    }

    void MakePixels(const Part& oPart, const Samples& oSamples, const krv::gobs::IInterpolator& oInterpolator,
                    const InterpolationWindow& oWindow, unsigned char* pPixels, unsigned char* pValid,
                    std::size_t nPitch)
    {
        moRowValid.resize(oPart.mnWidth * mnChannels);
        std::unique_ptr<krv::gobs::IGridRows> poRows;
        if (mpoAffine != nullptr && mpoAffine->IsGrid())
        {
            MapRow(oPart, 0, oSamples);
            poRows = krv::gobs::MakeGridRows(moSource.GetDataType(), mnChannels, moRule, oInterpolator, moX.data(),
                                             oPart.mnWidth);
        }
        for (std::size_t nRow = 0; nRow < oPart.mnHeight; ++nRow, pPixels += nPitch * GetPixelBytes())
        {
            MapRow(poRows != nullptr ? Part{oPart.mnX, oPart.mnY, 1, oPart.mnHeight} : oPart, nRow, oSamples);
            const bool bAll = poRows != nullptr ? poRows->Run(oWindow, moY.front(), pPixels, moRowValid.data())
                                                : oInterpolator.Run(oWindow, moX.data(), moY.data(), oPart.mnWidth,
                                                                    pPixels, moRowValid.data());
            if (!bAll || mpoFinisher->ChangesValid())
                mpoFinisher->Finish(pPixels, bAll ? nullptr : moRowValid.data(), oPart.mnWidth * mnChannels);
            if (pValid != nullptr)
                NotePixels(bAll, oPart.mnWidth, pValid + nRow * nPitch);
        }
    }

    // The places of a row of a part in the samples.
    void MapRow(const Part& oPart, std::size_t nRow, const Samples& oSamples)
    {
        moX.resize(oPart.mnWidth);
        moY.resize(oPart.mnWidth);
        mpoMap->MapRow(oPart.mnX, oPart.mnY + static_cast<long long>(nRow), oPart.mnWidth, moX.data(), moY.data());
        for (std::size_t n = 0; oSamples.GetXFactor() != 1 && n < oPart.mnWidth; ++n)
            moX[n] /= oSamples.GetXFactor();
        for (std::size_t n = 0; oSamples.GetYFactor() != 1 && n < oPart.mnWidth; ++n)
            moY[n] /= oSamples.GetYFactor();
    }

    void FillBackground(const Part& oPart, unsigned char* pPixels, unsigned char* pValid, std::size_t nPitch)
    {
        moRowValid.assign(oPart.mnWidth * mnChannels, 0);
        for (std::size_t nRow = 0; nRow < oPart.mnHeight; ++nRow, pPixels += nPitch * GetPixelBytes())
        {
            std::fill_n(pPixels, oPart.mnWidth * GetPixelBytes(), static_cast<unsigned char>(0));
            mpoFinisher->Finish(pPixels, moRowValid.data(), oPart.mnWidth * mnChannels);
            if (pValid != nullptr)
                NotePixels(false, oPart.mnWidth, pValid + nRow * nPitch);
        }
    }

    // A pixel is valid when a value is in a channel that has a no-data value, or in any when none has.
    void NotePixels(bool bAll, std::size_t nPixels, unsigned char* pValid) const
    {
        std::fill_n(pValid, nPixels, static_cast<unsigned char>(bAll ? 1 : 0));
        for (std::size_t n = 0; !bAll && n < nPixels * mnChannels; ++n)
        {
            if (moRowValid[n] != 0 && (!mbListed || moNumbers[n % mnChannels]))
                pValid[n / mnChannels] = 1;
        }
    }

    std::size_t GetPixelBytes() const { return moSource.GetDataType().GetValueBits() / 8 * mnChannels; }

    struct Level
    {
        std::unique_ptr<IRasterReader> mpoReader;
        std::unique_ptr<Samples> mpoSamples;
    };

    IRasterReader& moSource;
    std::shared_ptr<const IGridMap> mpoMap;
    const krv::gobs::AffineMap* mpoAffine; // the map when it is one
    TransformRequest moRequest;
    unsigned int mnChannels;
    Samples moFull;
    NoDataNumbers moNumbers; // of the result
    bool mbListed = false;   // a channel has one
    bool mbMayMiss = false;
    std::unique_ptr<const krv::gobs::IValueFinisher> mpoFinisher;
    bool mbLevelsKnown = false;
    std::unique_ptr<IOverviewReaderAccessor> mpoLevels; // outlives the readers of levels
    std::vector<unsigned int> moLevelFactors;           // ascending
    std::map<unsigned int, Level> moLevels;
    InterpolationRule moRule;
    std::unique_ptr<krv::gobs::IInterpolator> mpoInterpolator;
    std::vector<double> moX; // of a row
    std::vector<double> moY;
    std::vector<unsigned char> moRowValid;
};

TransformRasterReader::TransformRasterReader(IRasterReader* poSource, std::shared_ptr<const IGridMap> poMap,
                                             const TransformRequest& oRequest, bool bTakeOwnership)
{
    if (poSource == nullptr)
        throw krv::DataException("The source reader is NULL");
    if (poMap == nullptr)
        throw krv::DataException("The map is NULL");
    const IRasterReader& oSource = *poSource;
    if (oSource.GetWidth() == 0 || oSource.GetHeight() == 0 || oSource.GetChansCount() == 0)
        throw krv::DataException("The source reader has no pixels");
    if (oRequest.mnWidth == 0 || oRequest.mnHeight == 0)
        throw krv::DataException("The result has no pixels");
    const std::size_t nBackground = oRequest.moBackground.size();
    if (nBackground > 1 && nBackground != oSource.GetChansCount())
        throw krv::DataException(std::to_string(nBackground) + " background values for " +
                                 std::to_string(oSource.GetChansCount()) + " channels");
    mpoImplementation = std::make_unique<Implementation>(*poSource, std::move(poMap), oRequest);
    SetSource({poSource, {false}});
    TransformRasterReader::SetOptimalTileSize();
    mpoImplementation->mpoBordered = std::make_unique<ExactHaloReader>(this, false);
    OwnSource(bTakeOwnership);
}

TransformRasterReader::~TransformRasterReader() = default;

void TransformRasterReader::SetOptimalTileSize()
{
    SetGrid(GetWidth(), GetHeight(), std::min(TILE, GetWidth()), std::min(TILE, GetHeight()));
}

void TransformRasterReader::SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour)
{
    mpoImplementation->mpoBordered->SetMargins(nXMargin, nYMargin, eBehaviour);
    KeepMargins(nXMargin, nYMargin, eBehaviour);
}

void TransformRasterReader::ReadRaster(Raster* poRaster)
{
    krv::gobs::CheckRasterCompatible(poRaster, this);
    if (!mpoImplementation->mpoBordered->IsInside(*poRaster))
        return mpoImplementation->mpoBordered->ReadRaster(poRaster);
    const Part oPart{static_cast<long long>(poRaster->GetX()) - poRaster->GetXMargin(),
                     static_cast<long long>(poRaster->GetY()) - poRaster->GetYMargin(), poRaster->GetFullWidth(),
                     poRaster->GetFullHeight()};
    if (oPart.mnWidth > 0 && oPart.mnHeight > 0)
        mpoImplementation->Fill(oPart, poRaster->GetBuffer(), nullptr);
}

bool TransformRasterReader::HasValidity()
{
    return mpoImplementation->MayMiss();
}

std::unique_ptr<Mask> TransformRasterReader::ReadValid(Raster& oRaster)
{
    krv::gobs::CheckRasterCompatible(&oRaster, this);
    if (!mpoImplementation->mpoBordered->IsInside(oRaster))
        return mpoImplementation->mpoBordered->ReadValid(oRaster);
    const Part oPart{static_cast<long long>(oRaster.GetX()) - oRaster.GetXMargin(),
                     static_cast<long long>(oRaster.GetY()) - oRaster.GetYMargin(), oRaster.GetFullWidth(),
                     oRaster.GetFullHeight()};
    std::vector<unsigned char> oValid(oPart.mnWidth * oPart.mnHeight);
    if (oPart.mnWidth > 0 && oPart.mnHeight > 0)
        mpoImplementation->Fill(oPart, oRaster.GetBuffer(), oValid.data());
    static unsigned char nNone = 0;
    return std::make_unique<Mask>(oRaster.GetInfo(), oRaster.GetContext(), oValid.empty() ? &nNone : oValid.data(),
                                  false);
}

AuxiliaryData TransformRasterReader::GetAuxiliaryData() const
{
    return mpoImplementation->MakeRecord();
}

GeocodingInfo* TransformRasterReader::GetGeocodingInfo() const
{
    const TransformRequest& oRequest = mpoImplementation->GetRequest();
    if (oRequest.moGeocoding)
        return new GeocodingInfo(*oRequest.moGeocoding);
    const std::unique_ptr<GeocodingInfo> poSource(GetSource().GetGeocodingInfo());
    if (poSource == nullptr || mpoImplementation->GetAffine() == nullptr)
        return nullptr;
    if (poSource->IsIdentity())
        return new GeocodingInfo();
    return new GeocodingInfo(krv::gobs::Compose(mpoImplementation->GetAffine()->GetTerms(), *poSource));
}

unsigned int TransformRasterReader::GetWidth() const
{
    return mpoImplementation->GetRequest().mnWidth;
}

unsigned int TransformRasterReader::GetHeight() const
{
    return mpoImplementation->GetRequest().mnHeight;
}

const std::vector<unsigned int>& TransformRasterReader::GetChannels() const
{
    static const std::vector<unsigned int> NONE;
    return NONE;
}

} // namespace krv::datasources
