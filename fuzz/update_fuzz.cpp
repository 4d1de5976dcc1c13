// Any bytes as a TIFF file that is opened for update and changed by a random program, beside a model of pixels and
// record. An input is the file, the program, and the length of the program in its last two bytes.
#include "fuzz/support/edits.h"
#include "fuzz/support/inputfile.h"
#include "plugins/tif/reading/pagelist.h"
#include "plugins/tif/reading/rawdirectory.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

#include <tiff.h>

namespace
{

using namespace krv::plugins;

// Whether any page of a file that can be opened is coded with loss.
bool IsLossy(const std::string& fileName)
{
    const support::File oFile(fileName, support::File::Mode::eRead);
    unsigned char aHeader[tif::FileHeader::BYTES] = {};
    const auto oHeader = tif::FileHeader::Parse(aHeader, oFile.ReadUpTo(0, aHeader, sizeof(aHeader)));
    tif::PeekReader oReader(oFile);
    std::string trouble;
    const std::vector<tif::PageSummary> oPages = tif::ListPages(oReader, *oHeader, trouble);
    return std::any_of(oPages.begin(), oPages.end(),
                       [&](const tif::PageSummary& oPage)
                       {
                           const tif::RawDirectory oDirectory(oReader, *oHeader, oPage.mnOffset);
                           const std::uint64_t nCodec = oDirectory.GetNumber(oReader, TIFFTAG_COMPRESSION, 1);
                           return nCodec == COMPRESSION_JPEG || nCodec == COMPRESSION_WEBP ||
                                  nCodec == COMPRESSION_LERC || nCodec == COMPRESSION_PIXARLOG;
                       });
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* pBytes, std::size_t nBytes)
{
    if (nBytes < 10)
        return 0;
    nBytes -= 2;
    const std::size_t nProgram = std::min<std::size_t>(nBytes, pBytes[nBytes] + 256U * (pBytes[nBytes + 1] % 4));
    const krv::fuzz::InputFile oFile(pBytes, nBytes - nProgram);
    krv::fuzz::TifPointer poDataset = krv::fuzz::OpenTif(oFile.GetName(), eUpdate);
    if (!poDataset)
        return 0;
    FuzzedDataProvider oProgram(pBytes + nBytes - nProgram, nProgram);
    try
    {
        if (!krv::fuzz::Edits::IsSmall(*poDataset))
            return 0;
        krv::fuzz::Edits oEdits(oFile.GetName(), oProgram, IsLossy(oFile.GetName()));
        oEdits.Run(std::move(poDataset));
    }
    catch (const krv::FileException&)
    {
    }
    return 0;
}
