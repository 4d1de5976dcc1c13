#include "datasources/utils/loadmathmodel.h"

#include "datasources/interfaces/iephemerisdataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "tests/support/probe.h"
#include "tests/support/syntheticdataset.h"
#include "tests/support/thrown.h"
#include "toolkit/mathmodel/imathmodel.h"
#include "tools/conformance/formathome.h"

#include <memory>

#include <gtest/gtest.h>

namespace krv::core
{

namespace
{

using namespace krv::test;
using krv::mathmodel::IMathModel;
using Numbers = std::vector<unsigned int>;

// A model that is known by its name.
class NamedModel : public IMathModel
{
public:
    explicit NamedModel(std::string name) : moName(std::move(name)) {}

    bool ImageToGround(double, double, double, double&, double&) const override { return false; }
    bool GroundToImage(double, double, double, double&, double&) const override { return false; }
    IMathModel* Clone() const override { return new NamedModel(moName); }
    std::string GetName() const override { return moName; }
    IMathModel* CreateScaled(double, double) const override { return new NamedModel(moName); }
    double GetAccuracy() const override { return -1; }

private:
    std::string moName;
};

enum class Answer
{
    eModel,
    eNone, // null
    eKrv,  // throws
    eForeign
};

IMathModel* Give(Answer eAnswer, const std::string& name)
{
    if (eAnswer == Answer::eKrv)
        throw krv::DataException("no " + name);
    if (eAnswer == Answer::eForeign)
        throw 42;
    return eAnswer == Answer::eNone ? nullptr : new NamedModel(name);
}

class Models : public virtual krv::datasources::IMathModelDataset
{
public:
    bool HasMathModel() const override { return true; }
    Numbers GetMathModelList() const override { return moModels; }
    IMathModel* GetMathModel(unsigned int nSegment) override
    {
        return Give(meModel, "model " + std::to_string(nSegment));
    }
    unsigned int CreateMathModel(const IMathModel&) override { return 0; }
    void DeleteMathModel(unsigned int) override {}

    Numbers moModels = {2, 5};
    Answer meModel = Answer::eModel;
};

class Orbits : public virtual krv::datasources::IEphemerisDataset
{
public:
    int HasEphemeris() const override { return mbEphemeris ? 4 : 0; }
    Numbers GetEphemerisList() const override { return moOrbits; }
    void DeleteEphemeris(unsigned int) override {}
    IMathModel* BuildMathModel(unsigned int nEphemeris, unsigned int nSegment) override
    {
        return Give(nSegment == 0 ? meAlone : meTogether,
                    "orbit " + std::to_string(nEphemeris) + " with " + std::to_string(nSegment));
    }
    unsigned int CreateEphemeris(const std::string&, const std::vector<unsigned char>&) override { return 0; }

    bool mbEphemeris = true;
    Numbers moOrbits = {7, 9};
    Answer meAlone = Answer::eModel;
    Answer meTogether = Answer::eModel;
};

template <class... Facets>
class Dataset : public DatasetWithoutRaster, public Facets...
{
public:
    Dataset() : DatasetWithoutRaster(std::make_shared<ImageModel>()) {}
};

// The model's name, "null", or what was thrown.
std::string Load(krv::datasources::IDataset* poDataset, unsigned int nSegment)
{
    std::string name;
    const std::string error = Error(
        [&]
        {
            const std::unique_ptr<IMathModel> poModel(LoadMathModel(poDataset, nSegment));
            name = poModel ? poModel->GetName() : "null";
        });
    return error.empty() ? name : error;
}

} // namespace

TEST(LoadMathModel, SegmentZeroIsTheLastModel)
{
    Dataset<Models, Orbits> oDataset;
    EXPECT_EQ(Load(&oDataset, 0), "model 5");
    oDataset.meModel = Answer::eKrv;
    EXPECT_EQ(Load(&oDataset, 0), "data: no model 5");
    oDataset.moModels.clear();
    EXPECT_EQ(Load(&oDataset, 0), "null");
    Dataset<Orbits> oOrbits;
    EXPECT_EQ(Load(&oOrbits, 0), "null");
    EXPECT_EQ(Load(nullptr, 0), "null");
    EXPECT_EQ(Load(nullptr, 3), "null");
}

TEST(LoadMathModel, OtherSegmentsAreTriedInTurn)
{
    const struct
    {
        Answer meModel, meAlone, meTogether;
        bool mbEphemeris;
        Numbers moOrbits;
        const char* mpResult;
    } CASES[] = {
        {Answer::eModel, Answer::eModel, Answer::eModel, true, {7, 9}, "model 3"},
        {Answer::eKrv, Answer::eModel, Answer::eModel, true, {7, 9}, "orbit 3 with 0"},
        {Answer::eNone, Answer::eModel, Answer::eModel, true, {7, 9}, "orbit 3 with 0"},
        {Answer::eKrv, Answer::eKrv, Answer::eModel, true, {7, 9}, "orbit 9 with 3"},
        {Answer::eKrv, Answer::eNone, Answer::eModel, true, {7, 9}, "orbit 9 with 3"},
        {Answer::eKrv, Answer::eKrv, Answer::eNone, true, {7, 9}, "null"},
        {Answer::eKrv, Answer::eKrv, Answer::eKrv, true, {7, 9}, "data: no orbit 9 with 3"},
        {Answer::eKrv, Answer::eKrv, Answer::eModel, false, {7, 9}, "null"},
        {Answer::eKrv, Answer::eKrv, Answer::eModel, true, {}, "null"},
        {Answer::eForeign, Answer::eModel, Answer::eModel, true, {7, 9}, "foreign"},
        {Answer::eKrv, Answer::eForeign, Answer::eModel, true, {7, 9}, "foreign"},
    };
    for (const auto& oCase : CASES)
    {
        Dataset<Models, Orbits> oDataset;
        oDataset.meModel = oCase.meModel;
        oDataset.meAlone = oCase.meAlone;
        oDataset.meTogether = oCase.meTogether;
        oDataset.mbEphemeris = oCase.mbEphemeris;
        oDataset.moOrbits = oCase.moOrbits;
        EXPECT_EQ(Load(&oDataset, 3), oCase.mpResult) << &oCase - CASES;
    }
    Dataset<Orbits> oOrbits;
    EXPECT_EQ(Load(&oOrbits, 3), "orbit 3 with 0");
    Dataset<Models> oModels;
    oModels.meModel = Answer::eKrv;
    EXPECT_EQ(Load(&oModels, 3), "null");
    Dataset<> oNeither;
    EXPECT_EQ(Load(&oNeither, 3), "null");
}

TEST(LoadMathModel, OpensAndClosesFiles)
{
    static int nLive = 0;
    class CountedDataset : public Dataset<Models>
    {
    public:
        CountedDataset() { ++nLive; }
        ~CountedDataset() override { --nLive; }
    };
    krv::conformance::FormatHome oHome;
    oHome.Add(std::string(KRV_TEST_PLUGINS) + "/plain.so");
    auto poBuilder = std::make_unique<FunctionBuilder>("MODELS");
    poBuilder->moIdentify = [](const std::string&, const unsigned char* pHeader, unsigned int, int)
    {
        return pHeader[0] == 'x' ? 0 : 1;
    };
    Answer eAnswer = Answer::eModel;
    poBuilder->moOpen = [&eAnswer](const std::string& fileName, AccessMode eMode) -> krv::datasources::IDataset*
    {
        EXPECT_EQ(eMode, eReadOnly);
        if (fileName.ends_with("null"))
            return nullptr;
        auto poDataset = std::make_unique<CountedDataset>();
        poDataset->meModel = eAnswer;
        return poDataset.release();
    };
    oHome.WriteDescription("MODELS", "<Format/>");
    krv::datasources::DatasetManager::GetInstance()->Register(poBuilder.get(), oHome.GetDescriptionPath("MODELS"),
                                                              true);
    [[maybe_unused]] FunctionBuilder* const poTakenOver = poBuilder.release();
    const std::string file = oHome.GetFolder().Write("scene", "x");
    const std::unique_ptr<IMathModel> poModel(LoadMathModel(file, 2));
    EXPECT_EQ(poModel->GetName(), "model 2");
    EXPECT_EQ(LoadMathModel(oHome.GetFolder().Write("null", "x"), 2), nullptr);
    eAnswer = Answer::eForeign;
    EXPECT_EQ(Error([&] { LoadMathModel(file, 0); }), "foreign");
    EXPECT_EQ(nLive, 0);
    EXPECT_THROW(LoadMathModel(oHome.GetFolder().File("missing"), 0), krv::FileNotFoundException);
}

} // namespace krv::core
