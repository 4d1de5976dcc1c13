#pragma once

#include "plugins/support/builder.h"

#include <memory>
#include <string>

namespace krv::plugins::gdball
{

// The generic builder. It recognises pictures that libvips reads, where that was built. Whoever asks for it by name
// gets what lies beside files that other formats know.
class GdballBuilder : public support::Builder
{
public:
    GdballBuilder();
    ~GdballBuilder() override;

    // A further dataset over a file that stands in the table of open files; else, with levels beside it, the file with
    // these; else FileFormatException. For update also a file that can hold no levels of its own, so that they can be
    // made. A picture, with levels beside it or not, by its name or "name[page=n]".
    krv::datasources::IDataset* Open(const std::string& fileName, AccessMode eMode) override;
    // options: "FTYPE:<type> <options>", or those of a picture by the ending of the name. Throws DataException for a
    // type that no format has.
    krv::datasources::IDataset* Create(const std::string& fileName, const std::string& options) override;
    int Identify(const std::string& fileName, const unsigned char* pHeader, unsigned int nHeaderLength,
                 int nReserved) override;

private:
    static bool IsPicture(const std::string& fileName);
    std::unique_ptr<krv::datasources::IDataset> OpenImage(const std::string& fileName, AccessMode eMode);
};

} // namespace krv::plugins::gdball
