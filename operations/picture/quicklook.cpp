#include "operations/picture/quicklook.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/metadata/classnames.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/derived/pctrasterreader.h"
#include "datasources/reader/derived/totalpowerrasterreader.h"
#include "gobs/pct/pct.h"
#include "operations/job/exceptions.h"
#include "operations/job/progress.h"
#include "operations/picture/legend.h"
#include "operations/source/sourcefile.h"
#include "toolkit/exceptions/exceptions.h"

#include <fmt/format.h>

#include <algorithm>
#include <cmath>
#include <memory>
#include <optional>
#include <set>

namespace krv::operations
{

namespace
{

constexpr char UNIT_TAG[] = "UnitType";

struct Size
{
    unsigned int width;
    unsigned int height;
};

// Who works, and who is told.
struct Threads
{
    const Progress& progress;
    krv::threading::IExecutor* executor;
};

Size FitInto(unsigned int nWidth, unsigned int nHeight, unsigned int nLongest)
{
    const double nScale = std::min(static_cast<double>(nLongest) / std::max({nWidth, nHeight, 1U}), 1.0);
    const auto Scaled = [nScale](unsigned int n)
    {
        return static_cast<unsigned int>(std::max(std::lround(n * nScale), 1L));
    };
    return {Scaled(nWidth), Scaled(nHeight)};
}

std::uint64_t ReaderBytes(const krv::datasources::IRasterReader& oReader)
{
    return krv::gobs::BufferBytes(oReader.GetWidth(), oReader.GetHeight(), oReader.GetChansCount(),
                                  oReader.GetDataType());
}

// The planes of some channels, in their order, whatever their types.
std::vector<Plane> ReadPlanes(const SourceFile& oFile, const std::vector<unsigned int>& oChannels, const Size& oSize,
                              Resampling eMethod, const Threads& oThreads)
{
    const std::vector<ChannelGroup> oGroups = oFile.GroupByType(oChannels);
    std::uint64_t nBytes = 0;
    for (const ChannelGroup& oGroup : oGroups)
        nBytes += ReaderBytes(oFile.ReadAtLeast(oGroup.channels, oSize.width, oSize.height).Get());
    ProgressCounter oCounter(oThreads.progress, "view", nBytes);
    std::vector<Plane> oPlanes(oChannels.size());
    for (std::size_t g = 0; g < oGroups.size(); ++g)
    {
        std::vector<OptionalNoData> oNoData;
        for (const unsigned int nChannel : oGroups[g].channels)
            oNoData.push_back(oFile.GetNoData(nChannel));
        const auto Read = [&](const SourceFile& oSource)
        {
            return oSource.ReadAtLeast(oGroups[g].channels, oSize.width, oSize.height);
        };
        auto oFound = Reduce(oFile, Read, oNoData, oSize.width, oSize.height, eMethod, oCounter, oThreads.executor);
        for (std::size_t i = 0; i < oFound.size(); ++i)
            oPlanes[oGroups[g].positions[i]] = std::move(oFound[i]);
    }
    return oPlanes;
}

// Red, green, blue and alpha of the channel that has a colour table.
std::vector<Plane> ReadColours(const SourceFile& oFile, const DisplayChoice& oChoice, const Size& oSize,
                               const Threads& oThreads)
{
    const auto Read = [&](const SourceFile& oSource)
    {
        auto poValues = std::make_unique<krv::datasources::BasicReader>(&oSource.GetDataset(), oChoice.channels, false);
        auto poColours = std::make_unique<krv::datasources::PCTRasterReader>(poValues.get(), *oChoice.table, true,
                                                                             krv::datasources::eWithAlpha);
        (void)poValues.release();
        return LevelReader::AtLeast(std::move(poColours), oSize.width, oSize.height, oSource.GetName());
    };
    ProgressCounter oCounter(oThreads.progress, "view", ReaderBytes(Read(oFile).Get()));
    return Reduce(oFile, Read, std::vector<OptionalNoData>(4), oSize.width, oSize.height, Resampling::eNearest,
                  oCounter, oThreads.executor);
}

// By what a plane says, 0 to nFull.
void Multiply(std::vector<float>& oShares, const Plane& oPlane, float nFull)
{
    for (std::size_t i = 0; i < oShares.size(); ++i)
        oShares[i] *= std::clamp(oPlane.values[i] / nFull, 0.0F, 1.0F);
}

// Alpha that never exceeds 255 is meant in 8 bits, whatever the channel's type.
float FullAlpha(const Plane& oAlpha, float nFull)
{
    const float nMost = *std::max_element(oAlpha.values.begin(), oAlpha.values.end());
    return nMost <= 255.0F ? std::min(nFull, 255.0F) : nFull;
}

void ApplyAlpha(const SourceFile& oFile, const DisplayChoice& oChoice, const Size& oSize, std::vector<Plane>& oPlanes,
                std::vector<float>& oOpacity, const Threads& oThreads)
{
    const Plane oAlpha = ReadPlanes(oFile, {oChoice.alphaChannel}, oSize, Resampling::eAverage, oThreads).front();
    const float nFull = FullAlpha(oAlpha, oChoice.alphaFull);
    Multiply(oOpacity, oAlpha, nFull);
    for (Plane& oPlane : oPlanes)
    {
        for (std::size_t i = 0; oChoice.premultiplied && i < oPlane.values.size(); ++i)
            oPlane.values[i] = oAlpha.values[i] > 0 ? oPlane.values[i] * nFull / oAlpha.values[i] : 0.0F;
    }
}

LevelReader ReadBitmap(const SourceFile& oFile, unsigned int nBitmap)
{
    auto* const poBitmaps = dynamic_cast<krv::datasources::IBitmapDataset*>(&oFile.GetDataset());
    auto poReader =
        std::make_unique<krv::datasources::BasicReader>(poBitmaps, std::vector<unsigned int>{nBitmap}, false);
    if (poReader->GetWidth() != oFile.GetRaster().GetWidth() || poReader->GetHeight() != oFile.GetRaster().GetHeight())
        throw krv::DataException(fmt::format("{}: bitmap {} is not of the image's size", oFile.GetName(), nBitmap));
    return {std::move(poReader), nullptr, nullptr};
}

// The bits are read at full size: levels of bitmaps are not always there.
void ApplyMask(const SourceFile& oFile, unsigned int nBitmap, const Size& oSize, std::vector<float>& oShares,
               const Threads& oThreads)
{
    const auto Read = [nBitmap](const SourceFile& oSource)
    {
        return ReadBitmap(oSource, nBitmap);
    };
    ProgressCounter oCounter(oThreads.progress, "mask", ReaderBytes(Read(oFile).Get()));
    const auto oPlanes = Reduce(oFile, Read, {std::nullopt}, oSize.width, oSize.height, Resampling::eAverage, oCounter,
                                oThreads.executor);
    Multiply(oShares, oPlanes.front(), 1.0F);
}

// Pixels that will not be seen take no part in the stretch.
void HideTransparent(std::vector<Plane>& oPlanes, const std::vector<float>& oOpacity)
{
    for (Plane& oPlane : oPlanes)
    {
        for (std::size_t i = 0; i < oOpacity.size(); ++i)
            oPlane.coverage[i] = oOpacity[i] > 0 ? oPlane.coverage[i] : 0.0F;
    }
}

// Opacity of every pixel, 0 to 1: no-data in all shown channels, the validity mask and the alpha channel together.
// Premultiplied colours become plain ones.
std::vector<float> FindOpacity(const SourceFile& oFile, const DisplayChoice& oChoice, const Size& oSize,
                               std::vector<Plane>& oPlanes, const Threads& oThreads)
{
    for (std::size_t c = 0; c < oPlanes.size(); ++c)
        if (const auto oMask = oChoice.channelMasks.find(oChoice.channels[c]); oMask != oChoice.channelMasks.end())
            ApplyMask(oFile, oMask->second, oSize, oPlanes[c].coverage, oThreads);
    std::vector<float> oOpacity(oPlanes.front().coverage.size(), 0.0F);
    for (const Plane& oPlane : oPlanes)
    {
        for (std::size_t i = 0; i < oOpacity.size(); ++i)
            oOpacity[i] = std::max(oOpacity[i], oPlane.coverage[i]);
    }
    if (oChoice.alphaChannel != 0)
        ApplyAlpha(oFile, oChoice, oSize, oPlanes, oOpacity, oThreads);
    if (oChoice.maskBitmap != 0)
        ApplyMask(oFile, oChoice.maskBitmap, oSize, oOpacity, oThreads);
    HideTransparent(oPlanes, oOpacity);
    return oOpacity;
}

// Cyan, magenta, yellow and black become red, green and blue: light passes each ink in turn.
void MixInks(std::vector<Plane>& oPlanes, float nFull)
{
    for (std::size_t c = 0; c < 3; ++c)
    {
        for (std::size_t i = 0; i < oPlanes[c].values.size(); ++i)
            oPlanes[c].values[i] = 255.0F * (1 - oPlanes[c].values[i] / nFull) * (1 - oPlanes[3].values[i] / nFull);
    }
    oPlanes.resize(3);
}

// Writes the colour samples of all pixels; the alpha sample, when there is one, is left.
void PaintStretched(Picture& oPicture, const std::vector<Plane>& oPlanes, const std::vector<Stretch>& oStretches,
                    bool bInverted)
{
    for (std::size_t c = 0; c < oPlanes.size(); ++c)
    {
        for (std::size_t i = 0; i < oPlanes[c].values.size(); ++i)
        {
            const std::uint8_t nLevel = oPlanes[c].coverage[i] > 0 ? oStretches[c](oPlanes[c].values[i]) : 0;
            oPicture.pixels[i * oPicture.samples + c] = bInverted ? static_cast<std::uint8_t>(255 - nLevel) : nLevel;
        }
    }
}

// The picture of a channel with a colour table; its alpha holds what is not valid too.
void PaintColours(Picture& oPicture, const std::vector<Plane>& oColours)
{
    for (std::size_t c = 0; c < oColours.size(); ++c)
    {
        for (std::size_t i = 0; i < oColours[c].values.size(); ++i)
            oPicture.pixels[i * oPicture.samples + c] = static_cast<std::uint8_t>(oColours[c].values[i]);
    }
}

void PaintOpacity(Picture& oPicture, const std::vector<float>& oOpacity)
{
    for (std::size_t i = 0; i < oOpacity.size(); ++i)
        oPicture.pixels[(i + 1) * oPicture.samples - 1] = static_cast<std::uint8_t>(std::lround(oOpacity[i] * 255.0F));
}

// Drops the alpha sample of a picture that is opaque everywhere.
void DropOpaqueAlpha(Picture& oPicture)
{
    const unsigned int nSamples = oPicture.samples;
    const std::size_t nPixels = oPicture.pixels.size() / nSamples;
    for (std::size_t i = 0; i < nPixels; ++i)
    {
        if (oPicture.pixels[(i + 1) * nSamples - 1] != 255)
            return;
    }
    for (std::size_t i = 0; i < nPixels; ++i)
        std::copy_n(oPicture.pixels.begin() + static_cast<std::ptrdiff_t>(i * nSamples), nSamples - 1,
                    oPicture.pixels.begin() + static_cast<std::ptrdiff_t>(i * (nSamples - 1)));
    oPicture.pixels.resize(nPixels * (nSamples - 1));
    --oPicture.samples;
}

// The total power of the file's channels, in the mean of each pixel.
std::vector<Plane> ReadPower(const SourceFile& oFile, const std::vector<unsigned int>& oChannels, const Size& oSize,
                             const Threads& oThreads)
{
    const auto Read = [&](const SourceFile& oSource)
    {
        krv::datasources::PowerRequest oRequest;
        oRequest.moChannels = oChannels;
        return LevelReader::AtLeast(
            std::make_unique<krv::datasources::TotalPowerRasterReader>(&oSource.GetDataset(), false, oRequest),
            oSize.width, oSize.height, oSource.GetName());
    };
    ProgressCounter oCounter(oThreads.progress, "view", ReaderBytes(Read(oFile).Get()));
    return Reduce(oFile, Read, {std::nullopt}, oSize.width, oSize.height, Resampling::eAverage, oCounter,
                  oThreads.executor);
}

// What is not above 0 has no logarithm, and is no more seen than other missing pixels.
void TakeDecibels(std::vector<Plane>& oPlanes)
{
    for (Plane& oPlane : oPlanes)
        for (std::size_t i = 0; i < oPlane.values.size(); ++i)
        {
            const bool bShown = oPlane.coverage[i] > 0 && oPlane.values[i] > 0;
            oPlane.coverage[i] = bShown ? oPlane.coverage[i] : 0.0F;
            oPlane.values[i] = bShown ? 10.0F * std::log10(oPlane.values[i]) : 0.0F;
        }
}

// Pixels of a collar take no part in the stretch, though they are shown.
std::vector<Plane> WithoutCollar(const std::vector<Plane>& oPlanes)
{
    std::vector<Plane> oResult = oPlanes;
    const std::vector<bool> oCollar = FindCollar(oPlanes);
    for (Plane& oPlane : oResult)
        for (std::size_t i = 0; i < oCollar.size(); ++i)
            oPlane.coverage[i] = oCollar[i] ? 0.0F : oPlane.coverage[i];
    return oResult;
}

bool ShowsPower(const SourceFile& oFile, const QuickLookOptions& oOptions, const DisplayChoice& oChoice)
{
    return oOptions.power || (oOptions.channels.empty() && oOptions.stretch == StretchMode::eAuto &&
                              oFile.GetType(oChoice.channels.front()).IsComplex());
}

std::string FindUnit(const SourceFile& oFile, const QuickLook& oLook)
{
    const auto& oMetadata = oFile.GetMetadata();
    const unsigned int nChannel = oLook.choice.channels.front();
    if (oLook.decibels)
        return "dB";
    return oLook.power || nChannel > oMetadata.GetChannelCount() ? std::string()
                                                                 : oMetadata.GetChanMetadataValue(UNIT_TAG, nChannel);
}

// The values that a picture of a colour table shows.
std::set<double> ListValues(const SourceFile& oFile, const QuickLook& oLook, const Threads& oThreads)
{
    const Size oSize{oLook.picture.width, oLook.picture.height};
    const Plane oPlane = ReadPlanes(oFile, oLook.choice.channels, oSize, Resampling::eNearest, oThreads).front();
    std::set<double> oValues;
    for (std::size_t i = 0; i < oPlane.values.size(); ++i)
        if (oPlane.coverage[i] > 0)
            oValues.insert(oPlane.values[i]);
    return oValues;
}

void AddLegend(const SourceFile& oFile, QuickLook& oLook, const Threads& oThreads)
{
    const DisplayChoice& oChoice = oLook.choice;
    if (oChoice.table != nullptr)
        return AddColourLegend(*oChoice.table, ListValues(oFile, oLook, oThreads),
                               krv::datasources::GetClassNames(oFile.GetMetadata(), oChoice.channels.front()),
                               oLook.picture);
    if (oLook.stretches.size() != 1)
        throw RequestException("a legend is of one channel, and three are shown; choose one", "channels");
    const ValueScale oScale = oLook.decibels || oLook.power ? ValueScale() : oFile.GetScale(oChoice.channels.front());
    const Stretch& oStretch = oLook.stretches.front();
    const double nLow = oScale(oStretch.low), nHigh = oScale(oStretch.high);
    AddGreyLegend(nLow, nHigh, FindUnit(oFile, oLook), oChoice.inverted, oLook.picture);
}

} // namespace

QuickLook MakeQuickLook(const SourceFile& oFile, const QuickLookOptions& oOptions, const Progress& oProgress,
                        krv::threading::IExecutor* poExecutor)
{
    const Threads oThreads{oProgress, poExecutor};
    const auto& oRaster = oFile.GetRaster();
    QuickLook oLook;
    oLook.choice = ChooseDisplay(oFile, oOptions.channels);
    const DisplayChoice& oChoice = oLook.choice;
    const Size oSize = FitInto(oRaster.GetWidth(), oRaster.GetHeight(), oOptions.size);
    oLook.picture = {oSize.width, oSize.height, 4, {}};
    if (oChoice.table != nullptr)
    {
        oLook.picture.pixels.resize(std::size_t{oSize.width} * oSize.height * 4);
        PaintColours(oLook.picture, ReadColours(oFile, oChoice, oSize, oThreads));
        DropOpaqueAlpha(oLook.picture);
        if (oOptions.legend)
            AddLegend(oFile, oLook, oThreads);
        return oLook;
    }
    oLook.power = ShowsPower(oFile, oOptions, oChoice);
    oLook.decibels = oOptions.decibels || (oLook.power && oOptions.stretch == StretchMode::eAuto);
    const Resampling eMethod = oOptions.average ? Resampling::eAverage : Resampling::eNearest;
    std::vector<Plane> oPlanes = oLook.power ? ReadPower(oFile, oOptions.channels, oSize, oThreads)
                                             : ReadPlanes(oFile, oChoice.channels, oSize, eMethod, oThreads);
    // Between steps in memory, each of which is long for a large picture.
    const auto Ask = [&]
    {
        Report(oProgress, {"picture", 0, std::uint64_t{oSize.width} * oSize.height * 4});
    };
    Ask();
    if (oLook.decibels)
        TakeDecibels(oPlanes);
    const std::vector<float> oOpacity = FindOpacity(oFile, oChoice, oSize, oPlanes, oThreads);

    const bool bInks = oPlanes.size() == 4;
    if (bInks)
        MixInks(oPlanes, oChoice.inkFull);

    oLook.picture.samples = oPlanes.size() == 3 ? 4U : 2U;
    oLook.picture.pixels.resize(std::size_t{oSize.width} * oSize.height * oLook.picture.samples);
    Ask();
    const std::vector<Plane> oCounted = WithoutCollar(oPlanes);
    for (std::size_t c = 0; c < oPlanes.size(); ++c)
    {
        Ask();
        oLook.stretches.push_back(FindStretch(oCounted[c], bInks ? StretchMode::eNone : oOptions.stretch,
                                              !oLook.power && oFile.GetType(oChoice.channels[c]) == krv::gobs::eDT_8U,
                                              oChoice.reason == DisplayReason::eRoles));
    }
    Ask();
    PaintStretched(oLook.picture, oPlanes, oLook.stretches, oChoice.inverted);
    Ask();
    PaintOpacity(oLook.picture, oOpacity);
    DropOpaqueAlpha(oLook.picture);
    if (oOptions.legend)
        AddLegend(oFile, oLook, oThreads);
    return oLook;
}

} // namespace krv::operations
