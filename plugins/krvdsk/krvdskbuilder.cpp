#include "plugins/krvdsk/krvdskbuilder.h"

#include "plugins/krvdsk/createoptions.h"
#include "plugins/krvdsk/krvdskdataset.h"
#include "plugins/krvdsk/store/storewriter.h"
#include "toolkit/exceptions/exceptions.h"

#include <cstring>
#include <memory>

namespace krv::plugins::krvdsk
{

KrvdskBuilder::KrvdskBuilder() : Builder("Native file of the toolkit", {"krv"}, "KRVDSK")
{
    DescribeOptions(CreateOptions::Describe());
}

KrvdskBuilder::~KrvdskBuilder() = default;

krv::datasources::IDataset* KrvdskBuilder::Open(const std::string& fileName, AccessMode eMode)
{
    if (eMode == eUpdate)
        return new KrvdskDataset(GetFileFormat(), std::make_shared<StoreWriter>(std::make_shared<support::File>(
                                                      fileName, support::File::Mode::eUpdate)));
    return new KrvdskDataset(fileName, GetFileFormat());
}

krv::datasources::IDataset* KrvdskBuilder::Create(const std::string& fileName, const std::string& options)
{
    CreateOptions oOptions = CreateOptions::Parse(options);
    oOptions.moDefaults.moLinkPath = oOptions.moLinked.value_or(std::string());
    return new KrvdskDataset(GetFileFormat(), std::make_shared<StoreWriter>(fileName, oOptions.moDefaults));
}

int KrvdskBuilder::Identify(const std::string&, const unsigned char* pHeader, unsigned int nHeaderLength, int)
{
    const bool bMine =
        nHeaderLength >= SIGNATURE.size() && std::memcmp(pHeader, SIGNATURE.data(), SIGNATURE.size()) == 0;
    return bMine ? 0 : 1;
}

} // namespace krv::plugins::krvdsk
