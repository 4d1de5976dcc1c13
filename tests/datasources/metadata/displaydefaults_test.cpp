#include "datasources/metadata/displaydefaults.h"

#include "datasources/metadata/metadatadefaultrgbgmapper.h"
#include "tests/datasources/metadata/groupinglocale.h"
#include "tests/support/syntheticdataset.h"
#include "toolkit/exceptions/exceptions.h"

#include <gtest/gtest.h>

#include <memory>
#include <optional>

namespace krv::datasources
{

namespace
{

struct Colour
{
    const char* mpKey;
    unsigned int (*mpGet)(IDataset*);
    void (*mpSet)(IDataset*, unsigned int);
};

constexpr Colour COLOURS[] = {{"DefaultRed", &GetDefaultRed, &SetDefaultRed},
                              {"DefaultGreen", &GetDefaultGreen, &SetDefaultGreen},
                              {"DefaultBlue", &GetDefaultBlue, &SetDefaultBlue},
                              {"DefaultGray", &GetDefaultGrey, &SetDefaultGrey}};

struct Table
{
    const char* mpKey;
    bool (*mpGet)(IDataset*, unsigned int, std::string&, std::string&, unsigned int&);
    void (*mpSet)(IDataset*, unsigned int, const std::string&, const std::string&, unsigned int);
};

constexpr Table TABLES[] = {{"DEFAULT_LUT_REF", &GetDefaultLUT, &SetDefaultLUT},
                            {"DEFAULT_PCT_REF", &GetDefaultPCT, &SetDefaultPCT}};

class DisplayDefaults : public testing::Test
{
protected:
    AuxiliaryData& Metadata() { return moModel->moAuxiliary; }

    krv::test::ImageModelPtr moModel = std::make_shared<krv::test::ImageModel>();
    krv::test::DatasetPart moDataset{moModel};
};

} // namespace

TEST_F(DisplayDefaults, ColoursAreReadAsTheNumberAtTheFront)
{
    struct Case
    {
        const char* mpValue;
        unsigned int mnChannel;
    };
    const Case CASES[] = {{"3", 3},
                          {" 3abc", 3},
                          {"+7", 7},
                          {"-1", 4294967295u},
                          {"abc", 0},
                          {"", 0},
                          {"4294967295", 4294967295u},
                          {"4294967296", 0},
                          {"-4294967296", 0},
                          {"0x10", 0},
                          {"1.9", 1},
                          {"1,234", 1},
                          {"- 1", 0}};
    for (const Colour& oColour : COLOURS)
    {
        EXPECT_EQ(oColour.mpGet(&moDataset), 0u);
        for (const Case& oCase : CASES)
        {
            Metadata().SetFileMetadata({{oColour.mpKey, oCase.mpValue}});
            EXPECT_EQ(oColour.mpGet(&moDataset), oCase.mnChannel) << oColour.mpKey << " = " << oCase.mpValue;
        }
        Metadata().SetFileMetadata({});
    }
}

TEST_F(DisplayDefaults, ColoursAreWrittenUnderTheirOwnKeyWhateverTheLocale)
{
    const krv::test::GroupingLocale oLocale;
    for (const Colour& oColour : COLOURS)
    {
        oColour.mpSet(&moDataset, 1234567);
        EXPECT_EQ(Metadata().GetFileMetadata().at(oColour.mpKey), "1234567");
        EXPECT_EQ(oColour.mpGet(&moDataset), 1234567u);
    }
    EXPECT_EQ(Metadata().GetFileMetadata().size(), 4u);
    Metadata().SetFileMetadata({{"DefaultRed", "1.234"}});
    EXPECT_EQ(GetDefaultRed(&moDataset), 1u);
}

TEST_F(DisplayDefaults, TablesAreReferencedByChannel)
{
    for (const Table& oTable : TABLES)
    {
        SCOPED_TRACE(oTable.mpKey);
        std::string sFile, sLayer;
        unsigned int nNumber = 0;
        EXPECT_FALSE(oTable.mpGet(&moDataset, 2, sFile, sLayer, nNumber));
        oTable.mpSet(&moDataset, 2, "scene.dat", "SEG", 12);
        EXPECT_EQ(Metadata().GetChanMetadata(2).at(oTable.mpKey), "gdb:scene.dat/{SEG:12}");
        EXPECT_FALSE(oTable.mpGet(&moDataset, 1, sFile, sLayer, nNumber));
        ASSERT_TRUE(oTable.mpGet(&moDataset, 2, sFile, sLayer, nNumber));
        EXPECT_EQ(sFile + " " + sLayer + " " + std::to_string(nNumber), "scene.dat SEG 12");
        for (const unsigned int nChannel : {0u, 4u})
        {
            EXPECT_THROW(oTable.mpGet(&moDataset, nChannel, sFile, sLayer, nNumber), krv::OutOfBoundsException);
            EXPECT_THROW(oTable.mpSet(&moDataset, nChannel, "f", "l", 1), krv::OutOfBoundsException);
        }
    }
    EXPECT_EQ(Metadata().GetChanMetadata(2).size(), 2u);
}

TEST(DisplayDefaultTransformations, ChannelsAreRenumberedForASubset)
{
    using krv::qrfutils::MetaDataDefaultRGBGMapper;
    struct Case
    {
        std::vector<unsigned int> moChannels;
        std::string moValue;
        std::optional<std::string> moResult; // nothing: the tag is dropped
    };
    const Case CASES[] = {{{4, 2}, "2", "2"},
                          {{4, 2}, "4", "1"},
                          {{4, 2}, "3", {}},
                          {{4, 2}, "x", {}},
                          {{4, 2}, "", {}},
                          {{4, 2}, " \t+4th", "1"},
                          {{4, 2, 4}, "4", "1"}, // the first of equals
                          {{4, 0}, "x", "2"},
                          {{}, "1", {}},
                          {{4294967295u}, "-1", {}},
                          {{4294967295u}, "4294967295", "1"},
                          {{1, 4294967295u}, "4294967297", {}}, // no wrap to 1
                          {{0, 7}, "18446744073709551616", {}},
                          {{0, 7}, std::string(100000, '9'), {}},
                          {{7}, std::string(100000, '0') + "7", "1"}};
    for (const Case& oCase : CASES)
    {
        const MetadataMap oMap = {{"DefaultRed", oCase.moValue}, {"Other", "4"}, {"Default", "4"}};
        MetadataMap oExpected = {{"Other", "4"}, {"Default", "4"}};
        if (oCase.moResult)
            oExpected["DefaultRed"] = *oCase.moResult;
        EXPECT_EQ(MetaDataDefaultRGBGMapper(oCase.moChannels).Transform(oMap), oExpected)
            << testing::PrintToString(oCase.moChannels) << " value " << oCase.moValue.substr(0, 30);
    }
}

TEST(DisplayDefaultTransformations, KeysCountInTheirExactSpellingAlone)
{
    const krv::qrfutils::MetaDataDefaultRGBGMapper oMapper({4, 2});
    const krv::qrfutils::MetaDataDefaultRGBGMapper oCopy(oMapper);
    EXPECT_EQ(oCopy.Transform({{"DefaultRed", "2"}, {"DefaultGreen", "4"}, {"DefaultBlue", "3"}, {"DefaultGray", "2"}}),
              (MetadataMap{{"DefaultRed", "2"}, {"DefaultGreen", "1"}, {"DefaultGray", "2"}}));
    const MetadataMap UNTOUCHED = {
        {"defaultred", "2"}, {"DEFAULTGREEN", "3"}, {"DefaultBlue2", "4"}, {"DefaultGrey", "4"}};
    EXPECT_EQ(oCopy.Transform(UNTOUCHED), UNTOUCHED);
}

} // namespace krv::datasources
