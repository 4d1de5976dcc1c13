#include "datasources/writer/replacingwriter.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "toolkit/exceptions/exceptions.h"

namespace krv::datasources
{

ReplacingWriter::ReplacingWriter(const std::string& fileName, const std::vector<unsigned int>& oChannels,
                                 const std::string& format, const std::string& options)
{
    const Place oPlace = Place::Current();
    if (oChannels.empty())
        throw krv::DataException("No channels in dataset: file=" + fileName, oPlace);
    const IDataset& oDataset =
        UseNamed(DatasetManager::GetInstance()->NewDataset(fileName, format, options), fileName, oChannels, oPlace);
    if (oDataset.Exists())
        throw krv::DataException("The format " + format + " replaces no files: file=" + fileName, oPlace);
}

ReplacingWriter::~ReplacingWriter() = default;

} // namespace krv::datasources
