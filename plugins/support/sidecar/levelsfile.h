#pragma once

namespace krv::datasources
{
class IDataset;
}

namespace krv::plugins::support
{

// The first page of a file of levels, as the file's own record numbers it; the others are levels below it.
inline constexpr unsigned int FIRST_LEVEL_PAGE = 1;

// Marks all levels of such a file, which is open for update, as outdated for all channels.
// Nothing is synchronised here.
void ForgetLevels(krv::datasources::IDataset& oLevels);

} // namespace krv::plugins::support
