#pragma once

#include "plugins/tif/reading/pagelist.h"
#include "plugins/tif/reading/striletable.h"
#include "plugins/tif/writing/createoptions.h"
#include "plugins/tif/writing/taglist.h"

#include "gobs/raster/datatype.h"

#include <cstdint>
#include <cstdlib>
#include <memory>
#include <new>
#include <string>
#include <vector>

namespace krv::plugins::tif
{

// Memory that comes zeroed from the system and that a value is only written to where it differs: the tables of a sparse
// giant take pages for what was stored, not for what could be.
template <typename T>
struct ZeroedAllocator
{
    using value_type = T;

    ZeroedAllocator() = default;
    template <typename Other>
    ZeroedAllocator(const ZeroedAllocator<Other>&)
    {
    }

    T* allocate(std::size_t nCount)
    {
        void* pBlock = std::calloc(nCount, sizeof(T));
        if (pBlock == nullptr)
            throw std::bad_alloc();
        return static_cast<T*>(pBlock);
    }
    void deallocate(T* pBlock, std::size_t) { std::free(pBlock); }
    template <typename... Arguments>
    void construct(T* pValue, Arguments&&... oArguments)
    {
        const T nValue(oArguments...);
        if (*pValue != nValue)
            *pValue = nValue;
    }
    friend bool operator==(const ZeroedAllocator&, const ZeroedAllocator&) { return true; }
};

template <typename T>
using StrileList = std::vector<T, ZeroedAllocator<T>>;

// A page of a file that is being written: its tags, where its strips or tiles lie, and what of it stands in the file.
class PageModel : public IStrileIndex
{
public:
    explicit PageModel(bool bBigEndian) : moTags(bBigEndian) {}
    ~PageModel() override;

    Strile Get(std::uint64_t nIndex) const override;

    std::uint64_t GetStriles() const { return moOffsets.size(); }
    // All of them not stored.
    void SetStriles(std::uint64_t nStriles);
    // In terms of the tags: geometry and role; its offset is the page's number.
    PageSummary Summarise() const;
    bool IsTiled() const { return moTags.Find(322) != nullptr; }
    bool IsChanged() const { return moTags.IsChanged() || mbStrilesChanged || moDirectory.mnBytes == 0; }
    // Strips or tiles that the tags call for.
    std::uint64_t CountStriles() const;
    StrileShape GetShape() const;
    // The tags of the smallest and largest sample.
    bool HasRanges() const;
    void DropRanges();

    std::uint64_t mnNumber = 0; // stays with the page
    TagList moTags;
    StrileList<std::uint64_t> moOffsets;
    StrileList<std::uint64_t> moByteCounts;
    StrileList<std::uint64_t> moRoom;        // bytes taken in the file
    StrileList<std::uint32_t> moGenerations; // of the space that each takes
    bool mbStrilesChanged = false;
    bool mbArraysStale = false; // the arrays in the file are of other types than are written here
    bool mbBelowFirst = false;  // listed by the first page, not in the chain
    bool mbGone = false;        // no page of the file any more

    // In the file: the directory that belongs to the committed state, one written ahead for reading, and the arrays.
    Extent moDirectory;
    std::uint64_t mnNext = 0; // that the committed directory names
    Extent moDraft;
    Extent moOffsetArray;
    Extent moCountArray;
};

// The image that a new file begins with.
struct NewImage
{
    std::uint32_t mnWidth = 0;
    std::uint32_t mnHeight = 0;
    std::uint16_t mnChannels = 1;
    krv::gobs::DataType moType;
};

// Pages without lists of strips and tiles: FileEditor lays those out.

// The page of a new image. Throws DataException for a type or a codec that do not go together.
std::shared_ptr<PageModel> MakeImagePage(const NewImage& oImage, const CreateOptions& oOptions, bool bBigEndian,
                                         const Place& oPlace);

// A page of another size with the layout, the samples and the codec of a page whose tags are all in memory: a level.
std::shared_ptr<PageModel> MakeReducedPage(const PageModel& oFull, std::uint32_t nWidth, std::uint32_t nHeight);

// A page of bits beside the image: a zone, with its name for a description.
std::shared_ptr<PageModel> MakeBitmapPage(const PageModel& oImage, unsigned int nBitmap);
// Makes the page of a bitmap a zone with a description, which is a page of its own to other readers, or without one the
// image's mask. Tags alone: the pixels stay.
void SetBitmapKind(PageModel& oPage, unsigned int nBitmap, const std::string& description);

} // namespace krv::plugins::tif
