#include "datasources/interfaces/datatypechannelfilter.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "gobs/raster/raster.h"
#include "tests/conformance/formattraits.h"
#include "tests/conformance/tiffile.h"
#include "tests/support/demofile.h"
#include "tests/support/recipe.h"
#include "toolkit/exceptions/exceptions.h"
#include "tools/conformance/conformance.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>

using namespace krv::conformance;
using namespace krv::datasources;
using krv::test::RecipeImage;
using RasterPtr = std::unique_ptr<krv::gobs::Raster>;
using Channels = std::vector<unsigned int>;

namespace
{

FormatTraits DemoTraits()
{
    FormatTraits oTraits;
    oTraits.moShortName = "DEMO";
    oTraits.moLibrary = "demo";
    oTraits.mpMakeFile = [](const std::string& fileName, const Image& oImage)
    {
        krv::test::WriteDemoFile(fileName, oImage.mnWidth, oImage.mnHeight, oImage.moTypes, oImage.moTags);
    };
    oTraits.mbOverviews = false;
    return oTraits;
}

FormatTraits TifTraits()
{
    FormatTraits oTraits;
    oTraits.moShortName = "TIF";
    oTraits.moLibrary = "tif";
    oTraits.mpMakeFile = &WriteTifFile;
    oTraits.moVariants = TifVariants();
    oTraits.mbMixedTypes = false;
    std::erase(oTraits.moTypes, krv::gobs::eDT_C16U); // the file format has complex signed integers only
    return oTraits;
}

std::vector<FormatTraits> AllTraits()
{
    return {DemoTraits(), TifTraits()};
}

std::string Name(const ::testing::TestParamInfo<FormatTraits>& oInfo)
{
    return oInfo.param.moShortName;
}

class FormatConformance : public ::testing::TestWithParam<FormatTraits>
{
protected:
    std::string Make(const Image& oImage, const std::string& name = "sample")
    {
        std::string file = moFolder.File(name);
        GetParam().mpMakeFile(file, oImage);
        return file;
    }

    static std::string Library()
    {
        return std::string(KRV_TEST_HOME) + "/lib/qrfformats/" + GetParam().moLibrary + ".so";
    }

    // The generic checks over one file.
    static void ExpectConformity(const std::string& file)
    {
        const Plugin oPlugin(Library());
        for (const Check& oCheck : GetChecks())
        {
            for (const std::string& finding : krv::conformance::Run(oCheck, oPlugin, file))
                ADD_FAILURE() << oCheck.mpName << ": " << finding;
        }
    }

    // The whole image is that of the recipe.
    static ::testing::AssertionResult HoldsRecipe(IRasterReader& oReader, const Channels& oChannels)
    {
        const RasterPtr oWhole(oReader.ReadRaster(0, 0, oReader.GetWidth(), oReader.GetHeight()));
        const std::string expected =
            RecipeImage(oReader.GetWidth(), oReader.GetHeight(), oChannels, oReader.GetDataType());
        if (expected.size() != oWhole->GetBufferSize())
            return ::testing::AssertionFailure() << oWhole->GetBufferSize() << " bytes, not " << expected.size();
        const auto* const pBytes = reinterpret_cast<const char*>(oWhole->GetBuffer());
        const auto oPlaces = std::mismatch(expected.begin(), expected.end(), pBytes);
        if (oPlaces.first == expected.end())
            return ::testing::AssertionSuccess();
        return ::testing::AssertionFailure() << "byte " << oPlaces.first - expected.begin() << " differs";
    }

    krv::conformance::TempFolder moFolder;
};

} // namespace

TEST_P(FormatConformance, EveryLayoutPassesTheChecks)
{
    const FormatTraits& oTraits = GetParam();
    for (unsigned int nVariant = 0; nVariant < oTraits.moVariants.size(); ++nVariant)
    {
        SCOPED_TRACE(oTraits.moVariants[nVariant]);
        Image oImage;
        oImage.mnVariant = nVariant;
        if (oTraits.mbOverviews)
            oImage.moLevels = {2, 4};
        if (oTraits.mbMixedTypes)
            oImage.moTypes = {krv::gobs::eDT_16S, krv::gobs::eDT_C64R, krv::gobs::eDT_8U, krv::gobs::eDT_16S};
        ExpectConformity(Make(oImage));
    }
}

TEST_P(FormatConformance, SmallAndThinImagesPassTheChecks)
{
    for (const auto& [nWidth, nHeight] : {std::pair{1u, 1u}, {1u, 700u}, {700u, 1u}, {256u, 256u}, {257u, 17u}})
    {
        SCOPED_TRACE(std::to_string(nWidth) + " x " + std::to_string(nHeight));
        Image oImage;
        oImage.mnWidth = nWidth;
        oImage.mnHeight = nHeight;
        oImage.moTypes.assign(2, krv::gobs::eDT_16U);
        ExpectConformity(Make(oImage));
    }
}

TEST_P(FormatConformance, EveryTypeAndLayoutGivesTheRecipesPixels)
{
    const FormatTraits& oTraits = GetParam();
    for (const krv::gobs::NativeDataTypeCode eType : oTraits.moTypes)
    {
        for (unsigned int nVariant = 0; nVariant < oTraits.moVariants.size(); ++nVariant)
        {
            Image oImage;
            oImage.moTypes.assign(3, eType);
            oImage.mnVariant = nVariant;
            SCOPED_TRACE(oImage.moTypes[0].Describe() + " " + oTraits.moVariants[nVariant]);
            const std::string file = Make(oImage);
            BasicReader oReader(file);
            EXPECT_EQ(oReader.GetFileFormat()->GetShortName(), oTraits.moShortName);
            EXPECT_EQ(oReader.GetDataType(), oImage.moTypes[0]);
            EXPECT_TRUE(HoldsRecipe(oReader, {1, 2, 3}));
            BasicReader oTurned(file, {3, 1, 3});
            EXPECT_TRUE(HoldsRecipe(oTurned, {3, 1, 3}));
        }
    }
}

TEST_P(FormatConformance, MixedTypesAreReadTypeByType)
{
    if (!GetParam().mbMixedTypes)
        GTEST_SKIP() << "the format holds one type";
    Image oImage;
    oImage.moTypes.clear();
    for (const auto eType : GetParam().moTypes)
        oImage.moTypes.insert(oImage.moTypes.end(), {eType, krv::gobs::eDT_8U});
    const std::string file = Make(oImage);
    EXPECT_THROW(BasicReader{file}, krv::DataException); // all channels at once are of several types
    for (unsigned int nChannel = 1; nChannel <= oImage.moTypes.size(); ++nChannel)
    {
        const krv::gobs::DataType& oType = oImage.moTypes[nChannel - 1];
        BasicReader oReader(file, {nChannel});
        EXPECT_EQ(oReader.GetDataType(), oType);
        EXPECT_TRUE(HoldsRecipe(oReader, {nChannel})) << nChannel;
        const BasicReader oSame(file, DataTypeChannelFilter(oType));
        EXPECT_EQ(oSame.GetChansCount(), oType == krv::gobs::DataType(krv::gobs::eDT_8U) ? 16u : 1u) << nChannel;
    }
}

TEST_P(FormatConformance, TagsOfTheFileComeThrough)
{
    if (!GetParam().mbMetadata)
        GTEST_SKIP() << "the format holds no tags";
    Image oImage;
    oImage.moTags = {{"scene", "alps, july"}, {"Sensor", "x=1"}};
    const AuxiliaryData oData = BasicReader(Make(oImage)).GetAuxiliaryData();
    for (const auto& [key, value] : oImage.moTags)
        EXPECT_EQ(oData.GetFileMetadataValue(key), value);
}

TEST_P(FormatConformance, LevelsGiveTheRecipesPixels)
{
    if (!GetParam().mbOverviews)
        GTEST_SKIP() << "the format holds no levels";
    for (unsigned int nVariant = 0; nVariant < GetParam().moVariants.size(); ++nVariant)
    {
        SCOPED_TRACE(GetParam().moVariants[nVariant]);
        Image oImage;
        oImage.moTypes.assign(2, krv::gobs::eDT_16U);
        oImage.moLevels = {2, 4, 8};
        oImage.mnVariant = nVariant;
        BasicReader oReader(Make(oImage), {2, 1});
        const std::unique_ptr<IOverviewReaderAccessor> oAccessor(oReader.GetOverviewReaderAccessor());
        ASSERT_EQ(oAccessor->GetLevels(), (Channels{2, 4, 8}));
        for (const unsigned int nLevel : oImage.moLevels)
        {
            const std::unique_ptr<IRasterReader> oLevel(oAccessor->CreateRasterReader(nLevel));
            EXPECT_EQ(oLevel->GetWidth(), (oImage.mnWidth + nLevel - 1) / nLevel);
            EXPECT_TRUE(HoldsRecipe(*oLevel, {2 + 1000 * nLevel, 1 + 1000 * nLevel}));
        }
    }
}

// Files of all formats side by side: the manager gives each to its own, whatever it is called.
TEST_P(FormatConformance, TheManagerFindsTheFormat)
{
    const std::string file = Make(Image(), "misleading.xyz");
    for (int nTime = 0; nTime < 2; ++nTime)
    {
        for (const FormatTraits& oOther : AllTraits())
        {
            const std::string otherFile = moFolder.File("other");
            oOther.mpMakeFile(otherFile, Image());
            EXPECT_EQ(BasicReader(otherFile).GetFileFormat()->GetShortName(), oOther.moShortName);
            EXPECT_EQ(BasicReader(file).GetFileFormat()->GetShortName(), GetParam().moShortName);
        }
    }
    EXPECT_EQ(DatasetManager::GetInstance()->GetFormatByName(GetParam().moShortName)->GetShortName(),
              GetParam().moShortName);
}

INSTANTIATE_TEST_SUITE_P(Demo, FormatConformance, ::testing::Values(DemoTraits()), Name);
INSTANTIATE_TEST_SUITE_P(Tif, FormatConformance, ::testing::Values(TifTraits()), Name);
