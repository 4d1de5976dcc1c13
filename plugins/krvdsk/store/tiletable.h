#pragma once

#include "plugins/krvdsk/store/entry.h"
#include "plugins/krvdsk/store/storefile.h"

#include <array>
#include <bitset>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace krv::plugins::krvdsk
{

class StoreWriter;

// Where the tiles of one plane of one image lie: a tree of pages of up to 256 entries, of which as many are in memory
// as were asked for. Pages are never overwritten in the file: those that changed are written anew, up to the one entry
// that the directory keeps. One thread at a time.
class TileTable
{
public:
    static constexpr std::uint64_t PAGE_ENTRIES = 256;

    // An entry with what is known of it in memory only.
    struct Tile
    {
        Entry moEntry;
        std::uint64_t mnGeneration = 0; // of the room, see support::Space
        bool mbVerified = false;        // its checksum was found right
    };

    // nTiles: at least 1. oTop: of all pages, as the directory has it. what: the tiles, for messages.
    TileTable(std::uint64_t nTiles, const Entry& oTop, std::string what);

    std::uint64_t GetTileCount() const { return mnTiles; }
    const std::string& Describe() const { return moWhat; }
    // What messages call it, when channels before it come or go.
    void SetDescription(std::string what) { moWhat = std::move(what); }
    const Entry& GetTop() const { return moTop.moTiles.front().moEntry; }

    // Null for a tile that is not stored. Valid until the table changes. Throws FileFormatException for a damaged page.
    const Tile* Find(const StoreFile& oStore, std::uint64_t nTile);
    void SetVerified(const Tile& oTile) { const_cast<Tile&>(oTile).mbVerified = true; }
    void Set(const StoreFile& oStore, std::uint64_t nTile, const Tile& oNew);

    // Writes the pages that changed.
    void WritePages(StoreWriter& oWriter);
    bool IsChanged() const { return moTop.mbChanged; }
    void Touch() { moTop.mbChanged = true; }
    // Whether nothing is stored, or on its way.
    bool IsEmpty() const { return !GetTop().IsStored() && !moTop.mbChanged; }

    // Every stored page and tile, pages before what they name. nTile: UINT64_MAX for a page. Pages that are not in
    // memory are read, and dropped again unless bKeep is set.
    using Visit = std::function<void(Tile& oTile, std::uint64_t nTile)>;
    void ForEach(const StoreFile& oStore, bool bKeep, const Visit& oVisit);
    // The same for a page of which the callers wants to know what is wrong instead of an exception.
    using Complain = std::function<void(const std::string& what)>;
    void ForEach(const StoreFile& oStore, bool bKeep, const Visit& oVisit, const Complain& oComplain);

private:
    struct Node
    {
        std::vector<Tile> moTiles;
        std::vector<std::unique_ptr<Node>> moChildren; // empty for pages of tiles
        bool mbChanged = false;
    };

    // Entries of the page with a number at a height: 0 for those of tiles.
    std::uint64_t CountEntries(unsigned int nHeight, std::uint64_t nPage) const;
    Node* Load(const StoreFile& oStore, Node& oParent, std::size_t nSlot, unsigned int nHeight, std::uint64_t nPage);
    std::unique_ptr<Node> MakeNode(unsigned int nHeight, std::uint64_t nPage) const;
    std::unique_ptr<Node> ReadNode(const StoreFile& oStore, const Entry& oEntry, unsigned int nHeight,
                                   std::uint64_t nPage) const;
    void WriteChildren(StoreWriter& oWriter, Node& oNode);
    void Walk(const StoreFile& oStore, bool bKeep, const Visit& oVisit, const Complain& oComplain, Node& oNode,
              unsigned int nHeight, std::uint64_t nFirst);

    std::uint64_t mnTiles;
    unsigned int mnHeights = 0; // of pages one above the other
    std::string moWhat;
    Node moTop; // of one entry, which is not a page
    // The page of tiles that was asked for last.
    Node* mpLastPage = nullptr;
    std::uint64_t mnLastPage = UINT64_MAX;
};

} // namespace krv::plugins::krvdsk
