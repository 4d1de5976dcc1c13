#pragma once

#include "plugins/jp2/reading/codestream.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include <openjpeg.h>

namespace krv::plugins::jp2
{

struct ImageDeleter
{
    void operator()(opj_image_t* pImage) const { opj_image_destroy(pImage); }
};

using ImagePtr = std::unique_ptr<opj_image_t, ImageDeleter>;

// What OpenJPEG is asked for.
struct DecodeRequest
{
    unsigned int mnReduce = 0; // resolutions left out
    // Of the reference grid; all of the codestream when there is none.
    std::optional<GridRect> moArea;
    // Components, from 0, ascending; all of them when there are none. Those of a colour transform are not separated.
    std::vector<OPJ_UINT32> moComponents;
};

// Decodes a codestream that is given as pieces. Every call has a codec of its own: nothing is shared between threads or
// kept between calls. what: the subject of messages. Throws FileFormatException with the cause in OpenJPEG's words, and
// what reading the file threw.
ImagePtr Decode(support::File& oFile, const std::vector<Codestream::Piece>& oPieces, const DecodeRequest& oRequest,
                const std::string& what);

} // namespace krv::plugins::jp2
