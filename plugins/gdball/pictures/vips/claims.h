#pragma once

#include "plugins/gdball/pictures/picturekind.h"
#include "plugins/support/file/file.h"

#include <string>

namespace krv::plugins::gdball
{

// What the head of a picture says that decides what decoding it may cost, found without decoding anything.
struct Claims
{
    std::string moHeader;        // of PNM: what stands in place of the file's own first bytes
    std::uint64_t mnSkipped = 0; // these
    bool mbWhole = false;        // the decoder holds all of the picture, in whatever form, before it has the first row
    std::uint64_t mnCoefficients = 0; // of JPEG: bytes of what it holds then
};

// Throws FileFormatException for a file that is too short for the picture that it claims to be.
Claims ReadClaims(const support::File& oFile, PictureKind eKind);

// What has to be looked at before pixels can be trusted, since libvips does not: the checksums of PNG and that it is
// whole, the samples of PNM that is text. Reads all of such a file. Throws FileFormatException.
void CheckWhole(const support::File& oFile, PictureKind eKind);

} // namespace krv::plugins::gdball
