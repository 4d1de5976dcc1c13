#pragma once

#include "plugins/support/codec/status.h"

#include <cstddef>

namespace krv::plugins::codec
{

// Decodes one block of PackBits into exactly nOutput bytes: runs and stretches of bytes, each behind its length. There
// is no end mark; bytes behind the last one that is wanted are ignored, a run that reaches beyond it counts as more.
// Any input is safe: nothing outside of the two buffers is read or written.
Result DecodePackBits(const unsigned char* input, std::size_t nInput, unsigned char* output, std::size_t nOutput);

} // namespace krv::plugins::codec
