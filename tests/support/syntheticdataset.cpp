#include "tests/support/syntheticdataset.h"

#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/windowedio.h"
#include "gobs/raster/rasterinfo.h"
#include "tests/support/recipe.h"
#include "toolkit/exceptions/exceptions.h"
#include "tools/conformance/referenceimage.h"

#include <algorithm>
#include <cstring>

using krv::conformance::ReferenceImage;
using namespace krv::datasources;

namespace krv::test
{

namespace
{

// Serves a whole image that it holds in memory.
template <class Interface>
class MemoryIO : public WindowedIO<Interface>
{
public:
    MemoryIO(const ImageModel& oModel, ReferenceImage oImage)
        : mnTileWidth(oModel.mnTileWidth), mnTileHeight(oModel.mnTileHeight), moImage(std::move(oImage))
    {
    }

    unsigned int GetFileWidth() const override { return moImage.mnWidth; }
    unsigned int GetFileHeight() const override { return moImage.mnHeight; }
    unsigned int GetTileWidth() const override { return mnTileWidth; }
    unsigned int GetTileHeight() const override { return mnTileHeight; }

private:
    std::size_t GetPixelBytes() const override { return moImage.mnPixelBytes; }
    void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override
    {
        for (unsigned int nRow = 0; nRow < oRect.mnHeight; ++nRow)
        {
            const std::string row = moImage.Window(oRect.mnX, oRect.mnY + nRow, oRect.mnWidth, 1);
            std::memcpy(pTarget + nRow * nPitch, row.data(), row.size());
        }
    }
    void WritePixels(const PixelRect&, const unsigned char*, std::size_t) override
    {
        throw krv::DataException("synthetic: read only");
    }

    unsigned int mnTileWidth;
    unsigned int mnTileHeight;
    ReferenceImage moImage;
};

class LevelIO : public MemoryIO<IOverviewIO>
{
public:
    LevelIO(const ImageModel& oModel, unsigned int nLevel, ReferenceImage oImage)
        : MemoryIO(oModel, std::move(oImage)), mnLevel(nLevel)
    {
    }
    unsigned int GetLevel() const override { return mnLevel; }

private:
    unsigned int mnLevel;
};

void CheckChannels(const ImageModel& oModel, const std::vector<unsigned int>& oChannels)
{
    if (oChannels.empty())
        throw krv::DataException("synthetic: no channels");
    for (const unsigned int nChannel : oChannels)
    {
        if (nChannel == 0 || nChannel > oModel.moTypes.size())
            throw krv::DataException("synthetic: no channel " + std::to_string(nChannel));
        if (oModel.moTypes[nChannel - 1] != oModel.moTypes[oChannels[0] - 1])
            throw krv::DataException("synthetic: channels of several types");
    }
}

ReferenceImage MakeImage(unsigned int nWidth, unsigned int nHeight, std::string bytes)
{
    const std::size_t nPixels = std::max<std::size_t>(1, std::size_t(nWidth) * nHeight);
    const std::size_t nPixelBytes = bytes.size() / nPixels;
    return {nWidth, nHeight, nPixelBytes, std::move(bytes)};
}

class SyntheticManager : public IOverviewManager
{
public:
    explicit SyntheticManager(ImageModelPtr poModel) : mpoModel(std::move(poModel)) {}

    std::vector<unsigned int> GetLevels() const override { return mpoModel->moLevels; }
    IRasterIO* GetOverviewIO(unsigned int nLevel, const std::vector<unsigned int>& oChannels) override
    {
        Check(nLevel);
        CheckChannels(*mpoModel, oChannels);
        return new LevelIO(*mpoModel, nLevel,
                           MakeImage(mpoModel->LevelWidth(nLevel), mpoModel->LevelHeight(nLevel),
                                     LevelImage(*mpoModel, nLevel, oChannels)));
    }
    void CreateLevel(unsigned int nLevel) override { mpoModel->moLevels.push_back(nLevel); }
    bool IsValid(unsigned int nChannel, unsigned int nLevel) const override
    {
        const auto& oLevels = mpoModel->moLevels;
        return std::find(oLevels.begin(), oLevels.end(), nLevel) != oLevels.end() &&
               !mpoModel->moOutdated.contains({nChannel, nLevel});
    }
    void DeleteLevel(unsigned int nLevel) override { std::erase(mpoModel->moLevels, nLevel); }
    std::string GetResamplingName() const override { return ""; }
    void SetValid(unsigned int, unsigned int, bool) override {}
    unsigned int GetLevelWidth(unsigned int nLevel) const override
    {
        Check(nLevel);
        return mpoModel->LevelWidth(nLevel);
    }
    unsigned int GetLevelHeight(unsigned int nLevel) const override
    {
        Check(nLevel);
        return mpoModel->LevelHeight(nLevel);
    }
    AuxiliaryData GetAuxiliaryData(unsigned int nLevel) override
    {
        Check(nLevel);
        AuxiliaryData oData = mpoModel->moAuxiliary;
        oData.SetFileMetadataValue("level", std::to_string(nLevel));
        return oData;
    }
    void SetResamplingName(const std::string&) override {}

private:
    void Check(unsigned int nLevel) const
    {
        const auto& oLevels = mpoModel->moLevels;
        if (std::find(oLevels.begin(), oLevels.end(), nLevel) == oLevels.end())
            throw krv::DataException("synthetic: no level " + std::to_string(nLevel));
    }

    ImageModelPtr mpoModel;
};

} // namespace

IRasterIO* RasterPart::GetRasterIO(const std::vector<unsigned int>& oChannels)
{
    CheckChannels(*mpoModel, oChannels);
    const ImageModel& oModel = *mpoModel;
    const krv::gobs::DataType& oType = oModel.moTypes[oChannels[0] - 1];
    return new MemoryIO<IRasterIO>(oModel, MakeImage(oModel.mnWidth, oModel.mnHeight,
                                                     RecipeImage(oModel.mnWidth, oModel.mnHeight, oChannels, oType)));
}

IChannelInfo* RasterPart::GetChannelInfo(unsigned int nChannel) const
{
    CheckChannels(*mpoModel, {nChannel});
    return new ChannelInfo(mpoModel->moTypes[nChannel - 1]);
}

IOverviewManager* RasterPart::GetOverviewManager()
{
    return mpoModel->mbOverviewManager ? new SyntheticManager(mpoModel) : nullptr;
}

std::vector<unsigned int> BitmapPart::GetBitmapList() const
{
    std::vector<unsigned int> oNumbers;
    for (const auto& oBitmap : mpoModel->moBitmaps)
        oNumbers.push_back(oBitmap.first);
    return oNumbers;
}

IRasterIO* BitmapPart::GetBitmapIO(const std::vector<unsigned int>& oBitmaps)
{
    return new MemoryIO<IRasterIO>(*mpoModel,
                                   MakeImage(mpoModel->mnWidth, mpoModel->mnHeight, BitmapImage(*mpoModel, oBitmaps)));
}

unsigned int BitmapPart::CreateBitmap()
{
    const unsigned int nNumber = mpoModel->moBitmaps.empty() ? 1 : mpoModel->moBitmaps.rbegin()->first + 1;
    mpoModel->moBitmaps[nNumber];
    return nNumber;
}

void BitmapPart::SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription)
{
    mpoModel->moBitmaps.at(nBitmap) = oDescription;
}

MetadataMap BitmapPart::GetBitmapMetadata(unsigned int nBitmap) const
{
    return {{"bitmap", std::to_string(nBitmap)}};
}

std::string BitmapImage(const ImageModel& oModel, const std::vector<unsigned int>& oBitmaps)
{
    std::string oBytes = RecipeImage(oModel.mnWidth, oModel.mnHeight, oBitmaps, krv::gobs::eDT_8U);
    for (char& nByte : oBytes)
        nByte &= 1;
    return oBytes;
}

std::string LevelImage(const ImageModel& oModel, unsigned int nLevel, const std::vector<unsigned int>& oChannels)
{
    std::vector<unsigned int> oSeeds;
    for (const unsigned int nChannel : oChannels)
        oSeeds.push_back(nChannel + 1000 * nLevel);
    return RecipeImage(oModel.LevelWidth(nLevel), oModel.LevelHeight(nLevel), oSeeds,
                       oModel.moTypes.at(oChannels.at(0) - 1));
}

} // namespace krv::test
