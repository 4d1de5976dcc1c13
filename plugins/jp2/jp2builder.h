#pragma once

#include "plugins/support/builder.h"

namespace krv::plugins::jp2
{

// Recognises JPEG 2000 images by their first bytes, codestreams and files with boxes, opens them for reading, and makes
// new ones.
class Jp2Builder : public support::Builder
{
public:
    Jp2Builder();
    ~Jp2Builder() override;

    krv::datasources::IDataset* Open(const std::string& fileName, AccessMode eMode) override;
    // options: see CreateOptions. The file comes into being when the dataset is synchronised.
    krv::datasources::IDataset* Create(const std::string& fileName, const std::string& options) override;
    int Identify(const std::string& fileName, const unsigned char* pHeader, unsigned int nHeaderLength,
                 int nReserved) override;
};

} // namespace krv::plugins::jp2
