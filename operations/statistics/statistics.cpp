#include "operations/statistics/statistics.h"

#include "datasources/reader/derived/totalpowerrasterreader.h"
#include "datasources/reader/irasterreader.h"
#include "datasources/reader/validitysource.h"
#include "gobs/mask/mask.h"
#include "gobs/mask/samplematch.h"
#include "gobs/raster/pixelvalue.h"
#include "gobs/raster/raster.h"
#include "operations/job/exceptions.h"
#include "operations/source/fileworkers.h"
#include "toolkit/threading/foreachitem.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <functional>
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
    void CountInto(const HistogramBins& oBins)
    {
        moBins = oBins;
        moCounts.assign(oBins.count, 0);
    }

    void Add(const T* pValues, std::size_t n)
    {
        if (n == 0)
            return;
        for (std::size_t i = 0; i < n && !moCounts.empty(); ++i)
        {
            const double nBin = (static_cast<double>(pValues[i]) - moBins.low) * moBins.perValue;
            ++moCounts[std::min(static_cast<std::size_t>(std::max(nBin, 0.0)), moCounts.size() - 1)];
        }
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
        std::transform(moCounts.begin(), moCounts.end(), oOther.moCounts.begin(), moCounts.begin(), std::plus<>());
    }

    void Report(ChannelStatistics& oResult) const
    {
        oResult.histogram = moCounts;
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
    HistogramBins moBins;
    std::vector<std::uint64_t> moCounts; // none unless they are wanted
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
        moCounts.transparent += oSame.moCounts.transparent;
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

    void CountInto(const HistogramBins& oBins) override { moStatistics.CountInto(oBins); }

protected:
    // A pixel that is left out, by alpha or by something else.
    void CountMasked(std::uint64_t nPixel, const unsigned char* pOpaque)
    {
        ++moCounts.masked;
        moCounts.transparent += pOpaque != nullptr && IsMasked(pOpaque, nPixel) ? 1 : 0;
    }

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

    void Add(const unsigned char* pFirst, std::uint64_t nPixels, unsigned int nStride, const unsigned char* pValid,
             const unsigned char* pOpaque) override
    {
        const T* pFrom = reinterpret_cast<const T*>(pFirst);
        for (std::uint64_t nDone = 0; nDone < nPixels; nDone += RUN)
        {
            const auto n = static_cast<std::size_t>(std::min<std::uint64_t>(RUN, nPixels - nDone));
            const T* pRun = pFrom + nDone * nStride;
            if (pValid != nullptr)
                moStatistics.Add(moValid.data(), SiftMasked(pRun, n, nStride, pValid + nDone / 8,
                                                            pOpaque != nullptr ? pOpaque + nDone / 8 : nullptr));
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

    std::size_t SiftMasked(const T* pFrom, std::size_t n, unsigned int nStride, const unsigned char* pValid,
                           const unsigned char* pOpaque)
    {
        std::size_t nKept = 0;
        for (std::size_t i = 0; i < n; ++i)
        {
            const T nValue = pFrom[i * nStride];
            if (!IsMasked(pValid, i))
                nKept += Sift(&nValue, 1, 1, nKept);
            else if (moNoData.Matches(nValue))
                ++moCounts.noData;
            else
                this->CountMasked(i, pOpaque);
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

    void Add(const unsigned char* pFirst, std::uint64_t nPixels, unsigned int nStride, const unsigned char* pValid,
             const unsigned char* pOpaque) override
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
                this->CountMasked(i, pOpaque);
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

// What alpha alone says of pixels.
class Opacity
{
public:
    Opacity(const SourceFile& oFile, unsigned int nAlpha) : moReader(oFile.Read({nAlpha})), moSource(moReader.Get()) {}

    std::unique_ptr<const krv::gobs::Mask> Read(const krv::gobs::Raster& oTile) const
    {
        const std::unique_ptr<krv::gobs::Raster> poAlpha(
            moReader.Get().ReadRaster(static_cast<unsigned int>(oTile.GetX()), static_cast<unsigned int>(oTile.GetY()),
                                      oTile.GetWidth(), oTile.GetHeight()));
        return std::unique_ptr<const krv::gobs::Mask>(moSource.BuildMask(*poAlpha));
    }

private:
    LevelReader moReader;
    ValiditySource moSource;
};

// What a thread needs: the channels of one type that are looked at, and what says which pixels are valid beside the
// values of their own channels; null when nothing does.
struct Worker
{
    FilePointer file;
    LevelReader reader;
    std::unique_ptr<ValiditySource> validity;
    std::unique_ptr<Opacity> opacity; // null where there is no alpha
};

using Gatherers = std::vector<std::unique_ptr<StatisticsGatherer>>;

// How the values of a channel are gathered.
struct Gathering
{
    OptionalNoData noData;
    std::optional<HistogramBins> bins;
};

Gatherers MakeGatherers(const krv::gobs::DataType& oType, const std::vector<Gathering>& oHow)
{
    Gatherers oGatherers;
    for (const Gathering& oOne : oHow)
    {
        oGatherers.push_back(StatisticsGatherer::Make(oType, oOne.noData));
        if (oOne.bins)
            oGatherers.back()->CountInto(*oOne.bins);
    }
    return oGatherers;
}

// Small tiles are handed to a thread together: one alone takes hardly longer than that. Not many, since each may have
// histograms.
constexpr std::uint64_t PIECE_BYTES = std::uint64_t{1} << 20;
constexpr std::uint64_t MOST_TOGETHER = 8;

// What one tile gives; oHow: one per channel.
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

TileStatistics Gather(const Worker& oWorker, std::uint64_t nTile, const std::vector<Gathering>& oHow)
{
    const std::unique_ptr<krv::gobs::Raster> poTile(oWorker.reader.Get().GetRaster(static_cast<unsigned int>(nTile)));
    const auto nValueBytes = static_cast<std::size_t>(poTile->GetDataType().GetValueBits() / 8);
    const std::uint64_t nPixels = static_cast<std::uint64_t>(poTile->GetWidth()) * poTile->GetHeight();
    const std::unique_ptr<const krv::gobs::Mask> poMask(
        oWorker.validity != nullptr ? oWorker.validity->BuildMask(*poTile) : nullptr);
    const unsigned char* const pValid =
        poMask != nullptr && poMask->CountSet() != nPixels ? poMask->GetBits() : nullptr;
    const auto poOpaque = pValid != nullptr && oWorker.opacity != nullptr ? oWorker.opacity->Read(*poTile) : nullptr;
    const unsigned char* const pOpaque = poOpaque != nullptr ? poOpaque->GetBits() : nullptr;
    TileStatistics oResult{MakeGatherers(poTile->GetDataType(), oHow), poTile->GetBufferSize()};
    for (std::size_t c = 0; c < oHow.size(); ++c)
    {
        const krv::gobs::IMaskBuilder* const poOwn =
            oWorker.validity != nullptr ? oWorker.validity->GetChannelMask(c) : nullptr;
        const auto poChannel = poOwn != nullptr ? WithoutBackground(*poMask, *poOwn, *poTile) : nullptr;
        oResult.channels[c]->Add(poTile->GetBuffer() + c * nValueBytes, nPixels, poTile->GetChansCount(),
                                 poChannel != nullptr ? poChannel->GetBits() : pValid, pOpaque);
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
    auto poSource = oFile.MakeValidity(oChannels, !bUnread);
    // A pixel without data in all channels that have a value is none in those that have not.
    const bool bPixels = poSource->HasNoData() && std::any_of(oChannels.begin(), oChannels.end(), IsNone);
    return poSource->HasBitmap() || poSource->HasAlpha() || bPixels ? std::move(poSource) : nullptr;
}

// One result per channel of what the workers read; oReader is as theirs are. Tiles are gathered each for itself and
// merged in their order, so that sums of reals come out the same whoever gathers them.
std::vector<ChannelStatistics> GatherTiles(FileWorkers<Worker>& oWorkers,
                                           const krv::datasources::IRasterReader& oReader,
                                           const std::vector<Gathering>& oHow, const Progress& oProgress,
                                           krv::threading::IExecutor* poExecutor)
{
    const Gatherers oTotal = MakeGatherers(oReader.GetDataType(), oHow);
    ProgressCounter oCounter(oProgress, "stats",
                             krv::gobs::BufferBytes(oReader.GetWidth(), oReader.GetHeight(), oReader.GetChansCount(),
                                                    oReader.GetDataType()));
    krv::threading::TaskGroup oThreads(poExecutor, [&oCounter] { oCounter.Repeat(); });
    const std::uint64_t nTiles = oReader.GetTileCount();
    const std::uint64_t nTileBytes = krv::gobs::BufferBytes(oReader.GetTileWidth(), oReader.GetTileHeight(),
                                                            oReader.GetChansCount(), oReader.GetDataType());
    const std::uint64_t nTogether = std::clamp<std::uint64_t>(PIECE_BYTES / nTileBytes, 1, MOST_TOGETHER);
    krv::threading::ForEachItem(
        oThreads, (nTiles + nTogether - 1) / nTogether,
        [&](std::uint64_t nPiece)
        {
            const typename FileWorkers<Worker>::Use oWorker(oWorkers);
            std::vector<TileStatistics> oPiece;
            for (std::uint64_t n = nPiece * nTogether; n < std::min(nTiles, (nPiece + 1) * nTogether); ++n)
                oPiece.push_back(Gather(*oWorker, n, oHow));
            return oPiece;
        },
        [&](const std::vector<TileStatistics>& oPiece)
        {
            for (const TileStatistics& oTile : oPiece)
            {
                for (std::size_t c = 0; c < oTotal.size(); ++c)
                    oTotal[c]->Merge(*oTile.channels[c]);
                oCounter.Advance(oTile.bytes);
            }
        });
    std::vector<ChannelStatistics> oResults;
    for (const auto& poGatherer : oTotal)
        oResults.push_back(poGatherer->Get());
    return oResults;
}

// Statistics of channels of one type.
std::vector<ChannelStatistics> StatisticsOf(const SourceFile& oFile, const std::vector<unsigned int>& oChannels,
                                            const std::vector<Gathering>& oHow, bool bRaw, const Progress& oProgress,
                                            krv::threading::IExecutor* poExecutor)
{
    FileWorkers<Worker> oWorkers(oFile,
                                 [&](FilePointer poFile)
                                 {
                                     LevelReader oReader = poFile->Read(oChannels);
                                     oReader.Get().SetMargins(0, 0, eMirror);
                                     auto poValidity = bRaw ? nullptr : FindValidity(*poFile, oChannels);
                                     auto poOpacity =
                                         poValidity != nullptr && poValidity->HasAlpha()
                                             ? std::make_unique<Opacity>(
                                                   *poFile, krv::datasources::FindAlpha(poFile->GetMetadata()))
                                             : nullptr;
                                     return std::make_unique<Worker>(std::move(poFile), std::move(oReader),
                                                                     std::move(poValidity), std::move(poOpacity));
                                 });
    const LevelReader oWhole = oFile.Read(oChannels);
    return GatherTiles(oWorkers, oWhole.Get(), oHow, oProgress, poExecutor);
}

constexpr std::size_t FINE_BINS = 65536;

double ToDouble(const ExactNumber& oNumber)
{
    return std::visit([](auto nNumber) { return static_cast<double>(nNumber); }, oNumber);
}

// Whether each bin holds one integer.
bool IsExact(const ChannelStatistics& oStatistics)
{
    return oStatistics.minimum && !std::holds_alternative<double>(*oStatistics.minimum) &&
           ToDouble(*oStatistics.maximum) - ToDouble(*oStatistics.minimum) < static_cast<double>(FINE_BINS);
}

// Many bins between the extremes; none without a valid value.
std::optional<HistogramBins> MakeFineBins(const ChannelStatistics& oStatistics)
{
    if (!oStatistics.minimum)
        return std::nullopt;
    const double nLow = ToDouble(*oStatistics.minimum), nExtent = ToDouble(*oStatistics.maximum) - nLow;
    if (IsExact(oStatistics))
        return HistogramBins{nLow, 1, static_cast<std::size_t>(nExtent) + 1};
    const double nPerValue = static_cast<double>(FINE_BINS) / nExtent;
    return std::isfinite(nPerValue) && nPerValue > 0 ? HistogramBins{nLow, nPerValue, FINE_BINS}
                                                     : HistogramBins{nLow, 0, 1};
}

// The value that a share of the counted ones does not exceed; between the borders of a bin by a straight line.
double FindPercentile(const std::vector<std::uint64_t>& oCounts, const HistogramBins& oBins, bool bExact,
                      std::uint64_t nAll, double nPercent)
{
    const double nWanted = std::max(std::ceil(static_cast<double>(nAll) * nPercent / 100), 1.0);
    double nBefore = 0;
    for (std::size_t nBin = 0; nBin < oCounts.size(); ++nBin)
    {
        const auto nHere = static_cast<double>(oCounts[nBin]);
        if (nBefore + nHere >= nWanted && nHere > 0)
        {
            const double nAt = static_cast<double>(nBin) + (bExact ? 0 : (nWanted - nBefore) / nHere);
            return oBins.perValue > 0 ? oBins.low + nAt / oBins.perValue : oBins.low;
        }
        nBefore += nHere;
    }
    return oBins.low;
}

// The fine bins put together to those that were asked for.
void CoarsenHistogram(const std::vector<std::uint64_t>& oFine, const HistogramBins& oBins, bool bExact,
                      std::size_t nBins, ChannelStatistics& oStatistics)
{
    const double nHalf = bExact ? 0.5 : 0;
    oStatistics.histogramLow = oBins.low - nHalf;
    oStatistics.histogramHigh =
        bExact ? oBins.low + static_cast<double>(oFine.size()) - nHalf : ToDouble(*oStatistics.maximum);
    oStatistics.histogram.assign(nBins, 0);
    for (std::size_t n = 0; n < oFine.size(); ++n)
    {
        const double nAt =
            (static_cast<double>(n) + 0.5) * static_cast<double>(nBins) / static_cast<double>(oFine.size());
        oStatistics.histogram[std::min(static_cast<std::size_t>(nAt), nBins - 1)] += oFine[n];
    }
}

// Reads the file a second time, now that the extremes are known.
void AddDistribution(const SourceFile& oFile, const std::vector<unsigned int>& oChannels, std::vector<Gathering> oHow,
                     const StatisticsRequest& oRequest, std::vector<ChannelStatistics>& oResults,
                     const Progress& oProgress, krv::threading::IExecutor* poExecutor)
{
    for (std::size_t i = 0; i < oResults.size(); ++i)
        oHow[i].bins = MakeFineBins(oResults[i]);
    const auto oCounted = StatisticsOf(oFile, oChannels, oHow, oRequest.raw, oProgress, poExecutor);
    for (std::size_t i = 0; i < oResults.size(); ++i)
    {
        if (!oHow[i].bins)
            continue;
        const std::vector<std::uint64_t>& oFine = oCounted[i].histogram;
        const bool bExact = IsExact(oResults[i]);
        // What values stand for may count the other way round.
        const bool bTurned = oRequest.unscale && oFile.GetScale(oChannels[i]).scale < 0;
        for (const double nPercent : oRequest.percentiles)
            oResults[i].percentiles.push_back(
                FindPercentile(oFine, *oHow[i].bins, bExact, oResults[i].valid, bTurned ? 100 - nPercent : nPercent));
        if (oRequest.bins != 0)
            CoarsenHistogram(oFine, *oHow[i].bins, bExact, oRequest.bins, oResults[i]);
    }
}

// What the values stand for, by a factor that may be negative.
void Unscale(const ValueScale& oScale, ChannelStatistics& oStatistics)
{
    if (oScale.IsIdentity() || !oStatistics.minimum)
        return;
    double nLow = oScale(ToDouble(*oStatistics.minimum)), nHigh = oScale(ToDouble(*oStatistics.maximum));
    oStatistics.minimum = std::min(nLow, nHigh);
    oStatistics.maximum = std::max(nLow, nHigh);
    oStatistics.mean = oScale(*oStatistics.mean);
    oStatistics.deviation = *oStatistics.deviation * std::fabs(oScale.scale);
    for (double& nValue : oStatistics.percentiles)
        nValue = oScale(nValue);
    oStatistics.histogramLow = oScale(oStatistics.histogramLow);
    oStatistics.histogramHigh = oScale(oStatistics.histogramHigh);
    if (oScale.scale > 0)
        return;
    std::reverse(oStatistics.histogram.begin(), oStatistics.histogram.end());
    std::swap(oStatistics.histogramLow, oStatistics.histogramHigh);
}

// Pixels that are not valid are NaN, which is the no-data value.
std::vector<ChannelStatistics> PowerStatistics(const SourceFile& oFile, const StatisticsRequest& oRequest,
                                               const Progress& oProgress, krv::threading::IExecutor* poExecutor)
{
    krv::datasources::PowerRequest oPower;
    oPower.moChannels = oRequest.channels.empty() ? oRequest.channels : oFile.CheckChannels(oRequest.channels);
    const auto Open = [&oPower](const SourceFile& oOpened)
    {
        return std::make_unique<krv::datasources::TotalPowerRasterReader>(&oOpened.GetDataset(), false, oPower);
    };
    FileWorkers<Worker> oWorkers(oFile,
                                 [&Open](FilePointer poFile)
                                 {
                                     LevelReader oReader(Open(*poFile), nullptr, nullptr);
                                     return std::make_unique<Worker>(std::move(poFile), std::move(oReader), nullptr,
                                                                     nullptr);
                                 });
    const auto poReader = Open(oFile);
    const std::string noData = krv::datasources::GetNoDataText(poReader->GetAuxiliaryData(), 1);
    auto oResults =
        GatherTiles(oWorkers, *poReader, {{krv::datasources::ParseNoData(noData), {}}}, oProgress, poExecutor);
    oResults.front().type = poReader->GetDataType();
    oResults.front().noDataText = noData;
    return oResults;
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
    if (std::any_of(oRequest.percentiles.begin(), oRequest.percentiles.end(),
                    [](double nPercent) { return !(nPercent >= 0 && nPercent <= 100); }))
        throw RequestException("percentiles lie between 0 and 100");
    if (oRequest.power && (oRequest.bins != 0 || !oRequest.percentiles.empty()))
        throw RequestException(
            "histograms and percentiles of the power need a file that holds it; make one by copying the power",
            "power");
    if (oRequest.power)
        return PowerStatistics(oFile, oRequest, oProgress, poExecutor);
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
        std::vector<Gathering> oHow;
        for (const unsigned int nChannel : oGroup.channels)
            oHow.push_back({oFile.GetNoData(nChannel), std::nullopt});
        auto oFound = StatisticsOf(oFile, oGroup.channels, oHow, oRequest.raw, oProgress, poExecutor);
        if (oRequest.bins != 0 || !oRequest.percentiles.empty())
            AddDistribution(oFile, oGroup.channels, oHow, oRequest, oFound, oProgress, poExecutor);
        for (std::size_t i = 0; i < oFound.size(); ++i)
            oResults[oGroup.positions[i]] = std::move(oFound[i]);
    }
    for (std::size_t i = 0; i < oChannels.size(); ++i)
    {
        oResults[i].number = oChannels[i];
        oResults[i].type = oFile.GetType(oChannels[i]);
        if (!oResults[i].alpha)
            oResults[i].noDataText = oFile.GetNoDataText(oChannels[i]);
        if (oRequest.unscale)
            Unscale(oFile.GetScale(oChannels[i]), oResults[i]);
    }
    return oResults;
}

} // namespace krv::operations
