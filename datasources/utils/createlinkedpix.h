#pragma once

#include "datasources/api.h"

#include <string>

namespace krv::datasources
{

class IDataset;

// Makes a native file that refers to the pixels of another file by a relative path, with its geocoding, reference
// system and cleaned metadata. Channels of one bit get no place in it. The result is synchronised and owned by the
// caller; null when the source has no image channels. A file named `target` is replaced. Passes what the manager and
// the datasets throw, and throws DataException for a link to the file itself and for a chain of more than eight links,
// before anything is made. A failure leaves no new file, and an existing one as it was.
// No pixel is read: the size of the image does not matter.
KRV_DATASOURCES_API IDataset* CreateLinkedPix(std::string target, std::string source);

} // namespace krv::datasources
