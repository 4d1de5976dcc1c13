#pragma once

#include "plugins/tif/writing/fileeditor.h"

#include <memory>
#include <vector>

namespace krv::plugins::tif
{

// Gives a page other channels: an entry for each new channel, the old channel (from 1) that it takes its pixels from,
// or 0 for one that is 0 everywhere. The old pixels stay in the file until the next Synchronize. Throws DataException
// for a page whose channels cannot be changed.
void RebuildChannels(FileEditor& oEditor, const std::vector<unsigned int>& oSources,
                     const std::shared_ptr<PageModel>& poOld, const Place& oPlace);

} // namespace krv::plugins::tif
