#pragma once

#include "gobs/pct/pct.h"
#include "plugins/jp2/reading/boxes.h"

#include <map>
#include <optional>
#include <string>
#include <vector>

namespace krv::plugins::jp2
{

// What a JP2 file says of its image beside the codestream: the boxes in its header box. Pixels are handed out as they
// are coded: a palette is a table beside them, and the meaning of channels is in their metadata.
struct ImageHeader
{
    // What a channel is for.
    enum class Use
    {
        eColour,
        eAlpha,
        ePremultiplied,
        eOther
    };

    struct Channel
    {
        Use meUse = Use::eColour;
        unsigned int mnColour = 0; // from 1; 0: of the whole image, or none
    };

    std::map<unsigned int, Channel> moChannels; // by component, from 0; those that are told
    std::optional<krv::gobs::PCT> moPalette;    // of the component below
    unsigned int mnPaletteComponent = 0;
    unsigned int mnColours = 0;                            // enumerated colour space; 0 when there is none
    std::string moProfile;                                 // the name of an ICC profile
    std::optional<std::pair<double, double>> moResolution; // pixels per metre, across and down

    // The name of the colour space; empty when it is not known.
    std::string GetColourSpace() const;
};

// nComponents: of the codestream; what is told of others is left out. What is damaged is left out too, pTrouble says
// what it was.
ImageHeader ReadImageHeader(const support::File& oFile, const Box& oHeader, unsigned int nComponents,
                            std::string* pTrouble);

} // namespace krv::plugins::jp2
