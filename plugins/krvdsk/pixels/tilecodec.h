#pragma once

#include "plugins/krvdsk/store/catalogue.h"
#include "plugins/support/codec/blockcodec.h"
#include "plugins/support/file/scratch.h"

#include <cstddef>
#include <memory>
#include <span>
#include <vector>

namespace krv::plugins::krvdsk
{

// Turns the pixels of a plane's tile into the bytes that are stored, and back. A tile holds what of it lies in the
// image, or all of it where the plane says so: rows without gaps, little-endian values, bits packed most significant
// bit first with each row starting on a byte; then the predictor, then the coding. One thread at a time.
class TileCodec
{
public:
    // The plane outlives it. oBlock: of a tile.
    TileCodec(const Plane& oPlane, const ImageSize& oBlock) : moPlane(oPlane), moBlock(oBlock) {}

    // As stored, of a tile of which so much lies in the image.
    ImageSize GetStoredSize(unsigned int nWidth, unsigned int nRows) const
    {
        return moPlane.meStorage == Storage::eWholeTiles ? moBlock : ImageSize{nWidth, nRows};
    }

    // Whether pixels are stored as they are handed out.
    bool IsPlain() const { return moPlane.meCoding == Coding::eNone && !IsBits(); }
    // Whether all channels that are stored are there.
    bool IsWhole() const { return moPlane.GetChannels() == moPlane.moThere.size(); }
    std::size_t GetStoredRowBytes(std::size_t nWidth) const { return (nWidth * moPlane.GetPixelBits() + 7) / 8; }
    // The most bytes of a sound tile of which nWidth x nRows pixels lie in the image; just those when it is plain.
    std::size_t GetLargest(unsigned int nWidth, unsigned int nRows) const;

    // pStored: of a tile of which nWidth x nRows pixels lie in the image, which go to pTarget. Returns the cause when
    // it cannot be decoded, else null.
    const char* Decode(const unsigned char* pStored, std::size_t nStored, unsigned int nWidth, unsigned int nRows,
                       unsigned char* pTarget, std::size_t nPitch);
    // The channels that are there, out of rows of all of them.
    void Pick(const unsigned char* pStored, std::size_t nStoredPitch, std::size_t nWidth, std::size_t nRows,
              unsigned char* pTarget, std::size_t nPitch) const;

    // The same the other way; of values what is kept of them. Valid until the next call; may be the source itself.
    // Empty: all bits are 0, and nothing need be stored.
    std::span<const unsigned char> Encode(const unsigned char* pSource, std::size_t nPitch, unsigned int nWidth,
                                          unsigned int nRows);

private:
    bool IsBits() const { return moPlane.moType.GetBits() < 8; }
    const char* DecodeStored(const unsigned char* pStored, std::size_t nStored, std::size_t nWidth, std::size_t nRows,
                             unsigned char* pTarget, std::size_t nPitch);
    std::span<const unsigned char> EncodeStored(const unsigned char* pSource, std::size_t nPitch, std::size_t nWidth,
                                                std::size_t nRows);
    const unsigned char* PackBits(const unsigned char* pSource, std::size_t nPitch, std::size_t nWidth,
                                  std::size_t nRows);
    const unsigned char* Spread(const unsigned char* pSource, std::size_t nPitch, std::size_t nWidth,
                                std::size_t nRows);

    const Plane& moPlane;
    ImageSize moBlock;
    std::unique_ptr<codec::BlockDecoder> mpoDecoder; // made when they are wanted
    std::unique_ptr<codec::BlockEncoder> mpoEncoder;
    support::Scratch moRows;
    support::Scratch moPredicted;
    support::Scratch moCoded;
    support::Scratch moWhole;
    support::Scratch moKept;
    std::vector<unsigned char> moPredictorScratch;
};

} // namespace krv::plugins::krvdsk
