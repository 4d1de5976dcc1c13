#pragma once

#include "plugins/support/codec/blockcodec.h"
#include "plugins/support/file/scratch.h"
#include "plugins/tif/reading/page.h"
#include "plugins/tif/reading/strilesource.h"
#include "plugins/tif/writing/jpegencoder.h"
#include "toolkit/exceptions/place.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

namespace krv::plugins::tif
{

// Turns pixels as they are handed in into the stored bytes of a strip or tile. What a tile has beyond the image repeats
// the last column and row. The frequent codecs run here, the rare ones in libtiff. One thread at a time;
// encoders of one page may run side by side.
class StrileEncoder
{
public:
    // The page outlives it. oLevel: of the codec.
    StrileEncoder(Page& oPage, PixelUse eUse, std::optional<int> oLevel);
    ~StrileEncoder();

    // What is in the way of writing pixels of the page; empty when nothing is.
    std::string FindObstacle() const;
    // Throws DataException for a page whose pixels cannot be written.
    void CheckWritable(const Place& oPlace = Place::Current()) const;

    // Whether stored rows are just the rows that are handed in.
    bool IsPlain() const;

    // How many bytes of what is stored tell Encode the form of the page's strips or tiles.
    std::size_t GetFormBytes() const
    {
        return mpoJpeg ? JpegEncoder::FORM_BYTES : mpoEncoder ? mpoEncoder->GetFormBytes() : 0;
    }

    // nWidth, nRows: what of the strip or tile lies in the image. nStoredRows: the rows that it stores. oLike: so many
    // of the bytes that are replaced, or of others of the page. The result is valid until the next call; it may be the
    // source itself.
    std::span<const unsigned char> Encode(const unsigned char* pSource, std::size_t nPitch, std::uint32_t nWidth,
                                          std::uint32_t nRows, std::uint32_t nStoredRows,
                                          std::span<const unsigned char> oLike);

private:
    struct Rows
    {
        const unsigned char* mpFirst;
        std::size_t mnPitch;
    };

    Rows Narrow(const Rows& oRows, std::uint32_t nWidth, std::uint32_t nRows);
    void Pack(const unsigned char* pRow, unsigned char* pNext, std::size_t nSamples) const;
    Rows Pad(const Rows& oRows, std::uint32_t nWidth, std::uint32_t nRows, std::uint32_t nStoredRows);
    Rows Order(const Rows& oRows, std::uint32_t nStoredRows);
    std::span<const unsigned char> Compress(const unsigned char* pStored, std::size_t nBytes, std::uint32_t nStoredRows,
                                            std::span<const unsigned char> oLike);

    Page& moPage;
    const PageForm& moForm;
    PixelUse meUse;
    std::optional<int> moLevel;
    std::unique_ptr<codec::BlockEncoder> mpoEncoder; // one of two, or none when libtiff encodes
    std::unique_ptr<JpegEncoder> mpoJpeg;
    support::Scratch moNarrow;
    support::Scratch moPadded;
    support::Scratch moOrdered;
    support::Scratch moCoded;
    support::Scratch moReversed;
    std::vector<unsigned char> moPredictorScratch;
    std::vector<unsigned char> moLibraryBytes;
};

} // namespace krv::plugins::tif
