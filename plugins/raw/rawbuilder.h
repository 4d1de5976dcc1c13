#pragma once

#include "plugins/support/builder.h"

namespace krv::plugins::raw
{

class RawBuilder : public support::Builder
{
public:
    RawBuilder();
    ~RawBuilder() override;

    krv::datasources::IDataset* Open(const std::string& fileName, AccessMode eMode) override;
    krv::datasources::IDataset* Create(const std::string& fileName, const std::string& options) override;
    // Looks at the header beside the file too, by its exact name.
    int Identify(const std::string& fileName, const unsigned char* pHeader, unsigned int nHeaderLength,
                 int nReserved) override;
};

} // namespace krv::plugins::raw
