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
    const bool bEach = eRule == krv::gobs::eAnyChannel && oReader.GetChansCount() > 1;
    if (mpoFacet == nullptr || bEach)
        mpoSource = MakeSource(oReader, eRule);
    // Values are enough beside the reader's own word, unless channels have masks of their own.
    if (mpoFacet != nullptr && bEach && !mpoSource->HasChannelMasks())
        mpoSource = std::make_unique<ValiditySource>(oReader, eRule);
    const bool bSource =
        mpoSource != nullptr && (mpoSource->HasNoData() || mpoSource->HasBitmap() || mpoSource->HasAlpha());
    if (!bSource)
        mpoSource.reset();
    mbNeeded = bSource || (mpoFacet != nullptr && mpoFacet->HasValidity());
}

ReaderValidity::~ReaderValidity() = default;

bool ReaderValidity::IsByValues() const
{
    return mpoFacet == nullptr && mpoSource != nullptr && !mpoSource->HasBitmap() && !mpoSource->HasAlpha();
}

const krv::gobs::IMaskBuilder* ReaderValidity::GetChannelMask(std::size_t nPosition) const
{
    return mpoSource != nullptr ? mpoSource->GetChannelMask(nPosition) : nullptr;
}

std::unique_ptr<krv::gobs::Mask> ReaderValidity::Read(krv::gobs::Raster& oRaster)
{
    std::unique_ptr<krv::gobs::Mask> poMask;
    if (mbNeeded && mpoFacet != nullptr)
        poMask = mpoFacet->ReadValid(oRaster);
    else
        moReader.ReadRaster(&oRaster);
    if (mpoSource == nullptr)
        return poMask;
    mpoSource->SetMarginBehaviour(moReader.GetMarginBehaviour());
    std::unique_ptr<krv::gobs::Mask> poByValues(mpoSource->BuildMask(oRaster));
    if (poMask == nullptr)
        return poByValues;
    poMask->KeepCommon(*poByValues);
    return poMask;
}

} // namespace krv::datasources
