#include "toolkit/cache/tilestore.h"

#include "toolkit/cache/detail/store.h"

#include <algorithm>
#include <utility>

#include <unistd.h>

namespace krv::cache
{

using detail::Entry;
using detail::Store;

TileStore::TileStore(std::unique_ptr<Store> poStore) : mpoStore(std::move(poStore)) {}

TileStore::TileStore(std::uint64_t nBudget) : mpoStore(std::make_unique<Store>(nBudget)) {}

TileStore::~TileStore() = default;

// Never destroyed: datasets that live as long as the program go after everything else.
TileStore& TileStore::Process()
{
    static TileStore* const poStore = new TileStore(std::make_unique<Store>(detail::Ledger::Process()));
    return *poStore;
}

std::uint64_t TileStore::GetDefaultBudget()
{
    const auto nPages = static_cast<std::uint64_t>(std::max(0l, ::sysconf(_SC_PHYS_PAGES)));
    const auto nPageBytes = static_cast<std::uint64_t>(std::max(0l, ::sysconf(_SC_PAGESIZE)));
    return std::clamp<std::uint64_t>(nPages / 4 * nPageBytes, 1, std::uint64_t{1} << 30);
}

void TileStore::SetBudget(std::uint64_t nBytes)
{
    detail::Ledger& oLedger = mpoStore->GetLedger();
    oLedger.SetBudget(std::max<std::uint64_t>(1, nBytes));
    oLedger.TrimRasters();
    mpoStore->Settle();
}

std::uint64_t TileStore::GetBudget() const
{
    return mpoStore->GetLedger().GetBudget();
}

TileStatistics TileStore::GetStatistics() const
{
    return mpoStore->GetStatistics();
}

void TileStore::ResetStatistics()
{
    mpoStore->ResetStatistics();
}

void TileStore::Clear()
{
    mpoStore->Clear();
}

TileHold::TileHold(Store& oStore, Entry* poEntry, const TileArea& oArea) : mpoStore(&oStore), mpoEntry(poEntry)
{
    mpFirst = mpoEntry->Locate(oArea, mnPitch);
}

TileHold::TileHold(TileHold&& oOther) noexcept
{
    *this = std::move(oOther);
}

TileHold& TileHold::operator=(TileHold&& oOther) noexcept
{
    std::swap(mpoStore, oOther.mpoStore);
    std::swap(mpoEntry, oOther.mpoEntry);
    std::swap(mpFirst, oOther.mpFirst);
    std::swap(mnPitch, oOther.mnPitch);
    return *this;
}

TileHold::~TileHold()
{
    if (mpoEntry != nullptr)
        mpoStore->Release(mpoEntry);
}

TileClaim::TileClaim(Store& oStore, Entry* poEntry) : mpoStore(&oStore), mpoEntry(poEntry) {}

TileClaim::TileClaim(TileClaim&& oOther) noexcept
{
    *this = std::move(oOther);
}

TileClaim& TileClaim::operator=(TileClaim&& oOther) noexcept
{
    std::swap(mpoStore, oOther.mpoStore);
    std::swap(mpoEntry, oOther.mpoEntry);
    return *this;
}

TileClaim::~TileClaim()
{
    if (mpoEntry != nullptr)
        End(Entry::eWithheld, nullptr);
}

unsigned char* TileClaim::GetBytes() const
{
    return mpoEntry->moMemory.Get();
}

TileHold TileClaim::Publish(const TileArea& oArea)
{
    mpoStore->Finish(*mpoEntry, Entry::eReady, nullptr);
    return TileHold(*mpoStore, std::exchange(mpoEntry, nullptr), oArea);
}

TileHold TileClaim::Withhold(const TileArea& oArea)
{
    mpoStore->Finish(*mpoEntry, Entry::eWithheld, nullptr);
    return TileHold(*mpoStore, std::exchange(mpoEntry, nullptr), oArea);
}

// What ends without an exception that could be told, as a thread that is cancelled does, is as if it had not begun.
void TileClaim::Fail(const std::exception_ptr& oFailure) noexcept
{
    End(oFailure ? Entry::eFailed : Entry::eWithheld, oFailure);
}

void TileClaim::End(int nState, const std::exception_ptr& oFailure) noexcept
{
    Entry* const poEntry = std::exchange(mpoEntry, nullptr);
    mpoStore->Finish(*poEntry, static_cast<Entry::State>(nState), oFailure);
    mpoStore->Release(poEntry);
}

TileOwner::TileOwner(TileStore& oStore, TileLayer eLayer)
    : moStore(*oStore.mpoStore), mpoState(moStore.AddOwner(eLayer))
{
}

TileOwner::TileOwner(const std::string& identity, TileStore& oStore, TileLayer eLayer)
    : moStore(*oStore.mpoStore), mpoState(moStore.AddOwner(identity, eLayer))
{
}

TileOwner::~TileOwner()
{
    moStore.RemoveOwner(mpoState);
}

TileHold TileOwner::Find(const TileRequest& oRequest, Wait eWait) const
{
    if (IsEmpty())
        return {};
    Entry* const poEntry = moStore.Search(mpoState, oRequest, false, eWait == Wait::eYes).mpoTile;
    return poEntry == nullptr ? TileHold() : TileHold(moStore, poEntry, oRequest.moArea);
}

TileLook TileOwner::Look(const TileRequest& oRequest, Wait eWait) const
{
    const Store::Result oResult = moStore.Search(mpoState, oRequest, true, eWait == Wait::eYes);
    if (oResult.mpoTile != nullptr)
        return {TileHold(moStore, oResult.mpoTile, oRequest.moArea), {}};
    return oResult.mpoMake == nullptr ? TileLook() : TileLook{{}, TileClaim(moStore, oResult.mpoMake)};
}

void TileOwner::Retire(const TileName& oName, const TileFrame& oFrame) const
{
    if (!IsEmpty())
        moStore.Retire(*mpoState, oName, oFrame);
}

void TileOwner::Drop(const TileName& oName) const
{
    if (!IsEmpty())
        moStore.Drop(*mpoState, oName);
}

void TileOwner::DropAll() const
{
    moStore.DropAll(mpoState);
}

bool TileOwner::IsEmpty() const
{
    return mpoState->mnTiles.load(std::memory_order_relaxed) == 0;
}

TileCharge::TileCharge(TileStore& oStore) : moStore(*oStore.mpoStore) {}

TileCharge::~TileCharge()
{
    moStore.GetLedger().Remove(mnBytes);
}

void TileCharge::Set(std::size_t nBytes)
{
    detail::Ledger& oLedger = moStore.GetLedger();
    if (nBytes > mnBytes)
        oLedger.Add(nBytes - mnBytes);
    else
        oLedger.Remove(mnBytes - nBytes);
    mnBytes = nBytes;
    moStore.Settle();
}

} // namespace krv::cache
