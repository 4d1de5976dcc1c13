#include "datasources/reader/exacthaloreader.h"

#include "tests/datasources/reader/readertest.h"

namespace krv::test
{

namespace
{

using krv::datasources::BasicReader;
using krv::datasources::ExactHaloReader;

class ExactHaloReaderTest : public ReaderTest
{
};

} // namespace

TEST_F(ExactHaloReaderTest, OwnsWhatItTookAndRefusalsSayWhy)
{
    {
        const ExactHaloReader oOwner(new BasicReader(moFile), true);
        EXPECT_GT(moProbe.GetLive(), 0);
    }
    EXPECT_EQ(moProbe.GetLive(), 0);
    ExactHaloReader oReader(new BasicReader(moFile, Channels{1, 2, 3}), true);
    const auto Read = [&](eMarginBehaviour eBehaviour)
    {
        oReader.SetMargins(1, 1, eBehaviour);
        const RasterPtr oRaster(oReader.GetRaster(0));
    };
    EXPECT_EQ(Error([&] { Read(eException); }), "data: Margin behaviour is eException");
    EXPECT_EQ(Error([&] { Read(eNoData); }), "data: Channel 1 has no no-data value for the pixels outside the image");
    EXPECT_NE(Error([&] { Read(static_cast<eMarginBehaviour>(9)); }), "");
    EXPECT_EQ(oReader.GetMarginBehaviour(), eNoData);
    EXPECT_EQ(Error([&] { oReader.SetConstant({1}); }), "data: 1 values for 3 channels");
    EXPECT_EQ(Error([] { ExactHaloReader(nullptr, false); }), "data: The source reader is NULL");
}

} // namespace krv::test
