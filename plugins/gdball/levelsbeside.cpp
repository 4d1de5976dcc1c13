#include "plugins/gdball/levelsbeside.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/ilevelstates.h"
#include "datasources/interfaces/ioverviewio.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/levelbook.h"
#include "plugins/support/sidecar/levelsfile.h"
#include "plugins/support/sidecar/sidecarfile.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <algorithm>

namespace krv::plugins::gdball
{

using namespace krv::datasources;

namespace
{

using support::FIRST_LEVEL_PAGE;
constexpr const char* ENDING = support::LEVELS_ENDING;

// A level as the image numbers it, over what the file has of it.
class LevelIO : public IOverviewIO
{
public:
    LevelIO(std::unique_ptr<IRasterIO> poOwn, unsigned int nLevel) : mpoOwn(std::move(poOwn)), mnLevel(nLevel) {}
    ~LevelIO() override = default;

    unsigned int GetLevel() const override { return mnLevel; }
    unsigned int GetFileWidth() const override { return mpoOwn->GetFileWidth(); }
    unsigned int GetFileHeight() const override { return mpoOwn->GetFileHeight(); }
    unsigned int GetTileWidth() const override { return mpoOwn->GetTileWidth(); }
    unsigned int GetTileHeight() const override { return mpoOwn->GetTileHeight(); }
    void ReadWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX, unsigned int nPartY,
                    unsigned int nPartWidth, unsigned int nPartHeight, unsigned char* pBuffer) override
    {
        mpoOwn->ReadWindow(nX, nY, nWidth, nHeight, nPartX, nPartY, nPartWidth, nPartHeight, pBuffer);
    }
    void ReadWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                    unsigned char* pBuffer) override
    {
        mpoOwn->ReadWindow(nX, nY, nWidth, nHeight, pBuffer);
    }
    void WriteWindow(int nX, int nY, unsigned int nWidth, unsigned int nHeight, unsigned int nPartX,
                     unsigned int nPartY, unsigned int nPartWidth, unsigned int nPartHeight,
                     unsigned char* const pBuffer) override
    {
        mpoOwn->WriteWindow(nX, nY, nWidth, nHeight, nPartX, nPartY, nPartWidth, nPartHeight, pBuffer);
    }
    void WriteWindow(unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                     unsigned char* const pBuffer) override
    {
        mpoOwn->WriteWindow(nX, nY, nWidth, nHeight, pBuffer);
    }

private:
    std::unique_ptr<IRasterIO> mpoOwn;
    unsigned int mnLevel;
};

std::vector<krv::gobs::DataType> ListTypes(const IRasterDataset& oRaster)
{
    std::vector<krv::gobs::DataType> oTypes;
    for (unsigned int nChannel = 1; nChannel <= oRaster.GetChanCount(); ++nChannel)
        oTypes.push_back(std::unique_ptr<IChannelInfo>(oRaster.GetChannelInfo(nChannel))->GetDataType());
    return oTypes;
}

unsigned int DivideUp(unsigned int nSize, unsigned int nBy)
{
    return (nSize - 1) / nBy + 1;
}

} // namespace

std::optional<unsigned int> FindLevelNumber(unsigned int nWidth, unsigned int nHeight, unsigned int nLevelWidth,
                                            unsigned int nLevelHeight)
{
    constexpr unsigned int MOST = 65536;
    const auto IsUp = [&](unsigned int nBy)
    {
        return DivideUp(nWidth, nBy) == nLevelWidth && DivideUp(nHeight, nBy) == nLevelHeight;
    };
    const auto IsDown = [&](unsigned int nBy)
    {
        return std::max(1u, nWidth / nBy) == nLevelWidth && std::max(1u, nHeight / nBy) == nLevelHeight;
    };
    for (unsigned int nBy = 2; nBy <= MOST; nBy *= 2)
        if (IsUp(nBy) || IsDown(nBy))
            return nBy;
    for (unsigned int nBy = 2; nBy <= std::min(MOST, std::max(nWidth, nHeight)); ++nBy)
        if (IsUp(nBy) || IsDown(nBy))
            return nBy;
    return std::nullopt;
}

LevelsBeside::LevelsBeside(const std::string& imageName, IRasterDataset& oImage, AccessMode eMode)
    : moName(imageName),
      moFileName(support::FindAppended(imageName, ENDING)), moImage{oImage.GetWidth(), oImage.GetHeight(),
                                                                    ListTypes(oImage)},
      meMode(eMode)
{
    if (!moFileName.empty())
        OpenFile();
}

LevelsBeside::~LevelsBeside() = default;

void LevelsBeside::Fail(const std::string& what, const Place& oPlace) const
{
    throw DataException(moName + ENDING + ": " + what, oPlace);
}

IRasterDataset& LevelsBeside::GetRaster() const
{
    return dynamic_cast<IRasterDataset&>(*mpoFile);
}

IOverviewManager& LevelsBeside::GetOwn() const
{
    if (!mpoOwn)
        mpoOwn.reset(GetRaster().GetOverviewManager());
    if (!mpoOwn)
        Fail("its format has no levels", Place::Current());
    return *mpoOwn;
}

std::string LevelsBeside::FindFault() const
{
    const auto* const poRaster = dynamic_cast<const IRasterDataset*>(mpoFile.get());
    if (poRaster == nullptr || poRaster->GetChanCount() == 0)
        return "it holds no image";
    if (ListTypes(*poRaster) != moImage.moTypes)
        return "its channels are others than the image's";
    if (!FindLevelNumber(moImage.mnWidth, moImage.mnHeight, poRaster->GetWidth(), poRaster->GetHeight()))
        return "its " + std::to_string(poRaster->GetWidth()) + " x " + std::to_string(poRaster->GetHeight()) +
               " pixels are no level of " + std::to_string(moImage.mnWidth) + " x " + std::to_string(moImage.mnHeight);
    return {};
}

void LevelsBeside::OpenFile()
{
    std::string fault;
    try
    {
        mpoFile.reset(DatasetManager::GetInstance()->Open(moFileName, meMode));
        fault = FindFault();
        if (fault.empty())
            return ListLevels();
    }
    catch (const Exception& oError)
    {
        fault = oError.what();
    }
    krv::nspio::Warning::Warn(moFileName + " is not used: " + fault);
    mpoOwn.reset();
    mpoFile.reset();
}

// The larger one counts where two pages would be one level.
void LevelsBeside::ListLevels()
{
    moLevels.clear();
    const auto Add = [&](unsigned int nOwn, unsigned int nWidth, unsigned int nHeight)
    {
        if (const auto oLevel = FindLevelNumber(moImage.mnWidth, moImage.mnHeight, nWidth, nHeight))
            moLevels.emplace(*oLevel, nOwn);
    };
    Add(FIRST_LEVEL_PAGE, GetRaster().GetWidth(), GetRaster().GetHeight());
    for (const unsigned int nOwn : GetOwn().GetLevels())
        Add(nOwn, GetOwn().GetLevelWidth(nOwn), GetOwn().GetLevelHeight(nOwn));
}

std::vector<unsigned int> LevelsBeside::GetLevels() const
{
    std::vector<unsigned int> oLevels;
    for (const auto& [nLevel, nOwn] : moLevels)
        oLevels.push_back(nLevel);
    return oLevels;
}

unsigned int LevelsBeside::FindOwn(unsigned int nLevel, const Place& oPlace) const
{
    const auto oFound = moLevels.find(nLevel);
    if (oFound == moLevels.end())
        Fail("there is no level " + std::to_string(nLevel), oPlace);
    return oFound->second;
}

IRasterIO* LevelsBeside::OpenLevel(unsigned int nLevel, const std::vector<unsigned int>& oChannels)
{
    const unsigned int nOwn = FindOwn(nLevel, Place::Current());
    std::unique_ptr<IRasterIO> poOwn(nOwn == FIRST_LEVEL_PAGE ? GetRaster().GetRasterIO(oChannels)
                                                              : GetOwn().GetOverviewIO(nOwn, oChannels));
    return new LevelIO(std::move(poOwn), nLevel);
}

void LevelsBeside::MakeLevel(unsigned int nLevel)
{
    const Place oPlace = Place::Current();
    if (nLevel < 2)
        Fail("levels are reductions by 2 and more", oPlace);
    if (moLevels.contains(nLevel))
        Fail("level " + std::to_string(nLevel) + " is there already", oPlace);
    if (!mpoFile)
    {
        const std::string name = moName + ENDING;
        std::unique_ptr<IDataset> poNew(DatasetManager::GetInstance()->NewDataset(name, "TIF", ""));
        dynamic_cast<IRasterDataset&>(*poNew).Create(DivideUp(moImage.mnWidth, nLevel),
                                                     DivideUp(moImage.mnHeight, nLevel), moImage.moTypes);
        mpoFile = std::move(poNew);
        moFileName = name;
        moLevels = {{nLevel, FIRST_LEVEL_PAGE}};
        return;
    }
    const unsigned int nFirst = moLevels.begin()->first;
    if (nLevel < nFirst || nLevel % nFirst != 0)
        Fail("level " + std::to_string(nLevel) + " cannot be added: the file begins with level " +
                 std::to_string(nFirst) + ", and the others are multiples of it; delete the file to begin anew",
             oPlace);
    GetOwn().CreateLevel(nLevel / nFirst);
    moLevels[nLevel] = nLevel / nFirst;
}

void LevelsBeside::DropLevel(unsigned int nLevel)
{
    const unsigned int nOwn = FindOwn(nLevel, Place::Current());
    if (nOwn != FIRST_LEVEL_PAGE)
        GetOwn().DeleteLevel(nOwn);
    else if (moLevels.size() > 1)
        Fail("the largest level cannot be deleted before the others", Place::Current());
    else
    {
        mpoOwn.reset();
        mpoFile->Delete();
        mpoFile.reset();
    }
    moLevels.erase(nLevel);
}

bool LevelsBeside::IsValid(unsigned int nChannel, unsigned int nLevel) const
{
    const auto oFound = moLevels.find(nLevel);
    if (oFound == moLevels.end() || nChannel == 0 || nChannel > moImage.moTypes.size())
        return false;
    if (oFound->second != FIRST_LEVEL_PAGE)
        return GetOwn().IsValid(nChannel, oFound->second);
    return IsLevelValid(mpoFile->ReadAuxiliaryData(), nChannel, FIRST_LEVEL_PAGE);
}

void LevelsBeside::SetValid(const std::vector<unsigned int>& oChannels, unsigned int nLevel, bool bValid)
{
    const unsigned int nOwn = FindOwn(nLevel, Place::Current());
    mbForgotten = mbForgotten && !bValid;
    if (nOwn != FIRST_LEVEL_PAGE)
        return SetChannelsValid(GetOwn(), oChannels, nOwn, bValid);
    AuxiliaryData oBook = mpoFile->ReadAuxiliaryData();
    for (const unsigned int nChannel : oChannels)
        SetLevelValid(oBook, nChannel, FIRST_LEVEL_PAGE, bValid, moMethod);
    mpoFile->WriteAuxiliaryData(oBook);
}

void LevelsBeside::ForgetLevels()
{
    if (mbForgotten || !mpoFile || meMode != eUpdate)
        return;
    support::ForgetLevels(*mpoFile);
    mpoFile->Synchronize(); // before the pixels are in their file
    mbForgotten = true;
}

std::pair<unsigned int, unsigned int> LevelsBeside::GetSize(unsigned int nLevel) const
{
    const unsigned int nOwn = FindOwn(nLevel, Place::Current());
    if (nOwn == FIRST_LEVEL_PAGE)
        return {GetRaster().GetWidth(), GetRaster().GetHeight()};
    return {GetOwn().GetLevelWidth(nOwn), GetOwn().GetLevelHeight(nOwn)};
}

AuxiliaryData LevelsBeside::ReadRecord(unsigned int nLevel) const
{
    const unsigned int nOwn = FindOwn(nLevel, Place::Current());
    return nOwn == FIRST_LEVEL_PAGE ? mpoFile->ReadAuxiliaryData().GetCleanedMeta() : GetOwn().GetAuxiliaryData(nOwn);
}

std::string LevelsBeside::GetMethod() const
{
    if (!moMethod.empty() || !mpoFile)
        return moMethod;
    return GetLevelMethod(mpoFile->ReadAuxiliaryData(), FIRST_LEVEL_PAGE);
}

void LevelsBeside::SetMethod(const std::string& name)
{
    const std::string method = ParseLevelMethod(name);
    if (method.empty())
        Fail("\"" + name + "\" is no method of levels", Place::Current());
    moMethod = method;
    if (mpoFile)
        GetOwn().SetResamplingName(method);
}

void LevelsBeside::Synchronize()
{
    if (mpoFile && meMode == eUpdate)
        mpoFile->Synchronize();
}

void LevelsBeside::Close()
{
    mpoOwn.reset();
    if (mpoFile)
        mpoFile->Close();
}

} // namespace krv::plugins::gdball
