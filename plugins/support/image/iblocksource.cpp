#include "plugins/support/image/iblocksource.h"

#include "toolkit/exceptions/exceptions.h"

namespace krv::plugins::support
{

IBlockSource::~IBlockSource() = default;

void IBlockSource::WriteBlock(const BlockAddress&, const PixelRect&, const unsigned char*, std::size_t)
{
    throw DataException(GetName() + ": pixels cannot be written");
}

} // namespace krv::plugins::support
