#pragma once

#include "datasources/api.h"

#include <string>

namespace krv::datasources
{

// Reference tags name a file, "gdb:<file>", or one segment of it, "gdb:<file>/{<layer>:<number>}".

// The tag of the whole file when the layer is empty and the number 0, else that of the segment. The number is written
// as a signed one: above 2147483647 it appears negative, intended, and is read back as it was.
// Example: ("lut.pix", "PCT", 3) gives "gdb:lut.pix/{PCT:3}".
KRV_DATASOURCES_API std::string BuildRefMetadataTag(const std::string& file, const std::string& layer,
                                                    unsigned int nNumber);

// Splits a tag at its last braces; without a pair of braces it names a whole file. False for a text that is no tag, an
// empty layer or a number that does not fit 32 bits; "-1" is 4294967295. Never throws for a malformed tag.
// What was found before the flaw stays in the results, intended.
KRV_DATASOURCES_API bool ParseRefMetadataTag(const std::string& tag, std::string& file, std::string& layer,
                                             unsigned int& nNumber);

// Whether the file of a tag is this one: the tag names it as the user does, or as it lies beside the one that refers to
// it.
// reference: the file that a tag names. Compares names and folders; opens nothing.
KRV_DATASOURCES_API bool IsReferenceTo(const std::string& reference, const std::string& file);

} // namespace krv::datasources
