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
#include "datasources/interfaces/istoragedataset.h"
#include "datasources/interfaces/iverifieddataset.h"
#include "datasources/interfaces/iwatchedstoring.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "datasources/reader/irasteriterable.h"
#include "datasources/reader/irasterreader.h"
#include "datasources/reader/rasteriterator.h"
#include "gobs/raster/rasterinfo.h"
#include "tests/support/syntheticdataset.h"

#include <gtest/gtest.h>

#include <cstring>
#include <numeric>

using namespace krv::datasources;

namespace
{

// The place of a virtual operation in its class's table of functions, read from a pointer to it: the compiler stores
// one more than the distance in bytes. The destructor has the first two places.
template <class Class, class Result, class... Arguments>
std::ptrdiff_t Slot(Result (Class::*pOperation)(Arguments...))
{
    std::ptrdiff_t nCode = 0;
    std::memcpy(&nCode, &pOperation, sizeof nCode);
    return (nCode - 1) / static_cast<std::ptrdiff_t>(sizeof(void*));
}
template <class Class, class Result, class... Arguments>
std::ptrdiff_t Slot(Result (Class::*pOperation)(Arguments...) const)
{
    std::ptrdiff_t nCode = 0;
    std::memcpy(&nCode, &pOperation, sizeof nCode);
    return (nCode - 1) / static_cast<std::ptrdiff_t>(sizeof(void*));
}

using Slots = std::vector<std::ptrdiff_t>;
using UInt = unsigned int;
using UInts = std::vector<unsigned int>;

struct Table
{
    const char* mpName;
    Slots moSlots; // of the operations in the order of the contract
    std::ptrdiff_t mnFirst = 2;
};

std::vector<Table> Tables()
{
    using I = IRasterIO;
    using RD = IRasterDataset;
    using OM = IOverviewManager;
    using BM = IBitmapDataset;
    using PC = IPCTDataset;
    using LU = ILUTDataset;
    using MM = IMathModelDataset;
    using EP = IEphemerisDataset;
    using RI = IRasterIterable;
    using RR = IRasterReader;
    using OA = IOverviewAccessor;
    using Types = std::vector<krv::gobs::DataType>;
    using Info = krv::gobs::RasterInfo;
    using Buffer = unsigned char*;
    return {
        {"IDataset",
         {Slot(&IDataset::GetFileFormat), Slot(&IDataset::Delete), Slot(&IDataset::Exists), Slot(&IDataset::GetName),
          Slot(&IDataset::ReadAuxiliaryData), Slot(&IDataset::WriteAuxiliaryData), Slot(&IDataset::ReadCRS),
          Slot(&IDataset::UpdateCRS), Slot(&IDataset::IsLinked), Slot(&IDataset::Synchronize), Slot(&IDataset::IsOpen),
          Slot(&IDataset::Close)}},
        {"IRasterDataset",
         {Slot(&RD::GetRasterIO), Slot(&RD::AddNewChannel), Slot(&RD::DeleteChannel),
          Slot<RD, void, UInt, UInt, const Types&>(&RD::Create), Slot<RD, void, const Info&>(&RD::Create),
          Slot(&RD::GetWidth), Slot(&RD::GetHeight), Slot(&RD::GetChanCount), Slot(&RD::GetChannelInfo),
          Slot(&RD::GetHistoryIO), Slot(&RD::GetOverviewManager), Slot(&RD::GetRasterCapabilities)}},
        {"IGeocodedDataset", {Slot(&IGeocodedDataset::GetGeocoding), Slot(&IGeocodedDataset::SetGeocoding)}},
        {"IRasterIO",
         {Slot(&I::GetFileWidth), Slot(&I::GetFileHeight), Slot(&I::GetTileWidth), Slot(&I::GetTileHeight),
          Slot<I, void, int, int, UInt, UInt, UInt, UInt, UInt, UInt, Buffer>(&I::ReadWindow),
          Slot<I, void, UInt, UInt, UInt, UInt, Buffer>(&I::ReadWindow),
          Slot<I, void, int, int, UInt, UInt, UInt, UInt, UInt, UInt, Buffer>(&I::WriteWindow),
          Slot<I, void, UInt, UInt, UInt, UInt, Buffer>(&I::WriteWindow)}},
        {"IOverviewIO", {Slot(&IOverviewIO::GetLevel)}, 10},
        {"IChannelFilter",
         {Slot<IChannelFilter, UInts, const RD&>(&IChannelFilter::Accept),
          Slot<IChannelFilter, bool, const RD&, UInt>(&IChannelFilter::Accept)}},
        {"IChannelInfo",
         {Slot(&IChannelInfo::GetNativeDataType), Slot(&IChannelInfo::GetDataType),
          Slot(&IChannelInfo::GetConstraints)}},
        {"IOverviewManager",
         {Slot(&OM::GetLevels), Slot(&OM::GetOverviewIO), Slot(&OM::CreateLevel), Slot(&OM::IsValid),
          Slot(&OM::DeleteLevel), Slot(&OM::GetResamplingName), Slot(&OM::SetValid), Slot(&OM::GetLevelWidth),
          Slot(&OM::GetLevelHeight), Slot(&OM::GetAuxiliaryData), Slot(&OM::SetResamplingName)}},
        {"IBitmapDataset",
         {Slot(&BM::GetBitmapList), Slot(&BM::GetBitmapIO), Slot(&BM::DeleteBitmap), Slot(&BM::CreateBitmap),
          Slot(&BM::GetBitmapDescription), Slot(&BM::SetBitmapDescription), Slot(&BM::GetBitmapMetadata),
          Slot(&BM::SetBitmapMetadata), Slot(&BM::GetBitmapOverviewManager)}},
        {"IPCTDataset",
         {Slot(&PC::GetPCTList), Slot(&PC::GetPCT), Slot(&PC::GetPCTChannel), Slot(&PC::GetPCTDescription),
          Slot(&PC::CreatePCT), Slot(&PC::UpdatePCT), Slot(&PC::SetPCTDescription), Slot(&PC::DeletePCT)}},
        {"ILUTDataset",
         {Slot(&LU::GetLUTList), Slot(&LU::GetLUT), Slot(&LU::GetLUTChannel), Slot(&LU::GetLUTDescription),
          Slot(&LU::CreateLUT), Slot(&LU::UpdateLUT), Slot(&LU::SetLUTDescription), Slot(&LU::DeleteLUT)}},
        {"IVerifiedDataset", {Slot(&IVerifiedDataset::Verify)}},
        {"INewFileDataset", {Slot(&INewFileDataset::KeepExisting)}},
        {"ILevelStates", {Slot(&ILevelStates::SetChannelsValid)}},
        {"IWatchedStoring", {Slot(&IWatchedStoring::WatchStoring)}},
        {"IStorageDataset", {Slot(&IStorageDataset::GetUnusedBytes)}},
        {"ILayoutDataset", {Slot(&ILayoutDataset::GetVariant), Slot(&ILayoutDataset::CheckCloudLayout)}},
        {"IPlaceRemoval", {Slot(&IPlaceRemoval::RemoveCRS), Slot(&IPlaceRemoval::RemoveGeocoding)}},
        {"IPagedDataset", {Slot(&IPagedDataset::CountFurtherImages)}},
        {"IEncodedBlocks",
         {Slot(&IEncodedBlocks::GetEncodedForm), Slot(&IEncodedBlocks::ReadEncoded),
          Slot(&IEncodedBlocks::SetEncodedForm), Slot(&IEncodedBlocks::StoreEncoded)}},
        {"IBlockEncoder", {Slot(&IBlockEncoder::Encode)}},
        {"IBlockEncoding", {Slot(&IBlockEncoding::MakeBlockEncoder)}},
        {"IBlockTransfer", {Slot(&IBlockTransfer::TakeBlocks)}},
        {"IHistoryIO",
         {Slot(&IHistoryIO::ReadHistory), Slot(&IHistoryIO::AppendHistory), Slot(&IHistoryIO::ClearHistory)}},
        {"IMathModelDataset",
         {Slot(&MM::HasMathModel), Slot(&MM::GetMathModelList), Slot(&MM::GetMathModel), Slot(&MM::CreateMathModel),
          Slot(&MM::DeleteMathModel)}},
        {"IEphemerisDataset",
         {Slot(&EP::HasEphemeris), Slot(&EP::GetEphemerisList), Slot(&EP::DeleteEphemeris), Slot(&EP::BuildMathModel),
          Slot(&EP::CreateEphemeris)}},
        {"IEphemerisRecords", {Slot(&IEphemerisRecords::ReadEphemeris)}},
        {"ILinkedDataset", {Slot(&ILinkedDataset::GetLinkedFiles)}},
        {"IFileFormat",
         {Slot(&IFileFormat::GetDescription), Slot(&IFileFormat::GetExtensions), Slot(&IFileFormat::GetShortName)}},
        {"IFileIOBuilder",
         {Slot(&IFileIOBuilder::GetFileFormat), Slot(&IFileIOBuilder::Open), Slot(&IFileIOBuilder::Create),
          Slot(&IFileIOBuilder::Identify)}},
        {"IRasterIterable",
         {Slot(&RI::GetRaster), Slot(&RI::FindRaster), Slot(&RI::Begin), Slot(&RI::End), Slot(&RI::GetTileCount),
          Slot(&RI::SetOptimalTileSize), Slot(&RI::SetTileSize), Slot(&RI::GetTileWidth), Slot(&RI::GetTileHeight),
          Slot(&RI::GetChannelsInfo)}},
        {"IRasterReader",
         {Slot(&RR::GetFileFormat), Slot(&RR::SetMargins), Slot(&RR::GetXMargin), Slot(&RR::GetYMargin),
          Slot(&RR::GetMarginBehaviour), Slot<RR, void, krv::gobs::Raster*>(&RR::ReadRaster),
          Slot<RR, krv::gobs::Raster*, UInt, UInt, UInt, UInt>(&RR::ReadRaster), Slot(&RR::GetAuxiliaryData),
          Slot(&RR::GetCRS), Slot(&RR::GetGeocodingInfo), Slot(&RR::GetOverviewReaderAccessor), Slot(&RR::GetWidth),
          Slot(&RR::GetHeight), Slot(&RR::GetChansCount), Slot(&RR::GetDataType)},
         12},
        {"IOverviewReaderAccessor",
         {Slot(&OA::GetLevels), Slot(&OA::IsValid), Slot(&OA::IsLevelValid), Slot(&OA::GetAuxiliaryData),
          Slot(&OA::GetChanCount), Slot(&IOverviewReaderAccessor::CreateRasterReader)}},
    };
}

} // namespace

// Compiled plug-ins call by place: an operation that moves breaks them silently.
TEST(SlotOrder, EveryOperationKeepsItsPlace)
{
    for (const Table& oTable : Tables())
    {
        Slots oExpected(oTable.moSlots.size());
        std::iota(oExpected.begin(), oExpected.end(), oTable.mnFirst);
        EXPECT_EQ(oTable.moSlots, oExpected) << oTable.mpName;
    }
}

// The places above are those of a real object's table: a call through its raw pointer reaches the operation.
TEST(SlotOrder, PlacesAreThoseOfARealTable)
{
    const auto oModel = std::make_shared<krv::test::ImageModel>();
    krv::test::SyntheticDataset oDataset(oModel);
    IRasterDataset* const poRaster = &oDataset;
    void** pTable = nullptr;
    std::memcpy(&pTable, poRaster, sizeof pTable);
    using SizeFunction = unsigned int(const IRasterDataset*);
    const auto Call = [&](int nSlot)
    {
        return reinterpret_cast<SizeFunction*>(pTable[nSlot])(poRaster);
    };
    EXPECT_EQ(Call(7), oModel->mnWidth);
    EXPECT_EQ(Call(8), oModel->mnHeight);
    EXPECT_EQ(Call(9), oModel->moTypes.size());
}
