#include "tests/plugins/krvdsk/changes.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterio.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/rasterinfo.h"
#include "plugins/krvdsk/krvdskbuilder.h"
#include "tests/support/telldataset.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <algorithm>
#include <filesystem>

namespace krv::test
{

using krv::datasources::AuxiliaryData;
using krv::datasources::IOverviewManager;
using krv::datasources::IRasterIO;
using krv::gobs::DataType;
using krv::plugins::krvdsk::KrvdskBuilder;
using krv::plugins::krvdsk::KrvdskDataset;

namespace
{

using ManagerPointer = std::unique_ptr<IOverviewManager>;

DataType TypeOf(KrvdskDataset& oDataset, unsigned int nChannel)
{
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(oDataset.GetChannelInfo(nChannel));
    return poInfo->GetDataType();
}

void WriteNoise(IRasterIO* poIO, std::size_t nPixelBytes, std::mt19937& oRandom, bool bTile)
{
    const IOPointer oIO(poIO);
    const unsigned int nWidth = oIO->GetFileWidth(), nHeight = oIO->GetFileHeight();
    unsigned int nX = oRandom() % nWidth, nY = oRandom() % nHeight;
    unsigned int nColumns = 1 + oRandom() % (nWidth - nX), nRows = 1 + oRandom() % (nHeight - nY);
    if (bTile)
    {
        nX -= nX % oIO->GetTileWidth();
        nY -= nY % oIO->GetTileHeight();
        nColumns = std::min(oIO->GetTileWidth(), nWidth - nX);
        nRows = std::min(oIO->GetTileHeight(), nHeight - nY);
    }
    std::vector<unsigned char> oPixels(std::size_t{nColumns} * nRows * nPixelBytes);
    const unsigned int nSeed = oRandom();
    for (std::size_t nAt = 0; nAt < oPixels.size(); ++nAt)
        oPixels[nAt] = static_cast<unsigned char>((nSeed >> nAt % 24) + nAt / 5 * nSeed);
    oIO->WriteWindow(nX, nY, nColumns, nRows, oPixels.data());
}

} // namespace

void WriteAnew(const std::string& fileName, const std::string& bytes)
{
    std::filesystem::remove(fileName);
    krv::conformance::WriteFile(fileName, bytes);
}

NativePointer OpenNative(const std::string& fileName, AccessMode eMode)
{
    return NativePointer(static_cast<KrvdskDataset*>(KrvdskBuilder().Open(fileName, eMode)));
}

NativePointer CreateNative(const std::string& fileName, const std::string& options, unsigned int nWidth,
                           unsigned int nHeight, const Types& oTypes)
{
    NativePointer poDataset(static_cast<KrvdskDataset*>(KrvdskBuilder().Create(fileName, options)));
    poDataset->Create(nWidth, nHeight, oTypes);
    return poDataset;
}

std::string Tell(KrvdskDataset& oDataset)
{
    try
    {
        return TellDataset(oDataset);
    }
    catch (const krv::Exception& oException)
    {
        return "refused: " + oException.GetMessage();
    }
}

void Make(KrvdskDataset& oDataset, Change eChange, std::mt19937& oRandom)
{
    const unsigned int nChannels = oDataset.GetChanCount();
    const unsigned int nChannel = nChannels == 0 ? 0 : 1 + oRandom() % nChannels;
    const std::size_t nBytes = nChannels == 0 ? 0 : TypeOf(oDataset, nChannel).GetValueBits() / 8;
    const std::vector<unsigned int> oBitmaps = oDataset.GetBitmapList();
    switch (eChange)
    {
    case Change::eTiles:
    case Change::eWindows:
        if (nChannels != 0)
            WriteNoise(oDataset.GetRasterIO({nChannel}), nBytes, oRandom, eChange == Change::eTiles);
        return;
    case Change::eRecord:
    {
        AuxiliaryData oRecord = oDataset.ReadAuxiliaryData();
        oRecord.SetFileMetadataValue("key " + std::to_string(oRandom() % 4), std::string(oRandom() % 3000, 'v'));
        if (nChannels != 0)
            oRecord.SetChanMetadataValue("band", std::to_string(oRandom()), nChannel);
        oDataset.WriteAuxiliaryData(oRecord);
        oDataset.SetGeocoding({oRandom() % 100 * 1.0, 2, 0, 3, 0, -4});
        if (oRandom() % 8 == 0)
            oDataset.UpdateCRS(*krv::ogc::cs::CreateCRSFromEPSG(oRandom() % 2 == 0 ? 32632 : 4326));
        if (nChannels != 0)
            oDataset.GetHistoryIO(nChannel)->AppendHistory("step " + std::to_string(oRandom()));
        return;
    }
    case Change::eLevels:
    {
        const ManagerPointer poLevels(oDataset.GetOverviewManager());
        const std::vector<unsigned int> oLevels = poLevels->GetLevels();
        const unsigned int nLevel = 2U << oRandom() % 3;
        const bool bThere = std::find(oLevels.begin(), oLevels.end(), nLevel) != oLevels.end();
        if (!bThere)
            poLevels->CreateLevel(nLevel);
        else if (oRandom() % 4 == 0)
            poLevels->DeleteLevel(nLevel);
        else if (nChannels != 0)
        {
            WriteNoise(poLevels->GetOverviewIO(nLevel, {nChannel}), nBytes, oRandom, false);
            poLevels->SetValid(nChannel, nLevel, true);
        }
        return;
    }
    case Change::eBitmaps:
        if (oBitmaps.size() < 3)
        {
            const unsigned int nBitmap = oDataset.CreateBitmap();
            WriteNoise(oDataset.GetBitmapIO({nBitmap}), 1, oRandom, false);
            const ManagerPointer poLevels(oDataset.GetBitmapOverviewManager());
            if (poLevels->GetLevels().empty())
                poLevels->CreateLevel(2);
            WriteNoise(poLevels->GetOverviewIO(2, {nBitmap}), 1, oRandom, false);
        }
        else if (oRandom() % 3 == 0)
            oDataset.DeleteBitmap(oBitmaps[oRandom() % oBitmaps.size()]);
        else
            oDataset.SetBitmapDescription(oBitmaps[oRandom() % oBitmaps.size()], std::to_string(oRandom()));
        return;
    case Change::eChannels:
        if (nChannels > 5 || (nChannels > 0 && oRandom() % 2 == 0))
            oDataset.DeleteChannel(nChannel);
        else
            oDataset.AddNewChannel({oDataset.GetWidth(), oDataset.GetHeight(), oRandom() % 2 == 0 ? 1U : 2U,
                                    static_cast<krv::gobs::NativeDataTypeCode>(oRandom() % 15)});
        if (oDataset.GetChanCount() != 0)
            WriteNoise(oDataset.GetRasterIO({oDataset.GetChanCount()}),
                       TypeOf(oDataset, oDataset.GetChanCount()).GetValueBits() / 8, oRandom, true);
        return;
    case Change::eTables:
        if (oDataset.GetPCTList().size() > 3)
            oDataset.DeletePCT(oDataset.GetPCTList().front());
        krv::gobs::PCT oTable = krv::gobs::PCT::FromColours({{1, 2, 3}, {static_cast<std::uint16_t>(oRandom()), 5, 6}});
        oDataset.SetPCTDescription(oDataset.CreatePCT(oTable, nChannel), "table");
        if (oDataset.GetLUTList().empty())
            oDataset.CreateLUT({{0, 1}, {255, 2}}, nChannel);
        oDataset.UpdateLUT(oDataset.GetLUTList().front(), {{0, oRandom() % 9 * 1.0}, {255, 2}});
    }
}

} // namespace krv::test
