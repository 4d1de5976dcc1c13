#include "operations/copy/detail/copymodels.h"

#include "datasources/interfaces/imathmodeldataset.h"
#include "toolkit/mathmodel/rpcmodel.h"

#include <fmt/format.h>

#include <map>
#include <memory>

namespace krv::operations::detail
{

using krv::datasources::IMathModelDataset;
using krv::mathmodel::IMathModel;
using krv::mathmodel::RpcCoefficients;
using krv::mathmodel::RpcModel;

namespace
{

std::string NameModel(const CopyPlan& oPlan, unsigned int nModel)
{
    return fmt::format("{}: sensor model {}", oPlan.GetSource(0).GetName(), nModel);
}

// The model of the part that is copied.
std::unique_ptr<IMathModel> LoadModel(const CopyPlan& oPlan, IMathModelDataset& oModels, unsigned int nModel)
{
    std::unique_ptr<IMathModel> poModel(oModels.GetMathModel(nModel));
    if (!oPlan.IsCut())
        return poModel;
    const auto* const poPolynomials = dynamic_cast<const RpcModel*>(poModel.get());
    if (poPolynomials == nullptr)
        throw krv::DataException("one of the kind " + poModel->GetName() + " cannot be moved to a part of the image");
    return std::make_unique<RpcModel>(
        poPolynomials->GetCoefficients().Shifted(oPlan.GetWindow().x, oPlan.GetWindow().y));
}

// The file has its model in the record alone.
void CreateFromRecord(const CopyPlan& oPlan, const Target& oTarget, IMathModelDataset& oTo)
{
    const auto oModel = RpcCoefficients::FromText(oPlan.GetSource(0).GetMetadata().GetFileMetadataValue(POLYNOMIALS));
    if (!oModel || !oModel->FindFault().empty() || oTo.HasMathModel())
        return;
    const PixelWindow& oWindow = oPlan.GetWindow();
    oTarget.Try(oPlan.GetSource(0).GetName() + ": the sensor model",
                [&] { oTo.CreateMathModel(RpcModel(oModel->Shifted(oWindow.x, oWindow.y))); });
}

} // namespace

void CopyModels(const CopyPlan& oPlan, const Target& oTarget)
{
    auto* const poFrom = dynamic_cast<IMathModelDataset*>(&oPlan.GetSource(0).GetDataset());
    auto* const poTo = oTarget.Find<IMathModelDataset>();
    if (poTo == nullptr)
        return;
    if (poFrom == nullptr)
        return CreateFromRecord(oPlan, oTarget, *poTo);
    std::map<unsigned int, unsigned int> oLast; // by number in the copy
    for (const unsigned int nModel : poFrom->GetMathModelList())
        oTarget.Try(NameModel(oPlan, nModel),
                    [&]
                    {
                        const unsigned int nNew = poTo->CreateMathModel(*LoadModel(oPlan, *poFrom, nModel));
                        const auto [pEntry, bNew] = oLast.try_emplace(nNew, nModel);
                        if (!bNew)
                            Target::Warn(NameModel(oPlan, pEntry->second) +
                                         " is not kept: the format has one place, which the next one takes");
                        pEntry->second = nModel;
                    });
}

void RecordModel(const CopyPlan& oPlan, const Target& oTarget, krv::datasources::AuxiliaryData& oRecord)
{
    auto* const poFrom = dynamic_cast<IMathModelDataset*>(&oPlan.GetSource(0).GetDataset());
    if (poFrom == nullptr || !poFrom->HasMathModel() || oTarget.Find<IMathModelDataset>() != nullptr)
        return;
    const unsigned int nModel = poFrom->GetMathModelList().back();
    oTarget.Try(NameModel(oPlan, nModel),
                [&]
                {
                    const std::unique_ptr<IMathModel> poModel = LoadModel(oPlan, *poFrom, nModel);
                    const auto* const poPolynomials = dynamic_cast<const RpcModel*>(poModel.get());
                    if (poPolynomials == nullptr)
                        throw krv::DataException("the format has no place for one of the kind " + poModel->GetName());
                    oRecord.SetFileMetadataValue(POLYNOMIALS, poPolynomials->GetCoefficients().GetText());
                });
}

} // namespace krv::operations::detail
