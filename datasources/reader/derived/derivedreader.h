#pragma once

#include "datasources/reader/derived/derivedoverviewreaderaccessor.h"
#include "datasources/reader/idatasetaccess.h"
#include "datasources/reader/ivalidityreader.h"
#include "datasources/reader/tiledreader.h"
#include "toolkit/core/ownedorborrowed.h"

#include <memory>

namespace krv::datasources
{

class ReaderValidity;

// The base of readers over another reader, their source. It has tiles and margins of its own; everything else is the
// source's answer until a derived class overrides it: type, channels and record where they differ. A derived class says
// in any case how a raster is filled, by ReadRaster, and how a reader of a level is wrapped. One thread at a time.
// A program that shows pixels otherwise (a filter, an index of two channels) derives from this;
// docs/readers-over-readers.md tells what else to think of.
class KRV_DATASOURCES_API DerivedReader : public TiledReader, public IDatasetAccess, public IValidityReader
{
public:
    ~DerivedReader() override;

    // The tile of the source as it is then.
    void SetOptimalTileSize() override;
    // Passed on to the source, which makes the margins.
    void SetMargins(unsigned int nXMargin, unsigned int nYMargin, eMarginBehaviour eBehaviour) override;

    const std::vector<IChannelInfo*>& GetChannelsInfo() const override { return GetSource().GetChannelsInfo(); }
    IFileFormat* GetFileFormat() const override { return GetSource().GetFileFormat(); }
    AuxiliaryData GetAuxiliaryData() const override;
    krv::ogc::cs::ICRS* GetCRS() const override { return GetSource().GetCRS(); }
    krv::ogc::cs::GeocodingInfo* GetGeocodingInfo() const override { return GetSource().GetGeocodingInfo(); }
    // The levels of the source, each reader wrapped; null without a wrapping.
    IOverviewReaderAccessor* GetOverviewReaderAccessor() override;
    unsigned int GetWidth() const override { return GetSource().GetWidth(); }
    unsigned int GetHeight() const override { return GetSource().GetHeight(); }
    unsigned int GetChansCount() const override { return GetSource().GetChansCount(); }
    const krv::gobs::DataType& GetDataType() const override { return GetSource().GetDataType(); }

    // What the source stands on; null and no channels over a reader that does not show it.
    IDataset* GetDataset() const override;
    const std::vector<unsigned int>& GetChannels() const override;

    // A pixel is valid where the source's is. For that the source is read once more; a class that reads it anyway, or
    // that makes a pixel of others, overrides both.
    bool HasValidity() override;
    std::unique_ptr<krv::gobs::Mask> ReadValid(krv::gobs::Raster& oRaster) override;

protected:
    // No source, no tiles, no margins, eMirror. A derived class sets its source before anything else is called.
    DerivedReader();
    // Shares source, grid and margins, whose last owner releases what is owned.
    DerivedReader(const DerivedReader& oOther);

    // Takes the source's size and its tile.
    // Called by the constructor of the derived class. Not null.
    void SetSource(OwnedOrBorrowed<IRasterReader> oSource);
    IRasterReader& GetSource() const { return **mpoSource; }
    // Whether the source goes with this reader.
    void OwnSource(bool bOwned) { mpoSource->get_deleter().mbOwned = bOwned; }
    // Of the source.
    ReaderValidity& GetSourceValidity();
    // For a derived class whose source stands on something that goes with the class: ends the source, or this reader's
    // part in it, after which nothing may be called.
    void DropSource();

    // How the reader of a level becomes one of this kind; holds nothing of this reader. None unless overridden.
    virtual LevelWrapper GetLevelWrapper() const;

private:
    std::shared_ptr<OwnedOrBorrowed<IRasterReader>> mpoSource; // null only inside
    std::unique_ptr<ReaderValidity> mpoValidity;               // made when it is asked for
};

} // namespace krv::datasources
