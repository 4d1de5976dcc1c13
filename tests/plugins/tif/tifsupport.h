#pragma once

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "plugins/tif/tifbuilder.h"
#include "plugins/tif/tifdataset.h"

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace krv::test
{

// A dataset opened by the format's builder, without a manager.
class OpenTif
{
public:
    explicit OpenTif(const std::string& fileName)
        : mpoDataset(static_cast<krv::plugins::tif::TifDataset*>(moBuilder.Open(fileName, eReadOnly)))
    {
    }
    krv::plugins::tif::TifDataset& operator*() const { return *mpoDataset; }
    krv::plugins::tif::TifDataset* operator->() const { return mpoDataset.get(); }

private:
    krv::plugins::tif::TifBuilder moBuilder;
    std::unique_ptr<krv::plugins::tif::TifDataset> mpoDataset;
};

// 1 to nCount.
std::vector<unsigned int> AllChannels(unsigned int nCount);

// A whole image, pixel interleaved, read in bands of rows as high as the preferred block.
std::vector<unsigned char> ReadAll(krv::datasources::IRasterIO& oIO, std::size_t nPixelBytes);

// A file of the test's own that goes away with it.
class TemporaryFile
{
public:
    explicit TemporaryFile(const std::string& ending = ".tif");
    ~TemporaryFile();
    TemporaryFile(const TemporaryFile&) = delete;
    TemporaryFile& operator=(const TemporaryFile&) = delete;
    const std::string& GetName() const { return moName; }

private:
    std::string moName;
};

} // namespace krv::test
