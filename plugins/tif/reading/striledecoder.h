#pragma once

#include "plugins/support/codec/blockcodec.h"
#include "plugins/support/codec/predictor.h"
#include "plugins/support/file/scratch.h"
#include "plugins/tif/reading/jpegheader.h"
#include "plugins/tif/reading/page.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

namespace krv::plugins::tif
{

// The first pixels of a strip or tile that are wanted: all of its columns and rows that lie in the image.
struct WantedPixels
{
    std::uint32_t mnWidth;
    std::uint32_t mnRows;
    unsigned char* mpTarget;
    std::size_t mnPitch;
};

// Turns the stored bytes of strips and tiles of one page into pixels as they are handed out. The frequent codecs are
// decoded here, into the target itself where the pixels lie there as they are stored; the rare ones by libtiff. One
// thread at a time.
class StrileDecoder
{
public:
    explicit StrileDecoder(Page& oPage);

    // nStoredRows: the rows that the strip or tile holds. pRaw is changed while this runs. Throws FileFormatException
    // naming file, strip or tile, and cause.
    void Decode(std::uint32_t nStrile, std::uint32_t nStoredRows, unsigned char* pRaw, std::size_t nRaw,
                const WantedPixels& oWanted);

    // Turns stored rows without compression into pixels: nWidth pixels in nRows rows, nStoredPitch bytes apart, the
    // first pixel beginning with the first byte. pStored may be the target itself when nothing has to be widened.
    void Convert(unsigned char* pStored, std::size_t nStoredPitch, const WantedPixels& oWanted);

    // The same for rows that libtiff decoded, which are in this machine's order already.
    void ConvertDecoded(unsigned char* pStored, std::size_t nStoredPitch, const WantedPixels& oWanted);

    // "tile 7", "strip 7".
    std::string Describe(std::uint32_t nStrile) const;

    // Gives working memory above a sensible size back.
    void Relax();

private:
    void DecodeByLibrary(std::uint32_t nStrile, unsigned char* pRaw, std::size_t nRaw, unsigned char* pTarget,
                         std::size_t nBytes);
    void PrepareJpeg(std::uint32_t nStrile, std::span<unsigned char>& oRaw);
    void CheckStream(std::uint32_t nStrile, const unsigned char* pRaw, std::size_t nRaw) const;
    void UndoPredictor(unsigned char* pStored, std::size_t nStoredPitch, std::uint32_t nStoredWidth,
                       const WantedPixels& oWanted);
    void Finish(unsigned char* pStored, std::size_t nStoredPitch, bool bSwapped, const WantedPixels& oWanted);
    codec::SampleOrder GetOrder() const;

    Page& moPage;
    const PageForm& moForm;
    std::unique_ptr<codec::BlockDecoder> mpoDecoder; // made when it is wanted
    std::optional<JpegCompleter> moJpeg;
    support::Scratch moScratch;
    std::vector<unsigned char> moPredictorScratch;
};

} // namespace krv::plugins::tif
