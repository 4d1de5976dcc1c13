#include "tests/support/telldataset.h"

#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ihistoryio.h"
#include "datasources/interfaces/ilutdataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/metadata/auxiliarydata.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/datatype.h"
#include "toolkit/mathmodel/rpcmodel.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <algorithm>
#include <memory>
#include <sstream>
#include <vector>

namespace krv::test
{

namespace
{

using namespace krv::datasources;

// Of all pixels, in rows of blocks.
std::string Sum(IRasterIO* poIO, std::size_t nPixelBytes)
{
    const std::unique_ptr<IRasterIO> oIO(poIO);
    const unsigned int nWidth = oIO->GetFileWidth(), nHeight = oIO->GetFileHeight();
    const unsigned int nRows = std::min(std::max(oIO->GetTileHeight(), 64U), nHeight);
    std::vector<unsigned char> oPixels(std::size_t{nWidth} * nRows * nPixelBytes);
    std::uint64_t nSum = 0;
    for (unsigned int nY = 0; nY < nHeight; nY += nRows)
    {
        const unsigned int nCount = std::min(nRows, nHeight - nY);
        oIO->ReadWindow(0U, nY, nWidth, nCount, oPixels.data());
        const std::string_view bytes(reinterpret_cast<const char*>(oPixels.data()), nPixelBytes * nWidth * nCount);
        for (std::size_t nRow = 0; nRow < nCount; ++nRow)
            nSum = nSum * 1000003 +
                   std::hash<std::string_view>()(bytes.substr(nRow * nWidth * nPixelBytes, nWidth * nPixelBytes));
    }
    return std::to_string(nWidth) + " x " + std::to_string(nHeight) + " " + std::to_string(nSum) + "\n";
}

// Without the book of levels, which their manager tells, the text of a model, which the models do, and values that say
// nothing.
std::string Text(const MetadataMap& oMap)
{
    std::string text;
    for (const auto& [key, value] : oMap)
        if (!key.starts_with("_Overview_") && key != "RPC" && !value.empty())
            text += key + "=" + value + "\n";
    return text;
}

template <class Values>
std::string Numbers(const Values& oValues)
{
    std::ostringstream oText;
    oText.precision(17);
    for (const double nValue : oValues)
        oText << nValue << ' ';
    return oText.str();
}

std::string TellLevels(IOverviewManager* poManager, unsigned int nChannel, std::size_t nBytes)
{
    const std::unique_ptr<IOverviewManager> poLevels(poManager);
    std::string text;
    if (poLevels)
        for (const unsigned int nLevel : poLevels->GetLevels())
            text += "level " + std::to_string(nLevel) +
                    (poLevels->IsValid(nChannel, nLevel) ? " valid " : " invalid ") +
                    Sum(poLevels->GetOverviewIO(nLevel, {nChannel}), nBytes);
    return text;
}

std::string TellImage(IRasterDataset& oRaster, const AuxiliaryData& oRecord)
{
    std::string text = std::to_string(oRaster.GetWidth()) + " x " + std::to_string(oRaster.GetHeight()) + "\n";
    for (unsigned int nChannel = 1; nChannel <= oRaster.GetChanCount(); ++nChannel)
    {
        const std::unique_ptr<IChannelInfo> poInfo(oRaster.GetChannelInfo(nChannel));
        const krv::gobs::DataType oType = poInfo->GetDataType();
        const std::size_t nBytes = oType.GetValueBits() / 8;
        text += oType.Describe() + " of " + std::to_string(poInfo->GetNativeDataType().GetBits()) + " bits " +
                oRecord.GetChannelDescription(nChannel) + "\n" + Text(oRecord.GetChanMetadata(nChannel)) +
                Sum(oRaster.GetRasterIO({nChannel}), nBytes) +
                TellLevels(oRaster.GetOverviewManager(), nChannel, nBytes);
        if (IHistoryIO* const poHistory = oRaster.GetHistoryIO(nChannel))
            for (const std::string& entry : poHistory->ReadHistory())
                text += entry + "\n";
    }
    return text;
}

std::string TellBitmaps(IBitmapDataset& oBitmaps)
{
    std::string text;
    for (const unsigned int nBitmap : oBitmaps.GetBitmapList())
        text += "bitmap " + oBitmaps.GetBitmapDescription(nBitmap) + "\n" + Text(oBitmaps.GetBitmapMetadata(nBitmap)) +
                Sum(oBitmaps.GetBitmapIO({nBitmap}), 1) + TellLevels(oBitmaps.GetBitmapOverviewManager(), nBitmap, 1);
    return text;
}

// Some formats repeat the last colour until there is one for each value of the type.
std::string TellPCTs(const IPCTDataset& oTables)
{
    const auto Repeats = [](const krv::gobs::PCT::Entry& oFirst, const krv::gobs::PCT::Entry& oSecond)
    {
        return oFirst.colour.red == oSecond.colour.red && oFirst.colour.green == oSecond.colour.green &&
               oFirst.colour.blue == oSecond.colour.blue && oFirst.alpha == oSecond.alpha;
    };
    std::string text;
    for (const unsigned int nTable : oTables.GetPCTList())
    {
        const std::unique_ptr<krv::gobs::PCT> poTable(oTables.GetPCT(nTable));
        text += "PCT of " + std::to_string(oTables.GetPCTChannel(nTable)) + oTables.GetPCTDescription(nTable) + ": ";
        auto oEntries = poTable->GetEntries();
        while (oEntries.size() > 1 && Repeats(*std::prev(oEntries.end(), 2), oEntries.back()))
            oEntries.pop_back();
        for (const krv::gobs::PCT::Entry& oEntry : oEntries)
            text +=
                Numbers(std::vector<double>{oEntry.low, oEntry.high, 1.0 * oEntry.colour.red, 1.0 * oEntry.colour.green,
                                            1.0 * oEntry.colour.blue, 1.0 * oEntry.alpha});
        text += "\n";
    }
    return text;
}

std::string TellLUTs(const ILUTDataset& oTables)
{
    std::string text;
    for (const unsigned int nTable : oTables.GetLUTList())
    {
        text += "LUT " + oTables.GetLUTDescription(nTable) + ": ";
        for (const LookupEntry& oEntry : oTables.GetLUT(nTable))
            text += Numbers(std::vector<double>{oEntry.value, oEntry.result});
        text += "\n";
    }
    return text;
}

} // namespace

std::string TellDataset(IDataset& oDataset)
{
    const AuxiliaryData oRecord = oDataset.ReadAuxiliaryData();
    std::string text = Text(oRecord.GetFileMetadata());
    if (auto* const poRaster = dynamic_cast<IRasterDataset*>(&oDataset))
        text += TellImage(*poRaster, oRecord);
    if (auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(&oDataset))
        text += TellBitmaps(*poBitmaps);
    if (const auto* const poTables = dynamic_cast<const IPCTDataset*>(&oDataset))
        text += TellPCTs(*poTables);
    if (const auto* const poTables = dynamic_cast<const ILUTDataset*>(&oDataset))
        text += TellLUTs(*poTables);
    if (auto* const poModels = dynamic_cast<IMathModelDataset*>(&oDataset))
        for (const unsigned int nModel : poModels->GetMathModelList())
        {
            const std::unique_ptr<krv::mathmodel::IMathModel> poModel(poModels->GetMathModel(nModel));
            if (const auto* const poRpc = dynamic_cast<const krv::mathmodel::RpcModel*>(poModel.get()))
                text += "RPC " + Numbers(poRpc->GetCoefficients().GetValues()) + "\n";
        }
    if (const auto* const poPlaced = dynamic_cast<const IGeocodedDataset*>(&oDataset))
        text += Numbers(poPlaced->GetGeocoding().GetTerms());
    const std::unique_ptr<krv::ogc::cs::ICRS> poCRS(oDataset.ReadCRS());
    return text + (poCRS ? poCRS->GetName() : "no system") + "\n";
}

} // namespace krv::test
