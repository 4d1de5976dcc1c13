#include "plugins/support/writing/recordtext.h"

#include "tests/support/thrown.h"

#include <gtest/gtest.h>

using krv::plugins::support::RecordText;
using krv::test::Error;

// Every byte survives as key and as value; a text that is cut anywhere gives the record of what is left.
TEST(RecordText, KeysAndValuesAreBytes)
{
    RecordText oText;
    oText.moTags = krv::datasources::AuxiliaryData(2);
    std::string bytes;
    for (int n = 1; n < 256; ++n)
        bytes += static_cast<char>(n);
    oText.moTags.SetFileMetadataValue("[2]" + bytes, bytes + "%41");
    oText.moTags.SetFileMetadataValue("%3D", "a=b");
    oText.moTags.SetChanMetadataValue("=[1]", "[crs]=x", 2);
    oText.moTags.SetChannelDescription("line\nline", 1);
    oText.moLevels[4] = std::uint64_t{1} << 60;
    oText.SetGeocoding({500000.1, 0.3, 0, 1e-300, 0, -30});
    const std::string written = oText.Write();
    RecordText oRead;
    const auto Read = [&](const std::string& text)
    {
        oRead = RecordText();
        oRead.moTags = krv::datasources::AuxiliaryData(2);
        std::istringstream oLines(text);
        oRead.Read(oLines);
    };
    Read(written);
    EXPECT_EQ(oRead.moTags.GetFileMetadata(), oText.moTags.GetFileMetadata());
    EXPECT_EQ(oRead.moTags.GetChanMetadata(2), oText.moTags.GetChanMetadata(2));
    EXPECT_EQ(oRead.moTags.GetChannelDescription(1), "line\nline");
    EXPECT_EQ(oRead.moLevels, oText.moLevels);
    EXPECT_EQ(oRead.GetGeocoding().GetTerms(), oText.GetGeocoding().GetTerms());
    EXPECT_EQ(oRead.GetCRS(), nullptr);
    for (std::size_t n = 0; n <= written.size(); ++n)
    {
        Read(written.substr(0, n));
        EXPECT_LE(oRead.moTags.GetFileMetadata().size(), 2U) << n;
    }
    // Channels that are not there, levels that are none and a system that nobody knows.
    Read("[3]a=b\n[level 1]=5\n[level x]=5\n[level 2]=-5\n[geocoding]=1 2 3\n[crs]=nowhere\nno sign\n");
    EXPECT_TRUE(oRead.moLevels.empty() && oRead.moTags.GetFileMetadata().empty());
    EXPECT_EQ(oRead.GetGeocoding().GetTerms(), krv::ogc::cs::GeocodingInfo().GetTerms());
    EXPECT_TRUE(Error([&] { oRead.GetCRS(); }).starts_with("data: "));
}
