#include "plugins/support/codec/predictor.h"

#include "toolkit/raster/interleave.h"
#include "toolkit/simd/memoryaccess.h"
#include "toolkit/simd/vectors.h"

#include <array>
#include <utility>

namespace krv::plugins::codec
{

namespace
{

using simd::Load;
using simd::Store;
using simd::Swap;

// Works on one row of nBytes bytes whose samples of one channel lie nStride bytes apart.
using RowFunction = void (*)(const unsigned char* source, unsigned char* destination, std::size_t nBytes,
                             std::size_t nStride);

template <typename T, bool bSwap>
T LoadSample(const unsigned char* source)
{
    const T nValue = Load<T>(source);
    return bSwap ? Swap(nValue) : nValue;
}

// From nBegin on, when everything before it is done.
template <typename T, bool bSwap>
void UndoPlain(const unsigned char* source, unsigned char* destination, std::size_t nBegin, std::size_t nBytes,
               std::size_t nStride)
{
    for (std::size_t i = nBegin; i < nBytes; i += sizeof(T))
    {
        const T nBefore = i < nStride ? T{0} : Load<T>(destination + i - nStride);
        Store<T>(destination + i, static_cast<T>(LoadSample<T, bSwap>(source + i) + nBefore));
    }
}

// Up to nEnd; goes backwards, so that a row can be worked on in place.
template <typename T, bool bSwap>
void ApplyPlain(const unsigned char* source, unsigned char* destination, std::size_t nEnd, std::size_t nStride)
{
    for (std::size_t i = nEnd; i > 0; i -= sizeof(T))
    {
        const std::size_t nAt = i - sizeof(T);
        const T nBefore = nAt < nStride ? T{0} : Load<T>(source + nAt - nStride);
        const T nValue = static_cast<T>(Load<T>(source + nAt) - nBefore);
        Store<T>(destination + nAt, bSwap ? Swap(nValue) : nValue);
    }
}

#if defined(KRV_VECTORS)
template <typename T>
using Samples = simd::Vector<T, 16 / sizeof(T)>;

template <typename T, bool bSwap>
Samples<T> LoadSamples(const unsigned char* source)
{
    const auto oValue = Load<Samples<T>>(source);
    return bSwap ? simd::SwapBytes<T>(oValue) : oValue;
}

// Running sums within one vector, by adding it to itself shifted by one, two, four ... pixels:
//     differences   d0 d1    d2       d3          ..
//     by one        d0 d0+d1 d1+d2    d2+d3       ..
//     by two        d0 d0+d1 d0+d1+d2 d0+d1+d2+d3 ..
template <typename T, std::size_t nStride>
Samples<T> Accumulate(Samples<T> oValue)
{
    if constexpr (nStride < 16)
        oValue += simd::MoveUp<nStride>(oValue);
    if constexpr (nStride * 2 < 16)
        oValue += simd::MoveUp<nStride * 2>(oValue);
    if constexpr (nStride * 4 < 16)
        oValue += simd::MoveUp<nStride * 4>(oValue);
    if constexpr (nStride * 8 < 16)
        oValue += simd::MoveUp<nStride * 8>(oValue);
    return oValue;
}

// Pixels of up to sixteen bytes. Wherever a vector begins within a pixel, byte i continues byte 16 - nStride + i mod
// nStride of the one before.
template <typename T, bool bSwap, std::size_t nStride>
void UndoNarrow(const unsigned char* source, unsigned char* destination, std::size_t nBytes, std::size_t)
{
    static constexpr simd::Shuffle CARRY =
        simd::Shuffle::Make([](std::size_t i) { return 16 - nStride + i % nStride; });
    Samples<T> oSum{};
    std::size_t i = 0;
    for (; i + 16 <= nBytes; i += 16)
    {
        oSum = Accumulate<T, nStride>(LoadSamples<T, bSwap>(source + i)) + CARRY(oSum);
        Store(destination + i, oSum);
    }
    UndoPlain<T, bSwap>(source, destination, i, nBytes, nStride);
}

// Pixels of more than 16 (nVectors - 1) and up to 16 nVectors bytes: the sums stay in registers. The last vector of a
// pixel overlaps the one before it.
template <typename T, bool bSwap, std::size_t nVectors>
void UndoWide(const unsigned char* source, unsigned char* destination, std::size_t nBytes, std::size_t nStride)
{
    Samples<T> aSums[nVectors] = {};
    for (std::size_t i = 0; i < nBytes; i += nStride)
    {
        for (std::size_t k = 0; k < nVectors; ++k)
            aSums[k] += LoadSamples<T, bSwap>(source + i + (k + 1 < nVectors ? k * 16 : nStride - 16));
        for (std::size_t k = 0; k < nVectors; ++k)
            Store(destination + i + (k + 1 < nVectors ? k * 16 : nStride - 16), aSums[k]);
    }
}

// Pixels so wide that the sums of the one before are better read again.
template <typename T, bool bSwap>
void UndoVeryWide(const unsigned char* source, unsigned char* destination, std::size_t nBytes, std::size_t nStride)
{
    UndoPlain<T, bSwap>(source, destination, 0, nStride, nStride);
    std::size_t i = nStride;
    for (; i + 16 <= nBytes; i += 16)
        Store(destination + i, LoadSamples<T, bSwap>(source + i) + Load<Samples<T>>(destination + i - nStride));
    UndoPlain<T, bSwap>(source, destination, i, nBytes, nStride);
}

template <typename T, bool bSwap>
void ApplyRow(const unsigned char* source, unsigned char* destination, std::size_t nBytes, std::size_t nStride)
{
    std::size_t i = nBytes;
    for (; i >= nStride + 16; i -= 16)
    {
        const unsigned char* at = source + i - 16;
        const auto oValue = Load<Samples<T>>(at) - Load<Samples<T>>(at - nStride);
        Store(destination + i - 16, bSwap ? simd::SwapBytes<T>(oValue) : oValue);
    }
    ApplyPlain<T, bSwap>(source, destination, i, nStride);
}

template <typename T, bool bSwap, std::size_t... nIndices>
RowFunction ChooseUndo(std::size_t nStride, std::index_sequence<nIndices...>)
{
    static constexpr std::array<RowFunction, sizeof...(nIndices)> NARROW{
        &UndoNarrow<T, bSwap, (nIndices + 1) * sizeof(T)>...};
    static constexpr std::array<RowFunction, 7> WIDE{
        &UndoWide<T, bSwap, 2>, &UndoWide<T, bSwap, 3>, &UndoWide<T, bSwap, 4>, &UndoWide<T, bSwap, 5>,
        &UndoWide<T, bSwap, 6>, &UndoWide<T, bSwap, 7>, &UndoWide<T, bSwap, 8>};
    if (nStride <= 16)
        return NARROW[nStride / sizeof(T) - 1];
    return nStride <= 128 ? WIDE[(nStride - 17) / 16] : &UndoVeryWide<T, bSwap>;
}

template <typename T, bool bSwap>
RowFunction ChooseUndo(std::size_t nStride)
{
    return ChooseUndo<T, bSwap>(nStride, std::make_index_sequence<16 / sizeof(T)>());
}
#else
template <typename T, bool bSwap>
void UndoRow(const unsigned char* source, unsigned char* destination, std::size_t nBytes, std::size_t nStride)
{
    UndoPlain<T, bSwap>(source, destination, 0, nBytes, nStride);
}

template <typename T, bool bSwap>
RowFunction ChooseUndo(std::size_t)
{
    return &UndoRow<T, bSwap>;
}

template <typename T, bool bSwap>
void ApplyRow(const unsigned char* source, unsigned char* destination, std::size_t nBytes, std::size_t nStride)
{
    ApplyPlain<T, bSwap>(source, destination, nBytes, nStride);
}
#endif

template <bool bSwap>
RowFunction ChooseUndo(std::size_t nStride, std::size_t nSampleBytes)
{
    switch (nSampleBytes)
    {
    case 2:
        return ChooseUndo<std::uint16_t, bSwap>(nStride);
    case 4:
        return ChooseUndo<std::uint32_t, bSwap>(nStride);
    case 8:
        return ChooseUndo<std::uint64_t, bSwap>(nStride);
    default:
        return ChooseUndo<std::uint8_t, false>(nStride);
    }
}

template <bool bSwap>
RowFunction ChooseApply(std::size_t nSampleBytes)
{
    switch (nSampleBytes)
    {
    case 2:
        return &ApplyRow<std::uint16_t, bSwap>;
    case 4:
        return &ApplyRow<std::uint32_t, bSwap>;
    case 8:
        return &ApplyRow<std::uint64_t, bSwap>;
    default:
        return &ApplyRow<std::uint8_t, false>;
    }
}

unsigned char* GetScratch(std::vector<unsigned char>& oScratch, std::size_t nBytes)
{
    if (oScratch.size() < nBytes)
        oScratch.resize(nBytes);
    return oScratch.data();
}

// The place among the planes of byte nByte of a sample.
std::size_t GetPlane(std::size_t nByte, std::size_t nSampleBytes)
{
    return simd::LITTLE ? nSampleBytes - 1 - nByte : nByte;
}

} // namespace

void UndoHorizontal(const unsigned char* source, std::size_t nSourcePitch, unsigned char* destination,
                    std::size_t nDestinationPitch, const BlockShape& oShape, SampleOrder oOrder)
{
    if (oShape.GetRowBytes() == 0)
        return;
    const std::size_t nStride = oShape.mnChannels * oShape.mnSampleBytes;
    const RowFunction oUndo = oOrder == SampleOrder::eSwapped ? ChooseUndo<true>(nStride, oShape.mnSampleBytes)
                                                              : ChooseUndo<false>(nStride, oShape.mnSampleBytes);
    for (std::size_t i = 0; i < oShape.mnRows; ++i)
        oUndo(source + i * nSourcePitch, destination + i * nDestinationPitch, oShape.GetRowBytes(), nStride);
}

void ApplyHorizontal(const unsigned char* source, std::size_t nSourcePitch, unsigned char* destination,
                     std::size_t nDestinationPitch, const BlockShape& oShape, SampleOrder oOrder)
{
    const std::size_t nStride = oShape.mnChannels * oShape.mnSampleBytes;
    const RowFunction oApply = oOrder == SampleOrder::eSwapped ? ChooseApply<true>(oShape.mnSampleBytes)
                                                               : ChooseApply<false>(oShape.mnSampleBytes);
    for (std::size_t i = 0; i < oShape.mnRows; ++i)
        oApply(source + i * nSourcePitch, destination + i * nDestinationPitch, oShape.GetRowBytes(), nStride);
}

void UndoFloatingPoint(const unsigned char* source, std::size_t nSourcePitch, unsigned char* destination,
                       std::size_t nDestinationPitch, const BlockShape& oShape, std::vector<unsigned char>& oScratch)
{
    if (oShape.GetRowBytes() == 0)
        return;
    const std::size_t nSamples = oShape.GetRowSamples();
    const std::size_t nSampleBytes = oShape.mnSampleBytes;
    unsigned char* row = GetScratch(oScratch, oShape.GetRowBytes());
    const RowFunction oUndo = ChooseUndo<std::uint8_t, false>(oShape.mnChannels);
    std::array<const unsigned char*, 8> oPlanes{};
    for (std::size_t i = 0; i < nSampleBytes; ++i)
        oPlanes[i] = row + GetPlane(i, nSampleBytes) * nSamples;
    for (std::size_t i = 0; i < oShape.mnRows; ++i)
    {
        oUndo(source + i * nSourcePitch, row, oShape.GetRowBytes(), oShape.mnChannels);
        raster::InterleavePlanes(oPlanes.data(), nSamples, destination + i * nDestinationPitch, 0, nSampleBytes,
                                 {nSamples, 1, 1});
    }
}

void ApplyFloatingPoint(const unsigned char* source, std::size_t nSourcePitch, unsigned char* destination,
                        std::size_t nDestinationPitch, const BlockShape& oShape, std::vector<unsigned char>& oScratch)
{
    const std::size_t nSamples = oShape.GetRowSamples();
    const std::size_t nSampleBytes = oShape.mnSampleBytes;
    unsigned char* row = GetScratch(oScratch, oShape.GetRowBytes());
    for (std::size_t i = 0; i < oShape.mnRows; ++i)
    {
        for (std::size_t k = 0; k < nSampleBytes; ++k)
            raster::ExtractChannel(source + i * nSourcePitch, 0, k, nSampleBytes,
                                   row + GetPlane(k, nSampleBytes) * nSamples, 0, {nSamples, 1, 1});
        ApplyRow<std::uint8_t, false>(row, destination + i * nDestinationPitch, oShape.GetRowBytes(),
                                      oShape.mnChannels);
    }
}

} // namespace krv::plugins::codec
