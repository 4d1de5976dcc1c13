#include "datasources/writer/copyallbutpixels.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/metadata/auxdatadefaultrgbgtfm.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/detail/metadatakeys.h"
#include "datasources/metadata/droppedtags.h"
#include "datasources/metadata/referencetag.h"
#include "datasources/reader/idatasetaccess.h"
#include "datasources/writer/irasterwriter.h"
#include "gobs/pct/pct.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/mathmodel/imathmodel.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <algorithm>
#include <memory>

namespace krv::datasources
{

namespace
{

using krv::ogc::cs::GeocodingInfo;

// What a format refuses is told, not taken for a failure.
class Losses
{
public:
    template <typename Action>
    void Try(const std::string& what, Action oAction)
    {
        try
        {
            oAction();
        }
        catch (const krv::DataException& oError)
        {
            Add(what, oError.GetMessage());
        }
    }
    void Add(const std::string& what, const std::string& why) { moLines.push_back(what + " is not kept: " + why); }
    std::vector<std::string> Take() { return std::move(moLines); }

private:
    std::vector<std::string> moLines;
};

// A facet of what the reader or writer stands on; null when it shows nothing or has no such facet.
template <typename Facet>
Facet* FindFacet(const IRasterReader& oReader)
{
    const auto* const poAccess = dynamic_cast<const IDatasetAccess*>(&oReader);
    return poAccess != nullptr ? dynamic_cast<Facet*>(poAccess->GetDataset()) : nullptr;
}

// The numbers that the channels of a reader have in its file; none when channels are not those of a file one by one.
std::vector<unsigned int> NumbersInFile(const IRasterReader& oReader)
{
    const auto* const poAccess = dynamic_cast<const IDatasetAccess*>(&oReader);
    if (poAccess == nullptr || poAccess->GetChannels().size() != oReader.GetChansCount())
        return {};
    return poAccess->GetChannels();
}

AuxiliaryData MakeRecord(const IRasterReader& oSource, const IRasterReader& oTarget)
{
    AuxiliaryData oFrom = oSource.GetAuxiliaryData().GetCleanedMeta();
    DropStatistics(oFrom);
    const auto oNumbers = NumbersInFile(oSource);
    if (!oNumbers.empty())
        oFrom = krv::qrfutils::AuxDataDefaultRGBGTfm(oNumbers).Transform(oFrom);
    AuxiliaryData oRecord(oTarget.GetChansCount());
    oRecord.SetFileMetadata(oFrom.GetFileMetadata());
    for (unsigned int n = 1; n <= std::min(oFrom.GetChannelCount(), oRecord.GetChannelCount()); ++n)
    {
        oRecord.SetChanMetadata(oFrom.GetChanMetadata(n), n);
        oRecord.SetChannelDescription(oFrom.GetChannelDescription(n), n);
    }
    return oRecord;
}

// A table of the source itself is copied; the tag by which a channel names it would lead back to the source.
void DropOwnReferences(AuxiliaryData& oRecord, const std::string& name)
{
    std::string file, layer;
    unsigned int nNumber = 0;
    for (unsigned int n = 1; n <= oRecord.GetChannelCount(); ++n)
    {
        MetadataMap oTags = oRecord.GetChanMetadata(n);
        const auto oTag = oTags.find(detail::DEFAULT_PCT);
        if (oTag == oTags.end() || !ParseRefMetadataTag(oTag->second, file, layer, nNumber) ||
            !IsReferenceTo(file, name))
            continue;
        oTags.erase(oTag);
        oRecord.SetChanMetadata(oTags, n);
    }
}

void CopyPlace(const IRasterReader& oSource, IRasterWriter& oTarget, Losses& oLosses)
{
    const std::unique_ptr<krv::ogc::cs::ICRS> poCRS(oSource.GetCRS());
    if (poCRS != nullptr)
        oLosses.Try("the reference system", [&] { oTarget.SetCRS(poCRS.get()); });
    const std::unique_ptr<GeocodingInfo> poInfo(oSource.GetGeocodingInfo());
    if (poInfo == nullptr || poInfo->IsIdentity())
        return;
    if (FindFacet<IGeocodedDataset>(oTarget) == nullptr)
        return oLosses.Add("the geocoding", "the format has none");
    oLosses.Try("the geocoding", [&] { oTarget.SetGeocodingInfo(*poInfo); });
}

// Whether a reader shows the image of its dataset pixel for pixel: not in another grid, and not as a level.
bool IsInPlace(const IRasterReader& oReader)
{
    const auto* const poRaster = FindFacet<IRasterDataset>(oReader);
    if (poRaster == nullptr || poRaster->GetWidth() != oReader.GetWidth() ||
        poRaster->GetHeight() != oReader.GetHeight())
        return false;
    const auto* const poGeocoded = FindFacet<IGeocodedDataset>(oReader);
    const std::unique_ptr<GeocodingInfo> poInfo(oReader.GetGeocodingInfo());
    return poGeocoded == nullptr || poInfo == nullptr || poGeocoded->GetGeocoding() == *poInfo;
}

void CopyTables(const IRasterReader& oSource, const IRasterWriter& oTarget, Losses& oLosses)
{
    const auto* const poFrom = FindFacet<IPCTDataset>(oSource);
    auto* const poTo = FindFacet<IPCTDataset>(oTarget);
    const auto oNumbers = NumbersInFile(oSource), oNew = NumbersInFile(oTarget);
    for (const unsigned int nTable : poFrom != nullptr ? poFrom->GetPCTList() : std::vector<unsigned int>())
    {
        const auto oAt = std::find(oNumbers.begin(), oNumbers.end(), poFrom->GetPCTChannel(nTable));
        const auto nPosition = static_cast<std::size_t>(oAt - oNumbers.begin());
        if (oAt == oNumbers.end() || nPosition >= oNew.size())
            continue;
        const std::string what = "colour table " + std::to_string(nTable);
        if (poTo == nullptr)
            oLosses.Add(what, "the format has none");
        else
            oLosses.Try(what,
                        [&]
                        {
                            const std::unique_ptr<krv::gobs::PCT> poTable(poFrom->GetPCT(nTable));
                            const unsigned int nCopy = poTo->CreatePCT(*poTable, oNew[nPosition]);
                            const std::string description = poFrom->GetPCTDescription(nTable);
                            if (!description.empty())
                                poTo->SetPCTDescription(nCopy, description);
                        });
    }
}

void CopyModels(const IRasterReader& oSource, const IRasterWriter& oTarget, Losses& oLosses)
{
    auto* const poFrom = FindFacet<IMathModelDataset>(oSource);
    auto* const poTo = FindFacet<IMathModelDataset>(oTarget);
    for (const unsigned int nModel : poFrom != nullptr ? poFrom->GetMathModelList() : std::vector<unsigned int>())
    {
        const std::string what = "sensor model " + std::to_string(nModel);
        if (poTo == nullptr)
            oLosses.Add(what, "the format has none");
        else
            oLosses.Try(what,
                        [&]
                        {
                            const std::unique_ptr<krv::mathmodel::IMathModel> poModel(poFrom->GetMathModel(nModel));
                            poTo->CreateMathModel(*poModel);
                        });
    }
}

} // namespace

std::vector<std::string> CopyAllButPixels(const IRasterReader& oSource, IRasterWriter& oTarget)
{
    if (oSource.GetWidth() != oTarget.GetWidth() || oSource.GetHeight() != oTarget.GetHeight())
        throw krv::DataException("The images are of two sizes");
    Losses oLosses;
    AuxiliaryData oRecord = MakeRecord(oSource, oTarget);
    CopyPlace(oSource, oTarget, oLosses);
    if (IsInPlace(oSource))
    {
        CopyTables(oSource, oTarget, oLosses);
        DropOwnReferences(oRecord, FindFacet<IDataset>(oSource)->GetName());
    }
    oLosses.Try("the metadata", [&] { oTarget.SetAuxiliaryData(oRecord); });
    // Models come after the record, which may hold one as text.
    if (IsInPlace(oSource))
        CopyModels(oSource, oTarget, oLosses);
    return oLosses.Take();
}

} // namespace krv::datasources
