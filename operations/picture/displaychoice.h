#pragma once

#include "gobs/pct/pct.h"
#include "operations/api.h"

#include <map>
#include <memory>
#include <vector>

namespace krv::operations
{

class SourceFile;

// Why channels are shown.
// For texts that tell a user what is shown.
enum class DisplayReason
{
    eAsked,       // the caller named them
    eDefaults,    // the file's display defaults
    eColourTable, // the first has one
    eRoles,       // described as red, green and blue
    eInks,        // cyan, magenta, yellow and black
    eFirstThree,  // nothing is said, and there are three or more
    eFirst        // nothing is said
};

// Which channels of a file make a picture, and what belongs to them.
// Channels count from 1. Made without reading pixels.
struct DisplayChoice
{
    std::vector<unsigned int> channels;    // one, or red, green and blue; four inks: cyan, magenta, yellow, black
    std::shared_ptr<krv::gobs::PCT> table; // colours of the one channel; null: grey
    bool inverted = false;                 // small values are bright
    unsigned int alphaChannel = 0;         // opacity; 0: none
    float alphaFull = 255;                 // the alpha channel's value for opaque
    bool premultiplied = false;            // colours are multiplied by their opacity
    float inkFull = 255;                   // the value of an ink that covers fully
    unsigned int maskBitmap = 0;           // bitmap whose set bits are valid pixels; 0: none

    // Bitmap by channel; set bits are valid pixels of it.
    std::map<unsigned int, unsigned int> channelMasks; // the same of single channels, by their numbers
    DisplayReason reason = DisplayReason::eFirst;      // of the rule that decided
};

// In this order: the channels asked for; the file's display defaults; a colour table of the first channel; channels
// that are described as red, green and blue; the four inks of a separated image; the first three channels; the first.
// The alpha channel is opacity unless it is asked for. Throws RequestException for channels that are not there,
// and for two or more than three.
KRV_OPERATIONS_API DisplayChoice ChooseDisplay(const SourceFile& oFile, const std::vector<unsigned int>& oWanted);

} // namespace krv::operations
