#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::datasources
{

// What users may say of a new file of a format: a key, and what it takes, in words: "YES, NO", "a number from 1 to 9".
// Example: {"COMPRESS", "NONE, DEFLATE, LZW, ZSTD"}.
struct FormatOption
{
    std::string moKey; // in capitals
    std::string moTakes;
};

// A facet of format descriptions (IFileFormat), found by dynamic_cast. The order of the virtual operations is public
// and fixed.
// For help texts and dialogs: Create of the builder is what checks options.
class KRV_DATASOURCES_API IFormatOptions
{
public:
    virtual ~IFormatOptions();

    // In the order in which they are told to people; empty for a format without options.
    virtual std::vector<FormatOption> ListOptions() const = 0;
};

} // namespace krv::datasources
