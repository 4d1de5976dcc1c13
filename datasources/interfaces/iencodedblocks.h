#pragma once

#include "datasources/api.h"
#include "gobs/raster/datatype.h"

#include <cstddef>
#include <map>
#include <string>
#include <vector>

namespace krv::datasources
{

// How the blocks of an image, or of one of its levels, are stored: what it takes to decode them, and where they lie on
// the image. Two images of equal forms can exchange the bytes of their blocks.
struct EncodedForm
{
    // In capitals, as the option COMPRESS of new files has it: NONE, DEFLATE, LZW, ZSTD, JPEG and so on; empty for one
    // without a name.
    std::string moCodec;
    // Whether the blocks can be had as bytes: the codec has a name, and the file tells of each block where it is.
    bool mbReadable = true;
    // Whether pixels that are decoded and encoded again may change.
    bool mbLossy = false;
    unsigned int mnPredictor = 1; // 1: none, 2: differences along the rows, 3: byte planes of reals with differences
    bool mbBigEndian = false;     // the order of bytes before coding; false where none is left to choose
    bool mbSeparate = false;      // every channel in blocks of its own, a plane for each; else interleaved by pixel

    krv::gobs::DataType moType; // of the channels as they are handed out
    unsigned int mnChannels = 0;
    unsigned int mnSampleBits = 0; // of a stored value, both parts of a complex one; the type may have more

    unsigned int mnWidth = 0; // of the image or level, in pixels
    unsigned int mnHeight = 0;
    unsigned int mnBlockWidth = 0;
    unsigned int mnBlockHeight = 0;
    // Whether blocks that reach beyond the image hold what lies there too. Otherwise (strips) they end with it.
    bool mbWholeBlocks = true;

    // What else the codec goes by: whole numbers separated by blanks, by names in capitals. Of JPEG: SUBSAMPLING ("2
    // 2"), PHOTOMETRIC and others by the numbers of TIFF. A receiver refuses names that it does not know.
    std::map<std::string, std::string> moParameters;
    // What all blocks share; of JPEG an abbreviated stream of tables.
    std::vector<unsigned char> moTables;

    friend bool operator==(const EncodedForm&, const EncodedForm&) = default;
};

// A block in the grid of its plane, counted from 0.
// Plane 0 has all channels unless the form says that each has blocks of its own.
struct BlockNumber
{
    unsigned int mnPlane = 0;
    unsigned int mnColumn = 0;
    unsigned int mnRow = 0;
};

// The blocks of a dataset as bytes, neither decoded nor encoded: a facet of datasets, found by dynamic_cast. nLevel is
// 1 for the image, or the number of one of its levels. Whoever encodes blocks in the form of an image, on as many
// threads as it likes, stores them here one after the other. One thread at a time. The order of the virtual operations
// is public and fixed.
// Example: a copy without decoding, where both files have the facet and SetEncodedForm took the form of the source:
//   if (poFrom->ReadEncoded(1, oBlock, oBytes)) poTo->StoreEncoded(1, oBlock, oBytes.data(), oBytes.size());
class KRV_DATASOURCES_API IEncodedBlocks
{
public:
    virtual ~IEncodedBlocks();

    // Throws DataException for a level that does not exist.
    // A copy, which stays as it is when the file changes.
    virtual EncodedForm GetEncodedForm(unsigned int nLevel) = 0;

    // The bytes of a block as stored. False for a block that is not stored: its pixels are all 0. Throws DataException
    // for a block outside the grid, and what reading the file throws.
    virtual bool ReadEncoded(unsigned int nLevel, const BlockNumber& oBlock, std::vector<unsigned char>& oBytes) = 0;

    // Lays an image or level of which nothing is stored out anew, so that it takes blocks of this form. The size of a
    // level may be another, as long as the image's by its number, rounded in whatever way. I/O objects made before are
    // of no more use. False, and nothing changes, when it cannot: the format has not all of it, or size, type or
    // channels are others. Throws DataException when blocks are stored already, and for a dataset that is not open for
    // writing.
    virtual bool SetEncodedForm(unsigned int nLevel, const EncodedForm& oForm) = 0;

    // Stores bytes as a block in the place of what it held; they are taken as they are. Counts as a change of pixels.
    // Throws DataException for a block outside the grid and for a dataset that is not open for writing.
    virtual void StoreEncoded(unsigned int nLevel, const BlockNumber& oBlock, const unsigned char* pBytes,
                              std::size_t nBytes) = 0;
};

} // namespace krv::datasources
