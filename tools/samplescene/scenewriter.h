#pragma once

#include <cstdint>
#include <string>

namespace krv::samplescene
{

struct Options
{
    std::string folder;
    unsigned int size = 4096;
    std::uint32_t seed = 7;
};

// Writes rgb.tif (3 x 8U) and pan.tif (1 x 16U, eleven bits used) into the folder, on one grid, row by row: memory
// grows with the width of the scene alone. 0 is no-data: the collar around the turned footprint of the scene; no pixel
// inside it is 0 in every channel. Throws std::runtime_error naming the file that could not be written.
void WriteScene(const Options& oOptions);

} // namespace krv::samplescene
