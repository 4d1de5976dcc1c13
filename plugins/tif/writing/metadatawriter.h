#pragma once

#include "datasources/metadata/auxiliarydata.h"
#include "plugins/tif/writing/fileeditor.h"

#include <memory>

namespace krv::plugins::tif
{

// Stores a record in the tags of a page so that ReadMetadata gives it back. Only what differs from the page's record is
// touched. Values go into the tag that ReadMetadata takes them from, when it can hold them exactly; everything else
// becomes an item of tag 42112. Keys keep their letter case: one that is known by another case is said twice, by its
// tag and by an item. An empty value counts as none. What the form of the pixels says by itself (colours) cannot be
// taken away, only said otherwise. Throws DataException for a record of another channel count and for one that is too
// long to be read again.
void WriteMetadata(FileEditor& oEditor, const std::shared_ptr<PageModel>& poPage,
                   const krv::datasources::AuxiliaryData& oNew, const Place& oPlace);

} // namespace krv::plugins::tif
