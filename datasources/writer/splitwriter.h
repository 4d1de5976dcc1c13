#pragma once

#include "datasources/api.h"
#include "datasources/interfaces/iblockencoding.h"
#include "toolkit/threading/statestore.h"

#include <memory>
#include <vector>

namespace krv::gobs
{
class Raster;
}

namespace krv::datasources
{

class IRasterWriter;

// Writes the rasters of another writer in two steps: Encode, which takes the processor's time, on any thread, several
// at once; Store, which writes the file, by the thread that the writer belongs to. What is stored is the same as if the
// writer had got the rasters. Where the format does not encode apart from storing, Encode does nothing and Store all.
// WriteTiles does this by itself; a program needs the class when its tiles come in another way.
class KRV_DATASOURCES_API SplitWriter
{
public:
    // A raster's blocks as bytes, or the raster itself; opaque.
    class Encoded;

    // oWriter: borrowed; of the image (nLevel 1) or of a level of the dataset that it shows. nThreads: how many encode
    // at one time. What is laid out stays as it is meanwhile.
    SplitWriter(IRasterWriter& oWriter, unsigned int nLevel, unsigned int nThreads);
    ~SplitWriter();
    SplitWriter(const SplitWriter&) = delete;
    SplitWriter& operator=(const SplitWriter&) = delete;

    // Whether Encode does something, for rasters of whole blocks without margins.
    bool IsSplit() const { return mpoBlocks != nullptr; }
    // Throws what the codec throws.
    // Keeps the raster as long as the result where it is stored as it is.
    std::shared_ptr<const Encoded> Encode(std::shared_ptr<const krv::gobs::Raster> poRaster);
    // Throws what writing throws.
    // To be called for each result of Encode, in the order in which blocks are to lie in the file.
    void Store(const Encoded& oEncoded);

private:
    bool TakesForm();
    bool HasWholeBlocks(const krv::gobs::Raster& oRaster) const;
    void EncodePlane(const krv::gobs::Raster& oRaster, unsigned int nChannel, unsigned int nChannels,
                     unsigned int nPlane, Encoded& oEncoded);

    IRasterWriter& moWriter;
    unsigned int mnLevel;
    IEncodedBlocks* mpoBlocks = nullptr; // null: rasters are written whole
    EncodedForm moForm;
    std::vector<unsigned int> moPlanes; // of the writer's channels, or one for all
    krv::threading::StateStore<IBlockEncoder> moEncoders;
};

} // namespace krv::datasources
