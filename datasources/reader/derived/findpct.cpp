#include "datasources/reader/derived/findpct.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/displaydefaults.h"
#include "datasources/metadata/referencetag.h"
#include "gobs/pct/pct.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <algorithm>
#include <filesystem>
#include <string>
#include <system_error>

namespace krv::datasources
{

namespace
{

using krv::gobs::PCT;

// The first table where there is no number.
std::unique_ptr<PCT> TakeTable(IDataset* poDataset, unsigned int nNumber)
{
    auto* const poTables = dynamic_cast<IPCTDataset*>(poDataset);
    const auto oList = poTables != nullptr ? poTables->GetPCTList() : std::vector<unsigned int>();
    if (nNumber == 0 && !oList.empty())
        nNumber = oList.front();
    if (std::find(oList.begin(), oList.end(), nNumber) == oList.end())
        return nullptr;
    return std::unique_ptr<PCT>(poTables->GetPCT(nNumber));
}

std::string FindFile(const std::string& reference, const std::string& file)
{
    std::error_code oNone;
    const std::filesystem::path oBeside = std::filesystem::path(file).parent_path() / reference;
    return std::filesystem::exists(reference, oNone) ? reference : oBeside.string();
}

std::unique_ptr<PCT> TakeReferredTable(IDataset& oDataset, const std::string& file, unsigned int nNumber)
{
    if (IsReferenceTo(file, oDataset.GetName()))
        return TakeTable(&oDataset, nNumber);
    const std::unique_ptr<IDataset> poOther(
        DatasetManager::GetInstance()->Open(FindFile(file, oDataset.GetName()), eReadOnly));
    return TakeTable(poOther.get(), nNumber);
}

std::unique_ptr<PCT> FollowReference(IDataset& oDataset, unsigned int nChannel)
{
    std::string file, layer, reason = "it holds no such table";
    unsigned int nNumber = 0;
    if (nChannel > oDataset.ReadAuxiliaryData().GetChannelCount() ||
        !GetDefaultPCT(&oDataset, nChannel, file, layer, nNumber))
        return nullptr;
    try
    {
        if (auto poTable = TakeReferredTable(oDataset, file, nNumber))
            return poTable;
    }
    catch (const krv::Exception& oError)
    {
        reason = oError.what();
    }
    krv::nspio::Warning::Warn(oDataset.GetName() + ": the colour table of channel " + std::to_string(nChannel) +
                              " is to be in " + file + ": " + reason);
    return nullptr;
}

} // namespace

std::unique_ptr<PCT> FindPCT(IDataset& oDataset, unsigned int nChannel)
{
    if (auto poTable = FollowReference(oDataset, nChannel))
        return poTable;
    const auto* const poTables = dynamic_cast<const IPCTDataset*>(&oDataset);
    for (const unsigned int nTable : poTables != nullptr ? poTables->GetPCTList() : std::vector<unsigned int>())
    {
        if (poTables->GetPCTChannel(nTable) == nChannel)
            return std::unique_ptr<PCT>(poTables->GetPCT(nTable));
    }
    return nullptr;
}

} // namespace krv::datasources
