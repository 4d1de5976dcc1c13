#include "fuzz/support/exercise.h"

#include "datasources/interfaces/datatypechannelfilter.h"
#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/displaydefaults.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/reader/basicoverviewreaderaccessor.h"
#include "datasources/reader/basicreader.h"
#include "gobs/mask/imaskbuilder.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/raster.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <algorithm>
#include <memory>
#include <set>
#include <vector>

namespace krv::fuzz
{

namespace
{

using namespace krv::datasources;

constexpr std::size_t MAX_CHANNELS = 4;
constexpr unsigned int MAX_TILE = 256;

// One question; a refusal is as good an answer as any.
void Ask(const Refusal& oRefused, const std::function<void()>& oQuestion)
{
    try
    {
        oQuestion();
    }
    catch (const krv::Exception& oException)
    {
        if (oRefused)
            oRefused(oException);
    }
}

// The first tile, the last and one in between, with margins of which some lie outside.
void ReadTiles(IRasterReader& oReader, const Refusal& oRefused)
{
    oReader.SetTileSize(std::min(oReader.GetTileWidth(), MAX_TILE), std::min(oReader.GetTileHeight(), MAX_TILE));
    oReader.SetMargins(3, 2, eReplicate);
    const unsigned int nTiles = oReader.GetTileCount();
    for (const unsigned int nTile : std::set<unsigned int>{0U, nTiles / 2, nTiles - 1})
        Ask(oRefused, [&] { const std::unique_ptr<krv::gobs::Raster> oRaster(oReader.GetRaster(nTile)); });
}

void ExerciseRasters(IDataset& oDataset, IRasterDataset& oRasters, const Refusal& oRefused)
{
    const std::unique_ptr<IChannelInfo> oFirst(oRasters.GetChannelInfo(1));
    std::vector<unsigned int> oChannels = DataTypeChannelFilter(oFirst->GetDataType()).Accept(oRasters);
    oChannels.resize(std::min(oChannels.size(), MAX_CHANNELS));
    Ask(oRefused,
        [&]
        {
            BasicReader oReader(&oDataset, oChannels, false);
            ReadTiles(oReader, oRefused);
        });
    BasicOverviewReaderAccessor oLevels(&oRasters, oChannels);
    for (const unsigned int nLevel : oLevels.GetLevels())
        Ask(oRefused,
            [&]
            {
                oLevels.GetAuxiliaryData(nLevel);
                const std::unique_ptr<IRasterReader> oReader(oLevels.CreateRasterReader(nLevel));
                ReadTiles(*oReader, oRefused);
            });
}

void ExerciseColours(const IPCTDataset& oTables)
{
    for (const unsigned int nTable : oTables.GetPCTList())
    {
        const std::unique_ptr<krv::gobs::PCT> oTable(oTables.GetPCT(nTable));
        oTables.GetPCTChannel(nTable);
        oTables.GetPCTDescription(nTable);
    }
}

void ExerciseDisplay(IDataset& oDataset)
{
    std::string file, layer;
    unsigned int nNumber = 0;
    GetDefaultRed(&oDataset);
    GetDefaultPCT(&oDataset, 1, file, layer, nNumber);
}

void ExerciseDescription(IDataset& oDataset, const Refusal& oRefused)
{
    Ask(oRefused,
        [&]
        {
            const AuxiliaryData oTags = oDataset.ReadAuxiliaryData();
            for (unsigned int n = 1; n <= oTags.GetChannelCount(); ++n)
                Ask(oRefused, [&] { GetTypedNoData(oTags, n); });
            Ask(oRefused,
                [&]
                {
                    const std::unique_ptr<krv::gobs::IMaskBuilder> oMasks(
                        GetTypedNoDataMaskBuilder(oTags, krv::gobs::BkgdRule{}, true));
                });
        });
    Ask(oRefused,
        [&]
        {
            const std::unique_ptr<krv::ogc::cs::ICRS> oSystem(oDataset.ReadCRS());
            if (oSystem)
                oSystem->GetWKT();
        });
    Ask(oRefused,
        [&]
        {
            if (const auto* poGeocoded = dynamic_cast<IGeocodedDataset*>(&oDataset))
                poGeocoded->GetGeocoding().IsInvertible();
        });
    Ask(oRefused,
        [&]
        {
            if (const auto* poTables = dynamic_cast<IPCTDataset*>(&oDataset))
                ExerciseColours(*poTables);
        });
    Ask(oRefused, [&] { ExerciseDisplay(oDataset); });
}

} // namespace

void ExerciseDataset(IDataset& oDataset, const Refusal& oRefused)
{
    ExerciseDescription(oDataset, oRefused);
    if (auto* poRasters = dynamic_cast<IRasterDataset*>(&oDataset))
        Ask(oRefused, [&] { ExerciseRasters(oDataset, *poRasters, oRefused); });
    auto* poBitmaps = dynamic_cast<IBitmapDataset*>(&oDataset);
    if (poBitmaps != nullptr && !poBitmaps->GetBitmapList().empty())
        Ask(oRefused,
            [&]
            {
                BasicReader oReader(poBitmaps, {}, false);
                ReadTiles(oReader, oRefused);
            });
}

void ExerciseFile(const std::string& fileName)
{
    Ask({},
        [&]
        {
            const std::unique_ptr<IDataset> oDataset(DatasetManager::GetInstance()->Open(fileName, eReadOnly));
            ExerciseDataset(*oDataset, {});
        });
}

} // namespace krv::fuzz

// Of every fuzzer that opens files of any bytes.
extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    krv::nspio::Warning::SetSink([](const std::string&, const std::string&, unsigned int) {});
    krv::datasources::DatasetManager::GetInstance();
    return 0;
}
