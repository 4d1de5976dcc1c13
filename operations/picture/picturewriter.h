#pragma once

#include "operations/api.h"
#include "operations/job/progress.h"

#include <cstdint>
#include <string>
#include <vector>

namespace krv::operations
{

// An 8-bit picture in memory: 1 (grey), 2 (grey, alpha), 3 (red, green, blue) or 4 samples per pixel, rows top down.
struct Picture
{
    unsigned int width = 0;
    unsigned int height = 0;
    unsigned int samples = 0;

    // width * height * samples bytes, samples of a pixel side by side, without padding. Alpha is 255 for opaque.
    std::vector<std::uint8_t> pixels;
};

// Writes the picture as PNG, replacing an existing file only when all is written. Throws krv::IOException naming the
// file and the cause; nothing is left behind then. oProgress: told of each row, as the part "picture".
KRV_OPERATIONS_API void WritePng(const Picture& oPicture, const std::string& fileName, const Progress& oProgress = {});

// Whether WritePicture writes files of that name: ".png", ".jpg" and ".jpeg" in any letter case, and "-".
KRV_OPERATIONS_API bool IsPictureName(const std::string& fileName);

// The same in the form that the name says; "-" is PNG on the standard output. JPEG has no transparency: such pixels are
// white. Throws RequestException for another name.
// Nobody sees half a file: an existing one is replaced when all is written.
KRV_OPERATIONS_API void WritePicture(const Picture& oPicture, const std::string& fileName,
                                     const Progress& oProgress = {});

} // namespace krv::operations
