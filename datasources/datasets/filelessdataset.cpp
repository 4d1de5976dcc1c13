#include "datasources/datasets/filelessdataset.h"

#include "datasources/metadata/auxiliarydata.h"
#include "gobs/raster/rasterinfo.h"
#include "toolkit/exceptions/exceptions.h"

#include <utility>

namespace krv::datasources
{

FilelessDataset::FilelessDataset(std::string name) : moName(std::move(name)) {}

FilelessDataset::~FilelessDataset() = default;

void FilelessDataset::Refuse(const std::string& what, const Place& oPlace) const
{
    throw krv::DataException(moName + ": " + what, oPlace);
}

void FilelessDataset::CheckOpen(const Place& oPlace) const
{
    if (!mbOpen)
        Refuse("the dataset is closed", oPlace);
}

void FilelessDataset::CheckRecord(const AuxiliaryData& oData, const Place& oPlace) const
{
    if (oData.GetChannelCount() != GetChanCount())
        Refuse("the metadata are those of " + std::to_string(oData.GetChannelCount()) + " channels, not of " +
                   std::to_string(GetChanCount()),
               oPlace);
}

void FilelessDataset::AddNewChannel(const krv::gobs::RasterInfo&)
{
    Refuse("channels cannot be added");
}

void FilelessDataset::DeleteChannel(unsigned int)
{
    Refuse("channels cannot be deleted");
}

void FilelessDataset::Create(unsigned int, unsigned int, const std::vector<krv::gobs::DataType>&)
{
    Refuse("an image cannot be laid out");
}

void FilelessDataset::Create(const krv::gobs::RasterInfo& oInfo)
{
    Create(oInfo.GetWidth(), oInfo.GetHeight(),
           std::vector<krv::gobs::DataType>(oInfo.GetChansCount(), oInfo.GetDataType()));
}

} // namespace krv::datasources
