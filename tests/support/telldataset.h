#pragma once

#include "datasources/interfaces/idataset.h"

#include <string>

namespace krv::test
{

// All that a dataset says of its file, by every facet that it has: pixels, levels with their state, record, history,
// bitmaps, tables, models and place. Two that say the same give the same text. Bitmaps, tables and models count in
// their order: formats number them differently.
std::string TellDataset(krv::datasources::IDataset& oDataset);

} // namespace krv::test
