#include "plugins/support/sidecar/modelsidecars.h"
#include "plugins/support/sidecar/rpctext.h"
#include "plugins/support/sidecar/sidecarfile.h"
#include "tests/support/facts.h"
#include "tests/support/thrown.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/mathmodel/rpcmodel.h"
#include "tools/conformance/tempfolder.h"

#include <algorithm>
#include <cmath>
#include <filesystem>

#include <gtest/gtest.h>

namespace krv::plugins::support
{

namespace
{

using krv::mathmodel::RpcCoefficients;
using krv::mathmodel::RpcModel;

constexpr const char* KEYS[] = {"LINE_OFF",   "SAMP_OFF",   "LAT_OFF",   "LONG_OFF",   "HEIGHT_OFF",
                                "LINE_SCALE", "SAMP_SCALE", "LAT_SCALE", "LONG_SCALE", "HEIGHT_SCALE"};

// Numbers 3 to 92 of a model are 3, 4 and so on, written as such texts write them.
std::string MakeText(const std::string& end = "\n")
{
    std::string text;
    int nNext = 3;
    for (const char* const pKey : KEYS)
        text += std::string(pKey) + ": +00" + std::to_string(nNext++) + ".0 pixels" + end;
    for (const char* const pKey : {"LINE_NUM", "LINE_DEN", "SAMP_NUM", "SAMP_DEN"})
        for (int n = 1; n <= 20; ++n)
            text += std::string(pKey) + "_COEFF_" + std::to_string(n) + ": " + std::to_string(nNext++) + ".0D+00" + end;
    return text;
}

std::string MakeRpb()
{
    std::string text =
        "satId = \"P = 5; (x\";\nSpecId = \"RPC00B\";\nBEGIN_GROUP = IMAGE\n\terrBias = 1;\n\terrRand = 2;\n";
    int nNext = 3;
    for (const char* const pKey : {"lineOffset", "sampOffset", "latOffset", "longOffset", "heightOffset", "lineScale",
                                   "sampScale", "latScale", "longScale", "heightScale"})
        text += "\t" + std::string(pKey) + " =  " + std::to_string(nNext++) + ".0;\r\n";
    for (const char* const pKey : {"lineNumCoef", "lineDenCoef", "sampNumCoef", "sampDenCoef"})
    {
        text += "\t" + std::string(pKey) + " = (";
        for (int n = 1; n <= 20; ++n)
            text += "\n\t\t+" + std::to_string(nNext++) + "E+00" + (n < 20 ? "," : ");\n");
    }
    return text + "END_GROUP = IMAGE\nEND;\n";
}

void ExpectCounting(const RpcCoefficients& oModel, std::size_t nFrom)
{
    const RpcCoefficients::Values oValues = oModel.GetValues();
    for (std::size_t n = nFrom; n < oValues.size(); ++n)
        EXPECT_EQ(oValues[n], static_cast<double>(n) + 1) << n;
}

std::string Replaced(std::string text, const std::string& from, const std::string& to)
{
    return text.replace(text.find(from), from.size(), to);
}

} // namespace

TEST(RpcText, BothFormsAreRead)
{
    for (const char* const pEnd : {"\n", " \r\n"})
    {
        const RpcCoefficients oModel = ParseRpcText("\nNITF_RPC00B\nUNKNOWN: words\n" + MakeText(pEnd), "x");
        ExpectCounting(oModel, 2);
        EXPECT_TRUE(oModel.biasError < 0 && oModel.randomError < 0);
    }
    ExpectCounting(ParseRpcText("ERR_BIAS: 1 meters\nERR_RAND: 2 meters\n" + MakeText(), "x"), 0);
    ExpectCounting(ParseRpb(MakeRpb(), "x"), 0);
}

TEST(RpcText, WhatIsNoModelIsRefused)
{
    const std::string text = MakeText();
    const std::string rpb = MakeRpb();
    const std::pair<std::string, std::string> TEXTS[] = {
        {"", "\"LINE_OFF\" is missing"},
        {Replaced(text, "SAMP_DEN_COEFF_20", "x"), "\"SAMP_DEN_COEFF_20\" is missing"},
        {Replaced(text, "+003.0", "3,0"), "the value of \"LINE_OFF\" is no number: \"3,0\""},
        {Replaced(text, "+003.0 pixels", ""), "the value of \"LINE_OFF\" is no number: \"\""},
        {text + "lat_off: 3\n", "\"lat_off\" stands there twice, with different values"},
        {Replaced(text, "LINE_SCALE: +008", "LINE_SCALE: 0"),
         "the coefficients are no rational polynomial model: the scale of the line is zero"},
        {Replaced(text, "+003.0", "1e999"), "the value of \"LINE_OFF\" is no number: \"1e999\""}};
    for (const auto& [bad, why] : TEXTS)
        EXPECT_EQ(krv::test::Error([&] { ParseRpcText(bad, "x_RPC.TXT"); }), "file: x_RPC.TXT: " + why);
    const std::pair<std::string, std::string> RPBS[] = {
        {"lineOffset", "\"LINEOFFSET\" is missing"},
        {Replaced(rpb, "RPC00B", "RPC00A"), "coefficients in the order of RPC00A are not read, those of RPC00B are"},
        {Replaced(rpb, ",\n\t\t+32E+00", ""), "\"LINENUMCOEF\" has 19 values in place of 20"},
        {rpb.substr(0, rpb.find("+92E")), "\"SAMPDENCOEF\" has 19 values in place of 20"},
        {Replaced(rpb, "SpecId = \"RPC00B\"", "SpecId = ()") + "lineOffset = 4;",
         "\"lineOffset\" stands there twice, with different values"}};
    for (const auto& [bad, why] : RPBS)
        EXPECT_EQ(krv::test::Error([&] { ParseRpb(bad, "x.rpb"); }), "file: x.rpb: " + why);
}

TEST(ModelSidecars, AreFoundByExactNames)
{
    const struct
    {
        const char* mpImage;
        const char* mpSidecar;
        unsigned int mnModel; // 0: not taken
    } NAMES[] = {{"Scene.tif", "Scene_RPC.TXT", 1}, {"Scene.tif", "Scene_rpc.txt", 1},
                 {"Scene.tif", "scene_rpc.txt", 1}, {"Scene.tif", "SCENE_RPC.TXT", 1},
                 {"Scene.tif", "Scene.rpb", 2},     {"Scene.tif", "Scene.RPB", 2},
                 {"a.b.tif", "a.b.rpb", 2},         {"plain", "plain.rpb", 2},
                 {"Scene.tif", "sCENE.rpb", 0},     {"Scene.tif", "Scene.tif.rpb", 0}};
    for (const auto& oName : NAMES)
    {
        SCOPED_TRACE(oName.mpSidecar);
        const krv::conformance::TempFolder oFolder;
        const std::string image = oFolder.Write(oName.mpImage, "");
        const std::string sidecar = oFolder.Write(oName.mpSidecar, oName.mnModel == 1 ? MakeText() : MakeRpb());
        const std::vector<unsigned int> oFound = FindModelSidecars(image);
        ASSERT_EQ(oFound, oName.mnModel == 0 ? std::vector<unsigned int>() : std::vector{oName.mnModel});
        if (oName.mnModel != 0)
            ExpectCounting(ReadModelSidecar(image, oName.mnModel), 2);
        EXPECT_EQ(krv::test::Error([&] { ReadModelSidecar(image, 3 - oName.mnModel); }),
                  "data: " + image + ": there is no sensor model " + std::to_string(3 - oName.mnModel));
    }
    const krv::conformance::TempFolder oFolder;
    const std::string image = oFolder.File("a.tif");
    std::filesystem::create_directory(oFolder.File("a.RPB"));
    EXPECT_TRUE(FindModelSidecars(image).empty());
    const std::string large = oFolder.Write("a.rpb", std::string(70000, ' '));
    EXPECT_EQ(krv::test::Error([&] { ReadModelSidecar(image, 2); }),
              "file: " + large + ": 70000 bytes are too many for such a file; at most 65536 are read");
}

// Of every model in the real files: the image of the ground of an image position is that position, at the heights that
// the model was fitted to.
TEST(RpcText, GroundOfImageOfRealScenes)
{
    const std::string folder = krv::test::DataFolder();
    const struct
    {
        const char* mpFile;
        RpcCoefficients (*mpParse)(const std::string&, const std::string&);
        double mnLine; // what the file says of itself
        double mnLast;
    } SCENES[] = {{"geometry/test_rpcs_ext_file.rpb", &ParseRpb, 2295, 2.746327419806129E-10},
                  {"sidecar/rpcm/rpc_IKONOS.txt", &ParseRpcText, 5124, 1.929684859424581E-09},
                  {"sidecar/rpcm/20191015_073816_ssc1d3_0011_basic_l1a_panchromatic_dn_RPC.TXT", &ParseRpcText,
                   539.48675, -5.04938965881774e-05}};
    for (const auto& oScene : SCENES)
    {
        SCOPED_TRACE(oScene.mpFile);
        const std::string file = folder + "/" + oScene.mpFile;
        if (!std::filesystem::exists(file))
            GTEST_SKIP() << "the real files are not there";
        const RpcCoefficients oC = oScene.mpParse(ReadSidecar(file, 1 << 20), file);
        EXPECT_EQ(oC.lineOffset, oScene.mnLine);
        EXPECT_EQ(oC.sampleDenominator[19], oScene.mnLast);
        const RpcModel oModel(oC);
        double nWorst = 0;
        for (int n = 0; n < 21 * 21 * 5; ++n)
        {
            const double nColumn = oC.sampleOffset + oC.sampleScale * (n % 21 / 10.0 - 1);
            const double nRow = oC.lineOffset + oC.lineScale * (n / 21 % 21 / 10.0 - 1);
            const double nHeight = oC.heightOffset + oC.heightScale * (n / 441 / 2.0 - 1);
            double nLongitude = 0, nLatitude = 0, nAcross = 0, nDown = 0;
            ASSERT_TRUE(oModel.ImageToGround(nColumn, nRow, nHeight, nLongitude, nLatitude))
                << nColumn << " " << nRow << " " << nHeight;
            ASSERT_TRUE(oModel.GroundToImage(nLongitude, nLatitude, nHeight, nAcross, nDown));
            nWorst = std::max({nWorst, std::fabs(nAcross - nColumn), std::fabs(nDown - nRow)});
        }
        EXPECT_LT(nWorst, 1e-6);
    }
}

} // namespace krv::plugins::support
