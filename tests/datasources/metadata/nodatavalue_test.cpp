#include "datasources/metadata/nodatavalue.h"

#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/typednodata.h"
#include "datasources/reader/basicreader.h"
#include "gobs/mask/exactmaskdecision.h"
#include "gobs/mask/mask.h"
#include "gobs/raster/raster.h"
#include "tests/datasources/metadata/groupinglocale.h"
#include "tests/support/syntheticdataset.h"
#include "tests/support/thrown.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <limits>
#include <memory>
#include <optional>

namespace krv::datasources
{

namespace
{

constexpr const char* KEY = "NO_DATA_VALUE";

// Three channels; only channel 2 and the file may have a value.
AuxiliaryData Record(const std::string& channelText, const std::string& fileText)
{
    AuxiliaryData oData(3);
    if (!channelText.empty())
        oData.SetChanMetadataValue(KEY, channelText, 2);
    if (!fileText.empty())
        oData.SetFileMetadataValue(KEY, fileText);
    return oData;
}

struct ReadCase
{
    const char* mpChannel;
    const char* mpFile;
    bool mbFound;
    float mnValue;
};

using Builder = std::unique_ptr<krv::gobs::IMaskBuilder>;

template <class Decision>
const Decision& DecisionOf(const Builder& oBuilder)
{
    return dynamic_cast<const Decision&>(dynamic_cast<const krv::gobs::MaskDecisionBuilder&>(*oBuilder).GetDecision());
}

struct ParseCase
{
    std::string moText;
    std::string moValue;
    krv::gobs::SampleValue::eKind meKind;
};

} // namespace

TEST(NoDataValue, IsTheNumberAtTheFrontOfTheChannelsElseTheFilesText)
{
    const krv::test::GroupingLocale oLocale;
    const ReadCase CASES[] = {{"  -9999 ", "1", true, -9999.0f},
                              {"   ", "0", true, 0.0f},
                              {"", " 5", true, 5.0f},
                              {"", "", false, 77.0f},
                              {"  ", "", false, 77.0f},
                              {"abc", "3", true, 0.0f},
                              {"12abc", "", true, 12.0f},
                              {"1.5", "", true, 1.5f},
                              {"1,5", "", true, 1.0f},
                              {"1.000.000", "", true, 1.0f},
                              {"nan", "", true, 0.0f},
                              {"", "  ", true, 77.0f},
                              {"-3.4028234663852886e+38", "", true, -std::numeric_limits<float>::max()}};
    for (const ReadCase& oCase : CASES)
    {
        SCOPED_TRACE(std::string(oCase.mpChannel) + "|" + oCase.mpFile);
        const auto poModel = std::make_shared<krv::test::ImageModel>();
        poModel->moAuxiliary = Record(oCase.mpChannel, oCase.mpFile);
        krv::test::SyntheticDataset oDataset(poModel);
        const BasicReader oReader(static_cast<IDataset*>(&oDataset), {}, false);
        float nValue = 77;
        EXPECT_EQ(krv::qrfutils::GetNoDataValue(oReader, nValue, 2), oCase.mbFound);
        EXPECT_EQ(nValue, oCase.mnValue);
        EXPECT_THROW(krv::qrfutils::GetNoDataValue(oReader, nValue, 0), krv::OutOfBoundsException);
        EXPECT_THROW(krv::qrfutils::GetNoDataValue(oReader, nValue, 4), krv::OutOfBoundsException);
    }
}

TEST(NoDataMaskBuilder, ListsTheChannelsThatHaveAValue)
{
    using krv::gobs::MaskDecision;
    const krv::test::GroupingLocale oLocale;
    const Builder oOne(GetNoDataMaskBuilder(Record("-1.5", ""), krv::gobs::eAllChannels));
    EXPECT_EQ(DecisionOf<MaskDecision>(oOne).GetChannels(), std::vector<unsigned int>{2});
    EXPECT_EQ(DecisionOf<MaskDecision>(oOne).GetValues(), std::vector<double>{-1.5});
    EXPECT_EQ(DecisionOf<MaskDecision>(oOne).GetRule(), krv::gobs::eAllChannels);

    const Builder oMixed(GetNoDataMaskBuilder(Record("7x", " 8"), krv::gobs::eAnyChannel));
    EXPECT_EQ(DecisionOf<MaskDecision>(oMixed).GetChannels(), (std::vector<unsigned int>{1, 2, 3}));
    EXPECT_EQ(DecisionOf<MaskDecision>(oMixed).GetValues(), (std::vector<double>{8, 7, 8}));

    const Builder oNone(GetNoDataMaskBuilder(AuxiliaryData(3), krv::gobs::eAnyChannel));
    EXPECT_TRUE(DecisionOf<MaskDecision>(oNone).GetChannels().empty());
}

TEST(NoDataMaskBuilder, TextsThatAreNoNumberThrow)
{
    for (const char* pText : {"abc", "nan", "  ", "inf", "1e400"})
    {
        for (const bool bOfFile : {false, true})
        {
            const AuxiliaryData oData = bOfFile ? Record("", pText) : Record(pText, "1");
            const auto oError = krv::test::Thrown<krv::Exception>(
                [&] { Builder(GetNoDataMaskBuilder(oData, krv::gobs::eAnyChannel)); });
            EXPECT_EQ(oError.GetMessage(), std::string("Could not parse nodata value \"") + pText + "\"");
            krv::test::ExpectNoPlace(oError);
        }
    }
}

TEST(TypedNoData, ParsesWholeTextsAlone)
{
    using krv::gobs::SampleValue;
    const krv::test::GroupingLocale oLocale;
    const auto U = SampleValue::eUnsigned;
    const auto N = SampleValue::eNegative;
    const auto R = SampleValue::eReal;
    const ParseCase CASES[] = {
        {"0", "0", U},
        {" \t-9999\r\n", "-9999", N},
        {"+255", "255", U},
        {"-0", "0", U},
        {"007", "7", U},
        {"18446744073709551615", "18446744073709551615", U},
        {"18446744073709551616", "18446744073709551616", R},
        {"-9223372036854775808", "-9223372036854775808", N},
        {"-9223372036854775809", "-9223372036854775808", R},
        {"9007199254740993", "9007199254740993", U},
        {"0xFF", "255", U},
        {"-0X10", "-16", N},
        {"0xFFFFFFFFFFFFFFFF", "18446744073709551615", U},
        {"0x1p-1", "0.5", R},
        {"-9999.0", "-9999", R},
        {"1e3", "1000", R},
        {".5", "0.5", R},
        {"5.", "5", R},
        {"-3.4028234663852886e+38", "-3.4028234663852886e+38", R},
        {"nan", "nan", R},
        {"NaN", "nan", R},
        {"-NAN ", "nan", R},
        {"inf", "inf", R},
        {"-Infinity", "-inf", R},
    };
    for (const ParseCase& oCase : CASES)
    {
        SCOPED_TRACE(oCase.moText);
        const auto oValue = ParseNoData(oCase.moText);
        ASSERT_TRUE(oValue);
        EXPECT_EQ(oValue->GetText(), oCase.moValue);
        EXPECT_EQ(oValue->GetKind(), oCase.meKind);
    }
    for (const std::string text : {"",   "   ",  "abc",   "12abc", "1,5",    "1.000.000", "1 2",  "--1",   "+-1", "-",
                                   "0x", "0x-1", "0xnan", "0xinf", "nan(1)", "nano",      "infi", "1e400", "1e",  "1f"})
        EXPECT_FALSE(ParseNoData(text)) << text;
    EXPECT_FALSE(ParseNoData(std::string("1\0", 2)));
    EXPECT_FALSE(ParseNoData(std::string(100000, '9')));
}

TEST(TypedNoData, TakesTheChannelsElseTheFilesText)
{
    EXPECT_EQ(GetTypedNoData(Record(" nan ", "1"), 2)->GetText(), "nan");
    EXPECT_EQ(GetTypedNoData(Record("  ", " 4 "), 2)->GetText(), "4");
    EXPECT_EQ(GetNoDataText(Record("", " abc "), 1), "abc");
    EXPECT_FALSE(GetTypedNoData(Record("5", ""), 1));
    EXPECT_FALSE(GetTypedNoData(Record(" ", " "), 2));
    EXPECT_THROW(GetTypedNoData(Record("", "5x"), 1), krv::DataException);
    EXPECT_THROW(GetTypedNoData(Record("", "5"), 4), krv::OutOfBoundsException);
    EXPECT_THROW(GetTypedNoDataMaskBuilder(Record("five", ""), krv::gobs::eAnyChannel), krv::DataException);
}

} // namespace krv::datasources
