#pragma once

#include "plugins/tif/reading/strilesource.h"

#include <memory>

namespace krv::plugins::tif
{

// The source that suits a page: by strips and tiles, or row by row when the compressed strips are too large for that.
// Throws FileFormatException when neither will do.
std::unique_ptr<support::IBlockSource> MakePageSource(std::shared_ptr<Page> poPage, PixelUse eUse);

} // namespace krv::plugins::tif
