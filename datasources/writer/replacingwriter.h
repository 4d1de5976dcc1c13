#pragma once

#include "datasources/writer/basicwriter.h"

#include <string>
#include <vector>

namespace krv::datasources
{

// A writer of a new file that takes the place of one of its name, if there is one, as a whole: the old file stays until
// the first Synchronize of the new one, and for good when that is never reached. Its image is laid out by
// CreateNewFile.
// Readers that have the old file open go on reading it. Who opens the name sees the old file or the whole new one.
class KRV_DATASOURCES_API ReplacingWriter : public BasicWriter
{
public:
    // Channels of the new file, from 1. Throws DataException for an empty list, and for formats that cannot make a new
    // file beside an old one.
    // format: a short name, such as "TIF". options: as the format takes them.
    ReplacingWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels, const std::string& format,
                    const std::string& options);
    ~ReplacingWriter() override;
};

} // namespace krv::datasources
