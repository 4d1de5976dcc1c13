#include "plugins/jp2/jp2builder.h"

#include "plugins/jp2/jp2dataset.h"
#include "plugins/jp2/reading/boxes.h"

namespace krv::plugins::jp2
{

Jp2Builder::Jp2Builder()
    : Builder("JPEG 2000 (JP2 files and codestreams)", {"jp2", "j2k", "j2c", "jpc", "jpx", "jph", "jhc"}, "JP2")
{
    DescribeOptions(CreateOptions::Describe());
}

Jp2Builder::~Jp2Builder() = default;

krv::datasources::IDataset* Jp2Builder::Open(const std::string& fileName, AccessMode eMode)
{
    CheckReadOnly(fileName, eMode);
    return new Jp2Dataset(fileName, GetFileFormat());
}

krv::datasources::IDataset* Jp2Builder::Create(const std::string& fileName, const std::string& options)
{
    return new Jp2Dataset(GetFileFormat(), std::make_shared<Jp2Writer>(fileName, CreateOptions::Parse(options)));
}

int Jp2Builder::Identify(const std::string&, const unsigned char* pHeader, unsigned int nHeaderLength, int)
{
    return IsBoxed(pHeader, nHeaderLength) || IsCodestream(pHeader, nHeaderLength) ? 0 : 1;
}

} // namespace krv::plugins::jp2
