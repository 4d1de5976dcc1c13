#pragma once

#include <cstddef>

namespace krv::xml
{

// What a document may hold; anything beyond is refused as malformed. Descriptions are a few kilobytes and metadata some
// hundred; the limits keep a hostile document within a fraction of a second and some tens of megabytes.
// 16 MiB, as stored in the file.
constexpr std::size_t MAX_DOCUMENT_BYTES = 16U << 20U;

// Elements inside one another, the root among them.
constexpr std::size_t MAX_DOCUMENT_DEPTH = 256;

// Attributes count beside elements, since either takes memory.
constexpr std::size_t MAX_DOCUMENT_NODES = 1U << 18U; // elements and attributes together

} // namespace krv::xml
