#include "datasources/reader/derived/derivedreader.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/readervalidity.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"

#include <utility>

namespace krv::datasources
{

DerivedReader::DerivedReader() : mpoSource(std::make_shared<OwnedOrBorrowed<IRasterReader>>()) {}
DerivedReader::DerivedReader(const DerivedReader& oOther)
    : IRasterReader(oOther), TiledReader(oOther), IDatasetAccess(oOther), IValidityReader(oOther),
      mpoSource(oOther.mpoSource)
{
}
DerivedReader::~DerivedReader() = default;

void DerivedReader::SetSource(OwnedOrBorrowed<IRasterReader> oSource)
{
    SetGrid(oSource->GetWidth(), oSource->GetHeight(), oSource->GetTileWidth(), oSource->GetTileHeight());
    mpoValidity.reset();
    *mpoSource = std::move(oSource);
}

void DerivedReader::DropSource()
{
    mpoValidity.reset();
    mpoSource.reset();
}

void DerivedReader::SetOptimalTileSize()
{
    SetTileSize(GetSource().GetTileWidth(), GetSource().GetTileHeight());
}

void DerivedReader::SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour)
{
    KeepMargins(GetXMargin(), GetYMargin(), eBehaviour); // stays where the widths are refused, as in the source
    GetSource().SetMargins(nXMargin, nYMargin, eBehaviour);
    KeepMargins(nXMargin, nYMargin, eBehaviour);
}

AuxiliaryData DerivedReader::GetAuxiliaryData() const
{
    return GetSource().GetAuxiliaryData();
}

LevelWrapper DerivedReader::GetLevelWrapper() const
{
    return nullptr;
}

IOverviewReaderAccessor* DerivedReader::GetOverviewReaderAccessor()
{
    LevelWrapper oWrap = GetLevelWrapper();
    if (!oWrap)
        return nullptr;
    std::unique_ptr<IOverviewReaderAccessor> oLevels(GetSource().GetOverviewReaderAccessor());
    if (oLevels == nullptr)
        return nullptr;
    return new DerivedOverviewReaderAccessor(std::move(oLevels), std::move(oWrap));
}

IDataset* DerivedReader::GetDataset() const
{
    const auto* const poAccess = dynamic_cast<const IDatasetAccess*>(&GetSource());
    return poAccess != nullptr ? poAccess->GetDataset() : nullptr;
}

const std::vector<unsigned int>& DerivedReader::GetChannels() const
{
    static const std::vector<unsigned int> NONE;
    const auto* const poAccess = dynamic_cast<const IDatasetAccess*>(&GetSource());
    return poAccess != nullptr ? poAccess->GetChannels() : NONE;
}

ReaderValidity& DerivedReader::GetSourceValidity()
{
    if (mpoValidity == nullptr)
        mpoValidity = std::make_unique<ReaderValidity>(GetSource());
    return *mpoValidity;
}

bool DerivedReader::HasValidity()
{
    return GetSourceValidity().IsNeeded();
}

std::unique_ptr<krv::gobs::Mask> DerivedReader::ReadValid(krv::gobs::Raster& oRaster)
{
    ReadRaster(&oRaster);
    const IRasterReader& oSource = GetSource();
    krv::gobs::Raster oPixels({oRaster.GetWidth(), oRaster.GetHeight(), oSource.GetChansCount(), oSource.GetDataType()},
                              oRaster.GetContext());
    return GetSourceValidity().Read(oPixels);
}

} // namespace krv::datasources
