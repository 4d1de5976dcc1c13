#pragma once

#include "datasources/reader/tilework.h"
#include "datasources/writer/splitwriter.h"

#include <memory>
#include <utility>

namespace krv::datasources
{

// ForEachTile for an image that is made of another one: oWork(std::unique_ptr<Raster>) gives the raster to write, which
// is encoded by the same thread where the format encodes apart from storing, and stored by the calling one. oWriter: of
// a file that is laid out; its own blocks fit best into tiles that consist of whole ones. What is written is the same
// for any number of threads, in the order of the tiles byte for byte. Nothing is synchronised: that is the caller's,
// unless the answer is false.
// Example: a filter on all cores into a new file:
//   ThreadPool oPool;
//   WriteTiles([] { return OpenHaloReader("scene.tif", {1}, 3); }, &Smooth, *poWriter, {&oPool});
//   poWriter->Synchronize();
template <typename Work>
bool WriteTiles(const ReaderFactory& oMakeReader, Work oWork, IRasterWriter& oWriter, const TileJob& oJob = {})
{
    SplitWriter oSplit(oWriter, 1, oJob.mpoExecutor != nullptr ? oJob.mpoExecutor->GetThreadCount() + 1 : 1);
    const auto Encode = [&](std::unique_ptr<krv::gobs::Raster> poTile)
    {
        return oSplit.Encode(oWork(std::move(poTile)));
    };
    const auto Store = [&](const std::shared_ptr<const SplitWriter::Encoded>& poEncoded)
    {
        oSplit.Store(*poEncoded);
    };
    return ForEachTile(oMakeReader, Encode, Store, oJob);
}

} // namespace krv::datasources
