#pragma once

#include "gobs/raster/datatype.h"
#include "operations/api.h"
#include "operations/job/progress.h"
#include "operations/source/mapwindow.h"

#include <optional>
#include <string>
#include <vector>

namespace krv::threading
{
class IExecutor;
}

namespace krv::operations
{

// What the user wants copied.
// Example: the first three channels as 8 bits: {.sources = {"scene.tif"}, .channels = {1, 2, 3}, .type = eDT_8U}.
struct CopyRequest
{
    // All of one size; their channels follow each other.
    std::vector<std::string> sources;
    std::vector<unsigned int> channels;      // counted from 1 through all files; empty: all
    WindowRequest window;                    // nothing: the whole image
    std::optional<krv::gobs::DataType> type; // of all channels; nothing: each keeps its own
    bool promote = false;                    // the smallest type that holds all, in place of `type`
    std::optional<std::string> noData = {};  // of all files, in place of what they record; the copy records it
    // What values stand for (SourceFile::GetScale), as 32R unless a type is given. Of one file.
    bool unscale = false;
    // Two numbers whose values become the least and the largest of the type, 0 and 1 for reals; two more to become
    // these. Values beyond are cut off. The copy records how to come back. Of one file; empty: none of it.
    std::vector<double> scale = {};
    bool power = false; // the power of a radar scene, one channel, in place of its channels
};

// How the copy is stored.
// Example: {"scene.tif", "TIF", "COMPRESS=ZSTD LAYOUT=COG"}.
struct TargetForm
{
    std::string name;
    std::string format;  // short name; empty: by the name's extension, else TIF
    std::string options; // as the format takes them

    // Costs the decoding of each block.
    bool check = false; // decode blocks that move as bytes: what is damaged is not passed on
};

// Copies channels of one or several files of one size into a new file: pixels, metadata, geocoding, reference system,
// sensor models, colour tables, bitmaps and levels; with the option LAYOUT=COG levels are built when there are none.
// What the options leave open stays as the first file has it: codec, predictor, blocks and interleaving; a whole image
// is copied block by block as it is stored, without being decoded. Pixels are never encoded with loss unless the
// options ask for it, and then a mask says which are valid. Warns of what the target's format cannot hold. A file of
// that name is replaced when the copy is complete; on a failure, and when the user stops it, nothing changes. Of a
// radar scene as power only pixels, record, place and validity go over. The copy is the same, byte for byte, for any
// number of threads. Throws RequestException for what makes no sense, DataException when the target is one of the
// sources or no plain file, and what formats throw.
// poExecutor: whose threads decode and encode; borrowed, null for none.
KRV_OPERATIONS_API void Convert(const CopyRequest& oRequest, const TargetForm& oForm, const Progress& oProgress = {},
                                krv::threading::IExecutor* poExecutor = nullptr);

} // namespace krv::operations
