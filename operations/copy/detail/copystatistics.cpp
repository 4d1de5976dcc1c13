#include "operations/copy/detail/copystatistics.h"

#include "datasources/reader/basicreader.h"
#include "datasources/reader/rasterrange.h"
#include "datasources/reader/readervalidity.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "operations/statistics/statistics.h"
#include "toolkit/core/numbertext.h"

#include <fmt/format.h>

#include <memory>
#include <variant>

namespace krv::operations::detail
{

using krv::datasources::AuxiliaryData;
using krv::datasources::IRasterReader;

namespace
{

// Such a level has the brightness of the image.
constexpr unsigned int ENOUGH = 1024;
constexpr char MINIMUM[] = "STATISTICS_MINIMUM";

ChannelStatistics Look(IRasterReader& oReader, const OptionalNoData& oNoData)
{
    krv::datasources::ReaderValidity oValidity(oReader);
    const auto poGatherer = StatisticsGatherer::Make(oReader.GetDataType(), oNoData);
    oReader.SetMargins(0, 0, eMirror);
    for (unsigned int nTile = 0; nTile < oReader.GetTileCount(); ++nTile)
    {
        const std::unique_ptr<krv::gobs::Raster> poTile(oReader.GetRaster(nTile));
        const auto poMask = oValidity.Read(*poTile);
        poGatherer->Add(poTile->GetBuffer(), poTile->GetFullWidth() * poTile->GetFullHeight(), 1,
                        poMask != nullptr ? poMask->GetBits() : nullptr);
    }
    return poGatherer->Get();
}

std::string TextOf(const ExactNumber& oNumber)
{
    if (const double* const pReal = std::get_if<double>(&oNumber))
        return krv::NumberText(*pReal);
    return std::visit([](auto nNumber) { return fmt::format("{}", nNumber); }, oNumber);
}

} // namespace

void AddStatistics(const CopyPlan& oPlan, const Target& oTarget, AuxiliaryData oRecord)
{
    bool bNew = false;
    for (unsigned int nChannel = 1; nChannel <= oRecord.GetChannelCount(); ++nChannel)
    {
        const CopiedChannel& oCopied = oPlan.GetChannels()[nChannel - 1];
        if (oCopied.to.IsComplex() || !oRecord.GetChanMetadataValue(MINIMUM, nChannel).empty())
            continue;
        auto poImage =
            std::make_unique<krv::datasources::BasicReader>(&oTarget.Get(), std::vector<unsigned int>{nChannel}, false);
        const bool bWhole = poImage->GetWidth() <= ENOUGH && poImage->GetHeight() <= ENOUGH;
        const LevelReader oReader = LevelReader::AtLeast(std::move(poImage), ENOUGH, ENOUGH, oTarget.GetName());
        const ChannelStatistics oFound =
            Look(oReader.Get(), krv::datasources::ParseNoData(krv::datasources::GetNoDataText(oRecord, nChannel)));
        if (!oFound.minimum)
            continue;
        oRecord.SetChanMetadataValue(MINIMUM, TextOf(*oFound.minimum), nChannel);
        oRecord.SetChanMetadataValue("STATISTICS_MAXIMUM", TextOf(*oFound.maximum), nChannel);
        oRecord.SetChanMetadataValue("STATISTICS_MEAN", krv::NumberText(*oFound.mean), nChannel);
        oRecord.SetChanMetadataValue("STATISTICS_STDDEV", krv::NumberText(*oFound.deviation), nChannel);
        if (!bWhole)
            oRecord.SetChanMetadataValue("STATISTICS_APPROXIMATE", "YES", nChannel);
        bNew = true;
    }
    if (bNew)
        oTarget.Try("the statistics", [&] { oTarget.Get().WriteAuxiliaryData(oRecord); });
}

} // namespace krv::operations::detail
