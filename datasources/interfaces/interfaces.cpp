// The destructors of the pure interfaces: one home each, so that every library shares one type-info per class. And
// the rule that goes with an interface.
#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/iblockencoding.h"
#include "datasources/interfaces/iblocktransfer.h"
#include "datasources/interfaces/ichannelfilter.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/iencodedblocks.h"
#include "datasources/interfaces/iephemerisdataset.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/ifileiobuilder.h"
#include "datasources/interfaces/iformatoptions.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ihistoryio.h"
#include "datasources/interfaces/ilayoutdataset.h"
#include "datasources/interfaces/ilevelstates.h"
#include "datasources/interfaces/ilinkeddataset.h"
#include "datasources/interfaces/ilutdataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "datasources/interfaces/inewfiledataset.h"
#include "datasources/interfaces/ioverviewio.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/ipageddataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/iplaceremoval.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/interfaces/isidecardataset.h"
#include "datasources/interfaces/istoragedataset.h"
#include "datasources/interfaces/iverifieddataset.h"
#include "datasources/interfaces/iwatchedstoring.h"
#include "toolkit/core/numbertext.h"

namespace krv::datasources
{

IBitmapDataset::~IBitmapDataset() = default;
IBlockEncoder::~IBlockEncoder() = default;
IBlockEncoding::~IBlockEncoding() = default;
IBlockTransfer::~IBlockTransfer() = default;
IChannelFilter::~IChannelFilter() = default;
IChannelInfo::~IChannelInfo() = default;
IDataset::~IDataset() = default;
IEncodedBlocks::~IEncodedBlocks() = default;
IEphemerisDataset::~IEphemerisDataset() = default;
IEphemerisRecords::~IEphemerisRecords() = default;
IFileFormat::~IFileFormat() = default;
IFileIOBuilder::~IFileIOBuilder() = default;
IFormatOptions::~IFormatOptions() = default;
IGeocodedDataset::~IGeocodedDataset() = default;
IHistoryIO::~IHistoryIO() = default;
ILayoutDataset::~ILayoutDataset() = default;
ILevelStates::~ILevelStates() = default;
ILinkedDataset::~ILinkedDataset() = default;
ILUTDataset::~ILUTDataset() = default;
IMathModelDataset::~IMathModelDataset() = default;
INewFileDataset::~INewFileDataset() = default;
IOverviewIO::~IOverviewIO() = default;
IOverviewManager::~IOverviewManager() = default;
IPCTDataset::~IPCTDataset() = default;
IPagedDataset::~IPagedDataset() = default;
IPlaceRemoval::~IPlaceRemoval() = default;
IRasterDataset::~IRasterDataset() = default;
IRasterIO::~IRasterIO() = default;
ISidecarDataset::~ISidecarDataset() = default;
ISidecarWriting::~ISidecarWriting() = default;
IStorageDataset::~IStorageDataset() = default;
IVerifiedDataset::~IVerifiedDataset() = default;
IWatchedStoring::~IWatchedStoring() = default;

void SetChannelsValid(IOverviewManager& oManager, const std::vector<unsigned int>& oChannels, unsigned int nLevel,
                      bool bValid)
{
    if (auto* const poStates = dynamic_cast<ILevelStates*>(&oManager))
        return poStates->SetChannelsValid(oChannels, nLevel, bValid);
    for (const unsigned int nChannel : oChannels)
        oManager.SetValid(nChannel, nLevel, bValid);
}

unsigned int FindValidityMask(const IBitmapDataset& oBitmaps)
{
    for (const unsigned int nBitmap : oBitmaps.GetBitmapList())
        if (oBitmaps.GetBitmapDescription(nBitmap).empty())
            return nBitmap;
    return 0;
}

std::map<unsigned int, unsigned int> FindChannelMasks(const IBitmapDataset& oBitmaps)
{
    std::map<unsigned int, unsigned int> oMasks;
    for (const unsigned int nBitmap : oBitmaps.GetBitmapList())
    {
        const MetadataMap oTags = oBitmaps.GetBitmapMetadata(nBitmap);
        const auto oFound = oTags.find(VALIDITY_OF_CHANNEL);
        const auto oChannel = oFound == oTags.end() ? std::nullopt : ParseNumber<unsigned int>(oFound->second);
        if (oChannel && !oBitmaps.GetBitmapDescription(nBitmap).empty())
            oMasks.emplace(*oChannel, nBitmap);
    }
    return oMasks;
}

std::string NameChannelMask(unsigned int nChannel)
{
    return "Validity of channel " + std::to_string(nChannel);
}

} // namespace krv::datasources
