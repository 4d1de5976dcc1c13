// Readers, writers and datasets on top of each other give what the same steps give that each go through a file.
#include "datasources/datasets/constrasterdataset.h"
#include "datasources/datasets/memorydataset.h"
#include "datasources/datasets/metacomplexdataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/derived/pctrasterreader.h"
#include "datasources/reader/derived/totalpowerrasterreader.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/idatasetaccess.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "datasources/reader/multitypereader.h"
#include "datasources/reader/readervalidity.h"
#include "datasources/writer/memorywriter.h"
#include "datasources/writer/multitypewriter.h"
#include "gobs/mask/mask.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/raster.h"
#include "tests/support/pixels.h"
#include "tests/support/recipe.h"
#include "tools/conformance/formathome.h"

#include <gtest/gtest.h>

namespace krv::test
{

namespace
{

using namespace krv::datasources;
using gobs::DataType;
using gobs::Raster;
using Channels = std::vector<unsigned int>;
using ReaderPtr = std::unique_ptr<IRasterReader>;

constexpr unsigned int WIDTH = 310, HEIGHT = 275;

class Compositions : public ::testing::Test
{
protected:
    Compositions()
    {
        moHome.Add(std::string(KRV_TEST_HOME) + "/lib/qrfformats/krvdsk.so", "<Dataset><SupportsCreate/></Dataset>");
    }

    static void WriteAll(IRasterIO* poIO, std::string bytes)
    {
        const std::unique_ptr<IRasterIO> oIO(poIO);
        oIO->WriteWindow(0U, 0U, oIO->GetFileWidth(), oIO->GetFileHeight(),
                         reinterpret_cast<unsigned char*>(bytes.data()));
    }

    // A row of bits for each pixel of the image; empty when all are valid.
    static std::string ReadValidity(IRasterReader& oReader)
    {
        ReaderValidity oValidity(oReader);
        Raster oRaster({oReader.GetWidth(), oReader.GetHeight(), oReader.GetChansCount(), oReader.GetDataType()}, {});
        const std::unique_ptr<gobs::Mask> oMask = oValidity.Read(oRaster);
        std::string bits;
        for (unsigned int n = 0; oMask != nullptr && n < oReader.GetWidth() * oReader.GetHeight(); ++n)
            bits += oMask->GetBit(n % oReader.GetWidth(), n / oReader.GetWidth()) ? '\1' : '\0';
        return bits.find('\0') != std::string::npos ? bits : std::string();
    }

    // What a file has to hold of it: what values say is in the record.
    static std::string ReadMask(IRasterReader& oReader)
    {
        const auto* const poAccess = dynamic_cast<const IDatasetAccess*>(&oReader);
        auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(poAccess->GetDataset());
        if (poAccess->GetDataset() == nullptr)
            return ReadValidity(oReader);
        const unsigned int nMask = poBitmaps != nullptr ? FindValidityMask(*poBitmaps) : 0;
        return nMask != 0 ? ReadPixels(BasicReader(poBitmaps, {nMask}, false)) : std::string();
    }

    // Everything that a reader shows, as a file: pixels, validity, record, and levels by a method.
    std::string ToFile(IRasterReader& oReader, const char* pName, const char* pMethod = "NEAREST")
    {
        const std::string file = moHome.GetFolder().File(pName);
        const std::unique_ptr<IDataset> oDataset(DatasetManager::GetInstance()->NewDataset(file, "KRVDSK", ""));
        auto& oRasters = dynamic_cast<IRasterDataset&>(*oDataset);
        Channels oAll(oReader.GetChansCount());
        for (unsigned int n = 0; n < oAll.size(); ++n)
            oAll[n] = n + 1;
        oRasters.Create({oReader.GetWidth(), oReader.GetHeight(), oReader.GetChansCount(), oReader.GetDataType()});
        oDataset->WriteAuxiliaryData(oReader.GetAuxiliaryData().GetCleanedMeta());
        WriteAll(oRasters.GetRasterIO(oAll), ReadPixels(oReader));
        if (const std::string bits = ReadMask(oReader); !bits.empty())
        {
            auto& oBitmaps = dynamic_cast<IBitmapDataset&>(*oDataset);
            const unsigned int nMask = oBitmaps.CreateBitmap();
            oBitmaps.SetBitmapDescription(nMask, "");
            WriteAll(oBitmaps.GetBitmapIO({nMask}), bits);
        }
        const std::unique_ptr<IOverviewReaderAccessor> oLevels(oReader.GetOverviewReaderAccessor());
        const std::unique_ptr<IOverviewManager> oManager(oRasters.GetOverviewManager());
        oManager->SetResamplingName(pMethod);
        for (const unsigned int nLevel : oLevels != nullptr ? oLevels->GetLevels() : Channels())
        {
            oManager->CreateLevel(nLevel);
            WriteAll(oManager->GetOverviewIO(nLevel, oAll),
                     ReadPixels(*ReaderPtr(oLevels->CreateRasterReader(nLevel))));
            for (const unsigned int nChannel : oAll)
                oManager->SetValid(nChannel, nLevel, true);
        }
        oDataset->Close();
        return file;
    }

    static void ExpectSame(IRasterReader& oComposed, IRasterReader& oStepwise)
    {
        ASSERT_EQ(oComposed.GetDataType(), oStepwise.GetDataType());
        ASSERT_EQ(oComposed.GetChansCount(), oStepwise.GetChansCount());
        EXPECT_EQ(ReadPixels(oComposed), ReadPixels(oStepwise));
        EXPECT_EQ(ReadValidity(oComposed), ReadValidity(oStepwise));
        const std::unique_ptr<IOverviewReaderAccessor> oFirst(oComposed.GetOverviewReaderAccessor());
        const std::unique_ptr<IOverviewReaderAccessor> oSecond(oStepwise.GetOverviewReaderAccessor());
        ASSERT_EQ(oFirst->GetLevels(), oSecond->GetLevels());
        for (const unsigned int nLevel : oFirst->GetLevels())
        {
            EXPECT_EQ(oFirst->IsLevelValid(nLevel), oSecond->IsLevelValid(nLevel));
            EXPECT_EQ(ReadPixels(*ReaderPtr(oFirst->CreateRasterReader(nLevel))),
                      ReadPixels(*ReaderPtr(oSecond->CreateRasterReader(nLevel))))
                << "level " << nLevel;
        }
        ExactHaloReader oFirstHalo(&oComposed, false), oSecondHalo(&oStepwise, false);
        for (IRasterReader* const poReader :
             {static_cast<IRasterReader*>(&oFirstHalo), static_cast<IRasterReader*>(&oSecondHalo)})
        {
            poReader->SetTileSize(90, 61);
            poReader->SetMargins(20, 9, eMirror101);
        }
        for (unsigned int nTile = 0; nTile < oFirstHalo.GetTileCount(); ++nTile)
        {
            const std::unique_ptr<Raster> oOne(oFirstHalo.GetRaster(nTile)), oOther(oSecondHalo.GetRaster(nTile));
            ASSERT_EQ(PixelsOf(*oOne), PixelsOf(*oOther)) << "tile " << nTile;
        }
    }

    // 16-bit pixels with a no-data value and a mask that leaves a corner out, and levels.
    static void FillPart(MemoryDataset& oPart, unsigned int nSeed)
    {
        oPart.Create(WIDTH, HEIGHT, {gobs::eDT_16S});
        AuxiliaryData oTags(1);
        oTags.SetChanMetadataValue("NO_DATA_VALUE", "-7", 1);
        oPart.WriteAuxiliaryData(oTags);
        std::string pixels = RecipeImage(WIDTH, HEIGHT, {nSeed}, gobs::eDT_16S);
        for (std::size_t n = 0; n < 4000; n += nSeed + 1)
            reinterpret_cast<std::int16_t*>(pixels.data())[n] = -7;
        WriteAll(oPart.GetRasterIO({1}), pixels);
        const unsigned int nMask = oPart.CreateBitmap();
        oPart.SetBitmapDescription(nMask, "");
        std::string bits(std::size_t{WIDTH} * HEIGHT, '\1');
        for (unsigned int n = 0; n < 50 * nSeed; ++n)
            bits[n * WIDTH + n % 7] = '\0';
        WriteAll(oPart.GetBitmapIO({nMask}), bits);
        BasicWriter oWriter(static_cast<IRasterDataset*>(&oPart), {1});
        ASSERT_TRUE(BuildOverviews(oWriter, {2, 4}, "nearest"));
    }

    conformance::FormatHome moHome;
};

} // namespace

// Two images in memory, their pairs, and the power of these.
TEST_F(Compositions, PowerOfPairsInMemory)
{
    MemoryDataset oI, oQ;
    FillPart(oI, 1);
    FillPart(oQ, 3);
    MetaComplexDataset oPairs(&oI, &oQ, {{1, 1}}, false);
    TotalPowerRasterReader oComposed(&static_cast<IDataset&>(oPairs), false);
    ASSERT_FALSE(ReadValidity(oComposed).empty());
    EXPECT_EQ(std::unique_ptr<IOverviewReaderAccessor>(oComposed.GetOverviewReaderAccessor())->GetLevels(),
              (Channels{2, 4}));

    BasicReader oFirst(static_cast<IDataset*>(&oI), {}, false), oSecond(static_cast<IDataset*>(&oQ), {}, false);
    const std::string i = ToFile(oFirst, "i.krv"), q = ToFile(oSecond, "q.krv");
    MetaComplexDataset oStored(i, q, {{1, 1}});
    BasicReader oComplex(static_cast<IDataset*>(&oStored), {}, false);
    TotalPowerRasterReader oPower(ToFile(oComplex, "complex.krv"));
    BasicReader oStepwise(ToFile(oPower, "power.krv"));
    ExpectSame(oComposed, oStepwise);
}

// A constant in the place of a part that is missing, and the result kept in memory.
TEST_F(Compositions, PowerOfAPartAndAConstantKeptInMemory)
{
    MemoryDataset oI;
    oI.Create(WIDTH, HEIGHT, {gobs::eDT_32R});
    WriteAll(oI.GetRasterIO({1}), RecipeImage(WIDTH, HEIGHT, {5}, gobs::eDT_32R));
    ConstRasterDataset oQ(WIDTH, HEIGHT, {{gobs::eDT_32R, -2.5}});
    MetaComplexDataset oPairs(&oI, &oQ, {{1, 1}}, false);
    TotalPowerRasterReader oPower(&static_cast<IDataset&>(oPairs), false);
    MemoryWriter oWriter({WIDTH, HEIGHT, 1, oPower.GetDataType()});
    oPower.SetTileSize(64, 100);
    for (unsigned int nTile = 0; nTile < oPower.GetTileCount(); ++nTile)
        oWriter.WriteRaster(std::unique_ptr<Raster>(oPower.GetRaster(nTile)).get());
    BasicReader oComposed(oWriter.Share().release(), {}, true);

    BasicReader oFirst(static_cast<IDataset*>(&oI), {}, false), oSecond(&oQ, {}, false);
    MetaComplexDataset oStored(ToFile(oFirst, "i.krv"), ToFile(oSecond, "q.krv"), {{1, 1}});
    BasicReader oComplex(static_cast<IDataset*>(&oStored), {}, false);
    TotalPowerRasterReader oPowerOfFile(ToFile(oComplex, "complex.krv"));
    BasicReader oStepwise(ToFile(oPowerOfFile, "power.krv"));
    ExpectSame(oComposed, oStepwise);
}

// Rasters of one type into channels of three in memory, one of them in its colours.
TEST_F(Compositions, ColoursOfAMixedImageInMemory)
{
    MemoryDataset oMemory;
    MixedTypes oTypes;
    oTypes.moChannels = {gobs::eDT_16S, gobs::eDT_8U, gobs::eDT_32R};
    MultiTypeWriter oWriter(static_cast<IRasterDataset*>(&oMemory), {1, 2, 3}, oTypes);
    oWriter.CreateNewFile({WIDTH, HEIGHT, 3, gobs::eDT_32R});
    AuxiliaryData oTags(3);
    oTags.SetChanMetadataValue("NO_DATA_VALUE", "3", 2);
    oWriter.SetAuxiliaryData(oTags);
    std::vector<float> oValues(std::size_t{3} * WIDTH * HEIGHT);
    for (std::size_t n = 0; n < oValues.size(); ++n)
        oValues[n] = static_cast<float>(n % 3 == 1 ? n / 700 % 9 : n % 1000);
    const Raster oRaster({WIDTH, HEIGHT, 3, gobs::eDT_32R}, {0, 0}, reinterpret_cast<unsigned char*>(oValues.data()),
                         false);
    oWriter.WriteRaster(&oRaster);
    ASSERT_TRUE(BuildOverviews(oWriter, {2}, "mode"));
    gobs::PCT oTable;
    for (unsigned int n = 0; n < 9; ++n)
        oTable.Add({double(n),
                    n + 1.0,
                    {static_cast<std::uint16_t>(n * 5000), static_cast<std::uint16_t>(60000 - n * 3000),
                     static_cast<std::uint16_t>(n % 2 * 40000)}});
    oMemory.CreatePCT(oTable, 2);
    PCTRasterReader oComposed(static_cast<IDataset*>(&oMemory), 2, false);
    ASSERT_FALSE(ReadValidity(oComposed).empty());

    MultiTypeReader oMixed(&oMemory, {1, 2, 3}, gobs::eDT_32R, eOwnPlace);
    EXPECT_EQ(ReadPixels(oMixed), PixelsOf(oRaster));
    BasicReader oIndices(static_cast<IDataset*>(&oMemory), {2}, false);
    PCTRasterReader oColours(new BasicReader(ToFile(oIndices, "indices.krv", "MODE")), oTable, true);
    BasicReader oStepwise(ToFile(oColours, "colours.krv", "MODE"));
    ExpectSame(oComposed, oStepwise);
}

} // namespace krv::test
