#pragma once

#include "datasources/api.h"

#include <vector>

namespace krv::mathmodel
{
class IMathModel;
}

namespace krv::datasources
{

// The sensor models of a dataset, in numbered segments. The order of the virtual operations is public and fixed.
class KRV_DATASOURCES_API IMathModelDataset
{
public:
    virtual ~IMathModelDataset();

    virtual bool HasMathModel() const = 0;
    virtual std::vector<unsigned int> GetMathModelList() const = 0;
    // A new model owned by the caller. Throws krv::Exception when the segment holds none.
    virtual krv::mathmodel::IMathModel* GetMathModel(unsigned int nSegment) = 0;
    // Stores a model and returns its segment.
    virtual unsigned int CreateMathModel(const krv::mathmodel::IMathModel& oModel) = 0;
    virtual void DeleteMathModel(unsigned int nSegment) = 0;
};

} // namespace krv::datasources
