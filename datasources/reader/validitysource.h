#pragma once

#include "datasources/api.h"
#include "gobs/mask/imaskbuilder.h"
#include "gobs/mask/maskdecision.h"
#include "gobs/raster/margins.h"
#include "toolkit/exceptions/place.h"

#include <cstddef>
#include <memory>
#include <vector>

namespace krv::datasources
{

class AuxiliaryData;
class BasicReader;
class IDataset;
class IRasterReader;

namespace detail
{
class BitmapBackground;
}

// The channel that says how opaque pixels are: the first one whose tag "ColorInterp" is "Alpha", in any letter case; 0
// when there is none.
// Counted from 1. Only the record is looked at.
KRV_DATASOURCES_API unsigned int FindAlpha(const AuxiliaryData& oMetadata);

// Which pixels of an image hold data, by everything that the image declares at once: no-data values, a mask bitmap and
// an alpha channel. A pixel is valid when none of them says otherwise and it lies inside the image; unlike the masks of
// no-data builders a set bit is a valid pixel.
//
// No-data: the values of the channels, alpha aside, as GetTypedNoData reads them, combined by the rule. Mask bitmap:
// the validity mask of IBitmapDataset; its set bits are valid. Masks of single channels, as FindChannelMasks finds
// them: a channel has no data where its own mask or its no-data value says so, one with neither has data everywhere,
// and the rule combines all listed ones. Alpha: the channel that FindAlpha names; values above 0 are valid. One thread
// at a time.
// ReaderValidity puts it to use for rasters of any reader; this is for rasters that come from elsewhere.
class KRV_DATASOURCES_API ValiditySource : public krv::gobs::IMaskBuilder
{
public:
    // For rasters of the listed channels of the dataset (from 1, in the order of the rasters; none: all). The dataset
    // is borrowed and outlives this. Bitmap and alpha are read from it, with each mask. Throws DataException for a null
    // dataset, one without rasters and a text that is no no-data value, OutOfBoundsException for a channel that does
    // not exist.
    // bNoData: without it mask bitmap and alpha alone.
    explicit ValiditySource(IDataset* poDataset, const std::vector<unsigned int>& oChannels = {},
                            krv::gobs::BkgdRule eRule = krv::gobs::eAllChannels, bool bNoData = true);
    // The same by another record than the dataset's own.
    ValiditySource(IDataset* poDataset, const AuxiliaryData& oRecord, const std::vector<unsigned int>& oChannels,
                   krv::gobs::BkgdRule eRule = krv::gobs::eAllChannels, bool bNoData = true);
    // For rasters of a level of that size, or of the image itself, with everything that the dataset says: a pixel of a
    // level is valid by mask bitmap or alpha where any pixel of its box is, by the mask's own level where the dataset
    // holds one of that size. Throws the same.
    ValiditySource(IDataset* poDataset, const std::vector<unsigned int>& oChannels, unsigned int nWidth,
                   unsigned int nHeight, krv::gobs::BkgdRule eRule = krv::gobs::eAllChannels);
    // For rasters of the reader, a level's too: by what its metadata and its channels say. There is no bitmap, and
    // alpha counts only when it is one of the reader's channels. The reader may go away.
    explicit ValiditySource(const IRasterReader& oReader, krv::gobs::BkgdRule eRule = krv::gobs::eAllChannels);
    ~ValiditySource() override;
    ValiditySource(const ValiditySource&) = delete;
    ValiditySource& operator=(const ValiditySource&) = delete;

    // Which sources there are; with none of them every pixel of the image is valid.
    bool HasNoData() const { return mbNoData; }
    bool HasBitmap() const { return mpoBitmap != nullptr || HasChannelMasks(); }
    bool HasChannelMasks() const { return !moChannels.empty(); }
    bool HasAlpha() const { return mpoAlpha != nullptr || mnAlphaInRaster != 0; }
    // The number of the image's mask bitmap; 0 when there is none.
    unsigned int GetBitmap() const { return mnBitmap; }
    // What marks the pixels that the mask of a channel alone says to be background, by its position in the rasters,
    // from 0; null when it has no mask. It goes with this.
    const krv::gobs::IMaskBuilder* GetChannelMask(std::size_t nPosition) const;

    // How the margins of the rasters were made; eMirror when nobody says. Behaviours that copy pixels copy their
    // validity; under the others pixels outside the image are not valid.
    void SetMarginBehaviour(eMarginBehaviour eBehaviour);

    // A new mask over the raster's full extent, owned by the caller. Throws what reading bitmap and alpha throws.
    krv::gobs::Mask* BuildMask(const krv::gobs::Raster& oRaster) const override;

private:
    void FindSize(IDataset* poDataset, const Place& oPlace = Place::Current());
    void FindAll(IDataset& oDataset, const AuxiliaryData& oRecord, const std::vector<unsigned int>& oChannels,
                 krv::gobs::BkgdRule eRule, bool bNoData);
    void FindNoData(const AuxiliaryData& oMetadata, const std::vector<unsigned int>& oChannels, unsigned int nAlpha,
                    krv::gobs::BkgdRule eRule);
    void FindBitmap(IDataset& oDataset, const std::vector<unsigned int>& oChannels);
    std::vector<detail::BitmapBackground*> ListBeside() const;
    std::unique_ptr<krv::gobs::Mask> CombineChannels(const krv::gobs::Raster& oRaster) const;
    void UseAlphaOfRaster(unsigned int nPosition);
    void UseLevel(IDataset& oDataset, unsigned int nWidth, unsigned int nHeight);

    std::unique_ptr<const krv::gobs::IMaskBuilder> mpoNoData;
    std::unique_ptr<const krv::gobs::IMaskBuilder> mpoAlphaOfRaster;
    // Of one listed channel; both may be null.
    struct Channel
    {
        std::unique_ptr<const krv::gobs::IMaskBuilder> mpoNoData;
        std::unique_ptr<detail::BitmapBackground> mpoMask;
    };

    std::unique_ptr<detail::BitmapBackground> mpoBitmap;
    std::unique_ptr<detail::BitmapBackground> mpoAlpha;
    std::vector<Channel> moChannels; // none unless one of them has a mask
    krv::gobs::BkgdRule meRule = krv::gobs::eAllChannels;
    unsigned int mnImageWidth;
    unsigned int mnImageHeight;
    unsigned int mnBitmap = 0;
    unsigned int mnAlphaInRaster = 0; // from 1
    bool mbNoData = false;
    eMarginBehaviour meBehaviour = eMirror;
};

} // namespace krv::datasources
