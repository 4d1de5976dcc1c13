#include "datasources/metadata/auxiliarydata.h"

#include "datasources/metadata/metadatafilters.h"
#include "tests/support/thrown.h"

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <vector>

namespace krv::datasources
{

namespace
{

using krv::test::ExpectPlace;
using krv::test::Thrown;

std::vector<std::string> Keys(const MetadataMap& oMap)
{
    std::vector<std::string> oKeys;
    for (const auto& oEntry : oMap)
        oKeys.push_back(oEntry.first);
    return oKeys;
}

// Every operation that takes a channel number, with the name that must stand in the exception's signature.
struct ChannelOperation
{
    const char* mpName;
    std::function<void(AuxiliaryData&, unsigned int)> moCall;
};

// A call whose last argument is the channel.
template <class Method, class... Arguments>
ChannelOperation Operation(const char* pName, Method pMethod, const Arguments&... oArguments)
{
    return {pName, [=](AuxiliaryData& oData, unsigned int nChannel)
            {
                (oData.*pMethod)(oArguments..., nChannel);
            }};
}

std::vector<ChannelOperation> ChannelOperations()
{
    using Data = AuxiliaryData;
    return {Operation("GetChanMetadata", &Data::GetChanMetadata),
            Operation("GetChanMetadataValue", &Data::GetChanMetadataValue, "k"),
            Operation("GetChannelDescription", &Data::GetChannelDescription),
            Operation("GetChanOverviewMetadata", &Data::GetChanOverviewMetadata),
            Operation("SetChanMetadata", &Data::SetChanMetadata, MetadataMap{{"k", "v"}}),
            Operation("SetChanMetadataValue", &Data::SetChanMetadataValue, "k", "v"),
            Operation("RemoveChanMetadataValue", &Data::RemoveChanMetadataValue, "k"),
            Operation("SetChannelDescription", &Data::SetChannelDescription, "d"),
            {"AppendChanMetadata", [](Data& oData, unsigned int nChannel)
             {
                 oData.AppendChanMetadata({{"k", "v"}}, nChannel, true);
             }}};
}

void ExpectOutOfBounds(const ChannelOperation& oOperation, AuxiliaryData& oData, unsigned int nChannel)
{
    SCOPED_TRACE(std::string(oOperation.mpName) + " of channel " + std::to_string(nChannel));
    const auto oError = Thrown<krv::OutOfBoundsException>([&] { oOperation.moCall(oData, nChannel); });
    EXPECT_EQ(oError.GetMessage(), "Out of bounds.");
    EXPECT_EQ(oError.GetIndices(), std::vector<unsigned int>{nChannel});
    ExpectPlace(oError, std::string("AuxiliaryData::") + oOperation.mpName + "(", "datasources/metadata/auxiliarydata",
                354);
    EXPECT_FALSE(oData.IsModified());
}

} // namespace

TEST(CaseInsensitiveCompare, OrdersByFoldedBytesUpToTheFirstNul)
{
    const detail::CaseInsensitiveCompare oLess;
    struct Case
    {
        std::string moFirst, moSecond;
        bool mbLess, mbGreater;
    };
    const Case CASES[] = {{"Key", "kEY", false, false},
                          {"_DBLayout", "Band", true, false},
                          {"a", "ab", true, false},
                          {"", "a", true, false},
                          {"Z", "[", false, true}, // compared as z
                          {"\xC4", "\xE4", true, false},
                          {"z", "\x80", true, false}, // unsigned bytes
                          {std::string("a\0b", 3), "A", false, false},
                          {std::string("a\0b", 3), "aa", true, false}};
    for (const Case& oCase : CASES)
    {
        EXPECT_EQ(oLess(oCase.moFirst, oCase.moSecond), oCase.mbLess) << oCase.moFirst << " < " << oCase.moSecond;
        EXPECT_EQ(oLess(oCase.moSecond, oCase.moFirst), oCase.mbGreater) << oCase.moSecond << " < " << oCase.moFirst;
    }
}

TEST(AuxiliaryData, ChannelOutsideTheCountThrowsAndLeavesTheObject)
{
    AuxiliaryData oNone;
    AuxiliaryData oTwo(2);
    EXPECT_EQ(oNone.GetChannelCount(), 0u);
    for (const ChannelOperation& oOperation : ChannelOperations())
    {
        ExpectOutOfBounds(oOperation, oNone, 1);
        ExpectOutOfBounds(oOperation, oTwo, 0);
        ExpectOutOfBounds(oOperation, oTwo, 3);
        ExpectOutOfBounds(oOperation, oTwo, 4294967295u);
    }
    EXPECT_TRUE(oTwo.GetChanMetadata(1).empty() && oTwo.GetChanMetadata(2).empty());
}

TEST(AuxiliaryData, SingleValueSettersKeepTheFirstSpellingAndAssignTheFlag)
{
    AuxiliaryData oData(1);
    oData.SetFileMetadataValue("Key", "a");
    EXPECT_EQ(oData.GetFileMetadataValue("KEY"), "a");
    oData.SetFileMetadataValue("KEY", "b");
    EXPECT_EQ(Keys(oData.GetFileMetadata()), std::vector<std::string>{"Key"});
    EXPECT_EQ(oData.GetFileMetadataValue("key"), "b");
    EXPECT_EQ(oData.GetFileMetadataValue("absent"), "");

    oData.SetFileMetadata({{"Key", "a"}});
    EXPECT_TRUE(oData.IsModified());
    oData.SetFileMetadataValue("key", "a");
    EXPECT_FALSE(oData.IsModified());
    oData.SetFileMetadataValue("key", "A");
    EXPECT_TRUE(oData.IsModified());
    oData.SetChanMetadataValue("chan", "1", 1);
    EXPECT_TRUE(oData.IsModified());
    oData.SetChanMetadataValue("CHAN", "1", 1);
    EXPECT_FALSE(oData.IsModified());
    oData.SetChanMetadata(oData.GetChanMetadata(1), 1);
    EXPECT_TRUE(oData.IsModified());
    EXPECT_EQ(oData.GetChanMetadataValue("chan", 1), "1");
}

TEST(AuxiliaryData, RemovalEmptiesTheValueAndLeavesTheFlag)
{
    AuxiliaryData oData(1);
    oData.SetFileMetadataValue("A", "1");
    oData.SetChanMetadataValue("A", "1", 1);
    oData.RemoveFileMetadataValue("a");
    oData.RemoveFileMetadataValue("absent");
    EXPECT_EQ(oData.GetFileMetadata(), (MetadataMap{{"A", ""}}));
    EXPECT_TRUE(oData.IsModified());
    oData.SetFileMetadataValue("A", "");
    oData.RemoveChanMetadataValue("a", 1);
    EXPECT_EQ(oData.GetChanMetadata(1), (MetadataMap{{"A", ""}}));
    EXPECT_FALSE(oData.IsModified());
}

TEST(AuxiliaryData, AppendMergesOrStopsAtTheFirstDuplicate)
{
    const MetadataMap ADDED = {{"a", "1"}, {"b", "2"}, {"c", "3"}};
    AuxiliaryData oData(1);
    oData.SetChannelDescription("description", 1);
    oData.SetFileMetadataValue("x", "");
    oData.SetFileMetadataValue("x", "");
    oData.AppendChanMetadata({{"B", "x"}, {"d", "4"}}, 1, false);
    EXPECT_FALSE(oData.IsModified());
    const auto oError = Thrown<krv::Exception>([&] { oData.AppendChanMetadata(ADDED, 1, false); });
    EXPECT_EQ(oError.GetMessage(), "Duplicate key \"b\" found while appending metadata tags");
    krv::test::ExpectNoPlace(oError);
    EXPECT_EQ(oData.GetChanMetadata(1), (MetadataMap{{"a", "1"}, {"B", "x"}, {"d", "4"}}));

    oData.AppendChanMetadata(ADDED, 1, true);
    EXPECT_EQ(oData.GetChanMetadata(1), (MetadataMap{{"a", "1"}, {"b", "2"}, {"c", "3"}, {"d", "4"}}));
    EXPECT_EQ(Keys(oData.GetChanMetadata(1)), (std::vector<std::string>{"a", "b", "c", "d"}));
    EXPECT_EQ(oData.GetChannelDescription(1), "description");
}

TEST(AuxiliaryData, FilterTakesOutWhatItSelects)
{
    AuxiliaryData oData(2);
    oData.SetFileMetadata({{"keep", "1"}, {"drop_file", "2"}});
    oData.SetChanMetadata({{"keep", "1"}, {"drop_chan", "2"}}, 1);
    oData.SetChanMetadata({{"drop_chan", "2"}, {"drop_file", "3"}}, 2);
    const std::unique_ptr<krv::qrfutils::IMetadataFilter> oFile(krv::qrfutils::GetMetadataFilter("drop_file", false));
    const std::unique_ptr<krv::qrfutils::IMetadataFilter> oChan(krv::qrfutils::GetMetadataFilter("*_chan", false));
    const AuxiliaryData oFiltered = oData.GetFilteredMeta(oFile.get(), oChan.get());
    EXPECT_EQ(oFiltered.GetFileMetadata(), (MetadataMap{{"keep", "1"}}));
    EXPECT_EQ(oFiltered.GetChanMetadata(1), (MetadataMap{{"keep", "1"}}));
    EXPECT_EQ(oFiltered.GetChanMetadata(2), (MetadataMap{{"drop_file", "3"}}));
    EXPECT_EQ(oData.GetChanMetadata(2).size(), 2u);
}

TEST(AuxiliaryData, CleaningRemovesTheBookkeepingTagsAlone)
{
    const MetadataMap KEPT_FILE = {{"_DBLayout2", ""}, {"LAYER_CRC", ""}, {"_Overview_2", ""}, {"Sensor", ""}};
    MetadataMap oFile = KEPT_FILE;
    oFile["_DBLayout"] = "x";
    const MetadataMap KEPT_CHAN = {{"_Overview_", ""}, {"_Overview_3a", ""}, {"layer_crc", ""}, {"_DBLayout", ""}};
    MetadataMap oChan = KEPT_CHAN;
    oChan["_Overview_3"] = "x";
    oChan["_Overview_16"] = "y";

    AuxiliaryData oData(3);
    oData.SetFileMetadata(oFile);
    oData.SetChanMetadata(oChan, 1);
    oData.SetChanMetadata({{"LAYER_CRC", "x"}, {"_overview_2", ""}}, 3);
    const AuxiliaryData oCleaned = oData.GetCleanedMeta();
    EXPECT_EQ(oCleaned.GetFileMetadata(), KEPT_FILE);
    EXPECT_EQ(oCleaned.GetChanMetadata(1), KEPT_CHAN);
    EXPECT_EQ(oCleaned.GetChanMetadata(3), (MetadataMap{{"_overview_2", ""}}));
    EXPECT_EQ(oData.GetChanOverviewMetadata(1), (MetadataMap{{"_Overview_3", "x"}, {"_Overview_16", "y"}}));
    EXPECT_TRUE(oData.GetChanOverviewMetadata(3).empty());

    oData.SetFileMetadata({{"_dblayout", "x"}});
    EXPECT_EQ(oData.GetCleanedMeta().GetFileMetadata().size(), 1u);
}

} // namespace krv::datasources
