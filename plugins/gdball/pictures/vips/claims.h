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

// Throws FileFormatException for a PNG that was cut off, or a part of which is not as its checksum says. Reads all of
// the file.
void CheckPng(const support::File& oFile);

} // namespace krv::plugins::gdball
