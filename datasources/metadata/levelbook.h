#pragma once

#include "datasources/api.h"

#include <string>
#include <vector>

namespace krv::datasources
{

class AuxiliaryData;

// The book of levels: what a file's record says of its overviews. A channel's tag "_Overview_<level>" says "valid" or
// "invalid", and behind a blank the method by which the level was made. A level without the tag counts as valid: other
// programs made it, whose method for all levels the file's tag "IMAGE_STRUCTURE:OVERVIEW_RESAMPLING" may tell.
// Channels count from 1.

// nLevel: the reduction factor, from 2. Whether the level exists at all is not known here.
KRV_DATASOURCES_API bool IsLevelValid(const AuxiliaryData& oBook, unsigned int nChannel, unsigned int nLevel);
// method: in capitals; empty when it is not known.
// oBook is the program's copy: it is the file's after the record is written.
KRV_DATASOURCES_API void SetLevelValid(AuxiliaryData& oBook, unsigned int nChannel, unsigned int nLevel, bool bValid,
                                       const std::string& method);
// Marks the level as valid for no channel, and by no method. Returns whether that is news.
KRV_DATASOURCES_API bool SetLevelInvalid(AuxiliaryData& oBook, unsigned int nLevel);

// Of every channel.
KRV_DATASOURCES_API void RemoveLevel(AuxiliaryData& oBook, unsigned int nLevel);
// Puts what a book says of a level in the place of what another one does, for the channels that both have.
KRV_DATASOURCES_API void CopyLevel(const AuxiliaryData& oFrom, AuxiliaryData& oTo, unsigned int nLevel);
// The record of a file whose channels came or went: the tags and descriptions of those that they were, by number, 0 for
// new ones, of which no level is valid. oLevels: that the file has.
KRV_DATASOURCES_API AuxiliaryData TakeChannels(const AuxiliaryData& oRecord, const std::vector<unsigned int>& oSources,
                                               const std::vector<unsigned int>& oLevels);
// The levels that channel 1 has an entry of.
// Ascending.
KRV_DATASOURCES_API std::vector<unsigned int> GetBookedLevels(const AuxiliaryData& oBook);
// In capitals; empty when it is not known.
KRV_DATASOURCES_API std::string GetLevelMethod(const AuxiliaryData& oBook, unsigned int nLevel);

// Puts another name in the place of the method by which all levels without an entry were made; nothing where none is
// named.
KRV_DATASOURCES_API void RenameForeignMethod(AuxiliaryData& oBook, const std::string& method);

// Whether a level may have so many columns, or rows, when the image has nFull: programs differ in how they round. Level
// 1 is the image.
// For authors of formats: an image that is no such size is no level but something else.
KRV_DATASOURCES_API bool IsLevelSize(unsigned int nFull, unsigned int nReduced, unsigned int nLevel);

// The name of a method in capitals, given in any letter case; empty for one that overview managers do not know.
KRV_DATASOURCES_API std::string ParseLevelMethod(const std::string& name);

} // namespace krv::datasources
