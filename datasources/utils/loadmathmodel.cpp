#include "datasources/utils/loadmathmodel.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/iephemerisdataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/mathmodel/imathmodel.h"

#include <memory>
#include <vector>

namespace krv::core
{

using krv::datasources::IEphemerisDataset;
using krv::datasources::IMathModelDataset;
using krv::mathmodel::IMathModel;

namespace
{

IMathModel* LoadLast(IMathModelDataset* poModels)
{
    const std::vector<unsigned int> oList =
        poModels != nullptr ? poModels->GetMathModelList() : std::vector<unsigned int>();
    return oList.empty() ? nullptr : poModels->GetMathModel(oList.back());
}

// Null when the attempt throws one of the toolkit's exceptions.
template <class Attempt>
IMathModel* Try(const Attempt& oAttempt)
{
    try
    {
        return oAttempt();
    }
    catch (const krv::Exception&)
    {
        return nullptr;
    }
}

IMathModel* BuildFromOrbit(IEphemerisDataset& oOrbits, unsigned int nSegment)
{
    if (IMathModel* const poModel = Try([&] { return oOrbits.BuildMathModel(nSegment, 0); }))
        return poModel;
    const std::vector<unsigned int> oList =
        oOrbits.HasEphemeris() != 0 ? oOrbits.GetEphemerisList() : std::vector<unsigned int>();
    return oList.empty() ? nullptr : oOrbits.BuildMathModel(oList.back(), nSegment);
}

} // namespace

IMathModel* LoadMathModel(krv::datasources::IDataset* poDataset, unsigned int nSegment)
{
    auto* const poModels = dynamic_cast<IMathModelDataset*>(poDataset);
    if (nSegment == 0)
        return LoadLast(poModels);
    if (poModels != nullptr)
        if (IMathModel* const poModel = Try([&] { return poModels->GetMathModel(nSegment); }))
            return poModel;
    auto* const poOrbits = dynamic_cast<IEphemerisDataset*>(poDataset);
    return poOrbits != nullptr ? BuildFromOrbit(*poOrbits, nSegment) : nullptr;
}

IMathModel* LoadMathModel(const std::string& fileName, unsigned int nSegment)
{
    const std::unique_ptr<krv::datasources::IDataset> poDataset(
        krv::datasources::DatasetManager::GetInstance()->Open(fileName, eReadOnly));
    return LoadMathModel(poDataset.get(), nSegment);
}

} // namespace krv::core
