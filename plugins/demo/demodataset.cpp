#include "plugins/demo/demodataset.h"

#include "gobs/raster/datatypeadapter.h"
#include "plugins/demo/demoblocksource.h"
#include "toolkit/exceptions/exceptions.h"

#include <limits>
#include <sstream>

namespace krv::plugins::demo
{

namespace
{

support::Plane MakePlane(const std::string& type, const std::string& fileName)
{
    for (int nCode = krv::gobs::eDT_8U; nCode <= krv::gobs::eDT_C64R; ++nCode)
    {
        const auto eType = static_cast<krv::gobs::NativeDataTypeCode>(nCode);
        if (krv::gobs::DataTypeAdapter::TypeToString(eType) == type)
            return {eType, 1, {}};
    }
    throw krv::FileFormatException(fileName, fileName + " has channels of the unknown type " + type);
}

} // namespace

DemoDataset::DemoDataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat)
    : Dataset(fileName, poFormat)
{
    auto oFile = std::make_unique<support::File>(fileName, support::File::Mode::eRead);
    std::string header(MAX_HEADER_BYTES, '\0');
    header.resize(oFile->ReadUpTo(0, header.data(), header.size()));
    const std::size_t nEnd = header.find("\n\n");
    if (!header.starts_with(SIGNATURE) || nEnd == std::string::npos)
        throw krv::FileFormatException(fileName, fileName + " has no complete header");

    std::istringstream oLines(header.substr(SIGNATURE.size(), nEnd - SIGNATURE.size() + 1));
    oLines.imbue(std::locale::classic());
    long long nWidth = 0; // every number from a file is hostile: read wide and signed, then checked
    long long nHeight = 0;
    std::string line;
    std::getline(oLines >> nWidth >> nHeight >> std::ws, line);
    if (std::min(nWidth, nHeight) < 1 || std::max(nWidth, nHeight) > std::numeric_limits<int>::max() || line.empty())
        throw krv::FileFormatException(fileName, fileName + " has no valid image size or no channels");

    std::vector<support::Plane> oPlanes;
    std::istringstream oTypes(line);
    for (std::string type; oTypes >> type;)
        oPlanes.push_back(MakePlane(type, fileName));
    for (std::string value; std::getline(std::getline(oLines, line, '='), value);)
        moTags[line] = value;
    SetImage(std::make_unique<DemoBlockSource>(
        std::move(oFile), support::ImageLayout(nWidth, nHeight, BLOCK_SIZE, BLOCK_SIZE, oPlanes), nEnd + 2));
}

krv::datasources::AuxiliaryData DemoDataset::ReadAuxiliaryData()
{
    krv::datasources::AuxiliaryData oData(GetChanCount());
    oData.SetFileMetadata(moTags);
    return oData;
}

} // namespace krv::plugins::demo
