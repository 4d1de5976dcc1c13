#include "datasources/interfaces/idataset.h"
#include "datasources/reader/basicreader.h"
#include "gobs/raster/raster.h"
#include "tests/conformance/conformance.h"
#include "tests/support/tempfolder.h"
#include "toolkit/exceptions/exceptions.h"

#include <gtest/gtest.h>

#include <memory>

using namespace krv::datasources;

namespace
{

// What opening a DEMO file of these bytes throws, with FILE for its name; empty when it opens.
std::string OpenError(const std::string& bytes)
{
    const krv::test::TempFolder oFolder;
    const std::string file = oFolder.Write("image.demo", bytes);
    const krv::conformance::Plugin oPlugin(std::string(KRV_TEST_HOME) + "/lib/qrfformats/demo.so");
    try
    {
        std::unique_ptr<IDataset>(oPlugin.GetBuilder().Open(file, eReadOnly));
    }
    catch (const krv::FileFormatException& oException)
    {
        EXPECT_EQ(oException.GetFileName(), file);
        std::string message = oException.GetMessage();
        const std::size_t nFile = message.find(file);
        return nFile == std::string::npos ? message : message.replace(nFile, file.size(), "FILE");
    }
    return "";
}

} // namespace

TEST(DemoFormat, HeadersAreHostile)
{
    const std::string pixels(20, 'x');
    const std::string SHORT = "FILE is shorter than its header says";
    const std::string SIZE = "FILE has no valid image size or no channels";
    const std::pair<std::string, std::string> HEADERS[] = {
        {"DEMO1\n5 4\n8U\n\n" + pixels, ""},
        {"DEMO1\n5 4\n8U\n\n" + pixels + "more", ""},
        {"DEMO1\n5 2\n8U 8S\nkey=value\n\n" + pixels, ""},
        {"DEMO1\n5 2\n16U\nno tag\n\n" + pixels, ""},
        {"", "FILE has no complete header"},
        {"DEMO1\n5 4\n8U\n" + pixels, "FILE has no complete header"},
        {"DEMO2\n5 4\n8U\n\n" + pixels, "FILE has no complete header"},
        {"DEMO1\n5 4\n8U\n" + std::string(70000, 'k') + "=v\n\n" + pixels, "FILE has no complete header"},
        {"DEMO1\n\n5 4\n8U\n" + pixels, SIZE},
        {"DEMO1\n5\n\n", SIZE},
        {"DEMO1\n0 4\n8U\n\n", SIZE},
        {"DEMO1\n5 -4\n8U\n\n", SIZE},
        {"DEMO1\n4294967301 4\n8U\n\n" + pixels, SIZE},
        {"DEMO1\n5 99999999999999999999\n8U\n\n", SIZE},
        {"DEMO1\n5 4\n\n", SIZE},
        {"DEMO1\n5 4\n8U 12U\n\n" + pixels, "FILE has channels of the unknown type 12U"},
        {"DEMO1\n5 4\nBIT\n\n" + pixels, "FILE has channels of the unknown type BIT"},
        {"DEMO1\n5 4\n8U\n\n" + pixels.substr(1), SHORT},
        {"DEMO1\n5 4\n8U 8U\n\n" + pixels, SHORT},
        {"DEMO1\n2147483647 2147483647\nC64R C64R C64R\n\n" + pixels, SHORT},
    };
    for (const auto& [bytes, error] : HEADERS)
        EXPECT_EQ(OpenError(bytes), error) << bytes.substr(0, 60);
}

// As the application sees it: by name, through the manager.
TEST(DemoFormat, PixelsOfChannelsOfSeveralTypes)
{
    const krv::test::TempFolder oFolder;
    const std::string file = oFolder.Write("image.bin", "DEMO1\n2 1\n8U 16U 8U\n\n\1\2\3\4\5\6\7\10");
    BasicReader oReader(file, {3, 1});
    const std::unique_ptr<krv::gobs::Raster> oTile(oReader.GetRaster(0));
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(oTile->GetBuffer()), oTile->GetBufferSize()), "\7\1\10\2");
    BasicReader oWide(file, {2});
    const std::unique_ptr<krv::gobs::Raster> oWideTile(oWide.GetRaster(0));
    EXPECT_EQ(std::string(reinterpret_cast<const char*>(oWideTile->GetBuffer()), oWideTile->GetBufferSize()),
              "\3\4\5\6");
    EXPECT_THROW(BasicReader{file}, krv::DataException);
}
