// Readers, writers and datasets on top of each other give what the same steps give that each go through a file.
#include "datasources/datasets/constrasterdataset.h"
#include "datasources/datasets/memorydataset.h"
#include "datasources/datasets/metacomplexdataset.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/levelbook.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/defaultreader.h"
#include "datasources/reader/derived/pctrasterreader.h"
#include "datasources/reader/derived/rastercache.h"
#include "datasources/reader/derived/totalpowerrasterreader.h"
#include "datasources/reader/derived/transformrasterreader.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/idatasetaccess.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "datasources/reader/multitypereader.h"
#include "datasources/reader/readervalidity.h"
#include "datasources/writer/ioverviewwriteraccessor.h"
#include "datasources/writer/memorywriter.h"
#include "datasources/writer/multitypewriter.h"
#include "gobs/mask/mask.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/raster.h"
#include "gobs/resampling/gridmap.h"
#include "tests/support/facts.h"
#include "tests/support/pixels.h"
#include "tests/support/recipe.h"
#include "tools/conformance/formathome.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <map>

namespace krv::test
{

namespace
{

using namespace krv::datasources;
using gobs::AffineMap;
using gobs::DataType;
using gobs::Raster;
using gobs::Resampling;
using Channels = std::vector<unsigned int>;
using ReaderPtr = std::unique_ptr<IRasterReader>;
using LevelsPtr = std::unique_ptr<IOverviewReaderAccessor>;

constexpr unsigned int WIDTH = 61, HEIGHT = 44;

Channels All(unsigned int nChannels)
{
    Channels oAll(nChannels);
    for (unsigned int n = 0; n < nChannels; ++n)
        oAll[n] = n + 1;
    return oAll;
}

IDataset* DatasetOf(const IRasterReader& oReader)
{
    const auto* const poAccess = dynamic_cast<const IDatasetAccess*>(&oReader);
    return poAccess != nullptr ? poAccess->GetDataset() : nullptr;
}

LevelsPtr LevelsOf(IRasterReader& oReader)
{
    return LevelsPtr(oReader.GetOverviewReaderAccessor());
}

// A byte for each pixel of the image; empty when all are valid.
std::string ReadValidity(IRasterReader& oReader)
{
    ReaderValidity oValidity(oReader);
    Raster oRaster({oReader.GetWidth(), oReader.GetHeight(), oReader.GetChansCount(), oReader.GetDataType()}, {});
    const std::unique_ptr<gobs::Mask> oMask = oValidity.Read(oRaster);
    std::string bits;
    for (unsigned int n = 0; oMask != nullptr && n < oReader.GetWidth() * oReader.GetHeight(); ++n)
        bits += oMask->GetBit(n % oReader.GetWidth(), n / oReader.GetWidth()) ? '\1' : '\0';
    return bits.find('\0') != std::string::npos ? bits : std::string();
}

// The mask that the dataset below has; of other readers all that they know.
std::string ReadMask(IRasterReader& oReader)
{
    if (DatasetOf(oReader) == nullptr)
        return ReadValidity(oReader);
    auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(DatasetOf(oReader));
    const unsigned int nMask = poBitmaps != nullptr ? FindValidityMask(*poBitmaps) : 0;
    return nMask != 0 ? ReadPixels(BasicReader(poBitmaps, {nMask}, false)) : std::string();
}

// The mask of a level; empty bits stand for pixels that are all valid.
void WriteMaskLevel(IDataset& oDataset, unsigned int nLevel, std::string bits)
{
    auto& oBitmaps = dynamic_cast<IBitmapDataset&>(oDataset);
    const unsigned int nMask = FindValidityMask(oBitmaps);
    const std::unique_ptr<IOverviewManager> oManager(oBitmaps.GetBitmapOverviewManager());
    oManager->CreateLevel(nLevel);
    const std::unique_ptr<IRasterIO> oIO(oManager->GetOverviewIO(nLevel, {nMask}));
    bits.resize(bits.empty() ? std::size_t{oIO->GetFileWidth()} * oIO->GetFileHeight() : bits.size(), '\1');
    oIO->WriteWindow(0u, 0u, oIO->GetFileWidth(), oIO->GetFileHeight(), reinterpret_cast<unsigned char*>(bits.data()));
    oManager->SetValid(nMask, nLevel, true);
}

void WriteMask(IDataset& oDataset, std::string bits)
{
    auto& oBitmaps = dynamic_cast<IBitmapDataset&>(oDataset);
    const unsigned int nMask = oBitmaps.CreateBitmap();
    oBitmaps.SetBitmapDescription(nMask, "");
    const std::unique_ptr<IRasterIO> oIO(oBitmaps.GetBitmapIO({nMask}));
    oIO->WriteWindow(0u, 0u, oIO->GetFileWidth(), oIO->GetFileHeight(), reinterpret_cast<unsigned char*>(bits.data()));
}

void WriteTiles(IRasterReader& oReader, IRasterWriter& oWriter)
{
    for (unsigned int nTile = 0; nTile < oReader.GetTileCount(); ++nTile)
        oWriter.WriteRaster(std::unique_ptr<Raster>(oReader.GetRaster(nTile)).get());
}

// Everything that a reader shows: pixels, validity, record, and levels with the names of their methods.
void Store(IRasterReader& oReader, IDataset& oDataset, const std::vector<DataType>& oTypes)
{
    auto& oRasters = dynamic_cast<IRasterDataset&>(oDataset);
    oRasters.Create(oReader.GetWidth(), oReader.GetHeight(), oTypes);
    const AuxiliaryData oRecord = oReader.GetAuxiliaryData();
    oDataset.WriteAuxiliaryData(oRecord.GetCleanedMeta());
    MixedTypes oMixed;
    oMixed.moRaster = oReader.GetDataType();
    MultiTypeWriter oWriter(&oRasters, {}, oMixed);
    WriteTiles(oReader, oWriter);
    const std::string bits = ReadMask(oReader);
    if (!bits.empty())
        WriteMask(oDataset, bits);
    if (const LevelsPtr oLevels = LevelsOf(oReader))
    {
        const std::unique_ptr<IOverviewWriterAccessor> oWriters(oWriter.GetOverviewWriterAccessor());
        for (const unsigned int nLevel : oLevels->GetLevels())
        {
            if (const std::string method = GetLevelMethod(oRecord, nLevel); !method.empty())
                oWriters->SetResamplingName(method);
            oWriters->CreateLevel(nLevel);
            const ReaderPtr oLevel(oLevels->CreateRasterReader(nLevel));
            WriteTiles(*oLevel, *std::unique_ptr<IRasterWriter>(oWriters->CreateRasterWriter(nLevel)));
            if (!bits.empty())
                WriteMaskLevel(oDataset, nLevel, ReadValidity(*oLevel));
            oWriters->SetLevelValid(nLevel, oLevels->IsLevelValid(nLevel));
        }
    }
    oDataset.Synchronize();
}

std::vector<DataType> SameTypes(const IRasterReader& oReader)
{
    return std::vector<DataType>(oReader.GetChansCount(), oReader.GetDataType());
}

// A reader and what it stands on, which go in the reverse order.
struct Chain
{
    std::vector<std::shared_ptr<void>> moBelow;
    std::shared_ptr<IRasterReader> mpoReader; // null: the step makes no sense there

    Chain() = default;
    Chain(const Chain&) = default;
    Chain& operator=(const Chain&) = default;
    ~Chain()
    {
        mpoReader.reset();
        while (!moBelow.empty())
            moBelow.pop_back();
    }

    template <typename T>
    T& Keep(std::unique_ptr<T> poThing)
    {
        T& oThing = *poThing;
        moBelow.push_back(mpoReader);
        moBelow.push_back(std::shared_ptr<T>(std::move(poThing)));
        return oThing;
    }
    void Add(ReaderPtr poReader)
    {
        moBelow.push_back(mpoReader);
        mpoReader = std::move(poReader);
    }
    void Stop() { mpoReader.reset(); }
    void OnMemory(const std::vector<DataType>& oTypes)
    {
        auto poMemory = std::make_unique<MemoryDataset>();
        Store(*mpoReader, *poMemory, oTypes);
        IDataset& oMemory = Keep(poMemory->Share());
        if (oTypes == SameTypes(*mpoReader))
            Add(std::make_unique<BasicReader>(&oMemory, Channels(), false));
        else
            Add(std::make_unique<MultiTypeReader>(&oMemory, All(mpoReader->GetChansCount()), mpoReader->GetDataType(),
                                                  eOwnPlace));
    }
    void AddTransform(const ogc::cs::GeocodingInfo& oTerms, const TransformRequest& oRequest)
    {
        Add(std::make_unique<TransformRasterReader>(mpoReader.get(), std::make_shared<AffineMap>(oTerms), oRequest,
                                                    false));
    }
};

gobs::PCT MakeTable()
{
    gobs::PCT oTable;
    for (unsigned int n = 0; n < 40; ++n)
        oTable.Add({n * n * n / 20.0 - 100,
                    (n + 1) * (n + 1) * (n + 1) / 20.0 - 100,
                    {static_cast<std::uint16_t>(n * 1542 + 257), static_cast<std::uint16_t>(65535 - n * 1028),
                     static_cast<std::uint16_t>((n % 5 + 1) * 10280)}});
    oTable.SetBackground({1, 2, 3});
    return oTable;
}

struct Step
{
    const char* mpName;
    void (*mpAdd)(Chain& oChain);
};

const Step STEPS[] = {
    {"colours",
     [](Chain& o)
     {
         if (o.mpoReader->GetChansCount() != 1 || o.mpoReader->GetDataType().IsComplex())
             return o.Stop();
         o.Add(std::make_unique<PCTRasterReader>(o.mpoReader.get(), MakeTable(), false));
     }},
    {"power",
     [](Chain& o)
     {
         o.Add(std::make_unique<TotalPowerRasterReader>(o.mpoReader.get(), false));
     }},
    {"turned",
     [](Chain& o)
     {
         o.AddTransform({-3, 1.1, 0.2, 9, -0.2, 0.9}, {52, 45, Resampling::eNearest});
     }},
    {"halved",
     [](Chain& o)
     {
         o.AddTransform({1, 2.3, 0, 2, 0, 2.6}, {22, 16, Resampling::eAverage});
     }},
    {"moved",
     [](Chain& o)
     {
         o.AddTransform({0.25, 1, 0, -0.5, 0, 1}, {55, 40, Resampling::eCubic});
     }},
    {"cache",
     [](Chain& o)
     {
         o.Add(std::make_unique<RasterCache>(o.mpoReader.get(), false, CacheOptions{19, 23}));
     }},
    {"memory",
     [](Chain& o)
     {
         o.OnMemory(SameTypes(*o.mpoReader));
     }},
    {"mixed",
     [](Chain& o)
     {
         std::vector<DataType> oTypes = SameTypes(*o.mpoReader);
         for (std::size_t n = 0; n < oTypes.size(); n += 2)
             oTypes[n] = oTypes[n].IsComplex() ? gobs::eDT_C64R : gobs::eDT_64R;
         o.OnMemory(oTypes);
     }},
    {"pairs",
     [](Chain& o)
     {
         const unsigned int nChannels = o.mpoReader->GetChansCount();
         IDataset* const poDataset = DatasetOf(*o.mpoReader);
         const auto HasOther = [&](const IChannelInfo* po)
         {
             return po->GetDataType() != o.mpoReader->GetDataType();
         };
         const auto& oInfos = o.mpoReader->GetChannelsInfo();
         if (poDataset == nullptr || nChannels < 2 || o.mpoReader->GetDataType().IsComplex() ||
             std::any_of(oInfos.begin(), oInfos.end(), HasOther))
             return o.Stop();
         IDataset& oPairs = o.Keep(
             std::make_unique<MetaComplexDataset>(poDataset, std::vector<ComplexPair>{{1, 2}, {nChannels, 1}}, false));
         o.Add(std::make_unique<BasicReader>(&oPairs, Channels(), false));
     }},
    {"halo",
     [](Chain& o)
     {
         o.Add(std::make_unique<ExactHaloReader>(o.mpoReader.get(), false));
     }},
};

class Compositions : public ::testing::Test
{
protected:
    Compositions()
    {
        for (const char* const pFormat : {"krvdsk", "tif"})
            moHome.Add(std::string(KRV_TEST_HOME) + "/lib/qrfformats/" + pFormat + ".so",
                       "<Dataset><SupportsCreate/></Dataset>");
    }

    Chain StoreFile(IRasterReader& oReader)
    {
        const std::string file = moHome.GetFolder().File("step" + std::to_string(++mnFiles) + ".krv");
        const std::unique_ptr<IDataset> oDataset(DatasetManager::GetInstance()->NewDataset(file, "KRVDSK", ""));
        Store(oReader, *oDataset, SameTypes(oReader));
        oDataset->Close();
        Chain oChain;
        oChain.mpoReader.reset(CreateDefaultReader(file, {}));
        return oChain;
    }

    static void ExpectSame(IRasterReader& oComposed, IRasterReader& oStepwise)
    {
        ASSERT_EQ(oComposed.GetDataType(), oStepwise.GetDataType());
        ASSERT_EQ(oComposed.GetChansCount(), oStepwise.GetChansCount());
        ExpectSameImage(oComposed, oStepwise);
        const AuxiliaryData oOne = oComposed.GetAuxiliaryData(), oOther = oStepwise.GetAuxiliaryData();
        for (unsigned int n = 1; n <= oComposed.GetChansCount(); ++n)
            EXPECT_EQ(oOne.GetChanMetadataValue("NO_DATA_VALUE", n), oOther.GetChanMetadataValue("NO_DATA_VALUE", n));
        const LevelsPtr oFirst = LevelsOf(oComposed), oSecond = LevelsOf(oStepwise);
        const Channels oLevels = oFirst != nullptr ? oFirst->GetLevels() : Channels();
        ASSERT_EQ(oLevels, oSecond != nullptr ? oSecond->GetLevels() : Channels());
        for (const unsigned int nLevel : oLevels)
        {
            SCOPED_TRACE(nLevel);
            EXPECT_EQ(oFirst->IsLevelValid(nLevel), oSecond->IsLevelValid(nLevel));
            EXPECT_EQ(GetLevelMethod(oOne, nLevel), GetLevelMethod(oOther, nLevel));
            ExpectSameImage(*ReaderPtr(oFirst->CreateRasterReader(nLevel)),
                            *ReaderPtr(oSecond->CreateRasterReader(nLevel)));
        }
    }

    // Pixels, validity, and margins by the reader itself and wider ones.
    static void ExpectSameImage(IRasterReader& oComposed, IRasterReader& oStepwise)
    {
        ASSERT_EQ(ReadPixels(oComposed), ReadPixels(oStepwise));
        ASSERT_EQ(ReadValidity(oComposed), ReadValidity(oStepwise));
        const unsigned int nWidth = oComposed.GetWidth(), nHeight = oComposed.GetHeight();
        // Margins that lie inside or outside: of others readers of files make what exact ones do not.
        ExpectSameWindows(oComposed, oStepwise, {{0, 0, nWidth, nHeight}, {5, 4, nWidth - 11, nHeight - 9}},
                          {5, 4, eMirror});
        ExactHaloReader oFirst(&oComposed, false), oSecond(&oStepwise, false);
        ExpectSameWindows(oFirst, oSecond, {{0, 0, nWidth, nHeight - 8}, {nWidth - 2, 3, 2, nHeight - 4}},
                          {26, 9, eMirror101});
        oComposed.SetMargins(0, 0, eMirror);
    }

    struct Margins
    {
        unsigned int mnX;
        unsigned int mnY;
        eMarginBehaviour meBehaviour;
    };

    static void ExpectSameWindows(IRasterReader& oOne, IRasterReader& oOther,
                                  const std::vector<std::array<unsigned int, 4>>& oWindows, const Margins& oMargins)
    {
        for (IRasterReader* const poReader : {&oOne, &oOther})
            poReader->SetMargins(oMargins.mnX, oMargins.mnY, oMargins.meBehaviour);
        ReaderValidity oFirst(oOne), oSecond(oOther);
        for (const auto& [nX0, nY0, nWidth, nHeight] : oWindows)
        {
            const std::unique_ptr<Raster> oTile(oOne.ReadRaster(nX0, nY0, nWidth, nHeight)),
                oExpected(oOther.ReadRaster(nX0, nY0, nWidth, nHeight));
            ASSERT_EQ(PixelsOf(*oTile), PixelsOf(*oExpected)) << "window from " << nX0 << ", " << nY0;
            const auto oMask = oFirst.Read(*oTile), oOtherMask = oSecond.Read(*oExpected);
            for (std::uint64_t n = 0; n < oTile->GetFullWidth() * oTile->GetFullHeight(); ++n)
            {
                const std::uint64_t nX = n % oTile->GetFullWidth(), nY = n / oTile->GetFullWidth();
                ASSERT_EQ(oMask == nullptr || oMask->GetBit(nX, nY),
                          oOtherMask == nullptr || oOtherMask->GetBit(nX, nY))
                    << "window from " << nX0 << ", " << nY0 << ", validity at " << nX << ", " << nY;
            }
        }
    }

    // The chain, and each one that another step makes of it, against the last step over the file of those before.
    void Compare(const std::function<Chain()>& oMake, IRasterReader& oFile, unsigned int nDepth)
    {
        for (const Step& oStep : STEPS)
        {
            SCOPED_TRACE(oStep.mpName);
            Chain oComposed = oMake(), oStepwise;
            oStep.mpAdd(oComposed);
            if (oComposed.mpoReader == nullptr)
                continue;
            oStepwise.mpoReader = {std::shared_ptr<void>(), &oFile};
            oStep.mpAdd(oStepwise);
            if (oStepwise.mpoReader == nullptr)
                continue;
            ++mnCompared;
            ExpectSame(*oComposed.mpoReader, *oStepwise.mpoReader);
            if (HasFailure())
                return;
            if (nDepth == 1)
                continue;
            const auto oNext = [&]
            {
                Chain oChain = oMake();
                oStep.mpAdd(oChain);
                return oChain;
            };
            const Chain oStored = StoreFile(*oStepwise.mpoReader);
            Compare(oNext, *oStored.mpoReader, nDepth - 1);
            if (HasFailure())
                return;
        }
    }

    // A part of an image kept in memory, with a no-data value and a mask where there are none, and levels.
    void CompareAll(IRasterReader& oImage, const char* pMethod)
    {
        TransformRasterReader oPart(&oImage, std::make_shared<AffineMap>(ogc::cs::GeocodingInfo(40, 1, 0, 60, 0, 1)),
                                    {WIDTH, HEIGHT}, false);
        auto poMemory = std::make_shared<MemoryDataset>();
        Store(oPart, *poMemory, SameTypes(oPart));
        if (FindValidityMask(*poMemory) == 0)
        {
            std::string bits(std::size_t{WIDTH} * HEIGHT, '\1');
            for (unsigned int n = 0; n < 20; ++n)
                bits.replace(n * WIDTH, 21 - n, 21 - n, '\0');
            WriteMask(*poMemory, bits);
        }
        BasicWriter oWriter(static_cast<IRasterDataset*>(poMemory.get()), {});
        ASSERT_TRUE(BuildOverviews(oWriter, {2, 4}, pMethod));
        const auto oMake = [&]
        {
            Chain oChain;
            oChain.mpoReader = std::make_shared<BasicReader>(static_cast<IDataset*>(poMemory.get()), Channels(), false);
            return oChain;
        };
        const Chain oFile = StoreFile(*oMake().mpoReader);
        Compare(oMake, *oFile.mpoReader, 3);
        EXPECT_GT(mnCompared, 500u);
    }

    conformance::FormatHome moHome;
    unsigned int mnFiles = 0;
    unsigned int mnCompared = 0;
};

struct RealImage
{
    const char* mpFile;
    const char* mpMethod;
};

class RealCompositions : public Compositions, public ::testing::WithParamInterface<RealImage>
{
};

} // namespace

// Channels with no-data values of their own, and a part whose other half is a constant.
TEST_F(Compositions, OfChannelsThatAreNotValidTogether)
{
    MemoryDataset oStack;
    oStack.Create(120, 130, {gobs::eDT_16S, gobs::eDT_16S, gobs::eDT_16S});
    AuxiliaryData oTags(3);
    std::string pixels = RecipeImage(120, 130, {1, 2, 3}, gobs::eDT_16S);
    for (unsigned int n = 0; n < 3; ++n)
    {
        oTags.SetChanMetadataValue("NO_DATA_VALUE", std::to_string(-7 - static_cast<int>(n)), n + 1);
        for (std::size_t nAt = n; nAt < pixels.size() / 2; nAt += 3 * (n + 2))
            reinterpret_cast<std::int16_t*>(pixels.data())[nAt] = static_cast<std::int16_t>(-7 - static_cast<int>(n));
    }
    oStack.WriteAuxiliaryData(oTags);
    const std::unique_ptr<IRasterIO> oIO(oStack.GetRasterIO({1, 2, 3}));
    oIO->WriteWindow(0u, 0u, 120u, 130u, reinterpret_cast<unsigned char*>(pixels.data()));
    BasicReader oImage(static_cast<IDataset*>(&oStack), {}, false);
    CompareAll(oImage, "AVERAGE");

    ConstRasterDataset oConstant(120, 130, {{gobs::eDT_16S, -9}});
    MetaComplexDataset oPairs(&oStack, &oConstant, {{3, 1}}, false);
    BasicReader oComplex(static_cast<IDataset*>(&oPairs), {}, false);
    CompareAll(oComplex, "NEAREST");
}

// Any three on top of each other, over each image.
TEST_P(RealCompositions, OfAnyThree)
{
    const std::string file = DataFolder() + "/" + GetParam().mpFile;
    if (!std::filesystem::exists(file))
        GTEST_SKIP() << "the real files are not there";
    const ReaderPtr oImage(CreateDefaultReader(file, {}));
    CompareAll(*oImage, GetParam().mpMethod);
}

INSTANTIATE_TEST_SUITE_P(Files, RealCompositions,
                         ::testing::Values(RealImage{"palette/jello.tif", "MODE"}, RealImage{"sar/slc.tif", "NEAREST"},
                                           RealImage{"sar/slc.tif", "RMS"},
                                           RealImage{"nodata/image_nodata.tif", "AVERAGE"},
                                           RealImage{"dem/olinda_dem_utm25s.tif", "BILINEAR"}));

} // namespace krv::test
