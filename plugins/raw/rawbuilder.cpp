#include "plugins/raw/rawbuilder.h"

#include "datasources/interfaces/filekind.h"
#include "plugins/raw/rawdataset.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"

#include <sys/stat.h>

#include <memory>
#include <utility>

namespace krv::plugins::raw
{

RawBuilder::RawBuilder()
    : Builder("Plain pixels with a text header (ENVI, Esri BIL), elevation tiles (HGT)",
              {"img", "dat", "bsq", "bil", "bip", "bin", "raw", "envi", "flt", "hdr", "hgt"}, "RAW")
{
    RawOptions oOptions;
    support::Options oKeys;
    oOptions.List(oKeys);
    DescribeOptions(oKeys.Describe());
}

RawBuilder::~RawBuilder() = default;

krv::datasources::IDataset* RawBuilder::Open(const std::string& fileName, AccessMode eMode)
{
    auto oFiles = FindFiles(fileName);
    if (!oFiles)
        throw FileFormatException(fileName, fileName + ": no header lies beside it");
    if (eMode != eUpdate || oFiles->moData.empty())
        return new RawDataset(std::move(*oFiles), GetFileFormat());
    auto poFile = std::make_shared<support::File>(oFiles->moData, support::File::Mode::eUpdate);
    auto poWriter = std::make_shared<RawWriter>(std::move(poFile), oFiles->moHeader);
    return new RawDataset(GetFileFormat(), std::move(*oFiles), std::move(poWriter));
}

krv::datasources::IDataset* RawBuilder::Create(const std::string& fileName, const std::string& options)
{
    for (const char* const pEnding : {".HDR", ".HGT"})
        if (krv::ToUpper(fileName).ends_with(pEnding))
            throw DataException(fileName + ": name the new data file otherwise: its header is made beside it");
    RawOptions oOptions;
    for (const auto& [pEnding, eInterleave] : {std::pair{".BIL", Interleave::eLine}, {".BIP", Interleave::ePixel}})
        if (krv::ToUpper(fileName).ends_with(pEnding))
            oOptions.meInterleave = eInterleave; // as the name promises
    support::Options oKeys;
    oOptions.List(oKeys);
    oKeys.Parse(options);
    return new RawDataset(GetFileFormat(), oOptions, std::make_shared<RawWriter>(fileName, ChooseHeaderName(fileName)));
}

int RawBuilder::Identify(const std::string& fileName, const unsigned char* pHeader, unsigned int nHeaderLength, int)
{
    const std::string_view bytes(reinterpret_cast<const char*>(pHeader), nHeaderLength);
    if (krv::datasources::HasSignature(pHeader, nHeaderLength) && !HeaderText::IsHeader(bytes))
        return 1;
    const auto oFiles = FindFiles(fileName);
    if (!oFiles)
        return 1;
    struct stat oStatus = {};
    if (oFiles->moHeader == fileName || ::stat(fileName.c_str(), &oStatus) != 0)
        return 0;
    try
    {
        return IsSizeOf(ReadForm(*oFiles), static_cast<std::uint64_t>(oStatus.st_size)) ? 0 : 1;
    }
    catch (const FileFormatException&)
    {
        return 0; // its header is of this kind; opening says what is wrong with it
    }
}

} // namespace krv::plugins::raw
