#include "datasources/utils/createlinkedpix.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/inewfiledataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/iomanager/linkchain.h"
#include "datasources/metadata/auxiliarydata.h"
#include "gobs/raster/datatype.h"
#include "toolkit/core/core.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <cstdlib>
#include <filesystem>
#include <memory>
#include <system_error>
#include <utility>
#include <vector>

namespace krv::datasources
{

namespace
{

std::string MakeRelativePath(const std::string& target, const std::string& source)
{
    const std::unique_ptr<char, decltype(&std::free)> poPath(IMPMakeRelativePath(target, source), &std::free);
    return poPath.get();
}

// A dataset that was just made. Unless it is handed out its file goes with it.
class NewLink
{
public:
    NewLink(const std::string& target, const std::string& options)
        : mbExisted(std::filesystem::exists(target)),
          mpoDataset(DatasetManager::GetInstance()->NewDataset(target, "KRVDSK", options))
    {
    }
    ~NewLink() { Discard(); }
    NewLink(const NewLink&) = delete;
    NewLink& operator=(const NewLink&) = delete;

    IDataset* Get() const { return mpoDataset.get(); }
    IDataset* Release() { return mpoDataset.release(); }

private:
    // A dataset that knows whether its file has taken the name leaves another file of that name alone; of any other a
    // file that was there before is not known to be safe.
    void Discard() noexcept
    {
        if (mpoDataset == nullptr || (mbExisted && dynamic_cast<INewFileDataset*>(mpoDataset.get()) == nullptr))
            return;
        try
        {
            mpoDataset->Delete();
        }
        catch (...)
        {
            // What made the link fail says more.
        }
    }

    bool mbExisted;
    std::unique_ptr<IDataset> mpoDataset;
};

std::vector<krv::gobs::DataType> FindLinkedTypes(const IRasterDataset& oSource)
{
    std::vector<krv::gobs::DataType> oTypes;
    for (unsigned int nChannel = 1; nChannel <= oSource.GetChanCount(); ++nChannel)
    {
        const std::unique_ptr<IChannelInfo> poInfo(oSource.GetChannelInfo(nChannel));
        if (poInfo->GetDataType().GetBits() > 1)
            oTypes.push_back(poInfo->GetDataType());
    }
    return oTypes;
}

void CopyDescription(IDataset& oSource, IDataset& oTarget)
{
    const auto* const poFrom = dynamic_cast<IGeocodedDataset*>(&oSource);
    auto* const poTo = dynamic_cast<IGeocodedDataset*>(&oTarget);
    if (poFrom != nullptr && poTo != nullptr)
        poTo->SetGeocoding(poFrom->GetGeocoding());
    const std::unique_ptr<krv::ogc::cs::ICRS> poCRS(oSource.ReadCRS());
    if (poCRS != nullptr)
        oTarget.UpdateCRS(*poCRS);
    oTarget.WriteAuxiliaryData(oSource.ReadAuxiliaryData().GetCleanedMeta());
}

} // namespace

// The parameters are part of the contract.
// NOLINTNEXTLINE(performance-unnecessary-value-param)
IDataset* CreateLinkedPix(std::string target, std::string source)
{
    const std::unique_ptr<IDataset> poSource(DatasetManager::GetInstance()->Open(source, eReadOnly));
    const auto* const poFrom = dynamic_cast<IRasterDataset*>(poSource.get());
    if (poFrom == nullptr || poFrom->GetChanCount() == 0)
        return nullptr;
    std::error_code oNone;
    if (std::filesystem::equivalent(target, source, oNone))
        throw DataException(target + ": a file cannot be linked to itself");
    FollowLinks(*poSource, target, Place::Current());

    NewLink oLink(target, "FILENOCREATE=" + MakeRelativePath(target, source));
    auto* const poTo = dynamic_cast<IRasterDataset*>(oLink.Get());
    if (poTo == nullptr)
        return nullptr;
    poTo->Create(poFrom->GetWidth(), poFrom->GetHeight(), FindLinkedTypes(*poFrom));
    CopyDescription(*poSource, *oLink.Get());
    oLink.Get()->Synchronize();
    return oLink.Release();
}

} // namespace krv::datasources
