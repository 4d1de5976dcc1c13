#pragma once

#include "plugins/support/builder.h"

namespace krv::plugins::gdball
{

// The generic builder. It recognises no file: whoever asks for it by name gets one of what lies beside files that other
// formats know.
class GdballBuilder : public support::Builder
{
public:
    GdballBuilder();
    ~GdballBuilder() override;

    // A further dataset over a file that stands in the table of open files; else, with levels beside it, the file with
    // these; else null. For update also a file that can hold no levels of its own, so that they can be made.
    krv::datasources::IDataset* Open(const std::string& fileName, AccessMode eMode) override;
    // options: "FTYPE:<type> <options>". Throws DataException for a type that no format has.
    krv::datasources::IDataset* Create(const std::string& fileName, const std::string& options) override;
    int Identify(const std::string& fileName, const unsigned char* pHeader, unsigned int nHeaderLength,
                 int nReserved) override;
};

} // namespace krv::plugins::gdball
