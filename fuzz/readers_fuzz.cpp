// Readers of any channels, types, tiles and margins over images that are known pixel by pixel, made up and in DEMO
// files. Levels and readers around readers are read likewise.
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/defaultreader.h"
#include "datasources/reader/exacthaloreader.h"
#include "datasources/reader/ioverviewaccessor.h"
#include "datasources/reader/multitypereader.h"
#include "datasources/reader/rasteriterator.h"
#include "fuzz/support/choices.h"
#include "fuzz/support/inputfile.h"
#include "gobs/raster/raster.h"
#include "tests/support/conversionmodel.h"
#include "tests/support/demofile.h"
#include "tests/support/recipe.h"
#include "tests/support/syntheticdataset.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "tools/conformance/referenceimage.h"

#include <map>
#include <memory>

namespace
{

using namespace krv::datasources;
using namespace krv::gobs;
using krv::conformance::ReferenceImage;
using krv::fuzz::Check;
using krv::fuzz::Choices;
using ReaderPtr = std::unique_ptr<IRasterReader>;
using Channels = std::vector<unsigned int>;

constexpr int NO_DATA = 7; // every type holds it

NativeDataTypeCode ChooseType(Choices& oChoices)
{
    return static_cast<NativeDataTypeCode>(oChoices.Below(15));
}

// An image of known pixels.
class Scene
{
public:
    explicit Scene(Choices& oChoices)
    {
        moModel->mnWidth = 1 + oChoices.Below(40);
        moModel->mnHeight = 1 + oChoices.Below(30);
        moModel->mnTileWidth = 1 + oChoices.Below(20);
        moModel->mnTileHeight = 1 + oChoices.Below(20);
        const bool bDemo = oChoices.OneIn(2);
        const DataType oFirst = ChooseType(oChoices);
        moModel->moTypes.assign(1 + oChoices.Below(5), oFirst);
        if (oChoices.OneIn(2))
            for (DataType& oType : moModel->moTypes)
                oType = oChoices.OneIn(2) ? oFirst : DataType(ChooseType(oChoices));
        for (const unsigned int nLevel : {2, 4})
            if (!bDemo && oChoices.OneIn(2))
                moModel->moLevels.push_back(nLevel);
        moModel->moAuxiliary = AuxiliaryData(static_cast<unsigned int>(moModel->moTypes.size()));
        mbNoData = !bDemo && oChoices.OneIn(2);
        if (mbNoData)
            moModel->moAuxiliary.SetFileMetadataValue("NO_DATA_VALUE", std::to_string(NO_DATA));
        if (!bDemo)
            mpoDataset = std::make_unique<krv::test::SyntheticDataset>(moModel);
        else
        {
            mpoFile = std::make_unique<krv::fuzz::InputFile>(nullptr, 0);
            krv::test::WriteDemoFile(mpoFile->GetName(), moModel->mnWidth, moModel->mnHeight, moModel->moTypes);
            mpoDataset.reset(DatasetManager::GetInstance()->Open(mpoFile->GetName(), eReadOnly));
        }
    }

    IDataset* GetDataset() const { return mpoDataset.get(); }
    unsigned int GetChannelCount() const { return static_cast<unsigned int>(moModel->moTypes.size()); }
    const DataType& TypeOf(unsigned int nChannel) const { return moModel->moTypes.at(nChannel - 1); }
    bool HasNoData() const { return mbNoData; }
    const Channels& GetLevels() const { return moModel->moLevels; }

    // The channels in a type, on a level (1: the image itself); 0 for a channel is zeros.
    ReferenceImage GetImage(const Channels& oChannels, const DataType& oType, unsigned int nLevel) const
    {
        const krv::test::Type oTo(oType.GetNativeCode());
        ReferenceImage oImage{moModel->LevelWidth(nLevel), moModel->LevelHeight(nLevel), oChannels.size() * oTo.Bytes(),
                              ""};
        oImage.moBytes.resize(oImage.mnPixelBytes * oImage.mnWidth * oImage.mnHeight);
        auto* const pPixels = reinterpret_cast<unsigned char*>(oImage.moBytes.data());
        for (std::size_t nPosition = 0; nPosition < oChannels.size(); ++nPosition)
        {
            if (oChannels[nPosition] == 0)
                continue;
            const DataType& oOwn = TypeOf(oChannels[nPosition]);
            const krv::test::Type oFrom(oOwn.GetNativeCode());
            const std::string values =
                nLevel == 1 ? krv::test::RecipeImage(oImage.mnWidth, oImage.mnHeight, {oChannels[nPosition]}, oOwn)
                            : krv::test::LevelImage(*moModel, nLevel, {oChannels[nPosition]});
            for (std::size_t n = 0; n < std::size_t{oImage.mnWidth} * oImage.mnHeight; ++n)
                krv::test::ModelValue(reinterpret_cast<const unsigned char*>(&values[n * oFrom.Bytes()]), oFrom,
                                      pPixels + n * oImage.mnPixelBytes + nPosition * oTo.Bytes(), oTo);
        }
        return oImage;
    }

private:
    krv::test::ImageModelPtr moModel = std::make_shared<krv::test::ImageModel>();
    std::unique_ptr<krv::fuzz::InputFile> mpoFile;
    std::unique_ptr<IDataset> mpoDataset;
    bool mbNoData = false;
};

// Where a reader of several types puts its channels: the channel at each position, 0 for none.
Channels PlaceNaively(const Scene& oScene, const Channels& oChannels, eChannelPlacement ePlacement)
{
    if (ePlacement == eOwnPlace)
        return oChannels;
    std::map<DataType, Channels> oGroups;
    for (unsigned int nPosition = 0; nPosition < oChannels.size(); ++nPosition)
        oGroups[oScene.TypeOf(oChannels[nPosition])].push_back(nPosition);
    Channels oPlaced(oChannels.size());
    for (const auto& [oType, oPositions] : oGroups)
        for (unsigned int n = 0; n < oPositions.size(); ++n)
            oPlaced[oPositions[0] + n] = oChannels[oPositions[n]];
    return oPlaced;
}

// A reader and what it must deliver.
struct Known
{
    std::unique_ptr<IOverviewReaderAccessor> mpoLevels; // outlives its reader
    ReaderPtr mpoReader;
    ReferenceImage moImage;
    bool mbExact = false;
    std::string moConstant; // a pixel of eConstant
    std::string moNoData;   // one of eNoData, "" without the value

    // The buffer for a window with margins, or "" where the reader refuses.
    std::string Expect(const Raster& oRaster, eMarginBehaviour eBehaviour) const
    {
        const long long nX = oRaster.GetX(), nY = oRaster.GetY(), nXMargin = oRaster.GetXMargin(),
                        nYMargin = oRaster.GetYMargin();
        const auto nWidth = static_cast<long long>(oRaster.GetFullWidth());
        const auto nHeight = static_cast<long long>(oRaster.GetFullHeight());
        const long long nLeft = nX - nXMargin, nTop = nY - nYMargin;
        const bool bOutside =
            nLeft < 0 || nTop < 0 || nLeft + nWidth > moImage.mnWidth || nTop + nHeight > moImage.mnHeight;
        if (mbExact)
        {
            std::string bytes;
            const bool bMissing = eBehaviour == eException || (eBehaviour == eNoData && moNoData.empty());
            for (long long nRow = 0; nRow < nHeight && !(bOutside && bMissing); ++nRow)
                for (long long nColumn = 0; nColumn < nWidth; ++nColumn)
                {
                    const long long nFromX =
                        krv::conformance::FoldNaively(nLeft + nColumn, moImage.mnWidth, eBehaviour);
                    const long long nFromY = krv::conformance::FoldNaively(nTop + nRow, moImage.mnHeight, eBehaviour);
                    bytes += nFromX < 0 || nFromY < 0 ? (eBehaviour == eNoData ? moNoData : moConstant)
                                                      : moImage.Pixel(nFromX, nFromY);
                }
            return bytes;
        }
        const bool bBorder = (nXMargin != 0 || nYMargin != 0) &&
                             (bOutside || nLeft + nWidth == moImage.mnWidth || nTop + nHeight == moImage.mnHeight);
        if (bBorder && eBehaviour == eException)
            return "";
        return moImage.WithMargins(oRaster.GetX(), oRaster.GetY(), oRaster.GetWidth(), oRaster.GetHeight(),
                                   oRaster.GetXMargin(), oRaster.GetYMargin(), eBehaviour);
    }
};

bool SamePixels(const Raster& oRaster, const std::string& expected)
{
    const krv::test::Part& oPart = *krv::test::Type(oRaster.GetDataType().GetNativeCode()).mpoPart;
    const auto* const pExpected = reinterpret_cast<const unsigned char*>(expected.data());
    bool bSame = oRaster.GetBufferSize() == expected.size();
    for (std::size_t i = 0; bSame && i < expected.size(); i += static_cast<std::size_t>(oPart.mnBytes))
        bSame = krv::test::Same(oRaster.GetBuffer() + i, pExpected + i, oPart);
    return bSame;
}

Known MakeReader(const Scene& oScene, Choices& oChoices)
{
    const unsigned int nKind = oChoices.Below(3);
    Channels oChannels(1 + oChoices.Below(6));
    for (unsigned int& nChannel : oChannels)
        nChannel = 1 + oChoices.Below(oScene.GetChannelCount());
    const DataType oFirst = oScene.TypeOf(oChannels[0]);
    if (nKind == 0)
        std::erase_if(oChannels, [&](unsigned int n) { return oScene.TypeOf(n) != oFirst; });
    Known oKnown;
    Channels oPlaced = oChannels;
    if (nKind == 0)
        oKnown.mpoReader = std::make_unique<BasicReader>(oScene.GetDataset(), oChannels, false);
    else if (nKind == 1)
    {
        oKnown.mpoReader.reset(CreateDefaultReader(oScene.GetDataset(), oChannels));
        oPlaced = PlaceNaively(oScene, oChannels, eFromFirstPlace);
    }
    else
    {
        const eChannelPlacement ePlacement = oChoices.OneIn(2) ? eOwnPlace : eFromFirstPlace;
        oKnown.mpoReader =
            std::make_unique<MultiTypeReader>(oScene.GetDataset(), oChannels, ChooseType(oChoices), ePlacement);
        oPlaced = PlaceNaively(oScene, oChannels, ePlacement);
    }
    unsigned int nLevel = 1;
    const DataType oType = oKnown.mpoReader->GetDataType();
    if (!oScene.GetLevels().empty() && oChoices.OneIn(2))
    {
        nLevel = oChoices.Of(oScene.GetLevels());
        oKnown.mpoLevels.reset(oKnown.mpoReader->GetOverviewReaderAccessor());
        Check(oKnown.mpoLevels->GetLevels() == oScene.GetLevels() && oKnown.mpoLevels->IsLevelValid(nLevel), "levels");
        oKnown.mpoReader.reset(oKnown.mpoLevels->CreateRasterReader(nLevel));
        Check(oKnown.mpoReader->GetOverviewReaderAccessor() == nullptr, "a level has levels");
        oPlaced = oChannels;
    }
    oKnown.moImage = oScene.GetImage(oPlaced, oType, nLevel);
    Check(oKnown.mpoReader->GetDataType() == oType && oKnown.mpoReader->GetChansCount() == oChannels.size() &&
              oKnown.mpoReader->GetWidth() == oKnown.moImage.mnWidth &&
              oKnown.mpoReader->GetHeight() == oKnown.moImage.mnHeight,
          "size and type of a reader");
    oKnown.mbExact = oChoices.OneIn(2);
    if (!oKnown.mbExact)
        return oKnown;
    auto oExact = std::make_unique<ExactHaloReader>(oKnown.mpoReader.get(), true);
    [[maybe_unused]] auto* const poTakenOver = oKnown.mpoReader.release();
    const krv::test::Type oModel(oType.GetNativeCode());
    std::vector<double> oConstant;
    for (std::size_t n = 0; n < oChannels.size(); ++n)
    {
        unsigned char oValue[16] = {};
        oConstant.push_back(oChoices.Between(-300, 300));
        oModel.mpoPart->Store(oValue, krv::test::ModelPart(oConstant.back(), *oModel.mpoPart));
        oKnown.moConstant.append(reinterpret_cast<const char*>(oValue), oModel.Bytes());
        oModel.mpoPart->Store(oValue, NO_DATA);
        if (oScene.HasNoData())
            oKnown.moNoData.append(reinterpret_cast<const char*>(oValue), oModel.Bytes());
    }
    oExact->SetConstant(oConstant);
    oKnown.mpoReader = std::move(oExact);
    return oKnown;
}

template <class Read>
bool Reads(const Read& oRead)
{
    try
    {
        oRead();
    }
    catch (const krv::DataException&)
    {
        return false;
    }
    return true;
}

std::string DescribeRaster(const Raster& oRaster, eMarginBehaviour eBehaviour)
{
    std::string text = oRaster.GetDataType().Describe() + " x " + std::to_string(oRaster.GetChansCount());
    for (const long long n :
         {0ll + oRaster.GetX(), 0ll + oRaster.GetY(), 0ll + oRaster.GetWidth(), 0ll + oRaster.GetHeight(),
          0ll + oRaster.GetXMargin(), 0ll + oRaster.GetYMargin(), 0ll + eBehaviour})
        text += " " + std::to_string(n);
    return text;
}

eMarginBehaviour ChooseBehaviour(Choices& oChoices, const Known& oKnown)
{
    constexpr eMarginBehaviour BEHAVIOURS[] = {eReplicate, eMirror, eMirror101, eConstant, eWrap, eException, eNoData};
    return BEHAVIOURS[oChoices.Below(oKnown.mbExact ? 7 : 6)];
}

void CheckTiles(const Known& oKnown, Choices& oChoices)
{
    IRasterReader& oReader = *oKnown.mpoReader;
    if (oChoices.OneIn(4))
        oReader.SetOptimalTileSize();
    else
        oReader.SetTileSize(oChoices.Below(oReader.GetWidth() + 9), oChoices.Below(oReader.GetHeight() + 9));
    const eMarginBehaviour eBehaviour = ChooseBehaviour(oChoices, oKnown);
    const unsigned int nXMargin = oChoices.Below(2) * oChoices.Below(oReader.GetWidth() + 3);
    const unsigned int nYMargin = oChoices.Below(2) * oChoices.Below(oReader.GetHeight() + 3);
    const bool bWide = nXMargin > oReader.GetWidth() / 2 || nYMargin > oReader.GetHeight() / 2;
    const bool bSet = Reads([&] { oReader.SetMargins(nXMargin, nYMargin, eBehaviour); });
    Check(bSet == (oKnown.mbExact || eBehaviour == eReplicate || !bWide), "what margins are refused");
    if (!bSet)
        return;
    std::uint64_t nPixels = 0;
    unsigned int nTile = 0;
    for (auto oTile = oReader.Begin(); oTile != oReader.End() && nTile < 40; ++oTile, ++nTile)
    {
        std::unique_ptr<Raster> oRaster;
        const bool bRead = Reads([&] { oRaster.reset(*oTile); });
        if (!bRead)
        {
            Check(eBehaviour == eException || (eBehaviour == eNoData && oKnown.moNoData.empty()), "a tile is refused");
            continue;
        }
        Check(SamePixels(*oRaster, oKnown.Expect(*oRaster, eBehaviour)),
              "tile " + DescribeRaster(*oRaster, eBehaviour));
        const unsigned int nX = oRaster->GetX() + oRaster->GetWidth() - 1, nY = oRaster->GetY();
        Check(oReader.FindRaster(nX, nY) == oTile, "the tile of a pixel");
        nPixels += std::uint64_t{oRaster->GetWidth()} * oRaster->GetHeight();
    }
    if (nTile == oReader.GetTileCount() && eBehaviour != eException && eBehaviour != eNoData)
        Check(nPixels == std::uint64_t{oReader.GetWidth()} * oReader.GetHeight(), "tiles make up the image");
}

void CheckWindow(const Known& oKnown, Choices& oChoices)
{
    IRasterReader& oReader = *oKnown.mpoReader;
    const int nImageWidth = static_cast<int>(oReader.GetWidth()), nImageHeight = static_cast<int>(oReader.GetHeight());
    const bool bAnywhere = oKnown.mbExact && oChoices.OneIn(2);
    const int nX = bAnywhere ? oChoices.Between(-nImageWidth, 2 * nImageWidth) : oChoices.Between(0, nImageWidth - 1);
    const int nY =
        bAnywhere ? oChoices.Between(-nImageHeight, 2 * nImageHeight) : oChoices.Between(0, nImageHeight - 1);
    const unsigned int nWidth = 1 + oChoices.Below(bAnywhere ? nImageWidth : nImageWidth - nX);
    const unsigned int nHeight = 1 + oChoices.Below(bAnywhere ? nImageHeight : nImageHeight - nY);
    const eMarginBehaviour eBehaviour = ChooseBehaviour(oChoices, oKnown);
    Raster oRaster({nWidth, nHeight, oReader.GetChansCount(), oReader.GetDataType()},
                   {nX, nY, oChoices.Below(2) * oChoices.Below(2 * nImageWidth + 2),
                    oChoices.Below(2) * oChoices.Below(2 * nImageHeight + 2)});
    std::memset(oRaster.GetBuffer(), 0xCD, oRaster.GetBufferSize());
    oReader.SetMargins(0, 0, eBehaviour); // the raster's own count
    const std::string expected = oKnown.Expect(oRaster, eBehaviour);
    const bool bRead = Reads([&] { oReader.ReadRaster(&oRaster); });
    Check(bRead == !expected.empty(), "what is refused of " + DescribeRaster(oRaster, eBehaviour));
    Check(!bRead || SamePixels(oRaster, expected), "the window " + DescribeRaster(oRaster, eBehaviour));
}

} // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    krv::nspio::Warning::SetSink([](const std::string&, const std::string&, unsigned int) {});
    DatasetManager::GetInstance();
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* poBytes, std::size_t nBytes)
{
    Choices oChoices(poBytes, nBytes);
    const Scene oScene(oChoices);
    for (int nReader = 0; nReader < 3 && (nReader == 0 || !oChoices.IsAtEnd()); ++nReader)
    {
        const Known oKnown = MakeReader(oScene, oChoices);
        for (int nStep = 0; nStep < 6 && (nStep == 0 || !oChoices.IsAtEnd()); ++nStep)
            if (oChoices.OneIn(3))
                CheckTiles(oKnown, oChoices);
            else
                CheckWindow(oKnown, oChoices);
    }
    return 0;
}
