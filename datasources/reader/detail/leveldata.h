#pragma once

#include "toolkit/exceptions/place.h"

#include <vector>

namespace krv::datasources
{

class AuxiliaryData;

namespace detail
{

// The file channel at a 1-based position of an accessor's list. Throws OutOfBoundsException "Out of bounds.".
unsigned int ChannelAt(const std::vector<unsigned int>& oChannels, unsigned int nPosition, const Place& oPlace);

// A level's file metadata, and the metadata of the listed channels in the order of the list; no descriptions.
AuxiliaryData SelectLevelData(const AuxiliaryData& oLevelData, const std::vector<unsigned int>& oChannels);

} // namespace detail

} // namespace krv::datasources
