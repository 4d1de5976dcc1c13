#include "operations/statistics/statistics.h"

#include "datasources/reader/derived/totalpowerrasterreader.h"
#include "datasources/reader/irasterreader.h"
#include "datasources/reader/rasterrange.h"
#include "datasources/reader/validitysource.h"
#include "gobs/mask/mask.h"
#include "gobs/mask/samplematch.h"
#include "gobs/raster/pixelvalue.h"
#include "gobs/raster/raster.h"
#include "operations/source/fileworkers.h"
#include "toolkit/threading/foreachitem.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <limits>
#include <type_traits>

namespace krv::operations
{

namespace
{

using krv::datasources::ValiditySource;
__extension__ using Wide = __int128;

constexpr std::size_t RUN = 4096;

// Count, sum and squared deviations of what was seen. Merging two of them is stable whatever their means are.
struct Moments
{
    std::uint64_t count = 0;
    long double mean = 0;
    long double squares = 0; // sum of squared differences from the mean

    void Merge(const Moments& oOther)
    {
        if (oOther.count == 0)
            return;
        const auto nAll = static_cast<long double>(count + oOther.count);
        const long double nApart = oOther.mean - mean;
        const auto nShare = static_cast<long double>(oOther.count) / nAll;
        squares += oOther.squares + nApart * nApart * static_cast<long double>(count) * nShare;
        mean += nApart * nShare;
        count += oOther.count;
    }
};

// Sums of functions of n values in eight lanes, so that the loop is vectorised without reordering by the compiler.
template <typename Sum, typename T, typename Function>
Sum LaneSum(const T* pValues, std::size_t n, Function oFunction)
{
    std::array<Sum, 8> oLanes{};
    std::size_t i = 0;
    for (; i + 8 <= n; i += 8)
    {
        for (std::size_t k = 0; k < 8; ++k)
            oLanes[k] += oFunction(pValues[i + k]);
    }
    for (std::size_t k = 0; i < n; ++i, ++k)
        oLanes[k] += oFunction(pValues[i]);
    return ((oLanes[0] + oLanes[1]) + (oLanes[2] + oLanes[3])) + ((oLanes[4] + oLanes[5]) + (oLanes[6] + oLanes[7]));
}

// Integers of up to 16 bits: all sums are exact, so there is nothing to merge.
class SmallSums
{
public:
    template <typename T>
    void Add(const T* pValues, std::size_t n)
    {
        using Square = std::uint32_t;
        mnCount += n;
        mnSum += LaneSum<std::int32_t>(pValues, n, [](T v) { return static_cast<std::int32_t>(v); });
        mnSquares += LaneSum<std::uint64_t>(pValues, n,
                                            [](T v)
                                            {
                                                const auto nValue = static_cast<std::int32_t>(v);
                                                return static_cast<std::uint64_t>(static_cast<Square>(nValue) *
                                                                                  static_cast<Square>(nValue));
                                            });
    }
    void Merge(const SmallSums& oOther)
    {
        mnCount += oOther.mnCount;
        mnSum += oOther.mnSum;
        mnSquares += oOther.mnSquares;
    }
    long double GetMean() const { return static_cast<long double>(mnSum) / static_cast<long double>(mnCount); }
    long double GetVariance() const
    {
        const auto n = static_cast<long double>(mnCount);
        return static_cast<long double>(mnSquares * mnCount - Wide{mnSum} * mnSum) / n / n;
    }

private:
    std::uint64_t mnCount = 0;
    std::int64_t mnSum = 0;
    Wide mnSquares = 0;
};

// Everything else: runs around their own mean, and the plain sum for the mean.
template <typename Sum>
class MergedSums
{
public:
    template <typename T>
    void Add(const T* pValues, std::size_t n)
    {
        const auto nCount = static_cast<long double>(n);
        Moments oRun;
        oRun.count = n;
        if constexpr (std::is_integral_v<T>)
        {
            const Wide nSum = SumOf(pValues, n);
            mnSum += nSum;
            using Difference = std::conditional_t<sizeof(T) <= 4, std::int64_t, Wide>;
            const auto nPivot = static_cast<Difference>(nSum / static_cast<Wide>(n));
            const auto Apart = [nPivot](T v)
            {
                return static_cast<double>(static_cast<Difference>(v) - nPivot);
            };
            const double nFirst = LaneSum<double>(pValues, n, Apart);
            const double nSecond = LaneSum<double>(pValues, n, [&](T v) { return Apart(v) * Apart(v); });
            oRun.mean = static_cast<long double>(nSum) / nCount;
            oRun.squares =
                std::max(static_cast<long double>(nSecond) - static_cast<long double>(nFirst) * nFirst / nCount, 0.0L);
        }
        else
        {
            const double nSum = LaneSum<double>(pValues, n, [](T v) { return static_cast<double>(v); });
            const double nMean = nSum / static_cast<double>(n);
            const double nSquares = LaneSum<double>(pValues, n, [nMean](T v) { return (v - nMean) * (v - nMean); });
            if (std::isfinite(nSquares))
            {
                mnSum += nSum;
                oRun.mean = nMean;
                oRun.squares = nSquares;
            }
            else
                AddHuge(pValues, n, oRun);
        }
        moMoments.Merge(oRun);
    }
    void Merge(const MergedSums& oOther)
    {
        mnSum += oOther.mnSum;
        moMoments.Merge(oOther.moMoments);
    }
    long double GetMean() const { return static_cast<long double>(mnSum) / static_cast<long double>(moMoments.count); }
    long double GetVariance() const { return moMoments.squares / static_cast<long double>(moMoments.count); }

private:
    template <typename T>
    static Wide SumOf(const T* pValues, std::size_t n)
    {
        if constexpr (sizeof(T) <= 4)
            return LaneSum<std::int64_t>(pValues, n, [](T v) { return static_cast<std::int64_t>(v); });
        else
            return LaneSum<Wide>(pValues, n, [](T v) { return static_cast<Wide>(v); });
    }
    // Values so large that their squares leave the range of a double.
    template <typename T>
    void AddHuge(const T* pValues, std::size_t n, Moments& oRun)
    {
        const auto nSum = LaneSum<long double>(pValues, n, [](T v) { return static_cast<long double>(v); });
        const long double nMean = nSum / static_cast<long double>(n);
        mnSum += nSum;
        oRun.mean = nMean;
        oRun.squares = LaneSum<long double>(pValues, n, [nMean](T v) { return (v - nMean) * (v - nMean); });
    }

    Sum mnSum = 0;
    Moments moMoments;
};

template <typename T>
using SumsFor = std::conditional_t<std::is_floating_point_v<T>, MergedSums<long double>,
                                   std::conditional_t<sizeof(T) <= 2, SmallSums, MergedSums<Wide>>>;

// Statistics of valid values of one type, run by run.
template <typename T>
class RunStatistics
{
public:
    void Add(const T* pValues, std::size_t n)
    {
        if (n == 0)
            return;
        T nLow = mnLow, nHigh = mnHigh;
        for (std::size_t i = 0; i < n; ++i)
        {
            nLow = pValues[i] < nLow ? pValues[i] : nLow;
            nHigh = pValues[i] > nHigh ? pValues[i] : nHigh;
        }
        mnLow = nLow;
        mnHigh = nHigh;
        mnCount += n;
        moSums.Add(pValues, n);
    }

    void Merge(const RunStatistics& oOther)
    {
        if (oOther.mnCount == 0)
            return;
        mnLow = oOther.mnLow < mnLow ? oOther.mnLow : mnLow;
        mnHigh = oOther.mnHigh > mnHigh ? oOther.mnHigh : mnHigh;
        mnCount += oOther.mnCount;
        moSums.Merge(oOther.moSums);
    }

    void Report(ChannelStatistics& oResult) const
    {
        oResult.valid = mnCount;
        if (mnCount == 0)
            return;
        oResult.minimum = Exact(mnLow);
        oResult.maximum = Exact(mnHigh);
        oResult.mean = static_cast<double>(moSums.GetMean());
        oResult.deviation = static_cast<double>(std::sqrt(moSums.GetVariance()));
    }

private:
    static ExactNumber Exact(T nValue)
    {
        if constexpr (std::is_floating_point_v<T>)
            return static_cast<double>(nValue);
        else if constexpr (std::is_signed_v<T>)
            return static_cast<std::int64_t>(nValue);
        else
            return static_cast<std::uint64_t>(nValue);
    }

    std::uint64_t mnCount = 0;
    T mnLow = std::numeric_limits<T>::max();
    T mnHigh = std::numeric_limits<T>::lowest();
    SumsFor<T> moSums;
};

bool IsMasked(const unsigned char* pValid, std::uint64_t nPixel)
{
    return (pValid[nPixel / 8] & 128u >> nPixel % 8) == 0;
}

// What gatherers of both kinds have: counts of values that take no part, and the statistics of those that do.
template <typename T, typename Value>
class PartGatherer : public StatisticsGatherer
{
public:
    explicit PartGatherer(const OptionalNoData& oNoData) : moNoData(oNoData) {}

    void Merge(const StatisticsGatherer& oOther) override
    {
        const auto& oSame = dynamic_cast<const PartGatherer&>(oOther);
        moCounts.noData += oSame.moCounts.noData;
        moCounts.masked += oSame.moCounts.masked;
        moCounts.nan += oSame.moCounts.nan;
        moCounts.infinite += oSame.moCounts.infinite;
        moStatistics.Merge(oSame.moStatistics);
    }

    ChannelStatistics Get() const override
    {
        ChannelStatistics oResult = moCounts;
        moStatistics.Report(oResult);
        return oResult;
    }

protected:
    krv::gobs::SampleMatch<T> moNoData;
    ChannelStatistics moCounts;
    RunStatistics<Value> moStatistics;
    std::array<Value, RUN> moValid;
};

template <typename T>
class RealGatherer : public PartGatherer<T, T>
{
public:
    using PartGatherer<T, T>::PartGatherer;

    void Add(const unsigned char* pFirst, std::uint64_t nPixels, unsigned int nStride,
             const unsigned char* pValid) override
    {
        const T* pFrom = reinterpret_cast<const T*>(pFirst);
        for (std::uint64_t nDone = 0; nDone < nPixels; nDone += RUN)
        {
            const auto n = static_cast<std::size_t>(std::min<std::uint64_t>(RUN, nPixels - nDone));
            const T* pRun = pFrom + nDone * nStride;
            if (pValid != nullptr)
                moStatistics.Add(moValid.data(), SiftMasked(pRun, n, nStride, pValid + nDone / 8));
            else if (nStride == 1 && !moNoData.IsSet() && std::is_integral_v<T>)
                moStatistics.Add(pRun, n);
            else
                moStatistics.Add(moValid.data(), Sift(pRun, n, nStride));
        }
    }

private:
    using PartGatherer<T, T>::moNoData;
    using PartGatherer<T, T>::moCounts;
    using PartGatherer<T, T>::moStatistics;
    using PartGatherer<T, T>::moValid;

    // Copies the valid values of a run to moValid, from nAt on, and returns their number; counts the others.
    std::size_t Sift(const T* pFrom, std::size_t n, unsigned int nStride, std::size_t nAt = 0)
    {
        if (!moNoData.IsSet() && std::is_integral_v<T>)
        {
            for (std::size_t i = 0; i < n; ++i)
                moValid[nAt + i] = pFrom[i * nStride];
            return n;
        }
        std::size_t nValid = 0, nNoData = 0;
        for (std::size_t i = 0; i < n; ++i)
        {
            const T nValue = pFrom[i * nStride];
            const bool bNoData = moNoData.Matches(nValue);
            moValid[nAt + nValid] = nValue;
            nNoData += bNoData ? 1 : 0;
            if constexpr (std::is_floating_point_v<T>)
                nValid += !bNoData && std::fabs(nValue) <= std::numeric_limits<T>::max() ? 1 : 0;
            else
                nValid += bNoData ? 0 : 1;
        }
        moCounts.noData += nNoData;
        if (nValid + nNoData != n)
            CountStrange(pFrom, n, nStride);
        return nValid;
    }

    std::size_t SiftMasked(const T* pFrom, std::size_t n, unsigned int nStride, const unsigned char* pValid)
    {
        std::size_t nKept = 0;
        for (std::size_t i = 0; i < n; ++i)
        {
            const T nValue = pFrom[i * nStride];
            if (!IsMasked(pValid, i))
                nKept += Sift(&nValue, 1, 1, nKept);
            else
                ++(moNoData.Matches(nValue) ? moCounts.noData : moCounts.masked);
        }
        return nKept;
    }

    void CountStrange([[maybe_unused]] const T* pFrom, [[maybe_unused]] std::size_t n,
                      [[maybe_unused]] unsigned int nStride)
    {
        if constexpr (std::is_floating_point_v<T>)
        {
            for (std::size_t i = 0; i < n; ++i)
            {
                const T nValue = pFrom[i * nStride];
                if (moNoData.Matches(nValue) || std::isfinite(nValue))
                    continue;
                ++(std::isnan(nValue) ? moCounts.nan : moCounts.infinite);
            }
        }
    }
};

template <typename T>
class ComplexGatherer : public PartGatherer<T, double>
{
public:
    using PartGatherer<T, double>::PartGatherer;

    void Add(const unsigned char* pFirst, std::uint64_t nPixels, unsigned int nStride,
             const unsigned char* pValid) override
    {
        const T* pFrom = reinterpret_cast<const T*>(pFirst);
        std::size_t nValid = 0;
        for (std::uint64_t i = 0; i < nPixels; ++i)
        {
            const T nReal = pFrom[2 * i * nStride], nImaginary = pFrom[2 * i * nStride + 1];
            const double nMagnitude = Magnitude(nReal, nImaginary);
            if (moNoData.Matches(nReal, nImaginary))
                ++moCounts.noData;
            else if (pValid != nullptr && IsMasked(pValid, i))
                ++moCounts.masked;
            else if (std::isnan(static_cast<double>(nReal)) || std::isnan(static_cast<double>(nImaginary)))
                ++moCounts.nan;
            else if (!std::isfinite(nMagnitude))
                ++moCounts.infinite;
            else
                moValid[nValid++] = nMagnitude;
            if (nValid == RUN || i + 1 == nPixels)
            {
                moStatistics.Add(moValid.data(), nValid);
                nValid = 0;
            }
        }
    }

private:
    using PartGatherer<T, double>::moNoData;
    using PartGatherer<T, double>::moCounts;
    using PartGatherer<T, double>::moStatistics;
    using PartGatherer<T, double>::moValid;

    static double Magnitude(T nReal, T nImaginary)
    {
        const double nA = static_cast<double>(nReal), nB = static_cast<double>(nImaginary);
        return std::is_same_v<T, double> ? std::hypot(nA, nB) : std::sqrt(nA * nA + nB * nB);
    }
};

// What a thread needs: the channels of one type that are looked at, and what says which pixels are valid beside the
// values of their own channels; null when nothing does.
struct Worker
{
    FilePointer file;
    LevelReader reader;
    std::unique_ptr<ValiditySource> validity;
};

using Gatherers = std::vector<std::unique_ptr<StatisticsGatherer>>;

Gatherers MakeGatherers(const krv::gobs::DataType& oType, const std::vector<OptionalNoData>& oNoData)
{
    Gatherers oGatherers;
    for (const OptionalNoData& oValue : oNoData)
        oGatherers.push_back(StatisticsGatherer::Make(oType, oValue));
    return oGatherers;
}

// Of one tile; oNoData: one per channel.
struct TileStatistics
{
    Gatherers channels;
    std::uint64_t bytes;
};

// The pixels that are valid but for those that the mask of one channel excludes.
std::unique_ptr<krv::gobs::Mask> WithoutBackground(const krv::gobs::Mask& oValid,
                                                   const krv::gobs::IMaskBuilder& oChannelMask,
                                                   const krv::gobs::Raster& oTile)
{
    std::unique_ptr<krv::gobs::Mask> poMask(oChannelMask.BuildMask(oTile));
    std::transform(poMask->GetBits(), poMask->GetBits() + poMask->GetBitsSize(), oValid.GetBits(), poMask->GetBits(),
                   [](unsigned char nBackground, unsigned char nValid)
                   { return static_cast<unsigned char>(nValid & ~nBackground); });
    return poMask;
}

TileStatistics Gather(const Worker& oWorker, std::uint64_t nTile, const std::vector<OptionalNoData>& oNoData)
{
    const std::unique_ptr<krv::gobs::Raster> poTile(oWorker.reader.Get().GetRaster(static_cast<unsigned int>(nTile)));
    const auto nValueBytes = static_cast<std::size_t>(poTile->GetDataType().GetValueBits() / 8);
    const std::uint64_t nPixels = static_cast<std::uint64_t>(poTile->GetWidth()) * poTile->GetHeight();
    const std::unique_ptr<const krv::gobs::Mask> poMask(
        oWorker.validity != nullptr ? oWorker.validity->BuildMask(*poTile) : nullptr);
    const unsigned char* const pValid =
        poMask != nullptr && poMask->CountSet() != nPixels ? poMask->GetBits() : nullptr;
    TileStatistics oResult{MakeGatherers(poTile->GetDataType(), oNoData), poTile->GetBufferSize()};
    for (std::size_t c = 0; c < oNoData.size(); ++c)
    {
        const krv::gobs::IMaskBuilder* const poOwn =
            oWorker.validity != nullptr ? oWorker.validity->GetChannelMask(c) : nullptr;
        const auto poChannel = poOwn != nullptr ? WithoutBackground(*poMask, *poOwn, *poTile) : nullptr;
        oResult.channels[c]->Add(poTile->GetBuffer() + c * nValueBytes, nPixels, poTile->GetChansCount(),
                                 poChannel != nullptr ? poChannel->GetBits() : pValid);
    }
    return oResult;
}

std::unique_ptr<ValiditySource> FindValidity(const SourceFile& oFile, const std::vector<unsigned int>& oChannels)
{
    const auto IsNone = [&oFile](unsigned int nChannel)
    {
        return !oFile.GetNoData(nChannel);
    };
    const auto IsUnread = [&](unsigned int nChannel)
    {
        return IsNone(nChannel) && !oFile.GetNoDataText(nChannel).empty();
    };
    const bool bUnread = std::any_of(oChannels.begin(), oChannels.end(), IsUnread);
    auto poSource = std::make_unique<ValiditySource>(&oFile.GetDataset(), oChannels, krv::gobs::eAllChannels, !bUnread);
    // A pixel without data in all channels that have a value is none in those that have not.
    const bool bPixels = poSource->HasNoData() && std::any_of(oChannels.begin(), oChannels.end(), IsNone);
    return poSource->HasBitmap() || poSource->HasAlpha() || bPixels ? std::move(poSource) : nullptr;
}

// One result per channel of a group, which are all of one type. Tiles are gathered each for itself and merged in their
// order, so that sums of reals come out the same whoever gathers them.
std::vector<ChannelStatistics> StatisticsOf(const SourceFile& oFile, const std::vector<unsigned int>& oChannels,
                                            bool bRaw, const Progress& oProgress, krv::threading::IExecutor* poExecutor)
{
    std::vector<OptionalNoData> oNoData;
    for (const unsigned int nChannel : oChannels)
        oNoData.push_back(oFile.GetNoData(nChannel));
    FileWorkers<Worker> oWorkers(oFile,
                                 [&](FilePointer poFile)
                                 {
                                     LevelReader oReader = poFile->Read(oChannels);
                                     oReader.Get().SetMargins(0, 0, eMirror);
                                     auto poValidity = bRaw ? nullptr : FindValidity(*poFile, oChannels);
                                     return std::make_unique<Worker>(std::move(poFile), std::move(oReader),
                                                                     std::move(poValidity));
                                 });
    const LevelReader oWhole = oFile.Read(oChannels);
    const krv::datasources::IRasterReader& oReader = oWhole.Get();
    const Gatherers oTotal = MakeGatherers(oReader.GetDataType(), oNoData);
    ProgressCounter oCounter(oProgress, "stats",
                             krv::gobs::BufferBytes(oReader.GetWidth(), oReader.GetHeight(), oReader.GetChansCount(),
                                                    oReader.GetDataType()));
    krv::threading::TaskGroup oThreads(poExecutor, [&oCounter] { oCounter.Repeat(); });
    krv::threading::ForEachItem(
        oThreads, oReader.GetTileCount(),
        [&](std::uint64_t nTile)
        {
            const typename FileWorkers<Worker>::Use oWorker(oWorkers);
            return Gather(*oWorker, nTile, oNoData);
        },
        [&](const TileStatistics& oTile)
        {
            for (std::size_t c = 0; c < oTotal.size(); ++c)
                oTotal[c]->Merge(*oTile.channels[c]);
            oCounter.Advance(oTile.bytes);
        });
    std::vector<ChannelStatistics> oResults;
    for (const auto& poGatherer : oTotal)
        oResults.push_back(poGatherer->Get());
    return oResults;
}

// Pixels that are not valid are NaN, which is the no-data value.
std::vector<ChannelStatistics> PowerStatistics(const SourceFile& oFile, const StatisticsRequest& oRequest,
                                               const Progress& oProgress)
{
    krv::datasources::PowerRequest oPower;
    oPower.moChannels = oRequest.channels.empty() ? oRequest.channels : oFile.CheckChannels(oRequest.channels);
    krv::datasources::TotalPowerRasterReader oReader(&oFile.GetDataset(), false, oPower);
    const std::string noData = krv::datasources::GetNoDataText(oReader.GetAuxiliaryData(), 1);
    const auto poGatherer = StatisticsGatherer::Make(oReader.GetDataType(), krv::datasources::ParseNoData(noData));
    ProgressCounter oCounter(oProgress, "stats",
                             krv::gobs::BufferBytes(oReader.GetWidth(), oReader.GetHeight(), 1, oReader.GetDataType()));
    for (const std::unique_ptr<krv::gobs::Raster> poTile : krv::datasources::RasterRange(oReader))
    {
        poGatherer->Add(poTile->GetBuffer(), std::uint64_t{poTile->GetWidth()} * poTile->GetHeight(), 1);
        oCounter.Advance(poTile->GetBufferSize());
    }
    ChannelStatistics oResult = poGatherer->Get();
    oResult.type = oReader.GetDataType();
    oResult.noDataText = noData;
    return {oResult};
}

} // namespace

StatisticsGatherer::~StatisticsGatherer() = default;

std::unique_ptr<StatisticsGatherer> StatisticsGatherer::Make(const krv::gobs::DataType& oType,
                                                             const OptionalNoData& oNoData)
{
    return krv::gobs::VisitPartType(oType,
                                    [&]<class Part>(std::type_identity<Part>) -> std::unique_ptr<StatisticsGatherer>
                                    {
                                        if (oType.IsComplex())
                                            return std::make_unique<ComplexGatherer<Part>>(oNoData);
                                        return std::make_unique<RealGatherer<Part>>(oNoData);
                                    });
}

std::vector<ChannelStatistics> ComputeStatistics(const SourceFile& oFile, const StatisticsRequest& oRequest,
                                                 const Progress& oProgress, krv::threading::IExecutor* poExecutor)
{
    if (oRequest.power)
        return PowerStatistics(oFile, oRequest, oProgress);
    const auto oChannels = oFile.CheckChannels(oRequest.channels);
    const unsigned int nAlpha = oRequest.raw ? 0 : krv::datasources::FindAlpha(oFile.GetMetadata());
    std::vector<ChannelStatistics> oResults(oChannels.size());
    for (ChannelGroup oGroup : oFile.GroupByType(oChannels))
    {
        for (std::size_t i = oGroup.channels.size(); i-- > 0;)
        {
            if (oGroup.channels[i] != nAlpha)
                continue;
            oResults[oGroup.positions[i]].alpha = true;
            oGroup.channels.erase(oGroup.channels.begin() + static_cast<std::ptrdiff_t>(i));
            oGroup.positions.erase(oGroup.positions.begin() + static_cast<std::ptrdiff_t>(i));
        }
        if (oGroup.channels.empty())
            continue;
        auto oFound = StatisticsOf(oFile, oGroup.channels, oRequest.raw, oProgress, poExecutor);
        for (std::size_t i = 0; i < oFound.size(); ++i)
            oResults[oGroup.positions[i]] = std::move(oFound[i]);
    }
    for (std::size_t i = 0; i < oChannels.size(); ++i)
    {
        oResults[i].number = oChannels[i];
        oResults[i].type = oFile.GetType(oChannels[i]);
        if (!oResults[i].alpha)
            oResults[i].noDataText = oFile.GetNoDataText(oChannels[i]);
    }
    return oResults;
}

} // namespace krv::operations
