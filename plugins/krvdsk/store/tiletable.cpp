#include "plugins/krvdsk/store/tiletable.h"

#include "plugins/krvdsk/store/bytes.h"
#include "plugins/krvdsk/store/storewriter.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <utility>

namespace krv::plugins::krvdsk
{

namespace
{

constexpr unsigned int PAGE_BITS = 8;

} // namespace

TileTable::TileTable(std::uint64_t nTiles, const Entry& oTop, std::string what)
    : mnTiles(nTiles), moWhat(std::move(what))
{
    for (std::uint64_t nLeft = nTiles; nLeft > 1; nLeft = (nLeft - 1) / PAGE_ENTRIES + 1)
        ++mnHeights;
    moTop.moTiles.push_back({oTop, 0, false});
    moTop.moChildren.resize(mnHeights == 0 ? 0 : 1);
}

std::uint64_t TileTable::CountEntries(unsigned int nHeight, std::uint64_t nPage) const
{
    std::uint64_t nEntries = mnTiles;
    for (unsigned int nAt = 0; nAt < nHeight; ++nAt)
        nEntries = (nEntries - 1) / PAGE_ENTRIES + 1;
    return std::min(PAGE_ENTRIES, nEntries - nPage * PAGE_ENTRIES);
}

std::unique_ptr<TileTable::Node> TileTable::MakeNode(unsigned int nHeight, std::uint64_t nPage) const
{
    auto poNode = std::make_unique<Node>();
    poNode->moTiles.resize(CountEntries(nHeight, nPage));
    poNode->moChildren.resize(nHeight == 0 ? 0 : poNode->moTiles.size());
    return poNode;
}

std::unique_ptr<TileTable::Node> TileTable::ReadNode(const StoreFile& oStore, const Entry& oEntry, unsigned int nHeight,
                                                     std::uint64_t nPage) const
{
    const std::string what = "the index of " + moWhat;
    std::unique_ptr<Node> poNode = MakeNode(nHeight, nPage);
    if (oEntry.mnBytes != poNode->moTiles.size() * Entry::BYTES)
        oStore.Fail(what + " is damaged: a page has " + std::to_string(oEntry.mnBytes) + " bytes");
    const std::vector<unsigned char> oBytes = oStore.Read(oEntry, what);
    BytesReader oReader(oBytes, oStore.GetName(), what);
    for (Tile& oTile : poNode->moTiles)
        oTile.moEntry = oReader.ReadEntry();
    return poNode;
}

TileTable::Node* TileTable::Load(const StoreFile& oStore, Node& oParent, std::size_t nSlot, unsigned int nHeight,
                                 std::uint64_t nPage)
{
    std::unique_ptr<Node>& poChild = oParent.moChildren[nSlot];
    const Entry& oEntry = oParent.moTiles[nSlot].moEntry;
    if (!poChild && oEntry.IsStored())
        poChild = ReadNode(oStore, oEntry, nHeight, nPage);
    return poChild.get();
}

const TileTable::Tile* TileTable::Find(const StoreFile& oStore, std::uint64_t nTile)
{
    const std::uint64_t nPage = nTile / PAGE_ENTRIES;
    if (mnHeights != 0 && nPage != mnLastPage)
    {
        Node* pNode = &moTop;
        std::size_t nSlot = 0;
        for (unsigned int nHeight = mnHeights; nHeight-- > 0 && pNode != nullptr;)
        {
            const std::uint64_t nAt = nTile >> (PAGE_BITS * (nHeight + 1));
            pNode = Load(oStore, *pNode, nSlot, nHeight, nAt);
            nSlot = nTile >> (PAGE_BITS * nHeight) & (PAGE_ENTRIES - 1);
        }
        if (pNode == nullptr)
            return nullptr;
        mpLastPage = pNode;
        mnLastPage = nPage;
    }
    const Tile& oTile = mnHeights == 0 ? moTop.moTiles.front() : mpLastPage->moTiles[nTile % PAGE_ENTRIES];
    return oTile.moEntry.IsStored() ? &oTile : nullptr;
}

void TileTable::Set(const StoreFile& oStore, std::uint64_t nTile, const Tile& oNew)
{
    // All pages on the way are there before any of them changes.
    std::vector<Node*> oWay = {&moTop};
    std::size_t nSlot = 0;
    for (unsigned int nHeight = mnHeights; nHeight-- > 0;)
    {
        const std::uint64_t nPage = nTile >> (PAGE_BITS * (nHeight + 1));
        Node* pNode = Load(oStore, *oWay.back(), nSlot, nHeight, nPage);
        if (pNode == nullptr)
        {
            oWay.back()->moChildren[nSlot] = MakeNode(nHeight, nPage);
            pNode = oWay.back()->moChildren[nSlot].get();
        }
        oWay.push_back(pNode);
        nSlot = nTile >> (PAGE_BITS * nHeight) & (PAGE_ENTRIES - 1);
    }
    for (Node* pNode : oWay)
        pNode->mbChanged = true;
    oWay.back()->moTiles[nSlot] = oNew;
}

// A page is settled once its new place stands in the one above, which is still to be written: what fails on the way
// goes on where it stopped.
void TileTable::WriteChildren(StoreWriter& oWriter, Node& oNode)
{
    for (std::size_t nSlot = 0; nSlot < oNode.moChildren.size(); ++nSlot)
    {
        Node* const pChild = oNode.moChildren[nSlot].get();
        if (pChild == nullptr || !pChild->mbChanged)
            continue;
        WriteChildren(oWriter, *pChild);
        BytesWriter oBytes;
        for (const Tile& oTile : pChild->moTiles)
            oBytes.AddEntry(oTile.moEntry);
        Tile& oPage = oNode.moTiles[nSlot];
        oWriter.Replace(oPage.moEntry, oPage.mnGeneration, oBytes.GetBytes());
        pChild->mbChanged = false;
    }
}

void TileTable::WritePages(StoreWriter& oWriter)
{
    WriteChildren(oWriter, moTop);
    moTop.mbChanged = false;
}

void TileTable::Walk(const StoreFile& oStore, bool bKeep, const Visit& oVisit, const Complain& oComplain, Node& oNode,
                     unsigned int nHeight, std::uint64_t nFirst)
{
    for (std::size_t nSlot = 0; nSlot < oNode.moTiles.size(); ++nSlot)
    {
        const std::uint64_t nAt = nFirst + nSlot;
        if (nHeight == 0)
        {
            if (oNode.moTiles[nSlot].moEntry.IsStored())
                oVisit(oNode.moTiles[nSlot], nAt);
            continue;
        }
        std::unique_ptr<Node>& poChild = oNode.moChildren[nSlot];
        const bool bLoaded = poChild != nullptr;
        if (!bLoaded && !oNode.moTiles[nSlot].moEntry.IsStored())
            continue;
        try
        {
            // A page that was never written has no place yet.
            if (oNode.moTiles[nSlot].moEntry.IsStored())
                oVisit(oNode.moTiles[nSlot], UINT64_MAX);
            if (!bLoaded)
                poChild = ReadNode(oStore, oNode.moTiles[nSlot].moEntry, nHeight - 1, nAt);
        }
        catch (const krv::FileException& oError)
        {
            if (!oComplain)
                throw;
            oComplain(oError.GetMessage());
            continue;
        }
        Walk(oStore, bKeep, oVisit, oComplain, *poChild, nHeight - 1, nAt * PAGE_ENTRIES);
        if (!bLoaded && !bKeep)
            poChild.reset();
    }
}

void TileTable::ForEach(const StoreFile& oStore, bool bKeep, const Visit& oVisit, const Complain& oComplain)
{
    Walk(oStore, bKeep, oVisit, oComplain, moTop, mnHeights, 0);
}

void TileTable::ForEach(const StoreFile& oStore, bool bKeep, const Visit& oVisit)
{
    ForEach(oStore, bKeep, oVisit, {});
}

} // namespace krv::plugins::krvdsk
