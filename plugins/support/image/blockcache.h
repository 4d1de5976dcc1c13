#pragma once

namespace krv::plugins::support
{

// How the images of a dataset take part in the process's store of tiles (krv::cache::TileStore), which keeps their
// decoded blocks: each with itself alone, or with the images of other datasets of the same origin. The blocks of a file
// that is being written are its dataset's alone.
class BlockCache
{
public:
    enum class Sharing
    {
        eAlone,
        eByOrigin
    };

    explicit BlockCache(Sharing eSharing = Sharing::eAlone) : meSharing(eSharing) {}

    bool IsShared() const { return meSharing == Sharing::eByOrigin; }

private:
    Sharing meSharing;
};

} // namespace krv::plugins::support
