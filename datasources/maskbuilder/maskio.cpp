#include "datasources/maskbuilder/maskio.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/maskbuilder/bitmapmaskbuilder.h"
#include "datasources/writer/basicwriter.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"

#include <exception>
#include <vector>

namespace krv::datasources
{

namespace
{

// A bitmap that is made for a mask and goes again when the mask cannot be stored.
class NewBitmap
{
public:
    explicit NewBitmap(IBitmapDataset& oDataset) : moDataset(oDataset), mnNumber(oDataset.CreateBitmap()) {}
    NewBitmap(const NewBitmap&) = delete;
    NewBitmap& operator=(const NewBitmap&) = delete;
    ~NewBitmap()
    {
        try
        {
            if (!mbKept)
                moDataset.DeleteBitmap(mnNumber);
        }
        catch (const std::exception&)
        {
            // What kept the mask from being stored is told already.
        }
    }

    unsigned int GetNumber() const { return mnNumber; }
    void Keep() { mbKept = true; }

private:
    IBitmapDataset& moDataset;
    unsigned int mnNumber;
    bool mbKept = false;
};

void StoreMask(IBitmapDataset& oDataset, const krv::gobs::Mask& oMask, unsigned int nBitmap)
{
    BasicWriter oWriter(&oDataset, std::vector<unsigned int>{nBitmap});
    if (!oWriter.FileExists())
        throw krv::DataException("Unable to create bitmap, file doesn't exist.", Place::None());
    krv::gobs::Raster oRaster({oMask.GetWidth(), oMask.GetHeight(), 1, krv::gobs::eDT_8U}, oMask.GetContext());
    oMask.RetrieveRaster(oRaster);
    oWriter.WriteRaster(&oRaster);
}

} // namespace

krv::gobs::Mask* ReadMask(IBitmapDataset& oDataset, unsigned int nBitmap, krv::gobs::RasterInfo& oInfo,
                          krv::gobs::RasterContext& oContext)
{
    return BitmapMaskBuilder(&oDataset, nBitmap, false).BuildMask(oInfo, oContext);
}

unsigned int WriteMask(IBitmapDataset& oDataset, const krv::gobs::Mask& oMask, int nBitmap)
{
    const auto* const poRoot = dynamic_cast<const IDataset*>(&oDataset);
    if (poRoot == nullptr)
        throw krv::DataException("Dataset is not Valid.", Place::None()); // the capital is intended
    if (!poRoot->Exists())
        throw krv::DataException("Dataset doesn't exist.", Place::None());
    if (nBitmap >= 1)
    {
        StoreMask(oDataset, oMask, static_cast<unsigned int>(nBitmap));
        return static_cast<unsigned int>(nBitmap);
    }
    NewBitmap oNew(oDataset);
    StoreMask(oDataset, oMask, oNew.GetNumber());
    oNew.Keep();
    return oNew.GetNumber();
}

} // namespace krv::datasources
