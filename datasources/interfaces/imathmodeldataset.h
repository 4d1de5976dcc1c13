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
// LoadMathModel chooses among models and orbits and is what programs call.
class KRV_DATASOURCES_API IMathModelDataset
{
public:
    virtual ~IMathModelDataset();

    // Whether the list below has any; no model is read for it.
    virtual bool HasMathModel() const = 0;
    // The numbers of the segments. The last one is the model that counts where nobody names one.
    virtual std::vector<unsigned int> GetMathModelList() const = 0;
    // A new model owned by the caller. Throws krv::Exception when the segment holds none.
    virtual krv::mathmodel::IMathModel* GetMathModel(unsigned int nSegment) = 0;
    // Stores a model and returns its segment; a format with one place replaces the one that is there. The argument is
    // not kept. Throws DataException for a kind of model that the format cannot hold and for a dataset that is not open
    // for updating.
    virtual unsigned int CreateMathModel(const krv::mathmodel::IMathModel& oModel) = 0;
    // Throws DataException for a number that is not in the list, for a model that lies beside the file, and for a
    // dataset that is not open for updating.
    virtual void DeleteMathModel(unsigned int nSegment) = 0;
};

} // namespace krv::datasources
