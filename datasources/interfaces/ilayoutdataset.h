#pragma once

#include "datasources/api.h"

#include <optional>
#include <string>
#include <vector>

namespace krv::datasources
{

// How a file is laid out, for people who look at it. The order of the virtual operations is public and fixed.
// No pixel is decoded for the answers.
class KRV_DATASOURCES_API ILayoutDataset
{
public:
    virtual ~ILayoutDataset();

    // Which of the format's variants the file is, such as "BigTIFF"; empty for a format that has one alone.
    virtual std::string GetVariant() = 0;
    // What keeps programs from reading the file in few requests over a network: a sentence for each; empty for a file
    // that is laid out for that. No value for a format that knows no such layout. Throws what reading the file throws.
    virtual std::optional<std::vector<std::string>> CheckCloudLayout() = 0;
};

} // namespace krv::datasources
