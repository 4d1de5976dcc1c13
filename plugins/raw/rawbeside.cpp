// What lies in files of their own beside a plain file: the facets IBitmapDataset and IMathModelDataset of its dataset.
#include "plugins/raw/rawdataset.h"
#include "plugins/support/image/stackedio.h"
#include "plugins/support/sidecar/modelsidecars.h"
#include "toolkit/mathmodel/rpcmodel.h"

#include <algorithm>

namespace krv::plugins::raw
{

namespace
{

constexpr unsigned int MASK = 1;
constexpr unsigned int TEXT_MODEL = 1; // of support/sidecar
constexpr char NEW_ZONE[] = "Bitmap 1";

} // namespace

std::vector<unsigned int> RawDataset::GetBitmapList() const
{
    return GetSidecars().HasMask() ? std::vector<unsigned int>{MASK} : std::vector<unsigned int>();
}

void RawDataset::CheckBitmap(unsigned int nBitmap, const Place& oPlace) const
{
    if (nBitmap != MASK || !GetSidecars().HasMask())
        Refuse("bitmap " + std::to_string(nBitmap) + " does not exist", oPlace);
}

krv::datasources::IRasterIO* RawDataset::GetBitmapIO(const std::vector<unsigned int>& oBitmaps)
{
    std::vector<std::unique_ptr<krv::datasources::IRasterIO>> oParts;
    for (const unsigned int nBitmap : oBitmaps)
    {
        CheckBitmap(nBitmap, Place::Current());
        oParts.emplace_back(GetSidecars().OpenMask(IsWritten()));
    }
    if (oParts.size() == 1)
        return oParts.front().release();
    return new support::StackedIO(std::move(oParts), 1, 1);
}

void RawDataset::DeleteBitmap(unsigned int nBitmap)
{
    CheckWriting("bitmaps cannot be deleted", Place::Current());
    CheckBitmap(nBitmap, Place::Current());
    GetSidecars().DropMask();
    mbZone = false;
}

unsigned int RawDataset::CreateBitmap()
{
    const Place oPlace = Place::Current();
    CheckWriting("bitmaps cannot be added", oPlace);
    if (GetSidecars().HasMask())
        Refuse("one bitmap, the validity mask, lies beside the file already", oPlace);
    mpoWriter->BeginChange();
    GetSidecars().MakeMask();
    mbZone = true;
    return MASK;
}

std::string RawDataset::GetBitmapDescription(unsigned int nBitmap) const
{
    CheckBitmap(nBitmap, Place::Current());
    return mbZone ? NEW_ZONE : "";
}

// Others would take a zone beside the file for validity.
void RawDataset::SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription)
{
    const Place oPlace = Place::Current();
    CheckWriting("bitmaps cannot be written", oPlace);
    CheckBitmap(nBitmap, oPlace);
    if (!oDescription.empty() && mbZone)
        DeleteBitmap(nBitmap);
    if (!oDescription.empty())
        Refuse("a zone cannot be kept beside the file: a bitmap without a description, the validity mask, can", oPlace);
    mbZone = false;
}

krv::datasources::MetadataMap RawDataset::GetBitmapMetadata(unsigned int nBitmap) const
{
    CheckBitmap(nBitmap, Place::Current());
    return {};
}

void RawDataset::SetBitmapMetadata(unsigned int nBitmap, const krv::datasources::MetadataMap& oMetadata)
{
    CheckBitmap(nBitmap, Place::Current());
    if (!oMetadata.empty())
        Refuse("a mask beside the file has no metadata");
}

std::vector<unsigned int> RawDataset::GetMathModelList() const
{
    const bool bNew = mpoWriter && !mpoWriter->IsNamed();
    std::vector<unsigned int> oList = bNew ? std::vector<unsigned int>() : support::FindModelSidecars(GetFileName());
    if (moModel && std::find(oList.begin(), oList.end(), TEXT_MODEL) == oList.end())
        oList.insert(oList.begin(), TEXT_MODEL);
    return oList;
}

krv::mathmodel::IMathModel* RawDataset::GetMathModel(unsigned int nSegment)
{
    if (moModel && nSegment == TEXT_MODEL)
        return new krv::mathmodel::RpcModel(*moModel);
    return new krv::mathmodel::RpcModel(support::ReadModelSidecar(GetFileName(), nSegment));
}

unsigned int RawDataset::CreateMathModel(const krv::mathmodel::IMathModel& oModel)
{
    const Place oPlace = Place::Current();
    CheckWriting("sensor models cannot be written", oPlace);
    const auto* const poPolynomials = dynamic_cast<const krv::mathmodel::RpcModel*>(&oModel);
    if (poPolynomials == nullptr)
        Refuse("a sensor model of the kind " + oModel.GetName() + " cannot be written", oPlace);
    mpoWriter->BeginChange();
    moModel = poPolynomials->GetCoefficients();
    return TEXT_MODEL;
}

void RawDataset::DeleteMathModel(unsigned int)
{
    Refuse("sensor models cannot be deleted: remove the text beside the file");
}

} // namespace krv::plugins::raw
