// Every reader over readers over sources that lie, fail or change: an exception of the library or an answer.
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/derived/pctrasterreader.h"
#include "datasources/reader/derived/rastercache.h"
#include "datasources/reader/derived/totalpowerrasterreader.h"
#include "datasources/reader/derived/transformrasterreader.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/multitypereader.h"
#include "datasources/reader/readervalidity.h"
#include "gobs/mask/mask.h"
#include "gobs/pct/pct.h"
#include "gobs/resampling/gridmap.h"
#include "tests/datasources/reader/readertest.h"
#include "toolkit/cache/tilestore.h"

#include <cmath>

namespace krv::test
{

namespace
{

using namespace krv::datasources;
using gobs::AffineMap;
using gobs::Raster;
using gobs::Resampling;
using ReaderPtr = std::unique_ptr<IRasterReader>;

enum Lie
{
    eNone,
    eLarger,     // than the source
    eEmpty,      // no pixels
    eChannels,   // more of them
    eType,       // another one
    eNoInfos,    // no descriptions of channels
    eTags,       // a no-data value that is none, and of channels that are not there
    eTiles,      // of no size
    eShrinks,    // after it was asked first
    eThrows,     // at every reading
    eForeign,    // the same, something that is no exception of the library
    eNotANumber, // every pixel
    eLevels,     // that are null, of size 0, twice there
    eLies
};

class BadLevels : public IOverviewReaderAccessor
{
public:
    std::vector<unsigned int> GetLevels() const override { return {0, 2, 2, 4294967295u}; }
    bool IsValid(unsigned int, unsigned int) const override { return true; }
    bool IsLevelValid(unsigned int) const override { return true; }
    AuxiliaryData GetAuxiliaryData(unsigned int) override { return AuxiliaryData(0); }
    unsigned int GetChanCount() const override { return 7; }
    IRasterReader* CreateRasterReader(unsigned int) override { return nullptr; }
};

class Liar : public DerivedReader
{
public:
    Liar(ReaderPtr poTruth, Lie eLie) : meLie(eLie) { SetSource({poTruth.release(), {true}}); }

    unsigned int GetWidth() const override
    {
        ++mnAsked;
        const bool bShrunk = meLie == eShrinks && mnAsked > 6;
        return meLie == eEmpty || bShrunk ? 0 : GetSource().GetWidth() * (meLie == eLarger ? 100 : 1);
    }
    unsigned int GetChansCount() const override { return GetSource().GetChansCount() + (meLie == eChannels ? 2 : 0); }
    const gobs::DataType& GetDataType() const override
    {
        static const gobs::DataType OTHER = gobs::eDT_64S;
        return meLie == eType ? OTHER : GetSource().GetDataType();
    }
    const std::vector<IChannelInfo*>& GetChannelsInfo() const override
    {
        static const std::vector<IChannelInfo*> NONE;
        return meLie == eNoInfos ? NONE : GetSource().GetChannelsInfo();
    }
    AuxiliaryData GetAuxiliaryData() const override
    {
        if (meLie != eTags)
            return GetSource().GetAuxiliaryData();
        AuxiliaryData oTags(9);
        for (unsigned int n = 1; n < 9; ++n)
            oTags.SetChanMetadataValue("NO_DATA_VALUE", n % 2 == 1 ? "none at all" : "1e999", n);
        return oTags;
    }
    unsigned int GetTileWidth() const override { return meLie == eTiles ? 0 : DerivedReader::GetTileWidth(); }
    IOverviewReaderAccessor* GetOverviewReaderAccessor() override
    {
        if (meLie == eLevels)
            return new BadLevels();
        return meLie == eNone ? GetSource().GetOverviewReaderAccessor() : nullptr; // which would tell the truth
    }
    using DerivedReader::ReadRaster;
    void ReadRaster(Raster* poRaster) override
    {
        if (meLie == eThrows)
            throw krv::DataException("gone");
        if (meLie == eForeign)
            throw 5;
        GetSource().ReadRaster(poRaster);
        if (meLie == eNotANumber && GetDataType() == gobs::eDT_32R)
            std::fill_n(reinterpret_cast<float*>(poRaster->GetBuffer()), poRaster->GetBufferSize() / 4, NAN);
    }

private:
    Lie meLie;
    mutable unsigned int mnAsked = 0;
};

// Places that are none, far away or not near each other.
class BadMap : public gobs::IGridMap
{
public:
    explicit BadMap(unsigned int nKind) : mnKind(nKind) {}

    void MapRow(long long nX, long long nY, std::size_t nCount, double* pX, double* pY) const override
    {
        for (std::size_t n = 0; n < nCount; ++n)
        {
            const auto nAt = nX + nY + static_cast<long long>(n);
            pX[n] = mnKind == 0 ? NAN : (mnKind == 1 ? INFINITY : (nAt % 2 == 0 ? 1e300 : -3));
            pY[n] = mnKind == 3 ? 2 : pX[n];
        }
    }
    std::array<double, 4> GetFootprint(double, double) const override
    {
        const double aSteps[] = {1, 1e300, 0, NAN};
        return {aSteps[mnKind], 0, 0, aSteps[mnKind]};
    }

private:
    unsigned int mnKind;
};

// Everything that is asked of a reader.
void Use(IRasterReader& oReader)
{
    oReader.SetMargins(2, 3, eMirror);
    const RasterPtr oTile(oReader.GetRaster(0));
    oReader.SetMargins(0, 0, eMirror);
    Raster oWhole({oReader.GetWidth(), oReader.GetHeight(), oReader.GetChansCount(), oReader.GetDataType()}, {});
    static_cast<void>(ReaderValidity(oReader).Read(oWhole));
    const AuxiliaryData oRecord = oReader.GetAuxiliaryData();
    const std::unique_ptr<IOverviewReaderAccessor> oLevels(oReader.GetOverviewReaderAccessor());
    for (const unsigned int nLevel : oLevels != nullptr ? oLevels->GetLevels() : Channels())
    {
        oLevels->GetAuxiliaryData(nLevel);
        const ReaderPtr oLevel(oLevels->CreateRasterReader(nLevel));
        const RasterPtr oLevelTile(oLevel != nullptr ? oLevel->GetRaster(0) : nullptr);
    }
}

gobs::PCT MakeTable()
{
    gobs::PCT oTable;
    oTable.Add({0, 100, {1, 2, 3}});
    return oTable;
}

template <typename Reader, typename... Arguments>
void UseOver(IRasterReader& oSource, const Arguments&... oArguments)
{
    Reader oReader(&oSource, oArguments..., false);
    Use(oReader);
}

using Wrapping = void (*)(IRasterReader& oSource);

const std::pair<const char*, Wrapping> WRAPPINGS[] = {
    {"colours",
     [](IRasterReader& o)
     {
         UseOver<PCTRasterReader>(o, MakeTable());
     }},
    {"power",
     [](IRasterReader& o)
     {
         UseOver<TotalPowerRasterReader>(o);
     }},
    {"moved",
     [](IRasterReader& o)
     {
         UseOver<TransformRasterReader>(o, std::make_shared<AffineMap>(ogc::cs::GeocodingInfo(0.5, 1, 0, 0.5, 0, 1)),
                                        TransformRequest{20, 15, Resampling::eCubic});
     }},
    {"reduced",
     [](IRasterReader& o)
     {
         UseOver<TransformRasterReader>(o, std::make_shared<AffineMap>(ogc::cs::GeocodingInfo(0, 4, 0, 0, 1, 5)),
                                        TransformRequest{8, 6, Resampling::eAverage});
     }},
    {"halo",
     [](IRasterReader& o)
     {
         UseOver<ExactHaloReader>(o);
     }},
    {"cache",
     [](IRasterReader& o)
     {
         RasterCache oCache(&o, false, {5, 7});
         Use(oCache);
     }},
    {"cache without room",
     [](IRasterReader& o)
     {
         CacheOptions oOptions;
         oOptions.mnCeiling = 1;
         oOptions.mbExactMargins = true;
         RasterCache oCache(&o, false, oOptions), oFront(oCache);
         Use(oFront);
     }},
};

class BadSources : public ReaderTest
{
protected:
    BadSources() { moModel->moLevels = {2}; }

    std::string Over(Wrapping pWrapping, Lie eLie, const gobs::DataType& oType)
    {
        moModel->moTypes.assign(3, oType);
        Liar oLiar(std::make_unique<BasicReader>(moFile, Channels{2}), eLie);
        return Error([&] { pWrapping(oLiar); });
    }
};

} // namespace

TEST_F(BadSources, AreAnsweredOrRefused)
{
    const std::uint64_t nBudget = cache::TileStore::Process().GetBudget();
    for (const std::uint64_t nBytes : {nBudget, std::uint64_t{0}})
    {
        cache::TileStore::Process().SetBudget(nBytes);
        for (const auto& [pName, pWrapping] : WRAPPINGS)
        {
            for (const gobs::DataType& oType : {gobs::DataType(gobs::eDT_8U), gobs::DataType(gobs::eDT_32R)})
            {
                EXPECT_EQ(Over(pWrapping, eNone, oType), "") << pName;
                EXPECT_EQ(Over(pWrapping, eThrows, oType), "data: gone") << pName;
                EXPECT_EQ(Over(pWrapping, eForeign, oType), "foreign") << pName;
                EXPECT_EQ(Over(pWrapping, eNotANumber, oType), "") << pName;
                // What lies so that nothing can be read of it.
                for (const Lie eLie : {eLarger, eChannels, eType})
                {
                    const std::string error = Over(pWrapping, eLie, oType);
                    EXPECT_EQ(error.find("standard"), std::string::npos) << pName << " " << eLie << " " << error;
                    EXPECT_NE(error, "") << pName << ", lie " << eLie;
                }
                for (const Lie eLie : {eEmpty, eNoInfos, eTags, eTiles, eShrinks, eLevels})
                    EXPECT_EQ(Over(pWrapping, eLie, oType).find("standard"), std::string::npos) << pName << " " << eLie;
                EXPECT_EQ(moProbe.GetLive(), 0) << pName;
            }
        }
    }
    cache::TileStore::Process().SetBudget(nBudget);
}

TEST_F(BadSources, MapsThatLeadNowhere)
{
    BasicReader oSource(moFile, Channels{1, 2});
    for (unsigned int nKind = 0; nKind < 4; ++nKind)
    {
        for (const Resampling eMethod : {Resampling::eNearest, Resampling::eBilinear, Resampling::eCubic,
                                         Resampling::eLanczos, Resampling::eAverage, Resampling::eMode})
        {
            SCOPED_TRACE(std::to_string(nKind) + " " + gobs::GetResamplingName(eMethod));
            const std::string error = Error(
                [&]
                {
                    TransformRasterReader oReader(&oSource, std::make_shared<BadMap>(nKind), {9, 8, eMethod}, false);
                    Use(oReader);
                });
            EXPECT_EQ(error.find("standard"), std::string::npos) << error;
            EXPECT_TRUE(nKind != 0 || error.empty()) << error;
        }
    }
}

// Ready-made readers and writers of several channels, at the n-th call of what is below.
TEST_F(BadSources, MixedReadersThatFail)
{
    moModel->moTypes = {gobs::eDT_8U, gobs::eDT_16S, gobs::eDT_32R};
    moModel->moBitmaps = {{1, ""}};
    moModel->moAuxiliary.SetChanMetadataValue("NO_DATA_VALUE", "7", 2);
    const auto Mixed = [&]
    {
        const auto oDataset = MakeDataset();
        std::vector<std::unique_ptr<IRasterReader>> oOwned;
        for (unsigned int n = 1; n <= 3; ++n)
        {
            auto oBasic = std::make_unique<BasicReader>(moFile, Channels{n});
            oOwned.push_back(std::make_unique<ExactHaloReader>(oBasic.get(), true));
            static_cast<void>(oBasic.release());
        }
        std::vector<IRasterReader*> oReaders;
        for (auto& oReader : oOwned)
            oReaders.push_back(oReader.release());
        MultiTypeReader oReader(oDataset.get(), oReaders, {1, 2, 3}, gobs::eDT_64R);
        const RasterPtr oTile(oReader.GetRaster(0));
        EXPECT_TRUE(oReader.HasValidity());
        EXPECT_NE(oReader.ReadValid(*oTile), nullptr);
    };
    FailAtEveryCall(Mixed, [] {});
}

} // namespace krv::test
