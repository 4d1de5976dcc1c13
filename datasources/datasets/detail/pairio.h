#pragma once

#include "datasources/interfaces/windowedio.h"
#include "gobs/mask/samplevalue.h"
#include "gobs/raster/datatype.h"
#include "toolkit/core/hblock.h"
#include "toolkit/raster/merger.h"
#include "toolkit/raster/splitter.h"

#include <memory>
#include <optional>
#include <vector>

namespace krv::datasources::detail
{

// What no-data is in both channels of a pair, and as a complex value.
struct PairNoData
{
    krv::gobs::SampleValue moFirst;
    krv::gobs::SampleValue moSecond;
    krv::gobs::SampleValue moComplex; // the real part; the imaginary one is 0, or NaN beside NaN
    bool mbAsItIs = false;            // the two values are the complex one without more ado
};

// Pairs of channels of one type and of the same no-data rule each, as complex values.
struct PairForm
{
    krv::gobs::DataType moSource;
    krv::gobs::DataType moComplex;
    bool mbPolar = false;
    std::vector<std::optional<PairNoData>> moNoData; // of each pair
};

// Reads and writes through the I/O of the sources, which it owns.
class PairIO : public WindowedIO<IRasterIO>
{
public:
    // With one source its channels are the first and the second of each pair in turn; with two, poSecond has the second
    // ones. Both are of one size.
    PairIO(std::unique_ptr<IRasterIO> poFirst, std::unique_ptr<IRasterIO> poSecond, PairForm oForm);
    ~PairIO() override;

    unsigned int GetFileWidth() const override { return mpoFirst->GetFileWidth(); }
    unsigned int GetFileHeight() const override { return mpoFirst->GetFileHeight(); }
    unsigned int GetTileWidth() const override { return mpoFirst->GetTileWidth(); }
    unsigned int GetTileHeight() const override { return mpoFirst->GetTileHeight(); }

private:
    std::size_t GetPairs() const { return moForm.moNoData.size(); }
    std::size_t GetPixelBytes() const override { return GetPairs() * (moForm.moComplex.GetValueBits() / 8); }
    std::size_t GetSourceBytes() const { return 2 * GetPairs() * (moForm.moSource.GetValueBits() / 8); } // of a pixel
    void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override;
    void WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch) override;
    void ReadSource(const PixelRect& oRect, unsigned char* pSamples);
    void WriteSource(const PixelRect& oRect, unsigned char* pSamples);
    void Join(const unsigned char* pSamples, unsigned char* pComplex, std::size_t nPixels) const;
    void Part(const unsigned char* pComplex, unsigned char* pSamples, std::size_t nPixels) const;

    std::unique_ptr<IRasterIO> mpoFirst;
    std::unique_ptr<IRasterIO> mpoSecond; // null with one source
    PairForm moForm;
    bool mbDirect; // the source's samples are the parts
    std::optional<krv::raster::Merger> moMerger;
    std::optional<krv::raster::Splitter> moSplitter;
};

// Channels of one type and size that come from several I/O objects.
template <typename Base>
class StackedIO : public WindowedIO<Base>
{
public:
    struct Part
    {
        std::unique_ptr<IRasterIO> mpoIO;
        std::vector<std::size_t> moPositions; // of its channels, from 0
    };

    // The parts place every channel once.
    StackedIO(std::vector<Part> oParts, std::size_t nValueBytes);
    ~StackedIO() override;

    unsigned int GetFileWidth() const override { return moParts.front().mpoIO->GetFileWidth(); }
    unsigned int GetFileHeight() const override { return moParts.front().mpoIO->GetFileHeight(); }
    unsigned int GetTileWidth() const override { return moParts.front().mpoIO->GetTileWidth(); }
    unsigned int GetTileHeight() const override { return moParts.front().mpoIO->GetTileHeight(); }

private:
    std::size_t GetPixelBytes() const override { return mnChannels * mnValueBytes; }
    void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override;
    void WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch) override;

    std::vector<Part> moParts;
    std::size_t mnChannels = 0;
    std::size_t mnValueBytes;
    bool mbStraight = true; // one part, whose channels are these
};

extern template class StackedIO<IRasterIO>;
extern template class StackedIO<IOverviewIO>;

// Of one level.
class PairLevelIO : public StackedIO<IOverviewIO>
{
public:
    PairLevelIO(unsigned int nLevel, std::vector<Part> oParts, std::size_t nValueBytes);
    ~PairLevelIO() override;

    unsigned int GetLevel() const override { return mnLevel; }

private:
    unsigned int mnLevel;
};

// Bitmaps, each of one I/O or of two whose bits have to be set both. What has two is not written.
class JoinedBitmapIO : public WindowedIO<IRasterIO>
{
public:
    struct Bitmap
    {
        std::unique_ptr<IRasterIO> mpoFirst;
        std::unique_ptr<IRasterIO> mpoSecond; // may be null
    };

    explicit JoinedBitmapIO(std::vector<Bitmap> oBitmaps);
    ~JoinedBitmapIO() override;

    unsigned int GetFileWidth() const override { return moBitmaps.front().mpoFirst->GetFileWidth(); }
    unsigned int GetFileHeight() const override { return moBitmaps.front().mpoFirst->GetFileHeight(); }
    unsigned int GetTileWidth() const override { return moBitmaps.front().mpoFirst->GetTileWidth(); }
    unsigned int GetTileHeight() const override { return moBitmaps.front().mpoFirst->GetTileHeight(); }

private:
    std::size_t GetPixelBytes() const override { return moBitmaps.size(); }
    void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override;
    void WritePixels(const PixelRect& oRect, const unsigned char* pSource, std::size_t nPitch) override;

    std::vector<Bitmap> moBitmaps;
};

} // namespace krv::datasources::detail
