#pragma once

#include "plugins/support/builder.h"

namespace krv::plugins::krvdsk
{

// Recognises native files by their first bytes, opens them for reading or updating, and makes new ones.
class KrvdskBuilder : public support::Builder
{
public:
    KrvdskBuilder();
    ~KrvdskBuilder() override;

    krv::datasources::IDataset* Open(const std::string& fileName, AccessMode eMode) override;
    // options: see CreateOptions. The file comes into being when the dataset's image is laid out.
    krv::datasources::IDataset* Create(const std::string& fileName, const std::string& options) override;
    int Identify(const std::string& fileName, const unsigned char* pHeader, unsigned int nHeaderLength,
                 int nReserved) override;
};

} // namespace krv::plugins::krvdsk
