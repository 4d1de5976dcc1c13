#pragma once

#include "datasources/api.h"
#include "toolkit/exceptions/place.h"

#include <string>
#include <vector>

namespace krv::datasources
{

class IDataset;

// The links that lead from a file to one that holds its pixels, at most.
// Each link is a file to open: more would be a mistake, or an attack.
inline constexpr unsigned int MAXIMUM_LINKS = 8;

// Follows the links of `oSource`, to which `target` is or will be linked, and opens the files that they lead to one
// after the other; returns their names. Throws DataException when they come back to `target` or are more than
// MAXIMUM_LINKS, that of `target` among them. A file that cannot be opened ends its chain here: it is reported when its
// pixels are read.
// oSource: borrowed and left as it is. Opens files, so that it may wait for a network.
KRV_DATASOURCES_API std::vector<std::string> FollowLinks(const IDataset& oSource, const std::string& target,
                                                         const Place& oPlace = Place::Current());

} // namespace krv::datasources
