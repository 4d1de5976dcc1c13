#include "datasources/metadata/levelbook.h"

#include "datasources/metadata/auxiliarydata.h"

#include <gtest/gtest.h>

using namespace krv::datasources;

TEST(LevelBook, SaysOfEachLevelAndChannelWhatWasSaidLast)
{
    const std::string FOREIGN = "IMAGE_STRUCTURE:OVERVIEW_RESAMPLING";
    AuxiliaryData oBook(2);
    EXPECT_TRUE(IsLevelValid(oBook, 2, 4)) << "other programs record nothing";
    EXPECT_EQ(GetLevelMethod(oBook, 4), "");
    oBook.SetFileMetadataValue(FOREIGN, "Bilinear");
    EXPECT_EQ(GetLevelMethod(oBook, 4), "BILINEAR");
    oBook.SetFileMetadataValue(FOREIGN, "their own");
    EXPECT_EQ(GetLevelMethod(oBook, 4), "");

    EXPECT_TRUE(SetLevelInvalid(oBook, 4));
    EXPECT_FALSE(SetLevelInvalid(oBook, 4));
    SetLevelValid(oBook, 1, 4, true, "MODE");
    SetLevelValid(oBook, 2, 8, false, "RMS");
    EXPECT_TRUE(IsLevelValid(oBook, 1, 4) && !IsLevelValid(oBook, 2, 4) && !IsLevelValid(oBook, 2, 8));
    EXPECT_EQ(GetLevelMethod(oBook, 4), "MODE");
    EXPECT_EQ(oBook.GetFileMetadataValue(FOREIGN), "RMS");
    EXPECT_EQ(oBook.GetChanMetadataValue("_Overview_4", 1), "valid MODE");

    AuxiliaryData oCopy(3);
    CopyLevel(oBook, oCopy, 4);
    EXPECT_TRUE(IsLevelValid(oCopy, 1, 4) && !IsLevelValid(oCopy, 2, 4) && IsLevelValid(oCopy, 3, 4));
    RemoveLevel(oBook, 4);
    EXPECT_EQ(oBook.GetChanMetadataValue("_Overview_4", 1), "");
    EXPECT_EQ(ParseLevelMethod("nearest") + ParseLevelMethod("NONE") + ParseLevelMethod("best"), "NEARESTNONE");
}
