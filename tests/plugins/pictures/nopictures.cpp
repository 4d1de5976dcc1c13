// The generic format where pictures are not built.

#include "datasources/interfaces/ifileformat.h"
#include "datasources/iomanager/datasetmanager.h"
#include "tests/support/thrown.h"
#include "tools/conformance/formathome.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

using krv::datasources::DatasetManager;

TEST(NoPictures, TheGenericFormatSaysThatItHasNone)
{
    krv::conformance::FormatHome oHome;
    oHome.Add(std::string(KRV_TEST_HOME) + "/lib/qrfformats/gdball.so", "<Dataset><SupportsCreate/></Dataset>");
    DatasetManager& oManager = *DatasetManager::GetInstance();
    const auto* const poFormat = oManager.GetFormatByName("GDBALL");
    ASSERT_NE(poFormat, nullptr);
    EXPECT_NE(poFormat->GetDescription().find("without libvips"), std::string::npos);
    EXPECT_TRUE(poFormat->GetExtensions().empty());
    const krv::conformance::TempFolder oFolder;
    const std::string file = oFolder.Write("a.png", "\x89PNG\r\n\x1a\n");
    EXPECT_THROW(oManager.Open(file, eReadOnly), krv::FileFormatException);
    EXPECT_NE(krv::test::Error([&] { oManager.NewDataset(file, "png", ""); }).find("no format makes files"),
              std::string::npos);
}
