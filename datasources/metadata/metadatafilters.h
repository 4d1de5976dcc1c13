#pragma once

#include "datasources/metadata/imetadatafilter.h"
#include "datasources/metadata/logicalandfilter.h"
#include "datasources/metadata/logicalorfilter.h"
#include "datasources/metadata/regexmetadatafilter.h"

namespace krv::qrfutils
{

// Categories of tags, named by what a derived file changes so that they no longer hold. The values are public.
enum eMetadataCategory : unsigned long long
{
    ePixelValueTags = 1,     // histograms, checksums, radar calibration and looks
    eGeocodingTags = 2,      // the extents on the ground
    eImageSizeTags = 4,      // the same tag, intended: a new size moves the extents as well
    eReferenceTags = 8,      // references to lookup tables, pseudocolour tables and joined tables
    eDisplayDefaultTags = 16 // the channels that are shown as red, green, blue and grey
};

// The functions give new filters owned by the caller, and throw boost::regex_error for patterns that do not compile.

// The value of an entry takes no part in any of them. See RegexMetadataFilter for the syntax.
KRV_DATASOURCES_API IMetadataFilter* GetMetadataFilterRegEx(const std::string& pattern, bool bCaseInsensitive);

// A filter for whole keys, in which * stands for any text. < and > are taken as word boundaries, intended: stored
// wildcards rely on the expressions that they become.
// Example: "STATISTICS_*" selects what statistics programs leave behind.
KRV_DATASOURCES_API IMetadataFilter* GetMetadataFilter(const std::string& wildcard, bool bCaseInsensitive);

// Selects the tags of the categories whose bits are set, letter case not counted, and always the keys that begin with
// an underscore and "TIFFType". Unknown bits are ignored.
KRV_DATASOURCES_API LogicalOrFilter* GetMetadataFilter(unsigned long long nCategories);

} // namespace krv::qrfutils
