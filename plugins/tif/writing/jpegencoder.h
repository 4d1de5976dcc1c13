#pragma once

#include "plugins/tif/reading/jpegheader.h"
#include "plugins/tif/reading/page.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

namespace krv::plugins::tif
{

struct JpegPlan;

// Strips and tiles in JPEG that fit in among those of their page: readers keep the tables of one when they read the
// next, so a new one never brings another table where the page's others rely on one. Tables of the page (tag 347) are
// used and not repeated; where the strip or tile that is replaced had tables of its own, so has the new one, with the
// same quantisation, which keeps its quality; the sampling of colours is the one that is there. One thread at a time.
class JpegEncoder
{
public:
    // What comes before the first pixels of a stream is shorter.
    static constexpr std::size_t FORM_BYTES = std::size_t{16} << 10;

    // oLevel: quality of new tables, 1 to 100.
    JpegEncoder(Page& oPage, std::optional<int> oLevel);

    // What of the page is in the way; empty when its tables serve.
    const std::string& GetObstacle() const { return moObstacle; }

    // pPixels: nRows rows of all columns of the strip or tile, without gaps, colours as red, green and blue. oLike: the
    // stream that is replaced, or one of the same page, its begin at least; empty when there is none. The result is
    // valid until the next call. Throws IOException with the library's reason.
    std::span<const unsigned char> Encode(const unsigned char* pPixels, std::uint32_t nRows,
                                          std::span<const unsigned char> oLike);

private:
    JpegPlan MakePlan(const JpegHeader& oLike) const;
    void PlanComponents(JpegPlan& oPlan, const JpegHeader& oLike) const;
    void PlanCodes(JpegPlan& oPlan, const JpegHeader& oLike) const;
    bool IsShared(unsigned int nTable, const JpegHeader& oLike) const;

    Page& moPage;
    const PageForm& moForm;
    int mnQuality;
    std::uint8_t mnAcross = 1; // the sampling of colours that the page asks for
    std::uint8_t mnDown = 1;
    std::vector<unsigned char> moSharedBytes;
    JpegHeader moShared;
    std::string moObstacle;
    std::vector<unsigned char> moStream;
};

} // namespace krv::plugins::tif
