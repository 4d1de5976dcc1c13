#include "datasources/datasets/metacomplexdataset.h"

#include "datasources/datasets/detail/channellist.h"
#include "datasources/datasets/detail/pairio.h"
#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/droppedtags.h"
#include "datasources/metadata/typednodata.h"
#include "toolkit/core/ownedorborrowed.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/ogc/cs/geocodinginfo.h"

#include <algorithm>
#include <limits>
#include <map>
#include <optional>
#include <string_view>
#include <utility>

namespace krv::datasources
{

namespace
{

using krv::gobs::DataType;
using Source = OwnedOrBorrowed<IDataset>;

const std::string NO_DATA_KEY = "NO_DATA_VALUE";
const std::string DESCRIPTION_KEY = std::string("Description") + MetaComplexDataset::SECOND_SUFFIX;

// The complex type for a pair of channels; no type when there is none.
DataType FindComplexType(const DataType& oType, eComplexForm eForm)
{
    using namespace krv::gobs;
    NativeDataTypeCode eCode{};
    if (!oType.FindNativeCode(eCode) || oType.IsComplex() || eCode == eDT_BIT)
        return {};
    if (eForm == eAmplitudePhase)
        return oType.GetBits() <= 16 || eCode == eDT_32R ? eDT_C32R : eDT_C64R;
    switch (eCode)
    {
    case eDT_8U:
    case eDT_8S:
    case eDT_16S:
        return eDT_C16S;
    case eDT_16U:
        return eDT_C16U;
    case eDT_32S:
        return eDT_C32S;
    case eDT_32R:
        return eDT_C32R;
    default:
        return eDT_C64R;
    }
}

std::size_t ValueBytes(const DataType& oType)
{
    return static_cast<std::size_t>(oType.GetValueBits() / 8);
}

bool EndsInSuffix(const std::string& key)
{
    return key.ends_with(MetaComplexDataset::SECOND_SUFFIX);
}

std::string WithSuffix(const std::string& key)
{
    return key + MetaComplexDataset::SECOND_SUFFIX;
}

std::string WithoutSuffix(const std::string& key)
{
    return key.substr(0, key.size() - std::string_view(MetaComplexDataset::SECOND_SUFFIX).size());
}

// What a channel's tags tell beside its values and the book of levels.
MetadataMap ShownTags(const AuxiliaryData& oRecord, unsigned int nChannel)
{
    MetadataMap oTags = oRecord.GetCleanedMeta().GetChanMetadata(nChannel);
    DropStatistics(oTags);
    oTags.erase(NO_DATA_KEY);
    return oTags;
}

// The book of levels of a pair: a level is as both channels say, where they agree, and valid without a method when both
// have it so.
void JoinBooks(AuxiliaryData oFirst, unsigned int nFirst, AuxiliaryData oSecond, unsigned int nSecond,
               MetadataMap& oTags)
{
    const MetadataMap oOther = oSecond.GetChanOverviewMetadata(nSecond);
    for (const auto& [key, state] : oFirst.GetChanOverviewMetadata(nFirst))
    {
        const auto oFound = oOther.find(key);
        if (oFound == oOther.end())
            continue;
        const bool bValid = state.starts_with("valid") && oFound->second.starts_with("valid");
        oTags[key] = state == oFound->second ? state : bValid ? "valid" : "invalid";
    }
}

// The other way: tags in the place of those that were shown.
void ReplaceTags(AuxiliaryData& oRecord, unsigned int nChannel, const MetadataMap& oTags)
{
    MetadataMap oAll = oRecord.GetChanMetadata(nChannel);
    for (const auto& [key, value] : ShownTags(oRecord, nChannel))
        oAll.erase(key);
    for (const auto& [key, value] : oTags)
        oAll[key] = value;
    oRecord.SetChanMetadata(oAll, nChannel);
}

} // namespace

struct MetaComplexDataset::State
{
    State(Source poFirst, Source poSecond) : mpoFirst(std::move(poFirst)), mpoSecond(std::move(poSecond)) {}

    // The source of the second channels.
    IDataset& GetSecond() const { return mpoSecond != nullptr ? *mpoSecond : *mpoFirst; }
    AuxiliaryData ReadSecond(const AuxiliaryData& oFirst) const
    {
        return mpoSecond != nullptr ? mpoSecond->ReadAuxiliaryData() : oFirst;
    }

    Source mpoFirst;
    Source mpoSecond; // null when there is one source
    IRasterDataset* mpoFirstRasters = nullptr;
    IRasterDataset* mpoSecondRasters = nullptr;
    std::vector<ComplexPair> moPairs;
    eComplexForm meForm = eRealImaginary;
    std::vector<DataType> moSourceTypes;
    std::vector<DataType> moTypes;
    krv::ogc::cs::GeocodingInfo moNowhere;

    std::optional<detail::PairNoData> FindNoData(const AuxiliaryData& oFirst, const AuxiliaryData& oSecond,
                                                 std::size_t nPair) const;
    // The I/O of pairs of channels of one type over those of the sources, made by oOpen(second, channels).
    template <typename Open>
    std::unique_ptr<IRasterIO> OpenPairs(const std::vector<unsigned int>& oChannels, const Open& oOpen) const;
    // The same for any pairs of one complex type: those of one type each are read together.
    template <typename Part, typename Open>
    std::vector<Part> OpenParts(const std::vector<unsigned int>& oChannels, const Open& oOpen) const;
    detail::PairForm MakeForm(const std::vector<unsigned int>& oChannels) const;
};

std::optional<detail::PairNoData> MetaComplexDataset::State::FindNoData(const AuxiliaryData& oFirst,
                                                                        const AuxiliaryData& oSecond,
                                                                        std::size_t nPair) const
{
    // A text that is no number keeps nobody from the pixels.
    const auto oFirstValue = ParseNoData(GetNoDataText(oFirst, moPairs[nPair].mnFirst));
    const auto oSecondValue = ParseNoData(GetNoDataText(oSecond, moPairs[nPair].mnSecond));
    if (!oFirstValue || !oSecondValue)
        return std::nullopt;
    detail::PairNoData oNoData{*oFirstValue, *oSecondValue, *oFirstValue, false};
    const bool bZeros = oFirstValue->GetReal() == 0 && oSecondValue->GetReal() == 0;
    const bool bReal = moTypes[nPair].IsReal();
    if (meForm == eRealImaginary)
        oNoData.mbAsItIs = bZeros || (bReal && oFirstValue->IsNaN() && oSecondValue->IsNaN());
    if (bReal && !oNoData.mbAsItIs)
        oNoData.moComplex = NoDataValue::FromReal(std::numeric_limits<double>::quiet_NaN());
    return oNoData;
}

template <typename Open>
std::unique_ptr<IRasterIO> MetaComplexDataset::State::OpenPairs(const std::vector<unsigned int>& oChannels,
                                                                const Open& oOpen) const
{
    std::vector<unsigned int> oFirst, oSecond;
    for (const unsigned int nChannel : oChannels)
    {
        oFirst.push_back(moPairs[nChannel - 1].mnFirst);
        (mpoSecond != nullptr ? oSecond : oFirst).push_back(moPairs[nChannel - 1].mnSecond);
    }
    std::unique_ptr<IRasterIO> poFirst(oOpen(false, oFirst));
    std::unique_ptr<IRasterIO> poSecond(mpoSecond != nullptr ? oOpen(true, oSecond) : nullptr);
    if (poFirst == nullptr || (mpoSecond != nullptr && poSecond == nullptr))
        throw krv::DataException("A source of complex pairs gave no raster I/O");
    if (poSecond != nullptr &&
        (poFirst->GetFileWidth() != poSecond->GetFileWidth() || poFirst->GetFileHeight() != poSecond->GetFileHeight()))
        throw krv::DataException("The sources of complex pairs give raster I/O of different sizes");
    return std::make_unique<detail::PairIO>(std::move(poFirst), std::move(poSecond), MakeForm(oChannels));
}

template <typename Part, typename Open>
std::vector<Part> MetaComplexDataset::State::OpenParts(const std::vector<unsigned int>& oChannels,
                                                       const Open& oOpen) const
{
    std::map<DataType, std::pair<std::vector<unsigned int>, std::vector<std::size_t>>> oByType;
    for (std::size_t n = 0; n < oChannels.size(); ++n)
    {
        auto& [oNumbers, oPositions] = oByType[moSourceTypes[oChannels[n] - 1]];
        oNumbers.push_back(oChannels[n]);
        oPositions.push_back(n);
    }
    std::vector<Part> oParts;
    for (const auto& [oType, oMembers] : oByType)
        oParts.push_back({OpenPairs(oMembers.first, oOpen), oMembers.second});
    return oParts;
}

detail::PairForm MetaComplexDataset::State::MakeForm(const std::vector<unsigned int>& oChannels) const
{
    const AuxiliaryData oFirst = mpoFirst->ReadAuxiliaryData();
    const AuxiliaryData oSecond = ReadSecond(oFirst);
    detail::PairForm oForm{
        moSourceTypes[oChannels.front() - 1], moTypes[oChannels.front() - 1], meForm == eAmplitudePhase, {}};
    for (const unsigned int nChannel : oChannels)
        oForm.moNoData.push_back(FindNoData(oFirst, oSecond, nChannel - 1));
    return oForm;
}

// The levels of both sources as one.
class MetaComplexDataset::Manager : public IOverviewManager
{
public:
    Manager(const MetaComplexDataset& oDataset, std::unique_ptr<IOverviewManager> poFirst,
            std::unique_ptr<IOverviewManager> poSecond)
        : moState(*oDataset.mpoState), moDataset(oDataset), mpoFirst(std::move(poFirst)), mpoSecond(std::move(poSecond))
    {
    }

    std::vector<unsigned int> GetLevels() const override
    {
        if (moState.meForm == eAmplitudePhase &&
            (mpoFirst->GetResamplingName() != "NEAREST" || (mpoSecond && mpoSecond->GetResamplingName() != "NEAREST")))
            return {};
        std::vector<unsigned int> oLevels = mpoFirst->GetLevels();
        if (mpoSecond == nullptr)
            return oLevels;
        const std::vector<unsigned int> oOther = mpoSecond->GetLevels();
        std::erase_if(oLevels,
                      [&](unsigned int nLevel)
                      {
                          return std::find(oOther.begin(), oOther.end(), nLevel) == oOther.end() ||
                                 mpoFirst->GetLevelWidth(nLevel) != mpoSecond->GetLevelWidth(nLevel) ||
                                 mpoFirst->GetLevelHeight(nLevel) != mpoSecond->GetLevelHeight(nLevel);
                      });
        return oLevels;
    }
    IRasterIO* GetOverviewIO(unsigned int nLevel, const std::vector<unsigned int>& oChannels) override
    {
        CheckLevel(nLevel);
        static_cast<void>(
            detail::CheckChannelList(oChannels, moState.moTypes, moDataset.moDescription, Place::Current()));
        const auto Open = [&](bool bSecond, const std::vector<unsigned int>& oList)
        {
            return (bSecond ? mpoSecond : mpoFirst)->GetOverviewIO(nLevel, oList);
        };
        return new detail::PairLevelIO(nLevel, moState.OpenParts<detail::PairLevelIO::Part>(oChannels, Open),
                                       ValueBytes(moState.moTypes[oChannels.front() - 1]));
    }
    void CreateLevel(unsigned int nLevel) override
    {
        if (moState.meForm == eAmplitudePhase)
            moDataset.Refuse("levels of amplitudes and phases are made in their own channels");
        mpoFirst->CreateLevel(nLevel);
        if (mpoSecond == nullptr)
            return;
        try
        {
            mpoSecond->CreateLevel(nLevel);
        }
        catch (...)
        {
            mpoFirst->DeleteLevel(nLevel);
            throw;
        }
    }
    bool IsValid(unsigned int nChannel, unsigned int nLevel) const override
    {
        const std::vector<unsigned int> oLevels = GetLevels();
        return nChannel != 0 && nChannel <= moState.moPairs.size() &&
               std::find(oLevels.begin(), oLevels.end(), nLevel) != oLevels.end() &&
               mpoFirst->IsValid(moState.moPairs[nChannel - 1].mnFirst, nLevel) &&
               GetSecond().IsValid(moState.moPairs[nChannel - 1].mnSecond, nLevel);
    }
    void DeleteLevel(unsigned int nLevel) override
    {
        CheckLevel(nLevel);
        mpoFirst->DeleteLevel(nLevel);
        if (mpoSecond != nullptr)
            mpoSecond->DeleteLevel(nLevel);
    }
    std::string GetResamplingName() const override { return mpoFirst->GetResamplingName(); }
    void SetValid(unsigned int nChannel, unsigned int nLevel, bool bValid) override
    {
        CheckLevel(nLevel);
        const ComplexPair& oPair = moState.moPairs[CheckChannel(nChannel)];
        mpoFirst->SetValid(oPair.mnFirst, nLevel, bValid);
        GetSecond().SetValid(oPair.mnSecond, nLevel, bValid);
    }
    unsigned int GetLevelWidth(unsigned int nLevel) const override { return mpoFirst->GetLevelWidth(nLevel); }
    unsigned int GetLevelHeight(unsigned int nLevel) const override { return mpoFirst->GetLevelHeight(nLevel); }
    AuxiliaryData GetAuxiliaryData(unsigned int nLevel) override
    {
        const AuxiliaryData oFirst = mpoFirst->GetAuxiliaryData(nLevel);
        return moDataset.JoinRecords(oFirst, mpoSecond != nullptr ? mpoSecond->GetAuxiliaryData(nLevel) : oFirst);
    }
    void SetResamplingName(const std::string& oName) override
    {
        mpoFirst->SetResamplingName(oName);
        if (mpoSecond != nullptr)
            mpoSecond->SetResamplingName(oName);
    }

private:
    IOverviewManager& GetSecond() const { return mpoSecond != nullptr ? *mpoSecond : *mpoFirst; }
    void CheckLevel(unsigned int nLevel) const
    {
        const std::vector<unsigned int> oLevels = GetLevels();
        if (std::find(oLevels.begin(), oLevels.end(), nLevel) == oLevels.end())
            moDataset.Refuse("level " + std::to_string(nLevel) + " does not exist in both channels of the pairs");
    }
    std::size_t CheckChannel(unsigned int nChannel) const
    {
        if (nChannel == 0 || nChannel > moState.moPairs.size())
            moDataset.Refuse("channel " + std::to_string(nChannel) + " does not exist");
        return nChannel - 1;
    }

    const State& moState;
    const MetaComplexDataset& moDataset;
    std::unique_ptr<IOverviewManager> mpoFirst;
    std::unique_ptr<IOverviewManager> mpoSecond; // null when there is one source
};

namespace
{

Source OpenFile(const std::string& fileName, AccessMode eMode)
{
    return {DatasetManager::GetInstance()->Open(fileName, eMode), {true}};
}

std::string NameOf(IDataset* poDataset)
{
    return poDataset != nullptr ? poDataset->GetName() : std::string("nothing");
}

} // namespace

MetaComplexDataset::MetaComplexDataset(std::unique_ptr<State> poState)
    : FilelessDataset("<complex pairs of " + NameOf(poState->mpoFirst.get()) +
                      (poState->mpoSecond != nullptr ? " and " + NameOf(poState->mpoSecond.get()) : std::string()) +
                      ">"),
      moDescription(FilelessDataset::GetName()), mpoState(std::move(poState))
{
}

MetaComplexDataset::MetaComplexDataset(IDataset* poSource, const std::vector<ComplexPair>& oPairs, bool bTakeOwnership,
                                       eComplexForm eForm)
    : MetaComplexDataset(std::make_unique<State>(Source(poSource, {bTakeOwnership}), nullptr))
{
    Prepare(oPairs, eForm, Place::Current());
}

MetaComplexDataset::MetaComplexDataset(IDataset* poFirst, IDataset* poSecond, const std::vector<ComplexPair>& oPairs,
                                       bool bTakeOwnership, eComplexForm eForm)
    : MetaComplexDataset(std::make_unique<State>(Source(poFirst, {bTakeOwnership}),
                                                 Source(poSecond != poFirst ? poSecond : nullptr, {bTakeOwnership})))
{
    if (poSecond == nullptr)
        Refuse("the second source is NULL");
    Prepare(oPairs, eForm, Place::Current());
}

MetaComplexDataset::MetaComplexDataset(const std::string& firstFile, const std::string& secondFile,
                                       const std::vector<ComplexPair>& oPairs, AccessMode eMode, eComplexForm eForm)
    : MetaComplexDataset(std::make_unique<State>(OpenFile(firstFile, eMode),
                                                 secondFile != firstFile ? OpenFile(secondFile, eMode) : Source()))
{
    Prepare(oPairs, eForm, Place::Current());
}

MetaComplexDataset::~MetaComplexDataset() = default;

void MetaComplexDataset::Prepare(const std::vector<ComplexPair>& oPairs, eComplexForm eForm, const Place& oPlace)
{
    State& oState = *mpoState;
    oState.mpoFirstRasters = dynamic_cast<IRasterDataset*>(oState.mpoFirst.get());
    oState.mpoSecondRasters =
        oState.mpoSecond != nullptr ? dynamic_cast<IRasterDataset*>(oState.mpoSecond.get()) : oState.mpoFirstRasters;
    if (oState.mpoFirstRasters == nullptr || oState.mpoSecondRasters == nullptr)
        Refuse("a source has no rasters", oPlace);
    if (oPairs.empty())
        Refuse("no pairs of channels were given", oPlace);
    const IRasterDataset& oFirst = *oState.mpoFirstRasters;
    const IRasterDataset& oSecond = *oState.mpoSecondRasters;
    if (oFirst.GetWidth() != oSecond.GetWidth() || oFirst.GetHeight() != oSecond.GetHeight())
        Refuse("the sources are of " + std::to_string(oFirst.GetWidth()) + " x " + std::to_string(oFirst.GetHeight()) +
                   " and " + std::to_string(oSecond.GetWidth()) + " x " + std::to_string(oSecond.GetHeight()) +
                   " pixels",
               oPlace);
    const auto* const poFirstPlace = dynamic_cast<IGeocodedDataset*>(oState.mpoFirst.get());
    const auto* const poSecondPlace = dynamic_cast<IGeocodedDataset*>(oState.mpoSecond.get());
    if (poFirstPlace != nullptr && poSecondPlace != nullptr && !poFirstPlace->GetGeocoding().IsIdentity() &&
        !poSecondPlace->GetGeocoding().IsIdentity() && !(poFirstPlace->GetGeocoding() == poSecondPlace->GetGeocoding()))
        Refuse("the sources lie at different places", oPlace);
    const auto TypeOf = [&](const IRasterDataset& oRasters, unsigned int nChannel)
    {
        if (nChannel == 0 || nChannel > oRasters.GetChanCount())
            Refuse("channel " + std::to_string(nChannel) + " does not exist; there are " +
                       std::to_string(oRasters.GetChanCount()),
                   oPlace);
        const std::unique_ptr<IChannelInfo> oInfo(oRasters.GetChannelInfo(nChannel));
        if (oInfo == nullptr)
            Refuse("there is no description of channel " + std::to_string(nChannel), oPlace);
        return oInfo->GetDataType();
    };
    for (const ComplexPair& oPair : oPairs)
    {
        const DataType oType = TypeOf(oFirst, oPair.mnFirst), oOther = TypeOf(oSecond, oPair.mnSecond);
        const std::string channels = "channels " + std::to_string(oPair.mnFirst) + " and " +
                                     std::to_string(oPair.mnSecond) + " of the types " + oType.Describe() + " and " +
                                     oOther.Describe();
        const DataType oComplex = FindComplexType(oType, eForm);
        if (oType != oOther || oComplex == DataType())
            Refuse(channels + " are no pair", oPlace);
        oState.moSourceTypes.push_back(oType);
        oState.moTypes.push_back(oComplex);
    }
    oState.moPairs = oPairs;
    oState.meForm = eForm;
    if (eForm == eRealImaginary && !IsExact())
        krv::nspio::Warning::Warn(moDescription + ": C64R does not hold all values of pairs of 64-bit integers",
                                  oPlace);
}

bool MetaComplexDataset::IsExact() const
{
    bool bExact = mpoState->meForm == eRealImaginary;
    for (std::size_t n = 0; n < mpoState->moTypes.size(); ++n)
        bExact = bExact && krv::gobs::IsLossless(mpoState->moSourceTypes[n], mpoState->moTypes[n]);
    return bExact;
}

bool MetaComplexDataset::Exists() const
{
    return mpoState->mpoFirst->Exists() && mpoState->GetSecond().Exists();
}

AuxiliaryData MetaComplexDataset::JoinRecords(const AuxiliaryData& oFirst, const AuxiliaryData& oSecond) const
{
    AuxiliaryData oData(static_cast<unsigned int>(mpoState->moPairs.size()));
    MetadataMap oFileTags = oFirst.GetCleanedMeta().GetFileMetadata();
    oFileTags.erase(NO_DATA_KEY); // the channels have theirs
    const MetadataMap oOtherTags =
        mpoState->mpoSecond != nullptr ? oSecond.GetCleanedMeta().GetFileMetadata() : MetadataMap();
    for (const auto& [key, value] : oOtherTags)
        if (const auto oFound = oFileTags.find(key);
            key != NO_DATA_KEY && (oFound == oFileTags.end() || oFound->second != value))
            oFileTags[WithSuffix(key)] = value;
    DropStatistics(oFileTags);
    oData.SetFileMetadata(oFileTags);
    for (std::size_t nPair = 0; nPair < mpoState->moPairs.size(); ++nPair)
    {
        const ComplexPair& oPair = mpoState->moPairs[nPair];
        const auto nChannel = static_cast<unsigned int>(nPair) + 1;
        MetadataMap oTags = ShownTags(oFirst, oPair.mnFirst);
        for (const auto& [key, value] : ShownTags(oSecond, oPair.mnSecond))
            oTags[WithSuffix(key)] = value;
        if (const auto oNoData = mpoState->FindNoData(oFirst, oSecond, nPair))
            oTags[NO_DATA_KEY] = oNoData->moComplex.GetText();
        JoinBooks(oFirst, oPair.mnFirst, oSecond, oPair.mnSecond, oTags);
        const std::string description = oFirst.GetChannelDescription(oPair.mnFirst);
        const std::string other = oSecond.GetChannelDescription(oPair.mnSecond);
        if (!other.empty() && other != description)
            oTags[DESCRIPTION_KEY] = other;
        oData.SetChanMetadata(oTags, nChannel);
        oData.SetChannelDescription(description, nChannel);
    }
    return oData;
}

AuxiliaryData MetaComplexDataset::ReadAuxiliaryData()
{
    CheckOpen();
    const AuxiliaryData oFirst = mpoState->mpoFirst->ReadAuxiliaryData();
    return JoinRecords(oFirst, mpoState->ReadSecond(oFirst));
}

void MetaComplexDataset::WriteAuxiliaryData(const AuxiliaryData& oData)
{
    const Place oPlace = Place::Current();
    CheckOpen(oPlace);
    CheckRecord(oData, oPlace);
    AuxiliaryData oFirst = mpoState->mpoFirst->ReadAuxiliaryData();
    AuxiliaryData oOther = mpoState->ReadSecond(oFirst);
    AuxiliaryData& oSecond = mpoState->mpoSecond != nullptr ? oOther : oFirst;
    const AuxiliaryData oShown = JoinRecords(oFirst, oOther);

    MetadataMap oFirstTags = oData.GetFileMetadata(), oSecondTags;
    if (mpoState->mpoSecond != nullptr)
    {
        for (const auto& [key, value] : oData.GetFileMetadata())
            if (EndsInSuffix(key))
            {
                oSecondTags[WithoutSuffix(key)] = value;
                oFirstTags.erase(key);
            }
        // What both have alike is shown once.
        for (const auto& [key, value] : oSecond.GetFileMetadata())
            if (const auto oFound = oFirstTags.find(key);
                !oSecondTags.contains(key) && oFound != oFirstTags.end() && oFound->second == value)
                oSecondTags[key] = value;
        oSecond.SetFileMetadata(oSecondTags);
    }
    oFirst.SetFileMetadata(oFirstTags);
    for (std::size_t nPair = 0; nPair < mpoState->moPairs.size(); ++nPair)
    {
        const ComplexPair& oPair = mpoState->moPairs[nPair];
        const auto nChannel = static_cast<unsigned int>(nPair) + 1;
        MetadataMap oFirstMap, oSecondMap;
        const AuxiliaryData oTold = oData.GetCleanedMeta(); // the book of levels is their manager's
        for (const auto& [key, value] : oTold.GetChanMetadata(nChannel))
        {
            if (key == NO_DATA_KEY || key == DESCRIPTION_KEY)
                continue;
            if (EndsInSuffix(key))
                oSecondMap[WithoutSuffix(key)] = value;
            else
                oFirstMap[key] = value;
        }
        const std::string noData = oData.GetChanMetadataValue(NO_DATA_KEY, nChannel);
        if (noData != oShown.GetChanMetadataValue(NO_DATA_KEY, nChannel))
            oFirstMap[NO_DATA_KEY] = oSecondMap[NO_DATA_KEY] = noData;
        ReplaceTags(oFirst, oPair.mnFirst, oFirstMap);
        ReplaceTags(oSecond, oPair.mnSecond, oSecondMap);
        oFirst.SetChannelDescription(oData.GetChannelDescription(nChannel), oPair.mnFirst);
        const std::string other = oData.GetChanMetadataValue(DESCRIPTION_KEY, nChannel);
        if (!other.empty())
            oSecond.SetChannelDescription(other, oPair.mnSecond);
    }
    mpoState->mpoFirst->WriteAuxiliaryData(oFirst);
    if (mpoState->mpoSecond != nullptr)
        mpoState->mpoSecond->WriteAuxiliaryData(oSecond);
}

krv::ogc::cs::ICRS* MetaComplexDataset::ReadCRS() const
{
    CheckOpen();
    return mpoState->mpoFirst->ReadCRS();
}

void MetaComplexDataset::UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const
{
    CheckOpen();
    mpoState->mpoFirst->UpdateCRS(oCRS);
    if (mpoState->mpoSecond != nullptr)
        mpoState->mpoSecond->UpdateCRS(oCRS);
}

void MetaComplexDataset::Synchronize()
{
    CheckOpen();
    mpoState->mpoFirst->Synchronize();
    if (mpoState->mpoSecond != nullptr)
        mpoState->mpoSecond->Synchronize();
}

void MetaComplexDataset::Close()
{
    FilelessDataset::Close();
    for (const Source* const pSource : {&mpoState->mpoFirst, &mpoState->mpoSecond})
        if (*pSource != nullptr && pSource->get_deleter().mbOwned)
            (*pSource)->Close();
}

IRasterIO* MetaComplexDataset::GetRasterIO(const std::vector<unsigned int>& oChannels)
{
    const Place oPlace = Place::Current();
    CheckOpen(oPlace);
    static_cast<void>(detail::CheckChannelList(oChannels, mpoState->moTypes, moDescription, oPlace));
    const auto Open = [&](bool bSecond, const std::vector<unsigned int>& oList)
    {
        return (bSecond ? mpoState->mpoSecondRasters : mpoState->mpoFirstRasters)->GetRasterIO(oList);
    };
    auto oParts = mpoState->OpenParts<detail::StackedIO<IRasterIO>::Part>(oChannels, Open);
    if (oParts.size() == 1)
        return oParts.front().mpoIO.release();
    return new detail::StackedIO<IRasterIO>(std::move(oParts), ValueBytes(mpoState->moTypes[oChannels.front() - 1]));
}

unsigned int MetaComplexDataset::GetWidth() const
{
    return mpoState->mpoFirstRasters->GetWidth();
}

unsigned int MetaComplexDataset::GetHeight() const
{
    return mpoState->mpoFirstRasters->GetHeight();
}

unsigned int MetaComplexDataset::GetChanCount() const
{
    return static_cast<unsigned int>(mpoState->moPairs.size());
}

IChannelInfo* MetaComplexDataset::GetChannelInfo(unsigned int nChannel) const
{
    const Place oPlace = Place::Current();
    CheckOpen(oPlace);
    return new ChannelInfo(detail::CheckChannelList({nChannel}, mpoState->moTypes, moDescription, oPlace));
}

IOverviewManager* MetaComplexDataset::GetOverviewManager()
{
    CheckOpen();
    std::unique_ptr<IOverviewManager> poFirst(mpoState->mpoFirstRasters->GetOverviewManager());
    if (mpoState->mpoSecond == nullptr)
        return poFirst != nullptr ? new Manager(*this, std::move(poFirst), nullptr) : nullptr;
    std::unique_ptr<IOverviewManager> poSecond(mpoState->mpoSecondRasters->GetOverviewManager());
    if (poFirst == nullptr || poSecond == nullptr)
        return nullptr;
    return new Manager(*this, std::move(poFirst), std::move(poSecond));
}

AccessCapabilities MetaComplexDataset::GetRasterCapabilities()
{
    const AccessCapabilities oFirst = mpoState->mpoFirstRasters->GetRasterCapabilities();
    const AccessCapabilities oSecond = mpoState->mpoSecondRasters->GetRasterCapabilities();
    return {oFirst.IsReadable() && oSecond.IsReadable(), false, oFirst.IsUpdatable() && oSecond.IsUpdatable()};
}

const krv::ogc::cs::GeocodingInfo& MetaComplexDataset::GetGeocoding() const
{
    const auto* const poPlace = dynamic_cast<IGeocodedDataset*>(mpoState->mpoFirst.get());
    return poPlace != nullptr ? poPlace->GetGeocoding() : mpoState->moNowhere;
}

void MetaComplexDataset::SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    CheckOpen();
    auto* const poFirst = dynamic_cast<IGeocodedDataset*>(mpoState->mpoFirst.get());
    if (poFirst == nullptr)
        Refuse("the first source has no place for a geocoding");
    poFirst->SetGeocoding(oInfo);
    if (auto* const poSecond = dynamic_cast<IGeocodedDataset*>(mpoState->mpoSecond.get()))
        poSecond->SetGeocoding(oInfo);
}

namespace
{

IBitmapDataset& RequireBitmaps(IDataset* poDataset, const std::string& name)
{
    auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(poDataset);
    if (poBitmaps == nullptr)
        throw krv::DataException(name + ": the first source has no bitmaps");
    return *poBitmaps;
}

} // namespace

// The validity mask of a second source; 0 when there is none.
unsigned int MetaComplexDataset::FindSecondMask() const
{
    const auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(mpoState->mpoSecond.get());
    return poBitmaps != nullptr ? FindValidityMask(*poBitmaps) : 0;
}

// The number of the bitmap that stands for the second source's mask alone; 0 when there is none.
unsigned int MetaComplexDataset::FindOwnMask() const
{
    if (FindSecondMask() == 0)
        return 0;
    const auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(mpoState->mpoFirst.get());
    if (poBitmaps == nullptr)
        return 1;
    const std::vector<unsigned int> oList = poBitmaps->GetBitmapList();
    return FindValidityMask(*poBitmaps) != 0 ? 0 : oList.empty() ? 1 : oList.back() + 1;
}

std::vector<unsigned int> MetaComplexDataset::GetBitmapList() const
{
    CheckOpen();
    const auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(mpoState->mpoFirst.get());
    std::vector<unsigned int> oList = poBitmaps != nullptr ? poBitmaps->GetBitmapList() : std::vector<unsigned int>();
    if (const unsigned int nOwn = FindOwnMask(); nOwn != 0)
        oList.push_back(nOwn);
    return oList;
}

IRasterIO* MetaComplexDataset::GetBitmapIO(const std::vector<unsigned int>& oBitmaps)
{
    const Place oPlace = Place::Current();
    CheckOpen(oPlace);
    if (oBitmaps.empty())
        Refuse("no bitmaps were given", oPlace);
    const unsigned int nSecondMask = FindSecondMask(), nOwn = FindOwnMask();
    auto* const poFirst = dynamic_cast<IBitmapDataset*>(mpoState->mpoFirst.get());
    if (nSecondMask == 0)
        return RequireBitmaps(mpoState->mpoFirst.get(), moDescription).GetBitmapIO(oBitmaps);
    auto& oSecond = dynamic_cast<IBitmapDataset&>(*mpoState->mpoSecond);
    std::vector<detail::JoinedBitmapIO::Bitmap> oJoined;
    for (const unsigned int nBitmap : oBitmaps)
    {
        auto& oBitmap = oJoined.emplace_back();
        if (nBitmap == nOwn)
            oBitmap.mpoFirst.reset(oSecond.GetBitmapIO({nSecondMask}));
        else
            oBitmap.mpoFirst.reset(RequireBitmaps(mpoState->mpoFirst.get(), moDescription).GetBitmapIO({nBitmap}));
        if (nBitmap != nOwn && nBitmap == FindValidityMask(*poFirst))
            oBitmap.mpoSecond.reset(oSecond.GetBitmapIO({nSecondMask}));
        for (const IRasterIO* const poIO : {oBitmap.mpoFirst.get(), oBitmap.mpoSecond.get()})
            if (poIO != nullptr && (poIO->GetFileWidth() != GetWidth() || poIO->GetFileHeight() != GetHeight()))
                Refuse("bitmap " + std::to_string(nBitmap) + " is not of the image's size", oPlace);
    }
    return new detail::JoinedBitmapIO(std::move(oJoined));
}

void MetaComplexDataset::DeleteBitmap(unsigned int nBitmap)
{
    CheckOpen();
    RequireBitmaps(mpoState->mpoFirst.get(), moDescription).DeleteBitmap(nBitmap);
}

unsigned int MetaComplexDataset::CreateBitmap()
{
    CheckOpen();
    return RequireBitmaps(mpoState->mpoFirst.get(), moDescription).CreateBitmap();
}

std::string MetaComplexDataset::GetBitmapDescription(unsigned int nBitmap) const
{
    CheckOpen();
    if (nBitmap != 0 && nBitmap == FindOwnMask())
        return {};
    return RequireBitmaps(mpoState->mpoFirst.get(), moDescription).GetBitmapDescription(nBitmap);
}

void MetaComplexDataset::SetBitmapDescription(unsigned int nBitmap, const std::string& oDescription)
{
    CheckOpen();
    RequireBitmaps(mpoState->mpoFirst.get(), moDescription).SetBitmapDescription(nBitmap, oDescription);
}

MetadataMap MetaComplexDataset::GetBitmapMetadata(unsigned int nBitmap) const
{
    CheckOpen();
    if (nBitmap != 0 && nBitmap == FindOwnMask())
        return dynamic_cast<IBitmapDataset&>(*mpoState->mpoSecond).GetBitmapMetadata(FindSecondMask());
    return RequireBitmaps(mpoState->mpoFirst.get(), moDescription).GetBitmapMetadata(nBitmap);
}

void MetaComplexDataset::SetBitmapMetadata(unsigned int nBitmap, const MetadataMap& oMetadata)
{
    CheckOpen();
    RequireBitmaps(mpoState->mpoFirst.get(), moDescription).SetBitmapMetadata(nBitmap, oMetadata);
}

IOverviewManager* MetaComplexDataset::GetBitmapOverviewManager()
{
    CheckOpen();
    auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(mpoState->mpoFirst.get());
    return poBitmaps != nullptr && FindSecondMask() == 0 ? poBitmaps->GetBitmapOverviewManager() : nullptr;
}

} // namespace krv::datasources
