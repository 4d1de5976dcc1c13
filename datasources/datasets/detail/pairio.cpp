#include "datasources/datasets/detail/pairio.h"

#include "gobs/mask/samplematch.h"
#include "gobs/raster/buffertype.h"
#include "gobs/raster/pixelvalue.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/convertvalue.h"
#include "toolkit/raster/copydata.h"
#include "toolkit/raster/interleave.h"

#include <cmath>
#include <cstring>
#include <utility>

namespace krv::datasources::detail
{

namespace
{

HBlock Allocate(std::uint64_t nBytes)
{
    return HBlock(static_cast<unsigned char*>(HMalloc(nBytes)));
}

krv::gobs::DataType PartType(const krv::gobs::DataType& oComplex)
{
    return {oComplex.GetBits(), oComplex.IsSigned(), oComplex.IsReal(), 0, 0, false};
}

template <class Value>
Value Load(const unsigned char* pBytes)
{
    Value nValue;
    std::memcpy(&nValue, pBytes, sizeof(Value));
    return nValue;
}

template <class Value>
void Store(unsigned char* pBytes, Value nValue)
{
    std::memcpy(pBytes, &nValue, sizeof(Value));
}

// Runs oWork(source type, type of a complex part) for the types of a form.
template <typename Work>
void VisitTypes(const PairForm& oForm, const Work& oWork)
{
    krv::gobs::VisitPartType(oForm.moSource,
                             [&]<class Source>(std::type_identity<Source> oSource)
                             {
                                 krv::gobs::VisitPartType(oForm.moComplex,
                                                          [&]<class Part>(std::type_identity<Part> oPart)
                                                          { oWork(oSource, oPart); });
                             });
}

// The bytes of a rectangle without gaps between its rows, which are there or made room for.
class Packed
{
public:
    Packed(unsigned char* pBytes, const PixelRect& oRect, std::size_t nPixelBytes, std::size_t nPitch)
        : mnRow(oRect.mnWidth * nPixelBytes), mnRows(oRect.mnHeight), mnPitch(nPitch), mpBytes(pBytes)
    {
        if (mnRow != nPitch)
            mpCopy = Allocate(mnRow * mnRows);
    }

    unsigned char* Get() const { return mpCopy != nullptr ? mpCopy.get() : mpBytes; }
    void Fetch() const
    {
        if (mpCopy != nullptr)
            krv::raster::CopyRows(mpBytes, mnPitch, mpCopy.get(), mnRow, mnRow, mnRows);
    }
    void Give() const
    {
        if (mpCopy != nullptr)
            krv::raster::CopyRows(mpCopy.get(), mnRow, mpBytes, mnPitch, mnRow, mnRows);
    }

private:
    std::size_t mnRow;
    std::size_t mnRows;
    std::size_t mnPitch;
    unsigned char* mpBytes;
    HBlock mpCopy;
};

} // namespace

PairIO::PairIO(std::unique_ptr<IRasterIO> poFirst, std::unique_ptr<IRasterIO> poSecond, PairForm oForm)
    : mpoFirst(std::move(poFirst)), mpoSecond(std::move(poSecond)), moForm(std::move(oForm)),
      mbDirect(!moForm.mbPolar && moForm.moSource == PartType(moForm.moComplex))
{
    for (const auto& oNoData : moForm.moNoData)
        mbDirect = mbDirect && (!oNoData || oNoData->mbAsItIs);
}

PairIO::~PairIO() = default;

// With two sources the samples of a pair are brought together.
void PairIO::ReadSource(const PixelRect& oRect, unsigned char* pSamples)
{
    if (mpoSecond == nullptr)
        return mpoFirst->ReadWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, pSamples);
    const std::uint64_t nPixels = std::uint64_t{oRect.mnWidth} * oRect.mnHeight;
    const HBlock oBoth = Allocate(nPixels * GetSourceBytes());
    unsigned char* const pSecond = oBoth.get() + nPixels * GetSourceBytes() / 2;
    mpoFirst->ReadWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oBoth.get());
    mpoSecond->ReadWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, pSecond);
    if (!moMerger)
    {
        const auto eType = krv::gobs::QRFDataType2RasterBufferType(moForm.moSource);
        std::vector<krv::raster::MergeChannel> oChannels;
        for (unsigned int nPair = 0; nPair < GetPairs(); ++nPair)
            oChannels.insert(oChannels.end(), {{0, nPair}, {1, nPair}});
        const krv::raster::MergeSource oSource{eType, static_cast<unsigned int>(GetPairs())};
        moMerger.emplace(std::vector{oSource, oSource}, eType, oChannels);
    }
    moMerger->Run({oBoth.get(), pSecond}, pSamples, nPixels);
}

void PairIO::WriteSource(const PixelRect& oRect, unsigned char* pSamples)
{
    if (mpoSecond == nullptr)
        return mpoFirst->WriteWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, pSamples);
    const std::uint64_t nPixels = std::uint64_t{oRect.mnWidth} * oRect.mnHeight;
    const HBlock oBoth = Allocate(nPixels * GetSourceBytes());
    unsigned char* const pSecond = oBoth.get() + nPixels * GetSourceBytes() / 2;
    if (!moSplitter)
    {
        const auto eType = krv::gobs::QRFDataType2RasterBufferType(moForm.moSource);
        std::vector<krv::raster::SplitTarget> oTargets(2, {eType, {}});
        for (unsigned int nPair = 0; nPair < GetPairs(); ++nPair)
        {
            oTargets[0].moChannels.push_back(2 * nPair);
            oTargets[1].moChannels.push_back(2 * nPair + 1);
        }
        moSplitter.emplace(eType, static_cast<unsigned int>(2 * GetPairs()), oTargets);
    }
    moSplitter->Run(pSamples, {oBoth.get(), pSecond}, nPixels);
    mpoFirst->WriteWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oBoth.get());
    mpoSecond->WriteWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, pSecond);
}

void PairIO::ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch)
{
    const Packed oTarget(pTarget, oRect, GetPixelBytes(), nPitch);
    const std::uint64_t nPixels = std::uint64_t{oRect.mnWidth} * oRect.mnHeight;
    if (mbDirect)
        ReadSource(oRect, oTarget.Get());
    else
    {
        const HBlock oSamples = Allocate(nPixels * GetSourceBytes());
        ReadSource(oRect, oSamples.get());
        Join(oSamples.get(), oTarget.Get(), static_cast<std::size_t>(nPixels));
    }
    oTarget.Give();
}

void PairIO::WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch)
{
    const Packed oSource(const_cast<unsigned char*>(pSource), oRect, GetPixelBytes(), nPitch); // only read
    oSource.Fetch();
    const std::uint64_t nPixels = std::uint64_t{oRect.mnWidth} * oRect.mnHeight;
    if (mbDirect)
        return WriteSource(oRect, oSource.Get());
    const HBlock oSamples = Allocate(nPixels * GetSourceBytes());
    Part(oSource.Get(), oSamples.get(), static_cast<std::size_t>(nPixels));
    WriteSource(oRect, oSamples.get());
}

void PairIO::Join(const unsigned char* pSamples, unsigned char* pComplex, std::size_t nPixels) const
{
    const std::size_t nPairs = GetPairs();
    if (!moForm.mbPolar)
        krv::raster::CopyData(pSamples, krv::gobs::QRFDataType2RasterBufferType(moForm.moSource), 1, pComplex,
                              krv::gobs::QRFDataType2RasterBufferType(PartType(moForm.moComplex)), 1,
                              2 * nPairs * nPixels);
    const auto Work = [&]<class Source, class Value>(std::type_identity<Source>, std::type_identity<Value>)
    {
        for (std::size_t n = 0; n < nPixels * nPairs && moForm.mbPolar; ++n)
        {
            const auto nAmplitude = static_cast<double>(Load<Source>(pSamples + 2 * n * sizeof(Source)));
            const auto nPhase = static_cast<double>(Load<Source>(pSamples + (2 * n + 1) * sizeof(Source)));
            Store(pComplex + 2 * n * sizeof(Value), krv::raster::ConvertValue<Value>(nAmplitude * std::cos(nPhase)));
            Store(pComplex + (2 * n + 1) * sizeof(Value),
                  krv::raster::ConvertValue<Value>(nAmplitude * std::sin(nPhase)));
        }
        for (std::size_t nPair = 0; nPair < nPairs; ++nPair)
        {
            const auto& oNoData = moForm.moNoData[nPair];
            if (!oNoData || oNoData->mbAsItIs)
                continue;
            const krv::gobs::SampleMatch<Source> oFirst(oNoData->moFirst), oSecond(oNoData->moSecond);
            const Value nReal = krv::gobs::ToSample<Value>(oNoData->moComplex).value_or(Value(0));
            const Value nImaginary = oNoData->moComplex.IsNaN() ? nReal : Value(0);
            for (std::size_t n = nPair; n < nPixels * nPairs; n += nPairs)
            {
                if (!oFirst.Matches(Load<Source>(pSamples + 2 * n * sizeof(Source))) ||
                    !oSecond.Matches(Load<Source>(pSamples + (2 * n + 1) * sizeof(Source))))
                    continue;
                Store(pComplex + 2 * n * sizeof(Value), nReal);
                Store(pComplex + (2 * n + 1) * sizeof(Value), nImaginary);
            }
        }
    };
    VisitTypes(moForm, Work);
}

void PairIO::Part(const unsigned char* pComplex, unsigned char* pSamples, std::size_t nPixels) const
{
    const std::size_t nPairs = GetPairs();
    if (!moForm.mbPolar)
        krv::raster::CopyData(pComplex, krv::gobs::QRFDataType2RasterBufferType(PartType(moForm.moComplex)), 1,
                              pSamples, krv::gobs::QRFDataType2RasterBufferType(moForm.moSource), 1,
                              2 * nPairs * nPixels);
    const auto Work = [&]<class Source, class Value>(std::type_identity<Source>, std::type_identity<Value>)
    {
        for (std::size_t n = 0; n < nPixels * nPairs && moForm.mbPolar; ++n)
        {
            const auto nReal = static_cast<double>(Load<Value>(pComplex + 2 * n * sizeof(Value)));
            const auto nImaginary = static_cast<double>(Load<Value>(pComplex + (2 * n + 1) * sizeof(Value)));
            Store(pSamples + 2 * n * sizeof(Source), krv::raster::ConvertValue<Source>(std::hypot(nReal, nImaginary)));
            Store(pSamples + (2 * n + 1) * sizeof(Source),
                  krv::raster::ConvertValue<Source>(std::atan2(nImaginary, nReal)));
        }
        for (std::size_t nPair = 0; nPair < nPairs; ++nPair)
        {
            const auto& oNoData = moForm.moNoData[nPair];
            if (!oNoData || oNoData->mbAsItIs)
                continue;
            const krv::gobs::SampleMatch<Value> oMatch(oNoData->moComplex);
            const krv::gobs::SampleMatch<Source> oFirst(oNoData->moFirst), oSecond(oNoData->moSecond);
            for (std::size_t n = nPair; n < nPixels * nPairs; n += nPairs)
            {
                if (!oMatch.Matches(Load<Value>(pComplex + 2 * n * sizeof(Value)),
                                    Load<Value>(pComplex + (2 * n + 1) * sizeof(Value))))
                    continue;
                Store(pSamples + 2 * n * sizeof(Source), oFirst.GetValue());
                Store(pSamples + (2 * n + 1) * sizeof(Source), oSecond.GetValue());
            }
        }
    };
    VisitTypes(moForm, Work);
}

template <typename Base>
StackedIO<Base>::StackedIO(std::vector<Part> oParts, std::size_t nValueBytes)
    : moParts(std::move(oParts)), mnValueBytes(nValueBytes)
{
    for (const Part& oPart : moParts)
    {
        for (std::size_t n = 0; n < oPart.moPositions.size(); ++n)
            mbStraight = mbStraight && oPart.moPositions[n] == n;
        mnChannels += oPart.moPositions.size();
    }
    mbStraight = mbStraight && moParts.size() == 1;
}

template <typename Base>
StackedIO<Base>::~StackedIO() = default;

template <typename Base>
void StackedIO<Base>::ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch)
{
    const krv::raster::PixelArea oArea{oRect.mnWidth, oRect.mnHeight, mnValueBytes};
    const std::size_t nRow = oRect.mnWidth * mnValueBytes;
    if (mbStraight && nPitch == nRow * mnChannels)
        return moParts.front().mpoIO->ReadWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, pTarget);
    const HBlock oPlane = Allocate(nRow * oRect.mnHeight);
    for (const Part& oPart : moParts)
    {
        const std::size_t nOwn = oPart.moPositions.size();
        const HBlock oPixels = Allocate(nRow * nOwn * oRect.mnHeight);
        oPart.mpoIO->ReadWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oPixels.get());
        for (std::size_t n = 0; n < nOwn; ++n)
        {
            krv::raster::ExtractChannel(oPixels.get(), nRow * nOwn, n, nOwn, oPlane.get(), nRow, oArea);
            krv::raster::PlaceChannel(oPlane.get(), nRow, pTarget, nPitch, oPart.moPositions[n], mnChannels, oArea);
        }
    }
}

template <typename Base>
void StackedIO<Base>::WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch)
{
    const krv::raster::PixelArea oArea{oRect.mnWidth, oRect.mnHeight, mnValueBytes};
    const std::size_t nRow = oRect.mnWidth * mnValueBytes;
    for (const Part& oPart : moParts)
    {
        const HBlock oPixels = Allocate(nRow * oPart.moPositions.size() * oRect.mnHeight);
        krv::raster::GatherChannels(pSource, nPitch, mnChannels, oPixels.get(), nRow * oPart.moPositions.size(),
                                    oPart.moPositions.data(), oPart.moPositions.size(), oArea);
        oPart.mpoIO->WriteWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oPixels.get());
    }
}

template class StackedIO<IRasterIO>;
template class StackedIO<IOverviewIO>;

PairLevelIO::PairLevelIO(unsigned int nLevel, std::vector<Part> oParts, std::size_t nValueBytes)
    : StackedIO(std::move(oParts), nValueBytes), mnLevel(nLevel)
{
}

PairLevelIO::~PairLevelIO() = default;

JoinedBitmapIO::JoinedBitmapIO(std::vector<Bitmap> oBitmaps) : moBitmaps(std::move(oBitmaps)) {}

JoinedBitmapIO::~JoinedBitmapIO() = default;

void JoinedBitmapIO::ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch)
{
    const std::size_t nPixels = std::size_t{oRect.mnWidth} * oRect.mnHeight;
    std::vector<unsigned char> oPlane(nPixels), oOther(nPixels);
    for (std::size_t n = 0; n < moBitmaps.size(); ++n)
    {
        moBitmaps[n].mpoFirst->ReadWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oPlane.data());
        if (moBitmaps[n].mpoSecond != nullptr)
        {
            moBitmaps[n].mpoSecond->ReadWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oOther.data());
            for (std::size_t nAt = 0; nAt < nPixels; ++nAt)
                oPlane[nAt] &= oOther[nAt];
        }
        krv::raster::PlaceChannel(oPlane.data(), oRect.mnWidth, pTarget, nPitch, n, moBitmaps.size(),
                                  {oRect.mnWidth, oRect.mnHeight, 1});
    }
}

void JoinedBitmapIO::WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch)
{
    for (const Bitmap& oBitmap : moBitmaps)
        if (oBitmap.mpoSecond != nullptr)
            throw krv::DataException("A validity mask that is joined from two sources cannot be written");
    std::vector<unsigned char> oPlane(std::size_t{oRect.mnWidth} * oRect.mnHeight);
    for (std::size_t n = 0; n < moBitmaps.size(); ++n)
    {
        krv::raster::ExtractChannel(pSource, nPitch, n, moBitmaps.size(), oPlane.data(), oRect.mnWidth,
                                    {oRect.mnWidth, oRect.mnHeight, 1});
        moBitmaps[n].mpoFirst->WriteWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oPlane.data());
    }
}

} // namespace krv::datasources::detail
