#pragma once

#include "plugins/tif/peekreader.h"
#include "plugins/tif/rawdirectory.h"

#include <cstdint>
#include <memory>
#include <string>

#include <tiffio.h>

namespace krv::plugins::tif
{

// libtiff's view of one directory of a file. Every directory gets a handle of its own, whose header names that
// directory as the first one, so that a handle never moves. Nothing is printed: what libtiff has to say ends in
// exceptions. Nothing is mapped, strip and tile arrays are left in the file. One thread at a time.
class TiffHandle
{
public:
    // No single allocation of libtiff is larger.
    static constexpr tmsize_t MAXIMUM_ALLOCATION = tmsize_t{224} << 20;

    // Throws FileFormatException with libtiff's reason. The reader outlives the handle.
    TiffHandle(PeekReader& oReader, const FileHeader& oHeader, std::uint64_t nDirectory);
    ~TiffHandle();
    TiffHandle(const TiffHandle&) = delete;
    TiffHandle& operator=(const TiffHandle&) = delete;

    TIFF* Get() const { return mpoTiff; }

    // The first error since the last call, or nAlternative when there was none.
    std::string TakeMessage(const char* pAlternative);

    // Whether anything failed, or a codec made up pixels for data that it could not decode, since Forget(). libtiff
    // calls some of that a success.
    bool HasLostData() const;

    void Forget();

private:
    struct Client;

    std::unique_ptr<Client> mpoClient;
    TIFF* mpoTiff = nullptr;
};

} // namespace krv::plugins::tif
