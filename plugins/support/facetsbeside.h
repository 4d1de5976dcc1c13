#pragma once

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "plugins/support/dataset.h"

#include <string>
#include <vector>

namespace krv::plugins::support
{

// The bitmaps and sensor models of a format whose files have no place for them: those that lie beside. A dataset of
// such a format derives from this as well. Bitmap 1 is the mask of the image, or, where each channel has its own,
// bitmap n is the one of channel n; there are no zones. A new one is declared before it is stored: by an empty
// description the image's, by the tag VALIDITY_OF_CHANNEL, before it is opened, that of a channel. A rational
// polynomial model is written as a text.
// Only for formats without bitmaps and models of their own: one of both would hide the other.
class FacetsBeside : public krv::datasources::IBitmapDataset, public krv::datasources::IMathModelDataset
{
public:
    ~FacetsBeside() override;

    // Looks for the mask file when it is asked first.
    std::vector<unsigned int> GetBitmapList() const override;

    // Several bitmaps come as the channels of one.
    krv::datasources::IRasterIO* GetBitmapIO(const std::vector<unsigned int>& oBitmaps) override;
    // All of them.
    void DeleteBitmap(unsigned int nBitmap) override;

    // Throws DataException unless the dataset writes beside its file.
    unsigned int CreateBitmap() override;
    std::string GetBitmapDescription(unsigned int nBitmap) const override;
    void SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription) override;
    krv::datasources::MetadataMap GetBitmapMetadata(unsigned int nBitmap) const override;
    void SetBitmapMetadata(unsigned int nBitmap, const krv::datasources::MetadataMap& oMetadata) override;
    krv::datasources::IOverviewManager* GetBitmapOverviewManager() override { return nullptr; }

    bool HasMathModel() const override { return !GetMathModelList().empty(); }
    std::vector<unsigned int> GetMathModelList() const override;

    // A new RpcModel, owned by the caller.
    krv::mathmodel::IMathModel* GetMathModel(unsigned int nSegment) override;
    unsigned int CreateMathModel(const krv::mathmodel::IMathModel& oModel) override;
    void DeleteMathModel(unsigned int nSegment) override;

protected:
    // The one that derives from this.
    explicit FacetsBeside(const Dataset* poDataset) : moDataset(*poDataset) {}

private:
    [[noreturn]] void RefuseZone(Sidecars& oSidecars, const Place& oPlace) const;
    [[noreturn]] void RefuseBeside(const std::string& what, const Place& oPlace = Place::Current()) const;
    // The sidecars, which have that mask.
    Sidecars& FindMask(unsigned int nBitmap, const Place& oPlace = Place::Current()) const;

    const Dataset& moDataset; // the object itself, as a dataset
};

} // namespace krv::plugins::support
