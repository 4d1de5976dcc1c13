#include "plugins/support/facetsbeside.h"

#include "plugins/support/image/stackedio.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/mathmodel/rpcmodel.h"
#include "toolkit/nspio/warning.h"

#include <utility>

namespace krv::plugins::support
{

FacetsBeside::~FacetsBeside() = default;

void FacetsBeside::RefuseBeside(const std::string& what, const Place& oPlace) const
{
    throw DataException(moDataset.GetFileName() + ": " + what, oPlace);
}

Sidecars& FacetsBeside::FindMask(unsigned int nBitmap, const Place& oPlace) const
{
    Sidecars& oSidecars = moDataset.GetSidecars();
    if (!oSidecars.HasMask(nBitmap))
        RefuseBeside("bitmap " + std::to_string(nBitmap) + " does not exist", oPlace);
    return oSidecars;
}

std::vector<unsigned int> FacetsBeside::GetBitmapList() const
{
    return moDataset.GetSidecars().ListMasks();
}

krv::datasources::IRasterIO* FacetsBeside::GetBitmapIO(const std::vector<unsigned int>& oBitmaps)
{
    std::vector<std::unique_ptr<krv::datasources::IRasterIO>> oParts;
    for (const unsigned int nBitmap : oBitmaps)
        oParts.emplace_back(FindMask(nBitmap).OpenMask(nBitmap, moDataset.WritesBeside()));
    if (oParts.size() == 1)
        return oParts.front().release();
    return new StackedIO(std::move(oParts), 1, 1);
}

void FacetsBeside::DeleteBitmap(unsigned int nBitmap)
{
    moDataset.CheckWritingBeside("bitmaps cannot be deleted", Place::Current());
    FindMask(nBitmap).DropMasks();
}

unsigned int FacetsBeside::CreateBitmap()
{
    const Place oPlace = Place::Current();
    moDataset.CheckWritingBeside("bitmaps cannot be added", oPlace);
    return moDataset.GetSidecars().MakeMask();
}

std::string FacetsBeside::GetBitmapDescription(unsigned int nBitmap) const
{
    return FindMask(nBitmap).DescribeMask(nBitmap);
}

void FacetsBeside::RefuseZone(Sidecars& oSidecars, const Place& oPlace) const
{
    oSidecars.DropZone();
    RefuseBeside(NO_ZONES, oPlace);
}

void FacetsBeside::SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription)
{
    const Place oPlace = Place::Current();
    moDataset.CheckWritingBeside("bitmaps cannot be written", oPlace);
    Sidecars& oSidecars = FindMask(nBitmap, oPlace);
    if (oDescription == oSidecars.DescribeMask(nBitmap))
        return;
    if (oSidecars.IsZone(nBitmap) && oDescription.empty())
        return oSidecars.DeclareMask(0);
    if (oSidecars.IsZone(nBitmap))
        RefuseZone(oSidecars, oPlace);
    if (oSidecars.GetMaskTags(nBitmap).empty())
        RefuseBeside("the mask of the image has no description", oPlace);
    if (oDescription.empty())
        RefuseBeside("the mask of a channel cannot become the one of the image", oPlace);
    krv::nspio::Warning::Warn(moDataset.GetFileName() + ": the description \"" + oDescription +
                                  "\" of a mask beside the file is not kept",
                              oPlace);
}

krv::datasources::MetadataMap FacetsBeside::GetBitmapMetadata(unsigned int nBitmap) const
{
    return FindMask(nBitmap).GetMaskTags(nBitmap);
}

void FacetsBeside::SetBitmapMetadata(unsigned int nBitmap, const krv::datasources::MetadataMap& oMetadata)
{
    const Place oPlace = Place::Current();
    Sidecars& oSidecars = FindMask(nBitmap, oPlace);
    if (oMetadata == oSidecars.GetMaskTags(nBitmap))
        return;
    moDataset.CheckWritingBeside("bitmaps cannot be written", oPlace);
    if (!oSidecars.IsZone(nBitmap))
        RefuseBeside("a mask beside the file has no metadata", oPlace);
    const auto oOwner = oMetadata.find(krv::datasources::VALIDITY_OF_CHANNEL);
    const unsigned int nChannel =
        oOwner == oMetadata.end() ? 0 : krv::ParseNumber<unsigned int>(oOwner->second).value_or(0);
    if (nChannel == 0 || oMetadata.size() > 1)
        RefuseZone(oSidecars, oPlace);
    oSidecars.DeclareMask(nChannel);
}

std::vector<unsigned int> FacetsBeside::GetMathModelList() const
{
    return moDataset.GetSidecars().ListModels();
}

krv::mathmodel::IMathModel* FacetsBeside::GetMathModel(unsigned int nSegment)
{
    return new krv::mathmodel::RpcModel(moDataset.GetSidecars().ReadModel(nSegment));
}

unsigned int FacetsBeside::CreateMathModel(const krv::mathmodel::IMathModel& oModel)
{
    const Place oPlace = Place::Current();
    moDataset.CheckWritingBeside("sensor models cannot be written", oPlace);
    const auto* const poPolynomials = dynamic_cast<const krv::mathmodel::RpcModel*>(&oModel);
    if (poPolynomials == nullptr)
        RefuseBeside("a sensor model of the kind " + oModel.GetName() + " cannot be written", oPlace);
    return moDataset.GetSidecars().SetModel(poPolynomials->GetCoefficients());
}

void FacetsBeside::DeleteMathModel(unsigned int)
{
    RefuseBeside("sensor models cannot be deleted: remove the text beside the file");
}

} // namespace krv::plugins::support
