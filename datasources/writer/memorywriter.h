#pragma once

#include "datasources/datasets/memorydataset.h"
#include "datasources/writer/basicwriter.h"

#include <memory>

namespace krv::datasources
{

// Writes an image in memory, for results that need no file, and hands it on as a dataset without a copy. The image is
// laid out by CreateNewFile, or by the constructor that takes a description; channels of several types are written
// through MultiTypeWriter over a MemoryDataset.
// Example: MemoryWriter oResult(RasterInfo(500, 500, 1, eDT_32R)); ... BasicReader oReader(oResult.Share().release(),
// {}, true);
class KRV_DATASOURCES_API MemoryWriter : public BasicWriter
{
public:
    // Without an image yet: CreateNewFile makes it.
    explicit MemoryWriter(const MemoryOptions& oOptions = {});
    explicit MemoryWriter(const krv::gobs::RasterInfo& oInfo, const MemoryOptions& oOptions = {});
    ~MemoryWriter() override;

    // What was and will be written, as a dataset of its own; it may outlive the writer.
    // No pixel is copied: both see the same.
    std::unique_ptr<IDataset> Share() const;
    // The bytes of all pixels that there are.
    std::uint64_t GetBytes() const;

private:
    MemoryDataset& Get() const;
};

} // namespace krv::datasources
