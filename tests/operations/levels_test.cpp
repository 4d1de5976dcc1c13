// Levels of images with very many channels.
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/overviews/overviewbuilder.h"
#include "datasources/utils/open.h"
#include "datasources/writer/basicwriter.h"
#include "datasources/writer/irasterwriter.h"
#include "gobs/raster/raster.h"
#include "tools/conformance/tempfolder.h"

#include <gtest/gtest.h>

#include <filesystem>

namespace krv::operations
{

// Were the record written for each channel, the file would grow by it each time, and the time with it.
TEST(Levels, TheStatesOfAllChannelsAreOneChange)
{
    using namespace krv::datasources;
    const krv::conformance::TempFolder oFolder;
    for (const auto& [pImage, pFormat, pLevels] :
         {std::tuple("a.tif", "TIF", "a.tif"), std::tuple("b.bsq", "RAW", "b.bsq.ovr")})
    {
        const std::string image = oFolder.File(pImage);
        krv::gobs::Raster oPixels({40, 30, 500, krv::gobs::eDT_8U}, {0, 0, 0, 0});
        std::fill_n(oPixels.GetBuffer(), oPixels.GetBufferSize(), static_cast<unsigned char>(7));
        {
            const auto poWriter = krv::CreateWriter(image, oPixels.GetInfo(), pFormat);
            poWriter->WriteRaster(&oPixels);
            poWriter->Synchronize();
        }
        auto* const poManager = DatasetManager::GetInstance();
        const std::unique_ptr<IDataset> poDataset(image.ends_with(".tif")
                                                      ? poManager->Open(image, eUpdate)
                                                      : poManager->OpenFormat("GDBALL", image, eUpdate));
        auto* const poRaster = dynamic_cast<IRasterDataset*>(poDataset.get());
        BasicWriter oWriter(poRaster, {});
        ASSERT_TRUE(BuildOverviews(oWriter, {2, 4}, "average"));
        poDataset->Synchronize();
        const std::unique_ptr<IOverviewManager> poLevels(poRaster->GetOverviewManager());
        EXPECT_TRUE(poLevels->IsValid(1, 2) && poLevels->IsValid(500, 2) && poLevels->IsValid(500, 4)) << pImage;
        EXPECT_LT(std::filesystem::file_size(oFolder.File(pLevels)), 4U << 20) << pImage;
    }
}

} // namespace krv::operations
