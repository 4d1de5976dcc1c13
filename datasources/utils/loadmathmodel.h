#pragma once

#include "datasources/api.h"

#include <string>

namespace krv::datasources
{
class IDataset;
}

namespace krv::mathmodel
{
class IMathModel;
}

namespace krv::core
{

// A new sensor model of a dataset, owned by the caller, or null. Segment 0: the last one in the dataset's list of
// models. Any other: the model of that segment, else the one built from the orbit of that segment, else the one built
// from the dataset's last orbit and that segment. What fails in the first two attempts leads to the next; what the last
// one throws passes, and so does whatever is no krv::Exception.
// poDataset: borrowed, not null; the model stands on nothing of it. Null when the dataset has neither models nor
// orbits.
KRV_DATASOURCES_API krv::mathmodel::IMathModel* LoadMathModel(krv::datasources::IDataset* poDataset,
                                                              unsigned int nSegment);

// The same of a file, which is opened for reading and closed again. Passes what the manager throws.
KRV_DATASOURCES_API krv::mathmodel::IMathModel* LoadMathModel(const std::string& fileName, unsigned int nSegment);

} // namespace krv::core
