#include "operations/link/linking.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/utils/createlinkedpix.h"
#include "operations/job/exceptions.h"

#include <memory>

namespace krv::operations
{

void Link(const std::string& target, const std::string& source)
{
    const std::unique_ptr<krv::datasources::IDataset> poLink(krv::datasources::CreateLinkedPix(target, source));
    if (poLink == nullptr)
        throw RequestException(source + ": it has no image channels that could be linked");
    poLink->Close();
}

} // namespace krv::operations
