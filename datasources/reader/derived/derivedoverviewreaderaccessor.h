#pragma once

#include "datasources/reader/ioverviewaccessor.h"

#include <functional>
#include <memory>
#include <vector>

namespace krv::datasources
{

// Makes a reader over the reader of a level; what it returns owns that one.
// Holds nothing of the reader that gave it.
using LevelWrapper = std::function<std::unique_ptr<IRasterReader>(std::unique_ptr<IRasterReader> poLevel)>;

// The levels of another accessor, each reader wrapped. The accessor outlives every reader that it makes.
// Validity and sizes are the other accessor's; so are its errors.
class KRV_DATASOURCES_API DerivedOverviewReaderAccessor : public IOverviewReaderAccessor
{
public:
    // Without a wrapping a derived class makes the readers itself.
    // poLevels: not null; taken over.
    explicit DerivedOverviewReaderAccessor(std::unique_ptr<IOverviewReaderAccessor> poLevels,
                                           LevelWrapper oWrap = nullptr);
    ~DerivedOverviewReaderAccessor() override;

    std::vector<unsigned int> GetLevels() const override { return mpoLevels->GetLevels(); }
    bool IsValid(unsigned int nChannel, unsigned int nLevel) const override
    {
        return mpoLevels->IsValid(nChannel, nLevel);
    }
    bool IsLevelValid(unsigned int nLevel) const override { return mpoLevels->IsLevelValid(nLevel); }
    AuxiliaryData GetAuxiliaryData(unsigned int nLevel) override;
    unsigned int GetChanCount() const override { return mpoLevels->GetChanCount(); }

    // A new reader, owned by the caller. Throws DataException for a level that is not there.
    IRasterReader* CreateRasterReader(unsigned int nLevel) override;

protected:
    // A reader of the other accessor. Throws DataException when that gives none.
    std::unique_ptr<IRasterReader> OpenWrapped(unsigned int nLevel);
    IOverviewReaderAccessor& GetWrapped() { return *mpoLevels; }

private:
    std::unique_ptr<IOverviewReaderAccessor> mpoLevels;
    LevelWrapper moWrap;
};

} // namespace krv::datasources
