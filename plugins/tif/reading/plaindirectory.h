#pragma once

#include "plugins/tif/reading/peekreader.h"
#include "plugins/tif/reading/rawdirectory.h"

#include <cstdint>

namespace krv::plugins::tif
{

// Whether the tags that decide how pixels are read stand in a directory just as the format wants them: each once, in
// order, of the usual type and count, with values that go together, and a compression that is decoded here. Such a
// directory says the same to everybody; what libtiff makes of any other, it has to be asked.
bool IsPlainDirectory(const RawDirectory& oDirectory, PeekReader& oReader);

} // namespace krv::plugins::tif
