#include "datasources/metadata/auxiliarydata.h"
#include "tests/plugins/tif/tifsupport.h"
#include "tests/support/facts.h"
#include "tests/support/thrown.h"
#include "toolkit/mathmodel/rpcmodel.h"

#include <cmath>
#include <filesystem>

#include <gtest/gtest.h>
#include <tiffio.h>

namespace
{

using namespace krv::test;
using krv::mathmodel::IMathModel;
using krv::mathmodel::RpcCoefficients;
using krv::mathmodel::RpcModel;
using Numbers = std::vector<unsigned int>;

RpcCoefficients GetModel(krv::plugins::tif::TifDataset& oDataset, unsigned int nModel)
{
    const std::unique_ptr<IMathModel> poModel(oDataset.GetMathModel(nModel));
    return dynamic_cast<const RpcModel&>(*poModel).GetCoefficients();
}

RpcCoefficients MakeCoefficients()
{
    RpcCoefficients oC;
    RpcCoefficients::Values oValues = oC.GetValues();
    for (std::size_t n = 0; n < oValues.size(); ++n)
        oValues[n] = std::sqrt(static_cast<double>(n) + 1);
    return RpcCoefficients::FromValues(oValues);
}

TifPointer CreateSmall(const std::string& fileName)
{
    return CreateTif(fileName, "", 16, 16, 1, krv::gobs::eDT_8U);
}

// The numbers of tag 50844 as libtiff reads them.
std::vector<double> ReadTag(const std::string& fileName)
{
    const std::unique_ptr<TIFF, decltype(&TIFFClose)> poTiff(TIFFOpen(fileName.c_str(), "r"), &TIFFClose);
    std::uint16_t nCount = 0;
    double* pValues = nullptr;
    if (poTiff == nullptr || TIFFGetField(poTiff.get(), 50844, &nCount, &pValues) != 1)
        return {};
    return {pValues, pValues + nCount};
}

} // namespace

// One scene whose coefficients lie in a tag and, by another writer, in a text: they are equal to the digits of the
// text, but for the random error, which only one of them states.
TEST(TifModels, TagAndTextOfARealSceneAgree)
{
    const std::string folder = DataFolder() + "/geometry/";
    if (!std::filesystem::exists(folder))
        GTEST_SKIP() << "the real files are not there";
    const TifPointer poTag = OpenTif(folder + "test_rpcs.tif");
    const TifPointer poText = OpenTif(folder + "test_rpcs_ext_file.tif");
    EXPECT_EQ(poTag->GetMathModelList(), Numbers{3});
    EXPECT_EQ(poText->GetMathModelList(), Numbers{2});
    RpcCoefficients oTag = GetModel(*poTag, 3);
    const RpcCoefficients oText = GetModel(*poText, 2);
    EXPECT_EQ(oTag.randomError, -1);
    oTag.randomError = oText.randomError;
    EXPECT_EQ(oTag.GetText(), oText.GetText());
}

TEST(TifModels, AreStoredInTheTagAndNumbered)
{
    const TempFolder oFolder;
    const std::string file = oFolder.File("scene.tif");
    const RpcCoefficients oC = MakeCoefficients();
    const RpcCoefficients::Values oValues = oC.GetValues();
    {
        const TifPointer poDataset = CreateSmall(file);
        EXPECT_FALSE(poDataset->HasMathModel());
        EXPECT_EQ(poDataset->CreateMathModel(RpcModel(oC.Shifted(5, 5))), 3U);
        EXPECT_EQ(poDataset->CreateMathModel(RpcModel(oC)), 3U); // takes the place of the other
        EXPECT_EQ(GetModel(*poDataset, 3), oC);
        poDataset->Close();
    }
    EXPECT_EQ(ReadTag(file), std::vector<double>(oValues.begin(), oValues.end()));
    oFolder.Write("scene_RPC.TXT", "no model");
    const TifPointer poDataset = OpenTif(file, eUpdate);
    EXPECT_EQ(poDataset->GetMathModelList(), (Numbers{1, 3}));
    EXPECT_EQ(poDataset->ReadAuxiliaryData().GetFileMetadataValue("RPC"), oC.GetText());
    EXPECT_EQ(Error([&] { poDataset->GetMathModel(1); }),
              "file: " + oFolder.File("scene_RPC.TXT") + ": \"LINE_OFF\" is missing");
    EXPECT_EQ(Error([&] { poDataset->GetMathModel(2); }), "data: " + file + ": there is no sensor model 2");
    EXPECT_EQ(Error([&] { poDataset->DeleteMathModel(1); }),
              "data: " + file + ": sensor model 1 lies beside the file and is not deleted with it");
    poDataset->DeleteMathModel(3);
    EXPECT_EQ(poDataset->GetMathModelList(), Numbers{1});
    EXPECT_EQ(Error([&] { poDataset->DeleteMathModel(3); }), "data: " + file + ": there is no sensor model 3");
    poDataset->Close();
    EXPECT_TRUE(ReadTag(file).empty());
    const TifPointer poReader = OpenTif(file);
    EXPECT_EQ(Error([&] { poReader->CreateMathModel(RpcModel(oC)); }),
              "data: " + file + ": the file is open for reading only: sensor models cannot be written");
}

TEST(TifModels, OtherKindsAndFaultyTagsAreRefused)
{
    class Camera : public IMathModel
    {
    public:
        bool ImageToGround(double, double, double, double&, double&) const override { return false; }
        bool GroundToImage(double, double, double, double&, double&) const override { return false; }
        IMathModel* Clone() const override { return new Camera; }
        std::string GetName() const override { return "camera"; }
        IMathModel* CreateScaled(double, double) const override { return new Camera; }
        double GetAccuracy() const override { return -1; }
    };
    const TempFolder oFolder;
    const std::string file = oFolder.File("scene.tif");
    RpcCoefficients oC = MakeCoefficients();
    {
        const TifPointer poDataset = CreateSmall(file);
        EXPECT_EQ(Error([&] { poDataset->CreateMathModel(Camera()); }),
                  "data: " + file + ": TIFF holds rational polynomial models (RPC), not one of the kind camera");
        EXPECT_TRUE(poDataset->GetMathModelList().empty());
        oC.heightScale = 0; // the record takes any 92 numbers
        krv::datasources::AuxiliaryData oData = poDataset->ReadAuxiliaryData();
        oData.SetFileMetadataValue("RPC", oC.GetText());
        poDataset->WriteAuxiliaryData(oData);
        poDataset->Close();
    }
    const TifPointer poDataset = OpenTif(file);
    EXPECT_EQ(Error([&] { poDataset->GetMathModel(3); }),
              "file: " + file +
                  ": tag 50844 holds no rational polynomial model: the scale of the height is zero; the "
                  "file is damaged");
}
