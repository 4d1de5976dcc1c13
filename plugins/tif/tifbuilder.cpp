#include "plugins/tif/tifbuilder.h"

#include "plugins/tif/reading/rawdirectory.h"
#include "plugins/tif/tifdataset.h"
#include "plugins/tif/writing/fileeditor.h"

#include <memory>

namespace krv::plugins::tif
{

TifBuilder::TifBuilder()
    : Builder("GeoTIFF (TIFF and BigTIFF images)", {"tif", "tiff", "tf8", "btf", "ovr", "msk"}, "TIF")
{
    DescribeOptions(CreateOptions::Describe());
}

TifBuilder::~TifBuilder() = default;

krv::datasources::IDataset* TifBuilder::Open(const std::string& fileName, AccessMode eMode)
{
    if (eMode == eUpdate)
        return new TifDataset(GetFileFormat(), std::make_shared<FileEditor>(fileName));
    return new TifDataset(fileName, GetFileFormat());
}

krv::datasources::IDataset* TifBuilder::Create(const std::string& fileName, const std::string& options)
{
    return new TifDataset(GetFileFormat(), std::make_shared<FileEditor>(fileName, CreateOptions::Parse(options)));
}

int TifBuilder::Identify(const std::string&, const unsigned char* pHeader, unsigned int nHeaderLength, int)
{
    return FileHeader::Parse(pHeader, nHeaderLength) ? 0 : 1;
}

} // namespace krv::plugins::tif
