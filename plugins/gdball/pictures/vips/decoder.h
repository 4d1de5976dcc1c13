#pragma once

#include "plugins/gdball/pictures/picturekind.h"
#include "plugins/gdball/pictures/vips/claims.h"
#include "plugins/gdball/pictures/vips/session.h"
#include "plugins/gdball/pictures/vips/streams.h"
#include "plugins/support/file/file.h"

#include <cstddef>
#include <exception>
#include <memory>
#include <set>
#include <string>

namespace krv::plugins::gdball
{

// A picture that is to be read.
struct Picture
{
    std::shared_ptr<const support::File> mpoFile;
    PictureKind meKind;
    unsigned int mnPage; // from 1
    Claims moClaims;
    std::set<std::string> moSaid; // warnings
};

// One pass of libvips over a picture, from the top to the bottom, in the caller's thread. It decodes strictly: whatever
// libvips would bridge with pixels of its own is an error.
class Decoder
{
public:
    // Reads the head. Throws FileFormatException for a picture that libvips cannot read, and for one that cannot be
    // decoded within bounded memory, DataException for a page that is not there. oPicture outlives the decoder.
    explicit Decoder(Picture& oPicture);
    ~Decoder();
    Decoder(const Decoder&) = delete;
    Decoder& operator=(const Decoder&) = delete;

    // Its head: size, bands, kind of samples, and what else the file says.
    VipsImage& GetImage() const { return *mpoImage; }

    // The row that is decoded next; those before it cannot be read again.
    unsigned int GetNext() const { return mnNext; }
    // Rows from that one on, all of their width; row r goes to pTarget + r * nPitch.
    void Read(unsigned int nRows, unsigned char* pTarget, std::size_t nPitch);
    // Passes over some.
    void Skip(unsigned int nRows);

private:
    // Throws DataException when the picture does not have the page.
    void CheckPage() const;
    void CheckMemory() const;
    // Decodes the next rows, into the target when there is one.
    void Prepare(unsigned int nRows, VipsRegion* pTarget);
    [[noreturn]] void Fail(Listener& oListener, const std::string& what) const;
    static void OnTrouble(VipsOperation*, void* pThis);

    Picture& moPicture;
    std::exception_ptr moError; // of reading the file
    bool mbTrouble = false;     // libvips says that what it decoded is not what was stored
    Owned<VipsSource> mpoSource;
    Owned<VipsOperation> mpoOperation;
    Owned<VipsImage> mpoImage;
    unsigned int mnNext = 0;
};

} // namespace krv::plugins::gdball
