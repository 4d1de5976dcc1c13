#include "plugins/jp2/recordbox.h"

#include "plugins/support/writing/recordtext.h"

#include <algorithm>
#include <sstream>
#include <utility>

namespace krv::plugins::jp2
{

namespace
{

constexpr unsigned int NEITHER = 65535;

} // namespace

std::string WriteRecordBox(const krv::datasources::AuxiliaryData& oRecord)
{
    support::RecordText oText;
    oText.moTags = oRecord;
    return oText.Write();
}

void ReadRecordBox(const std::string& text, krv::datasources::AuxiliaryData& oRecord)
{
    support::RecordText oText;
    oText.moTags = oRecord;
    std::istringstream oLines(text);
    oLines.imbue(std::locale::classic());
    oText.Read(oLines);
    oRecord = oText.moTags;
}

std::vector<ChannelUse> FindUses(const krv::datasources::AuxiliaryData& oRecord, bool bColours)
{
    constexpr std::pair<const char*, unsigned int> COLOURS[] = {{"Red", 1}, {"Green", 2}, {"Blue", 3}, {"Gray", 1}};
    const unsigned int nChannels = oRecord.GetChannelCount();
    std::vector<ChannelUse> oUses(nChannels, {NEITHER, NEITHER});
    bool bTold = false;
    for (unsigned int nChannel = 1; nChannel <= nChannels; ++nChannel)
    {
        ChannelUse& oUse = oUses[nChannel - 1];
        const std::string interpretation = oRecord.GetChanMetadataValue("ColorInterp", nChannel);
        for (const auto& [pName, nColour] : COLOURS)
            if (interpretation == pName)
                oUse = {0, nColour};
        if (interpretation == "Alpha")
            oUse = {oRecord.GetChanMetadataValue("AlphaKind", nChannel) == "Premultiplied" ? 2u : 1u, 0};
        bTold = bTold || oUse.mnUse == 0;
    }
    if (bTold)
        return oUses;
    const unsigned int nColours = bColours ? 3 : 1;
    for (unsigned int nAt = 0; nAt < std::min(nColours, nChannels); ++nAt)
        if (oUses[nAt].mnUse == NEITHER)
            oUses[nAt] = {0, nAt + 1};
    return oUses;
}

} // namespace krv::plugins::jp2
