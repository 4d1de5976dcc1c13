#include "datasources/reader/idatasetaccess.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "datasources/reader/irasteriterable.h"
#include "datasources/reader/irasterreader.h"
#include "datasources/reader/ivalidityreader.h"

namespace krv::datasources
{

IDatasetAccess::~IDatasetAccess() = default;
IOverviewAccessor::~IOverviewAccessor() = default;
IOverviewReaderAccessor::~IOverviewReaderAccessor() = default;
IRasterIterable::~IRasterIterable() = default;
IValidityReader::~IValidityReader() = default;

} // namespace krv::datasources
