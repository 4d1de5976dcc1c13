#pragma once

namespace krv::plugins::support
{

// How the images of a dataset take part in the process's store of tiles (krv::cache::TileStore), which keeps their
// decoded blocks: each with itself alone, or with the images of other datasets of the same origin. The blocks of a file
// that is being written are its dataset's alone.
// Made by the dataset and given to each of its images. Holds no blocks itself.
class BlockCache
{
public:
    // Whether several datasets of one file decode a block once between them.
    enum class Sharing
    {
        eAlone,   // the dataset is written, or its format cannot tell what it reads
        eByOrigin // by IBlockSource::GetOrigin
    };

    explicit BlockCache(Sharing eSharing = Sharing::eAlone) : meSharing(eSharing) {}

    bool IsShared() const { return meSharing == Sharing::eByOrigin; }

private:
    Sharing meSharing;
};

} // namespace krv::plugins::support
