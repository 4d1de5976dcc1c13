#include "operations/copy/detail/copyrecord.h"

#include "datasources/metadata/auxdatadefaultrgbgtfm.h"
#include "datasources/metadata/droppedtags.h"
#include "datasources/metadata/referencetag.h"
#include "datasources/metadata/typednodata.h"
#include "operations/copy/detail/copymodels.h"
#include "toolkit/mathmodel/rpccoefficients.h"

#include <fmt/format.h>

#include <algorithm>
#include <charconv>
#include <climits>
#include <filesystem>
#include <sstream>
#include <vector>

namespace krv::operations::detail
{

using krv::datasources::AuxiliaryData;
using krv::datasources::DropStatistics;
using krv::datasources::MetadataMap;

namespace
{

constexpr char NO_DATA[] = "NO_DATA_VALUE";
constexpr char CONTROL_POINTS[] = "GroundControlPoints";
constexpr const char* TABLE_REFERENCES[] = {"DEFAULT_LUT_REF", "DEFAULT_PCT_REF"};

// Numbers separated by blanks; empty when anything else is among them.
std::vector<double> ParseDoubles(const std::string& text)
{
    std::vector<double> oNumbers;
    std::istringstream oWords(text);
    for (std::string word; oWords >> word;)
    {
        double nValue = 0;
        const char* const pEnd = word.data() + word.size();
        const auto [pNext, eError] = std::from_chars(word.data(), pEnd, nValue);
        if (eError != std::errc() || pNext != pEnd)
            return {};
        oNumbers.push_back(nValue);
    }
    return oNumbers;
}

void Move(std::vector<double>& oNumbers, std::size_t nAt, unsigned int nBy)
{
    if (nAt < oNumbers.size())
        oNumbers[nAt] -= nBy;
}

// "column row x y z; ..."
std::string MovePoints(const std::string& text, const PixelWindow& oWindow)
{
    std::string moved;
    std::istringstream oPoints(text);
    for (std::string point; std::getline(oPoints, point, ';');)
    {
        auto oNumbers = ParseDoubles(point);
        Move(oNumbers, 0, oWindow.x);
        Move(oNumbers, 1, oWindow.y);
        moved += fmt::format("{}{}", moved.empty() ? "" : "; ", fmt::join(oNumbers, " "));
    }
    return moved;
}

void MoveWithWindow(MetadataMap& oMap, const PixelWindow& oWindow)
{
    const auto oPoints = oMap.find(CONTROL_POINTS);
    if (oPoints != oMap.end())
        oPoints->second = MovePoints(oPoints->second, oWindow);
    const auto oPolynomials = oMap.find(POLYNOMIALS);
    if (oPolynomials == oMap.end())
        return;
    const auto oModel = krv::mathmodel::RpcCoefficients::FromText(oPolynomials->second);
    if (oModel)
        oPolynomials->second = oModel->Shifted(oWindow.x, oWindow.y).GetText();
    else
        oMap.erase(oPolynomials); // of what it is cannot be told whether it still holds
}

// The first file's channels by their place in the copy; places of others match no number.
std::vector<unsigned int> NumbersOfFirst(const CopyPlan& oPlan)
{
    std::vector<unsigned int> oNumbers;
    for (const CopiedChannel& oChannel : oPlan.GetChannels())
        oNumbers.push_back(oChannel.source == 0 ? oChannel.channel : UINT_MAX);
    return oNumbers;
}

// References to a table that is copied name the copy; others stay as they are.
void RenumberTables(MetadataMap& oMap, std::size_t nSource, const std::string& source, const std::string& target,
                    const TableNumbers& oTables)
{
    for (const char* const pKey : TABLE_REFERENCES)
    {
        const auto oTag = oMap.find(pKey);
        std::string file, layer;
        unsigned int nNumber = 0;
        if (oTag == oMap.end() || !krv::datasources::ParseRefMetadataTag(oTag->second, file, layer, nNumber))
            continue;
        const auto oTable = oTables.find({nSource, nNumber});
        if (oTable == oTables.end() || !krv::datasources::IsReferenceTo(file, source))
            continue;
        const bool bBare = file.find('/') == std::string::npos;
        oTag->second = krv::datasources::BuildRefMetadataTag(
            bBare ? std::filesystem::path(target).filename().string() : target, layer, oTable->second);
    }
}

// One value for the file when all channels have it, as in one file; otherwise each channel keeps its own.
void SpreadNoData(const CopyPlan& oPlan, MetadataMap& oFileMap, AuxiliaryData& oRecord)
{
    std::vector<std::string> oTexts;
    for (const CopiedChannel& oChannel : oPlan.GetChannels())
        oTexts.push_back(oPlan.GetSource(oChannel.source).GetNoDataText(oChannel.channel));
    const bool bSame = std::all_of(oTexts.begin(), oTexts.end(), [&](const auto& text) { return text == oTexts[0]; });
    oFileMap.erase(NO_DATA);
    if (bSame && !oTexts.front().empty())
        oFileMap[NO_DATA] = oTexts.front();
    for (std::size_t i = 0; i < oTexts.size() && !bSame; ++i)
    {
        if (!oTexts[i].empty())
            oRecord.SetChanMetadataValue(NO_DATA, oTexts[i], static_cast<unsigned int>(i) + 1);
    }
}

MetadataMap FileRecord(const CopyPlan& oPlan)
{
    const AuxiliaryData oFirst = oPlan.GetSource(0).GetMetadata().GetCleanedMeta();
    if (oPlan.IsWholeFile())
        return oFirst.GetFileMetadata();
    return krv::qrfutils::AuxDataDefaultRGBGTfm(NumbersOfFirst(oPlan)).Transform(oFirst).GetFileMetadata();
}

} // namespace

void DropNoData(AuxiliaryData& oRecord)
{
    const auto Without = [](MetadataMap oMap)
    {
        oMap.erase(NO_DATA);
        return oMap;
    };
    oRecord.SetFileMetadata(Without(oRecord.GetFileMetadata()));
    for (unsigned int nChannel = 1; nChannel <= oRecord.GetChannelCount(); ++nChannel)
        oRecord.SetChanMetadata(Without(oRecord.GetChanMetadata(nChannel)), nChannel);
}

AuxiliaryData MakeRecord(const CopyPlan& oPlan, const std::string& target, const TableNumbers& oTables,
                         bool bPixelsChange, bool bWithoutNoData)
{
    const bool bStale = oPlan.IsCut() || oPlan.IsLossy() || bPixelsChange;
    AuxiliaryData oRecord(static_cast<unsigned int>(oPlan.GetChannels().size()));
    std::vector<AuxiliaryData> oSources;
    for (std::size_t s = 0; s < oPlan.GetSourceCount(); ++s)
        oSources.push_back(oPlan.GetSource(s).GetMetadata().GetCleanedMeta());
    unsigned int nPosition = 0;
    for (const CopiedChannel& oChannel : oPlan.GetChannels())
    {
        ++nPosition;
        const AuxiliaryData& oSource = oSources[oChannel.source];
        if (oChannel.channel > oSource.GetChannelCount())
            continue;
        MetadataMap oMap = oSource.GetChanMetadata(oChannel.channel);
        if (bStale)
            DropStatistics(oMap);
        if (bWithoutNoData)
            oMap.erase(NO_DATA);
        RenumberTables(oMap, oChannel.source, oPlan.GetSource(oChannel.source).GetName(), target, oTables);
        oRecord.SetChanMetadata(oMap, nPosition);
        oRecord.SetChannelDescription(oSource.GetChannelDescription(oChannel.channel), nPosition);
    }
    MetadataMap oFileMap = FileRecord(oPlan);
    if (oPlan.IsCut())
        MoveWithWindow(oFileMap, oPlan.GetWindow());
    if (bStale)
        DropStatistics(oFileMap);
    if (bWithoutNoData)
        oFileMap.erase(NO_DATA);
    else if (oPlan.GetSourceCount() > 1)
        SpreadNoData(oPlan, oFileMap, oRecord);
    oRecord.SetFileMetadata(oFileMap);
    return oRecord;
}

krv::ogc::cs::GeocodingInfo ShiftGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo, unsigned int nX, unsigned int nY)
{
    if (nX == 0 && nY == 0)
        return oInfo;
    double nMapX = 0, nMapY = 0;
    oInfo.RasterToMap(nX, nY, nMapX, nMapY);
    return {nMapX, oInfo.GetXPerColumn(), oInfo.GetXPerRow(), nMapY, oInfo.GetYPerColumn(), oInfo.GetYPerRow()};
}

} // namespace krv::operations::detail
