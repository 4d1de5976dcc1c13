#pragma once

#include "plugins/krvdsk/krvdskdataset.h"
#include "tools/conformance/tempfolder.h"

#include <memory>
#include <random>
#include <string>
#include <vector>

namespace krv::test
{

using NativePointer = std::unique_ptr<krv::plugins::krvdsk::KrvdskDataset>;
using IOPointer = std::unique_ptr<krv::datasources::IRasterIO>;
using Types = std::vector<krv::gobs::DataType>;

// Some systems bring a file that is written over to the disk at once, which takes the time of many tests.
void WriteAnew(const std::string& fileName, const std::string& bytes);

NativePointer OpenNative(const std::string& fileName, AccessMode eMode = eReadOnly);
NativePointer CreateNative(const std::string& fileName, const std::string& options, unsigned int nWidth,
                           unsigned int nHeight, const Types& oTypes);

// All that a dataset says of its file, pixels and tables of everything included: two that say the same give the same.
std::string Tell(krv::plugins::krvdsk::KrvdskDataset& oDataset);

// The ways of changing a file, one of which a scenario does most.
enum class Change
{
    eTiles,
    eWindows,
    eRecord,
    eLevels,
    eBitmaps,
    eChannels,
    eTables
};
constexpr Change CHANGES[] = {Change::eTiles,   Change::eWindows,  Change::eRecord, Change::eLevels,
                              Change::eBitmaps, Change::eChannels, Change::eTables};
void Make(krv::plugins::krvdsk::KrvdskDataset& oDataset, Change eChange, std::mt19937& oRandom);

} // namespace krv::test
