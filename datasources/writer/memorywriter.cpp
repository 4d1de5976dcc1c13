#include "datasources/writer/memorywriter.h"

#include "gobs/raster/rasterinfo.h"

namespace krv::datasources
{

MemoryWriter::MemoryWriter(const MemoryOptions& oOptions)
{
    SetDataset(new MemoryDataset(oOptions), {}, true);
}

MemoryWriter::MemoryWriter(const krv::gobs::RasterInfo& oInfo, const MemoryOptions& oOptions) : MemoryWriter(oOptions)
{
    BasicWriter::CreateNewFile(oInfo);
}

MemoryWriter::~MemoryWriter() = default;

MemoryDataset& MemoryWriter::Get() const
{
    return static_cast<MemoryDataset&>(*GetDataset());
}

std::unique_ptr<IDataset> MemoryWriter::Share() const
{
    return Get().Share();
}

std::uint64_t MemoryWriter::GetBytes() const
{
    return Get().GetBytes();
}

} // namespace krv::datasources
