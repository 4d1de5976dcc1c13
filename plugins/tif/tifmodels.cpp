// The sensor models of a TIFF file and of the texts beside it: the facet IMathModelDataset of its dataset.
#include "plugins/support/sidecar/modelsidecars.h"
#include "plugins/tif/reading/metadata.h"
#include "plugins/tif/reading/tiffvalues.h"
#include "plugins/tif/tifdataset.h"
#include "toolkit/mathmodel/rpcmodel.h"

#include <algorithm>

namespace krv::plugins::tif
{

using krv::mathmodel::RpcCoefficients;
using krv::mathmodel::RpcModel;

namespace
{

constexpr unsigned int TAG_MODEL = support::FIRST_OWN_MODEL;

RpcModel* ReadModelTag(const Page& oPage)
{
    const std::vector<double> oNumbers = ReadDoubles(oPage.GetTiff(), TAG_RPC);
    if (oNumbers.size() != RpcCoefficients::COUNT)
        oPage.Fail("tag 50844 has " + std::to_string(oNumbers.size()) + " numbers in place of " +
                   std::to_string(RpcCoefficients::COUNT));
    RpcCoefficients::Values oValues{};
    std::copy(oNumbers.begin(), oNumbers.end(), oValues.begin());
    const RpcCoefficients oModel = RpcCoefficients::FromValues(oValues);
    const std::string fault = oModel.FindFault();
    if (!fault.empty())
        oPage.Fail("tag 50844 holds no rational polynomial model: " + fault);
    return new RpcModel(oModel);
}

} // namespace

std::vector<unsigned int> TifDataset::GetMathModelList() const
{
    std::vector<unsigned int> oList = GetSidecars().ListModels();
    if (!ReadDoubles(GetPage().GetTiff(), TAG_RPC).empty())
        oList.push_back(TAG_MODEL);
    return oList;
}

krv::mathmodel::IMathModel* TifDataset::GetMathModel(unsigned int nSegment)
{
    const Page& oPage = GetPage();
    const std::vector<unsigned int> oList = GetMathModelList();
    if (std::find(oList.begin(), oList.end(), nSegment) == oList.end())
        Refuse("there is no sensor model " + std::to_string(nSegment));
    if (nSegment == TAG_MODEL)
        return ReadModelTag(oPage);
    return new RpcModel(GetSidecars().ReadModel(nSegment));
}

unsigned int TifDataset::CreateMathModel(const krv::mathmodel::IMathModel& oModel)
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("sensor models cannot be written", oPlace);
    const auto* const poModel = dynamic_cast<const RpcModel*>(&oModel);
    if (poModel == nullptr)
        Refuse("TIFF holds rational polynomial models (RPC), not one of the kind " + oModel.GetName(), oPlace);
    const RpcCoefficients::Values oValues = poModel->GetCoefficients().GetValues();
    Edit(
        [&]
        {
            const std::shared_ptr<PageModel>& poPage = oEditor.GetPages().front();
            poPage->moTags.SetDoubles(TAG_RPC, {oValues.begin(), oValues.end()});
        });
    return TAG_MODEL;
}

void TifDataset::DeleteMathModel(unsigned int nSegment)
{
    const Place oPlace = Place::Current();
    FileEditor& oEditor = GetEditor("sensor models cannot be deleted", oPlace);
    if (nSegment > 0 && nSegment < TAG_MODEL)
        Refuse("sensor model " + std::to_string(nSegment) + " lies beside the file and is not deleted with it", oPlace);
    if (nSegment != TAG_MODEL || ReadDoubles(GetPage(oPlace).GetTiff(), TAG_RPC).empty())
        Refuse("there is no sensor model " + std::to_string(nSegment), oPlace);
    Edit([&] { oEditor.GetPages().front()->moTags.Remove(TAG_RPC); });
}

} // namespace krv::plugins::tif
