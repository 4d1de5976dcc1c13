#pragma once

#include "datasources/api.h"
#include "datasources/interfaces/metadatamap.h"

#include <map>
#include <string>
#include <vector>

namespace krv::datasources
{

class IOverviewManager;
class IRasterIO;

// The bitmaps (masks) of a dataset, of the image's size, each with a number from 1 that it keeps. Bits are handed out
// and taken as they are stored, one byte per pixel: reading gives 0 or 1, writing takes any byte but 0 as set. The
// order of the virtual operations is public and fixed.
//
// A bitmap with a description is a zone: somebody's selection of pixels, which changes nothing else. One without says
// which pixels are valid. The validity mask of the image is the one of these with the lowest number; its set bits are
// the valid pixels, and ValiditySource, levels, statistics and pictures honour it. A bitmap is made the validity mask
// by SetBitmapDescription with an empty text, and made a zone again by any other text; CreateBitmap makes zones. A
// format stores the two kinds so that other readers do not take a zone for validity. A zone whose metadata have the
// number of a channel under VALIDITY_OF_CHANNEL says which pixels of that channel are valid; ValiditySource honours
// these beside the mask of the image.
inline constexpr char VALIDITY_OF_CHANNEL[] = "ValidityOfChannel";

// Example, the validity mask of a file that was opened for update:
//   const unsigned int nMask = poBitmaps->CreateBitmap();
//   poBitmaps->SetBitmapDescription(nMask, "");
//   WriteMask(*poBitmaps, oMask, nMask);
class KRV_DATASOURCES_API IBitmapDataset
{
public:
    virtual ~IBitmapDataset();

    // The numbers of the existing bitmaps, ascending.
    virtual std::vector<unsigned int> GetBitmapList() const = 0;
    // A new 8-bit unsigned I/O object over the listed bitmaps, owned by the caller; the dataset outlives it. Throws
    // DataException for a number that is not in the list.
    virtual IRasterIO* GetBitmapIO(const std::vector<unsigned int>& oBitmaps) = 0;
    // Takes the bitmap and its levels out of the file; the others keep their numbers. Throws DataException for a number
    // that is not in the list and for a dataset that is not open for updating, as the operations below do.
    virtual void DeleteBitmap(unsigned int nBitmap) = 0;
    // Adds a zone, all clear and with a description of the format's choice, and returns its number.
    virtual unsigned int CreateBitmap() = 0;
    // Empty for a bitmap that says which pixels are valid. Throws DataException for a number that is not in the list.
    virtual std::string GetBitmapDescription(unsigned int nBitmap) const = 0;
    // Decides the kind of the bitmap as well; the pixels stay.
    virtual void SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription) = 0;
    // The tags of the bitmap itself, empty when it has none. Throws DataException for a number that is not in the list.
    virtual MetadataMap GetBitmapMetadata(unsigned int nBitmap) const = 0;
    // Replaces all tags of the bitmap. Throws DataException where the format has no place for them.
    virtual void SetBitmapMetadata(unsigned int nBitmap, const MetadataMap& oMetadata) = 0;
    // The levels of the bitmaps, with bitmap numbers for channels; a new object that the caller deletes, or null. A
    // format may have levels of the validity mask alone.
    virtual IOverviewManager* GetBitmapOverviewManager() = 0;
};

// The number of the validity mask; 0 when there is none.
// Asks for list and descriptions; no pixel is read.
KRV_DATASOURCES_API unsigned int FindValidityMask(const IBitmapDataset& oBitmaps);
// The bitmaps that say it of single channels, by the number of the channel; of several the one with the lowest number.
// Tags that are no number of a channel count for nothing.
KRV_DATASOURCES_API std::map<unsigned int, unsigned int> FindChannelMasks(const IBitmapDataset& oBitmaps);
// What such a bitmap is called where nobody gave it a name.
KRV_DATASOURCES_API std::string NameChannelMask(unsigned int nChannel);

} // namespace krv::datasources
