#pragma once

#include "datasources/interfaces/iencodedblocks.h"
#include "plugins/tif/reading/page.h"
#include "plugins/tif/writing/pagemodel.h"

#include <cstdint>
#include <memory>
#include <string>

namespace krv::plugins::tif
{

// How the strips or tiles of a page are stored, in words that other formats share.
krv::datasources::EncodedForm DescribeBlocks(Page& oPage);

// The most bytes of a strip or tile that its decoder looks at.
std::uint64_t GetLargestCoded(const PageForm& oForm, std::uint32_t nStoredRows);

// The tags of a page, all in memory, with another size, layout and codec, not laid out yet. Whether it came out as the
// form says shows in its description: the type, for one, is the page's. Null for a form that tags do not express.
std::shared_ptr<PageModel> MakeEncodedPage(const PageModel& oPage, const krv::datasources::EncodedForm& oForm);

} // namespace krv::plugins::tif
