#pragma once

#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "datasources/reader/rasteriterator.h"
#include "tests/support/pixels.h"
#include "tests/support/probe.h"
#include "tests/support/recipe.h"
#include "tests/support/syntheticdataset.h"
#include "tests/support/thrown.h"
#include "tools/conformance/formathome.h"
#include "tools/conformance/referenceimage.h"

#include <gtest/gtest.h>

namespace krv::test
{

using namespace krv::conformance;

using Channels = std::vector<unsigned int>;
using RasterPtr = std::unique_ptr<krv::gobs::Raster>;

// The file "image.test" is opened through the manager as the decorated synthetic dataset of the model.
class ReaderTest : public ::testing::Test
{
protected:
    ReaderTest()
    {
        moHome.Add(std::string(KRV_TEST_PLUGINS) + "/plain.so");
        moFile = moHome.GetFolder().Write("image.test", "SYNTHETIC");
        RegisterSynthetic();
        moModel->moAuxiliary.SetFileMetadataValue("scene", "alps");
        for (unsigned int nChannel = 1; nChannel <= 3; ++nChannel)
        {
            moModel->moAuxiliary.SetChanMetadataValue("band", "b" + std::to_string(nChannel), nChannel);
            moModel->moAuxiliary.SetChannelDescription("channel " + std::to_string(nChannel), nChannel);
        }
    }

    void RegisterSynthetic()
    {
        auto oBuilder = std::make_unique<FunctionBuilder>("SYNTHETIC");
        oBuilder->moIdentify = [](const std::string&, const unsigned char* pHeader, unsigned int, int)
        {
            return pHeader[0] == 'S' ? 0 : 1;
        };
        oBuilder->moOpen = [this](const std::string& name, AccessMode)
        {
            moModel->moName = name;
            return moMakeDataset().release();
        };
        moModel->mpoFormat = oBuilder->GetFileFormat();
        krv::datasources::DatasetManager::GetInstance()->Register(oBuilder.get(), "", true);
        [[maybe_unused]] auto* const poTakenOver = oBuilder.release();
    }

    std::unique_ptr<krv::datasources::IDataset> MakeDataset() { return moMakeDataset(); }

    ReferenceImage Image(const Channels& oChannels) const
    {
        const auto& oType = moModel->moTypes.at(oChannels.at(0) - 1);
        return {moModel->mnWidth, moModel->mnHeight, oType.GetValueBits() / 8 * oChannels.size(),
                RecipeImage(moModel->mnWidth, moModel->mnHeight, oChannels, oType)};
    }

    // A probe throws at the first, second, third ... call of an operation, until it gets through: nothing stays alive
    // but what was, and no I/O object outlives its dataset. Prepare comes before each run.
    template <class Operation, class Prepare>
    void FailAtEveryCall(const Operation& oOperation, const Prepare& oPrepare)
    {
        bool bThrown = true;
        for (unsigned int nCall = 1; bThrown; ++nCall)
        {
            oPrepare();
            moProbe.Arm(nCall);
            Error(oOperation);
            bThrown = moProbe.HasThrown();
            ASSERT_EQ(moProbe.GetLive(), 0) << "call " << nCall;
            ASSERT_FALSE(moProbe.HasOrphans()) << "call " << nCall;
        }
    }

    Probe moProbe; // outlives all it watches
    ImageModelPtr moModel = std::make_shared<ImageModel>();
    std::function<std::unique_ptr<krv::datasources::IDataset>()> moMakeDataset = [this]
    {
        return Decorate(moProbe, std::make_unique<SyntheticDataset>(moModel));
    };
    FormatHome moHome;
    std::string moFile;
};

} // namespace krv::test
