// Any bytes as a header of plain pixels: parsed, described, changed and written. What is written is read as it was, and
// no tag is lost between the header and what it cannot say.
#include "plugins/raw/envirecord.h"
#include "plugins/raw/headertext.h"
#include "plugins/raw/rawimage.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <string>

using namespace krv::plugins::raw;
using krv::datasources::AuxiliaryData;

namespace
{

constexpr unsigned int MOST_CHANNELS = 64;

void Expect(bool bHolds)
{
    if (!bHolds)
        std::abort();
}

void ExerciseForm(const RawForm& oForm)
{
    if (!oForm.CountBytes() || oForm.mnChannels > MOST_CHANNELS)
        return;
    oForm.MakeLayout();
    Expect(!oForm.PlacePlanes().empty());
    IsSizeOf(oForm, 4096);
}

void ExerciseRecord(const HeaderText& oHeader, unsigned int nChannels)
{
    const AuxiliaryData oTags = ReadTags(oHeader, nChannels);
    HeaderText oChanged = oHeader;
    const AuxiliaryData oLeft = WriteTags(oTags, oChanged), oRead = ReadTags(oChanged, nChannels);
    for (const auto& [key, value] : oTags.GetFileMetadata())
        Expect(value.empty() || oRead.GetFileMetadataValue(key) == value || oLeft.GetFileMetadataValue(key) == value);
    for (unsigned int nChannel = 1; nChannel <= nChannels; ++nChannel)
        for (const auto& [key, value] : oTags.GetChanMetadata(nChannel))
            Expect(value.empty() || oRead.GetChanMetadataValue(key, nChannel) == value ||
                   oLeft.GetChanMetadataValue(key, nChannel) == value);
    if (const auto oTable = ReadClasses(oHeader))
        Expect(WriteClasses(*oTable, oChanged) &&
               ReadClasses(oChanged)->GetEntries().size() == oTable->GetEntries().size());
    if (const auto oInfo = ReadGeocoding(oHeader); oInfo && WriteGeocoding(*oInfo, nullptr, oChanged))
        Expect(ReadGeocoding(oChanged) == oInfo);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* poBytes, std::size_t nBytes)
{
    const std::string text(reinterpret_cast<const char*>(poBytes), nBytes);
    const HeaderText oHeader(text);
    Expect(HeaderText(oHeader.Write()).Write() == oHeader.Write());
    unsigned int nChannels = 3;
    for (const RawKind eKind : {RawKind::eEnvi, RawKind::eEsri})
        try
        {
            const RawForm oForm = ReadForm(RawFiles{eKind, "x.bil", "x.hdr", text});
            ExerciseForm(oForm);
            if (eKind == RawKind::eEnvi)
                nChannels = std::min(oForm.mnChannels, MOST_CHANNELS);
            else
                ReadImage(RawFiles{eKind, "x.bil", "x.hdr", oForm.mnChannels > MOST_CHANNELS ? "" : text});
        }
        catch (const krv::FileFormatException&)
        {
        }
    ExerciseRecord(oHeader, nChannels);
    return 0;
}
