#include "operations/picture/displaychoice.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/metadata/displaydefaults.h"
#include "datasources/reader/derived/findpct.h"
#include "datasources/reader/validitysource.h"
#include "gobs/raster/pixelvalue.h"
#include "operations/job/exceptions.h"
#include "operations/source/sourcefile.h"
#include "toolkit/core/lettercase.h"

#include <algorithm>
#include <limits>
#include <type_traits>

namespace krv::operations
{

namespace
{

// What a channel says it shows: its colour interpretation, else its description; in capitals.
std::string RoleOf(const SourceFile& oFile, unsigned int nChannel)
{
    const auto& oMetadata = oFile.GetMetadata();
    if (nChannel > oMetadata.GetChannelCount())
        return {};
    const std::string role = krv::ToUpper(oMetadata.GetChanMetadataValue("COLORINTERP", nChannel));
    return !role.empty() ? role : krv::ToUpper(oMetadata.GetChannelDescription(nChannel));
}

unsigned int FindRole(const SourceFile& oFile, const std::string& role)
{
    for (unsigned int i = 1; i <= oFile.GetChannelCount(); ++i)
    {
        if (RoleOf(oFile, i) == role)
            return i;
    }
    return 0;
}

std::vector<unsigned int> IfAllThere(const SourceFile& oFile, const std::vector<unsigned int>& oChannels)
{
    const unsigned int nCount = oFile.GetChannelCount();
    const bool bAll =
        std::all_of(oChannels.begin(), oChannels.end(), [nCount](unsigned int n) { return n >= 1 && n <= nCount; });
    return bAll ? oChannels : std::vector<unsigned int>();
}

bool UseDefaults(const SourceFile& oFile, DisplayChoice& oChoice)
{
    const auto& oMetadata = oFile.GetMetadata();
    using namespace krv::datasources;
    oChoice.channels =
        IfAllThere(oFile, {GetDefaultRed(oMetadata), GetDefaultGreen(oMetadata), GetDefaultBlue(oMetadata)});
    if (oChoice.channels.empty())
        oChoice.channels = IfAllThere(oFile, {GetDefaultGrey(oMetadata)});
    oChoice.reason = DisplayReason::eDefaults;
    return !oChoice.channels.empty();
}

std::shared_ptr<krv::gobs::PCT> TableOf(const SourceFile& oFile, unsigned int nChannel)
{
    return krv::datasources::FindPCT(oFile.GetDataset(), nChannel);
}

bool UseRoles(const SourceFile& oFile, DisplayChoice& oChoice)
{
    oChoice.channels = IfAllThere(oFile, {FindRole(oFile, "RED"), FindRole(oFile, "GREEN"), FindRole(oFile, "BLUE")});
    oChoice.reason = DisplayReason::eRoles;
    return !oChoice.channels.empty();
}

float FullScale(const krv::gobs::DataType& oType)
{
    return krv::gobs::VisitPartType(
        oType, []<class T>(std::type_identity<T>)
        { return std::is_floating_point_v<T> ? 1.0F : static_cast<float>(std::numeric_limits<T>::max()); });
}

bool UseInks(const SourceFile& oFile, DisplayChoice& oChoice)
{
    if (krv::ToUpper(oFile.GetMetadata().GetFileMetadataValue("PHOTOMETRIC")) != "SEPARATED" ||
        oFile.GetChannelCount() < 4)
        return false;
    oChoice.channels = {1, 2, 3, 4};
    oChoice.inkFull = FullScale(oFile.GetType(1));
    oChoice.reason = DisplayReason::eInks;
    return true;
}

void UseFirst(const SourceFile& oFile, DisplayChoice& oChoice)
{
    for (unsigned int i = 1; i <= oFile.GetChannelCount() && oChoice.channels.size() < 3; ++i)
    {
        if (i != oChoice.alphaChannel)
            oChoice.channels.push_back(i);
    }
    if (oChoice.channels.empty())
        oChoice.channels = {1};
    oChoice.reason = DisplayReason::eFirstThree;
    if (oChoice.channels.size() == 3)
        return;
    oChoice.channels.resize(1);
    oChoice.reason = DisplayReason::eFirst;
}

void ChooseChannels(const SourceFile& oFile, const std::vector<unsigned int>& oWanted, DisplayChoice& oChoice)
{
    if (!oWanted.empty())
    {
        if (oWanted.size() != 1 && oWanted.size() != 3)
            throw RequestException("a quick look shows one channel, or three as red, green and blue");
        oChoice.channels = oFile.CheckChannels(oWanted);
        oChoice.reason = DisplayReason::eAsked;
        return;
    }
    if (UseDefaults(oFile, oChoice))
        return;
    if (TableOf(oFile, 1) != nullptr)
    {
        oChoice.channels = {1};
        oChoice.reason = DisplayReason::eColourTable;
        return;
    }
    if (!UseRoles(oFile, oChoice) && !UseInks(oFile, oChoice))
        UseFirst(oFile, oChoice);
}

} // namespace

DisplayChoice ChooseDisplay(const SourceFile& oFile, const std::vector<unsigned int>& oWanted)
{
    DisplayChoice oChoice;
    oChoice.alphaChannel = krv::datasources::FindAlpha(oFile.GetMetadata());
    ChooseChannels(oFile, oWanted, oChoice);
    if (std::find(oChoice.channels.begin(), oChoice.channels.end(), oChoice.alphaChannel) != oChoice.channels.end())
        oChoice.alphaChannel = 0;
    if (oChoice.alphaChannel != 0)
    {
        oChoice.alphaFull = FullScale(oFile.GetType(oChoice.alphaChannel));
        oChoice.premultiplied =
            krv::ToUpper(oFile.GetMetadata().GetChanMetadataValue("AlphaKind", oChoice.alphaChannel)) ==
            "PREMULTIPLIED";
    }
    if (oChoice.channels.size() == 1)
    {
        oChoice.table = TableOf(oFile, oChoice.channels.front());
        oChoice.inverted = krv::ToUpper(oFile.GetMetadata().GetFileMetadataValue("PHOTOMETRIC")) == "MINISWHITE";
    }
    if (const auto* const poBitmaps = dynamic_cast<krv::datasources::IBitmapDataset*>(&oFile.GetDataset()))
    {
        oChoice.maskBitmap = krv::datasources::FindValidityMask(*poBitmaps);
        oChoice.channelMasks = krv::datasources::FindChannelMasks(*poBitmaps);
    }
    return oChoice;
}

} // namespace krv::operations
