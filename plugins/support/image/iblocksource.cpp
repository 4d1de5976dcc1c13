#include "plugins/support/image/iblocksource.h"

#include "toolkit/exceptions/exceptions.h"

namespace krv::plugins::support
{

IBlockSource::~IBlockSource() = default;

void IBlockSource::WriteBlock(const BlockAddress&, const PixelRect&, const unsigned char*, std::size_t)
{
    throw DataException(GetName() + ": pixels cannot be written");
}

BlockOrigin IBlockSource::GetOrigin() const
{
    return {};
}

void IBlockSource::Expect(const BlockAddress&, unsigned int) {}

void IBlockSource::Foresee(const BlockAddress&, unsigned int) {}

} // namespace krv::plugins::support
