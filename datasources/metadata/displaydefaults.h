#pragma once

#include "datasources/api.h"

#include <string>

namespace krv::datasources
{

class AuxiliaryData;
class IDataset;

// How a dataset is to be shown, kept in its metadata. Exceptions of the dataset's metadata operations pass. The dataset
// is borrowed and not null; nothing checks that a channel exists, except that tables belong to existing channels: else
// OutOfBoundsException "Out of bounds.".

// The default channel of a colour; 0 when there is none, or when its tag does not begin with a number of 32 bits.
// The tag of grey is "DefaultGray", intended.
// Reads the whole record for one tag: who wants several reads it once and takes the functions below.
KRV_DATASOURCES_API unsigned int GetDefaultRed(IDataset* poDataset);
KRV_DATASOURCES_API unsigned int GetDefaultGreen(IDataset* poDataset);
KRV_DATASOURCES_API unsigned int GetDefaultBlue(IDataset* poDataset);
KRV_DATASOURCES_API unsigned int GetDefaultGrey(IDataset* poDataset);

// The same from metadata that were read before.
KRV_DATASOURCES_API unsigned int GetDefaultRed(const AuxiliaryData& oData);
KRV_DATASOURCES_API unsigned int GetDefaultGreen(const AuxiliaryData& oData);
KRV_DATASOURCES_API unsigned int GetDefaultBlue(const AuxiliaryData& oData);
KRV_DATASOURCES_API unsigned int GetDefaultGrey(const AuxiliaryData& oData);

// Set the tag in the dataset's record, which is written for each call; 0 says that there is none. The dataset is open
// for update.
KRV_DATASOURCES_API void SetDefaultRed(IDataset* poDataset, unsigned int nChannel);
KRV_DATASOURCES_API void SetDefaultGreen(IDataset* poDataset, unsigned int nChannel);
KRV_DATASOURCES_API void SetDefaultBlue(IDataset* poDataset, unsigned int nChannel);
KRV_DATASOURCES_API void SetDefaultGrey(IDataset* poDataset, unsigned int nChannel);

// The segment that holds a channel's default lookup or pseudocolour table; false when none is named. What
// ParseRefMetadataTag finds of a malformed tag stays in the results.
// file, layer and number are those of the reference tag (referencetag.h); nothing is opened.
KRV_DATASOURCES_API bool GetDefaultLUT(IDataset* poDataset, unsigned int nChannel, std::string& file,
                                       std::string& layer, unsigned int& nNumber);
KRV_DATASOURCES_API bool GetDefaultPCT(IDataset* poDataset, unsigned int nChannel, std::string& file,
                                       std::string& layer, unsigned int& nNumber);

// An empty layer and the number 0 name the file as a whole.
KRV_DATASOURCES_API void SetDefaultLUT(IDataset* poDataset, unsigned int nChannel, const std::string& file,
                                       const std::string& layer, unsigned int nNumber);
KRV_DATASOURCES_API void SetDefaultPCT(IDataset* poDataset, unsigned int nChannel, const std::string& file,
                                       const std::string& layer, unsigned int nNumber);

} // namespace krv::datasources
