#pragma once

#include "plugins/tif/reading/rawdirectory.h"

#include <cstdint>
#include <string>
#include <vector>

namespace krv::plugins::tif
{

// A directory as far as its role in the file goes.
struct PageSummary
{
    std::uint64_t mnOffset = 0;
    std::uint64_t mnWidth = 0;
    std::uint64_t mnHeight = 0;
    std::uint64_t mnChannels = 1;
    std::uint64_t mnBits = 1;
    std::uint64_t mnFormat = 1;
    bool mbReduced = false;
    bool mbMask = false;
    bool mbPage = false;       // one of a multi-page file
    bool mbDescribed = false;  // has an image description that is not empty
    bool mbBelowFirst = false; // not of the main chain
    // Of a level its reduction factor, of a bitmap its number, where its name says so; else 0.
    unsigned int mnNumber = 0;
};

// The name (tag 285) by which levels and bitmaps made here keep their numbers.
std::string MakePageName(unsigned int nNumber, bool bLevel);
// 0 for another name.
unsigned int ParsePageName(const std::string& name, bool bLevel);

// All pages of a file, the first one first: the main chain, then the directories that the first page lists below itself
// (what further hangs on those is left alone). A chain that breaks, by a damaged directory, in a circle, or with more
// than MAXIMUM_PAGES, ends there, and what broke it goes to trouble. Throws FileFormatException for a damaged first
// one.
std::vector<PageSummary> ListPages(PeekReader& oReader, const FileHeader& oHeader, std::string& trouble);

constexpr std::size_t MAXIMUM_PAGES = 65535;
constexpr std::size_t MAXIMUM_SUBDIRECTORIES = 4096;
// No longer name gives a page its number.
constexpr std::size_t LONGEST_PAGE_NAME = 32;

// A reduced page of a full-size one.
struct PageLevel
{
    unsigned int mnLevel = 0; // its reduction factor
    PageSummary moPage;
};

// The levels of the first page, ascending: reduced pages of the same channels and type, not masks. The number of a
// level is the one that its name gives, else the ratio of the widths, rounded, at least 2; of two pages with one
// number the larger counts.
std::vector<PageLevel> FindLevels(const std::vector<PageSummary>& oPages);

// The bitmaps: full-size pages of one channel of 1 or 8 bits that are masks, or that are zones: pages whose name says
// that they are bitmaps made here. Each gets the number that its name gives; those without get the smallest that are
// left. The one that reduced masks belong to comes first: the validity mask, which is the mask without a description
// of the lowest number, or else a mask with one, as zones were stored once; the others stand in the order of the file.
std::vector<PageSummary> FindMasks(const std::vector<PageSummary>& oPages);
// The reduced masks; none when there is no mask that they could belong to.
std::vector<PageLevel> FindMaskLevels(const std::vector<PageSummary>& oPages);

// Pages of the main chain that are none of these and not reduced: further images.
unsigned int CountFurtherImages(const std::vector<PageSummary>& oPages);

} // namespace krv::plugins::tif
