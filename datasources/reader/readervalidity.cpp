#include "datasources/reader/readervalidity.h"

#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/reader/idatasetaccess.h"
#include "datasources/reader/irasterreader.h"
#include "datasources/reader/ivalidityreader.h"
#include "datasources/reader/rasteraccess.h"
#include "datasources/reader/validitysource.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"

namespace krv::datasources
{

namespace
{

std::unique_ptr<ValiditySource> MakeSource(const IRasterReader& oReader, krv::gobs::BkgdRule eRule)
{
    const auto* const poAccess = dynamic_cast<const IDatasetAccess*>(&oReader);
    IDataset* const poDataset = poAccess != nullptr ? poAccess->GetDataset() : nullptr;
    const auto* const poPlain = dynamic_cast<const RasterAccess*>(&oReader);
    const bool bBitmaps = poPlain != nullptr && poPlain->IsOfBitmaps();
    if (dynamic_cast<IRasterDataset*>(poDataset) == nullptr || bBitmaps)
        return std::make_unique<ValiditySource>(oReader, eRule);
    return std::make_unique<ValiditySource>(poDataset, poAccess->GetChannels(), oReader.GetWidth(), oReader.GetHeight(),
                                            eRule);
}

} // namespace

ReaderValidity::ReaderValidity(IRasterReader& oReader, krv::gobs::BkgdRule eRule)
    : moReader(oReader), mpoFacet(dynamic_cast<IValidityReader*>(&oReader))
{
    if (mpoFacet == nullptr)
        mpoSource = MakeSource(oReader, eRule);
    mbNeeded = mpoFacet != nullptr ? mpoFacet->HasValidity()
                                   : mpoSource->HasNoData() || mpoSource->HasBitmap() || mpoSource->HasAlpha();
}

ReaderValidity::~ReaderValidity() = default;

bool ReaderValidity::IsByValues() const
{
    return mpoSource != nullptr && !mpoSource->HasBitmap() && !mpoSource->HasAlpha();
}

std::unique_ptr<krv::gobs::Mask> ReaderValidity::Read(krv::gobs::Raster& oRaster)
{
    if (mbNeeded && mpoFacet != nullptr)
        return mpoFacet->ReadValid(oRaster);
    moReader.ReadRaster(&oRaster);
    if (!mbNeeded)
        return nullptr;
    mpoSource->SetMarginBehaviour(moReader.GetMarginBehaviour());
    return std::unique_ptr<krv::gobs::Mask>(mpoSource->BuildMask(oRaster));
}

} // namespace krv::datasources
