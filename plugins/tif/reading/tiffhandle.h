#pragma once

#include "plugins/tif/reading/peekreader.h"
#include "plugins/tif/reading/rawdirectory.h"

#include <cstdint>
#include <memory>
#include <string>

#include <tiffio.h>

namespace krv::plugins::tif
{

// What went wrong inside libtiff. Its own words go to the debug output: they tell a user nothing.
struct TiffTrouble
{
    std::string moCause;        // why the file could not be read, in the words of this library; empty when it could
    bool mbUnknownKind = false; // libtiff cannot decode data of this kind
    bool mbLostData = false;    // something failed, or a codec made up pixels for data that it could not decode
};

// libtiff's view of one directory of a file. Every directory gets a handle of its own, whose header names that
// directory as the first one, so that a handle never moves. Nothing is printed: what libtiff has to say ends in
// exceptions. Nothing is mapped, strip and tile arrays are left in the file. One thread at a time.
class TiffHandle
{
public:
    // No single allocation of libtiff is larger.
    static constexpr tmsize_t MAXIMUM_ALLOCATION = tmsize_t{224} << 20;

    // Throws FileFormatException. The reader outlives the handle.
    TiffHandle(PeekReader& oReader, const FileHeader& oHeader, std::uint64_t nDirectory);
    ~TiffHandle();
    TiffHandle(const TiffHandle&) = delete;
    TiffHandle& operator=(const TiffHandle&) = delete;

    TIFF* Get() const { return mpoTiff; }

    // What went wrong since the last call or Forget(). libtiff calls some of that a success.
    TiffTrouble TakeTrouble();

    void Forget();

private:
    struct Client;

    std::unique_ptr<Client> mpoClient;
    TIFF* mpoTiff = nullptr;
};

} // namespace krv::plugins::tif
