#include "fuzz/support/edits.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/droppedtags.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/rasterinfo.h"
#include "plugins/tif/tifbuilder.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <algorithm>
#include <cstring>
#include <numeric>
#include <stdexcept>
#include <utility>

namespace krv::fuzz
{

namespace
{

using krv::datasources::AuxiliaryData;
using krv::datasources::IOverviewManager;
using krv::datasources::IRasterIO;
using krv::plugins::tif::TifDataset;

constexpr unsigned int MAX_SIDE = 4096;
constexpr unsigned int MAX_CHANNELS = 12;
constexpr std::size_t MAX_PAGES = 6;
constexpr unsigned int MAX_STEPS = 16;

[[noreturn]] void Complain(const std::string& what)
{
    throw std::logic_error("the model says otherwise: " + what);
}

std::vector<unsigned int> Count(unsigned int nCount)
{
    std::vector<unsigned int> oNumbers(nCount);
    std::iota(oNumbers.begin(), oNumbers.end(), 1U);
    return oNumbers;
}

std::size_t ValueBytes(const krv::gobs::DataType& oType)
{
    return oType.GetValueBits() / 8;
}

// Zeros, all of them known.
Samples MakeSamples(unsigned int nWidth, unsigned int nHeight, unsigned int nChannels, std::size_t nValueBytes)
{
    const std::size_t nValues = std::size_t{nWidth} * nHeight * nChannels;
    return {nWidth,
            nHeight,
            nChannels,
            nValueBytes,
            std::vector<unsigned char>(nValues * nValueBytes),
            std::vector<unsigned char>(nValues, 1)};
}

// A part that cannot be read is tried value by value of a row.
Samples ReadSamples(const std::function<IRasterIO*(const std::vector<unsigned int>&)>& oMakeIO, unsigned int nChannels,
                    std::size_t nValueBytes)
{
    std::unique_ptr<IRasterIO> poIO(oMakeIO(Count(nChannels)));
    Samples oSamples = MakeSamples(poIO->GetFileWidth(), poIO->GetFileHeight(), nChannels, nValueBytes);
    try
    {
        poIO->ReadWindow(0U, 0U, oSamples.mnWidth, oSamples.mnHeight, oSamples.moBytes.data());
        return oSamples;
    }
    catch (const krv::Exception&)
    {
    }
    for (unsigned int nChannel = 0; nChannel < nChannels; ++nChannel)
    {
        poIO.reset(oMakeIO({nChannel + 1}));
        const unsigned int nStep = std::max(1U, poIO->GetTileWidth());
        std::vector<unsigned char> oRow(nStep * nValueBytes);
        for (unsigned int nY = 0; nY < oSamples.mnHeight; ++nY)
            for (unsigned int nX = 0; nX < oSamples.mnWidth; nX += nStep)
            {
                const unsigned int nWidth = std::min(nStep, oSamples.mnWidth - nX);
                bool bKnown = true;
                try
                {
                    poIO->ReadWindow(nX, nY, nWidth, 1U, oRow.data());
                }
                catch (const krv::Exception&)
                {
                    bKnown = false;
                }
                for (unsigned int nAt = 0; nAt < nWidth; ++nAt)
                {
                    const std::size_t nTo = (std::size_t{nY} * oSamples.mnWidth + nX + nAt) * nChannels + nChannel;
                    oSamples.moKnown[nTo] = bKnown;
                    std::memcpy(&oSamples.moBytes[nTo * nValueBytes], &oRow[nAt * nValueBytes], nValueBytes);
                }
            }
    }
    return oSamples;
}

std::string Text(const krv::datasources::MetadataMap& oMap)
{
    std::string text;
    for (const auto& [key, value] : oMap)
        if (!key.starts_with("_Overview_")) // asked for as states
            text += key + "=" + value + "\n";
    return text;
}

View Look(TifDataset& oDataset)
{
    View oView;
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(oDataset.GetChannelInfo(1));
    const unsigned int nChannels = oDataset.GetChanCount();
    const std::size_t nValueBytes = ValueBytes(poInfo->GetDataType());
    oView.moImage =
        ReadSamples([&](const auto& oChannels) { return oDataset.GetRasterIO(oChannels); }, nChannels, nValueBytes);
    const std::unique_ptr<IOverviewManager> poLevels(oDataset.GetOverviewManager());
    for (const unsigned int nLevel : poLevels->GetLevels())
    {
        try
        {
            oView.moLevels[nLevel] =
                ReadSamples([&](const auto& oChannels) { return poLevels->GetOverviewIO(nLevel, oChannels); },
                            nChannels, nValueBytes);
        }
        catch (const krv::Exception&)
        {
            oView.moLevels[nLevel] = Samples(); // its page cannot be read
        }
        for (unsigned int nChannel = 1; nChannel <= nChannels; ++nChannel)
            oView.moStates[nLevel] += poLevels->IsValid(nChannel, nLevel) ? "1" : "0";
    }
    AuxiliaryData oRecord = oDataset.ReadAuxiliaryData();
    krv::datasources::DropStatistics(oRecord); // every change of pixels does
    oView.moRecord = Text(oRecord.GetFileMetadata());
    for (unsigned int nChannel = 1; nChannel <= oRecord.GetChannelCount(); ++nChannel)
        oView.moRecord += Text(oRecord.GetChanMetadata(nChannel)) + oRecord.GetChannelDescription(nChannel) + "\n";
    for (const unsigned int nBitmap : oDataset.GetBitmapList())
        try
        {
            oView.moBitmaps[nBitmap] = Samples();
            oView.moBitmapTexts += std::to_string(nBitmap) + oDataset.GetBitmapDescription(nBitmap) + "\n" +
                                   Text(oDataset.GetBitmapMetadata(nBitmap));
            oView.moBitmaps[nBitmap] = ReadSamples([&](const auto&) { return oDataset.GetBitmapIO({nBitmap}); }, 1, 1);
        }
        catch (const krv::Exception&)
        {
        }
    for (const unsigned int nTable : oDataset.GetPCTList())
    {
        const std::unique_ptr<krv::gobs::PCT> poTable(oDataset.GetPCT(nTable));
        for (unsigned int nAt = 0; nAt < 256; ++nAt)
        {
            std::uint16_t nAlpha = 0;
            const krv::gobs::RGBTuple<std::uint16_t> oColour = poTable->GetValue16(nAt, nAlpha);
            oView.moTables += std::to_string(oColour.red) + " " + std::to_string(oColour.green) + " " +
                              std::to_string(oColour.blue) + ";";
        }
    }
    const krv::ogc::cs::GeocodingInfo& oInfo = oDataset.GetGeocoding();
    for (const double nValue : oInfo.GetTerms())
        oView.moGeography += std::to_string(nValue) + " ";
    try
    {
        const std::unique_ptr<krv::ogc::cs::ICRS> poSystem(oDataset.ReadCRS());
        oView.moGeography += poSystem ? poSystem->GetWKT() : "none";
    }
    catch (const krv::Exception&)
    {
        oView.moGeography += "refused";
    }
    return oView;
}

// What is known of the wanted must be there.
void Compare(const std::string& what, const Samples& oWanted, const Samples& oGot)
{
    if (oWanted.mnWidth != oGot.mnWidth || oWanted.mnHeight != oGot.mnHeight || oWanted.mnChannels != oGot.mnChannels)
        Complain(what + " has another size");
    if (oWanted.moBytes == oGot.moBytes && oWanted.moKnown == oGot.moKnown)
        return;
    for (std::size_t nAt = 0; nAt < oWanted.moKnown.size(); ++nAt)
        if (oWanted.moKnown[nAt] &&
            (!oGot.moKnown[nAt] || std::memcmp(&oWanted.moBytes[nAt * oWanted.mnValueBytes],
                                               &oGot.moBytes[nAt * oWanted.mnValueBytes], oWanted.mnValueBytes) != 0))
            Complain(what + ", value " + std::to_string(nAt) + (oGot.moKnown[nAt] ? " differs" : " cannot be read"));
}

void Compare(const std::string& what, const std::map<unsigned int, Samples>& oWanted,
             const std::map<unsigned int, Samples>& oGot)
{
    if (oWanted.size() != oGot.size())
        Complain(what + ": " + std::to_string(oGot.size()) + " instead of " + std::to_string(oWanted.size()));
    for (const auto& [nNumber, oSamples] : oWanted)
        if (const auto oFound = oGot.find(nNumber); oFound == oGot.end())
            Complain(what + " " + std::to_string(nNumber) + " is missing");
        else
            Compare(what + " " + std::to_string(nNumber), oSamples, oFound->second);
}

void Forget(Samples& oSamples)
{
    std::fill(oSamples.moKnown.begin(), oSamples.moKnown.end(), static_cast<unsigned char>(0));
}

// Whether any page is coded with loss.
bool IsLossy(TifDataset& oDataset)
{
    std::vector<unsigned int> oLevels = std::unique_ptr<IOverviewManager>(oDataset.GetOverviewManager())->GetLevels();
    oLevels.push_back(1);
    return std::any_of(oLevels.begin(), oLevels.end(),
                       [&](unsigned int nLevel) { return oDataset.GetEncodedForm(nLevel).mbLossy; });
}

// nSource: the old channel (from 1) of each new one, or 0.
void Rearrange(Samples& oSamples, const std::vector<unsigned int>& oSources)
{
    if (oSamples.mnWidth == 0)
        return; // a page that cannot be read
    Samples oNew = MakeSamples(oSamples.mnWidth, oSamples.mnHeight, static_cast<unsigned int>(oSources.size()),
                               oSamples.mnValueBytes);
    const std::size_t nPixels = std::size_t{oSamples.mnWidth} * oSamples.mnHeight;
    for (std::size_t nPixel = 0; nPixel < nPixels; ++nPixel)
        for (std::size_t nAt = 0; nAt < oSources.size(); ++nAt)
            if (oSources[nAt] != 0)
            {
                const std::size_t nFrom = nPixel * oSamples.mnChannels + oSources[nAt] - 1;
                const std::size_t nTo = nPixel * oSources.size() + nAt;
                oNew.moKnown[nTo] = oSamples.moKnown[nFrom];
                std::memcpy(&oNew.moBytes[nTo * oSamples.mnValueBytes],
                            &oSamples.moBytes[nFrom * oSamples.mnValueBytes], oSamples.mnValueBytes);
            }
    oSamples = std::move(oNew);
}

} // namespace

TifPointer OpenTif(const std::string& fileName, AccessMode eMode)
{
    try
    {
        return TifPointer(static_cast<TifDataset*>(krv::plugins::tif::TifBuilder().Open(fileName, eMode)));
    }
    catch (const krv::Exception&)
    {
        return nullptr;
    }
}

Edits::Edits(const std::string& fileName, Choices& oProgram) : moFileName(fileName), moProgram(oProgram) {}

bool Edits::IsSmall(TifDataset& oDataset, std::uint64_t nMostBytes)
{
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(oDataset.GetChannelInfo(1));
    const std::unique_ptr<IOverviewManager> poLevels(oDataset.GetOverviewManager());
    return oDataset.GetWidth() <= MAX_SIDE && oDataset.GetHeight() <= MAX_SIDE &&
           oDataset.GetChanCount() <= MAX_CHANNELS && poLevels->GetLevels().size() <= MAX_PAGES &&
           oDataset.GetBitmapList().size() <= MAX_PAGES &&
           std::uint64_t{oDataset.GetWidth()} * oDataset.GetHeight() * oDataset.GetChanCount() *
                   ValueBytes(poInfo->GetDataType()) <=
               nMostBytes;
}

void Edits::Check(const char* pWhat, const View& oGot) const
{
    const std::string what = std::string("after ") + pWhat + ": ";
    Compare(what + "the image", moModel.moImage, oGot.moImage);
    Compare(what + "level", moModel.moLevels, oGot.moLevels);
    Compare(what + "bitmap", moModel.moBitmaps, oGot.moBitmaps);
    for (const auto& [nLevel, states] : oGot.moStates)
        if (const auto oWanted = moModel.moStates.find(nLevel);
            oWanted == moModel.moStates.end() || oWanted->second != states)
            Complain(what + "level " + std::to_string(nLevel) + " has states " + states);
    constexpr std::pair<const char*, Part> PARTS[] = {{"record", &View::moRecord},
                                                      {"texts of bitmaps", &View::moBitmapTexts},
                                                      {"tables", &View::moTables},
                                                      {"geography", &View::moGeography}};
    for (const auto& [pName, pPart] : PARTS)
        if (moModel.*pPart != oGot.*pPart)
            Complain(what + pName + ":\n" + oGot.*pPart + "instead of\n" + moModel.*pPart);
}

bool Edits::Try(const char* pWhat, const std::function<void()>& oAction, const std::vector<Part>& oMay)
{
    bool bDone = true;
    std::string refusal;
    try
    {
        oAction();
    }
    catch (const krv::Exception& oException)
    {
        bDone = false;
        refusal = oException.GetMessage();
    }
    const View oGot = Look(*mpoDataset);
    if (bDone)
        for (const Part pPart : oMay)
            moModel.*pPart = oGot.*pPart;
    Check((pWhat + (bDone ? "" : ", refused (" + refusal + ")")).c_str(), oGot);
    return bDone;
}

bool Edits::WritePixels(IRasterIO& oIO, Samples& oSamples, const std::vector<unsigned int>& oChannels, bool bBits)
{
    const unsigned int nX = moProgram.Below(oSamples.mnWidth);
    const unsigned int nY = moProgram.Below(oSamples.mnHeight);
    const unsigned int nWidth = 1 + moProgram.Below(oSamples.mnWidth - nX);
    const unsigned int nHeight = 1 + moProgram.Below(oSamples.mnHeight - nY);
    const unsigned int nSeed = moProgram.Below(256);
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(mpoDataset->GetChannelInfo(1));
    const krv::gobs::DataType& oType = poInfo->GetDataType();
    const bool bWhole = poInfo->GetNativeDataType() == oType;
    const std::size_t nBytes = oSamples.mnValueBytes;
    std::vector<unsigned char> oBuffer(std::size_t{nWidth} * nHeight * oChannels.size() * nBytes);
    for (std::size_t nAt = 0; nAt < oBuffer.size(); ++nAt)
        oBuffer[nAt] = static_cast<unsigned char>((nAt * nSeed + nAt / 7 + nSeed) >> (nSeed % 3));
    // Values that the stored samples hold where they have fewer bits.
    const std::size_t nPart = bBits ? 1 : oType.GetBits() / 8;
    const unsigned int nKept = bBits ? 1 : poInfo->GetNativeDataType().GetBits() - (oType.IsSigned() ? 1 : 0);
    for (std::size_t nAt = 0; (bBits || !bWhole) && nAt < oBuffer.size(); nAt += nPart)
    {
        std::uint64_t nValue = 0;
        std::memcpy(&nValue, &oBuffer[nAt], nPart);
        nValue &= (std::uint64_t{1} << nKept) - 1;
        const float nReal = static_cast<float>(nValue % 16);
        if (oType.IsReal() && !bBits)
            std::memcpy(&oBuffer[nAt], &nReal, sizeof(nReal));
        else
            std::memcpy(&oBuffer[nAt], &nValue, nPart);
    }
    // A write that fails leaves its own window undefined, no more.
    const bool bKnown = [&]
    {
        try
        {
            oIO.WriteWindow(nX, nY, nWidth, nHeight, oBuffer.data());
            return true;
        }
        catch (const krv::Exception&)
        {
            return false;
        }
    }();
    if (mbLossy)
        Forget(oSamples);
    for (unsigned int nRow = 0; nRow < nHeight; ++nRow)
        for (unsigned int nColumn = 0; nColumn < nWidth; ++nColumn)
            for (std::size_t nAt = 0; nAt < oChannels.size(); ++nAt)
            {
                const std::size_t nTo =
                    (std::size_t{nY + nRow} * oSamples.mnWidth + nX + nColumn) * oSamples.mnChannels + oChannels[nAt] -
                    1;
                oSamples.moKnown[nTo] = bKnown && !mbLossy;
                std::memcpy(&oSamples.moBytes[nTo * nBytes],
                            &oBuffer[((std::size_t{nRow} * nWidth + nColumn) * oChannels.size() + nAt) * nBytes],
                            nBytes);
            }
    return bKnown;
}

// A change of the image makes its levels invalid.
void Edits::WriteWindow()
{
    std::vector<unsigned int> oChannels = Count(moModel.moImage.mnChannels);
    if (moProgram.OneIn(2))
        oChannels = {1 + moProgram.Below(moModel.moImage.mnChannels)};
    Try("window",
        [&]
        {
            const std::unique_ptr<IRasterIO> poIO(mpoDataset->GetRasterIO(oChannels));
            if (!WritePixels(*poIO, moModel.moImage, oChannels, false))
                return void(moModel.moStates = Look(*mpoDataset).moStates); // it may have begun
            for (auto& [nLevel, states] : moModel.moStates)
                std::fill(states.begin(), states.end(), '0');
        },
        {});
}

void Edits::ChangeChannels()
{
    const unsigned int nOld = moModel.moImage.mnChannels;
    std::vector<unsigned int> oSources = Count(nOld);
    const bool bAdd = moProgram.OneIn(2);
    const unsigned int nChannel = moProgram.Below(nOld + 2);
    if (bAdd)
        oSources.resize(nOld + 1 + nChannel % 2, 0);
    else if (nChannel >= 1 && nChannel <= nOld)
        oSources.erase(oSources.begin() + (nChannel - 1));
    if (oSources.empty() || oSources.size() > MAX_CHANNELS)
        return;
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(mpoDataset->GetChannelInfo(1));
    const auto Change = [&]
    {
        if (bAdd)
            mpoDataset->AddNewChannel(krv::gobs::RasterInfo(moModel.moImage.mnWidth, moModel.moImage.mnHeight,
                                                            1 + nChannel % 2, poInfo->GetDataType()));
        else
            mpoDataset->DeleteChannel(nChannel);
        Rearrange(moModel.moImage, oSources);
        if (mbLossy)
            Forget(moModel.moImage);
        for (auto& [nLevel, oLevel] : moModel.moLevels)
        {
            Rearrange(oLevel, oSources);
            if (mbLossy)
                Forget(oLevel);
            const std::string old = std::exchange(moModel.moStates[nLevel], "");
            for (const unsigned int nSource : oSources)
                moModel.moStates[nLevel] += nSource == 0 ? '0' : old[nSource - 1];
        }
    };
    Try(bAdd ? "channels added" : "channel deleted", Change, {&View::moRecord, &View::moTables});
}

void Edits::ChangeRecord()
{
    constexpr const char* KEYS[] = {"Title", "ImageDescription", "Software", "NO_DATA_VALUE",
                                    "a:b",   "XResolution",      "RPC"};
    AuxiliaryData oRecord = mpoDataset->ReadAuxiliaryData();
    const std::string key = moProgram.OneIn(2) ? std::string(moProgram.Of(KEYS)) : "own " + moProgram.Text(12);
    const std::string value = moProgram.Text(40);
    const unsigned int nChannel = moProgram.Below(oRecord.GetChannelCount() + 1);
    const bool bDescription = moProgram.OneIn(4);
    if (nChannel == 0)
        oRecord.SetFileMetadataValue(key, value);
    else if (bDescription)
        oRecord.SetChannelDescription(value, nChannel);
    else
        oRecord.SetChanMetadataValue(key, value, nChannel);
    if (!Try("record", [&] { mpoDataset->WriteAuxiliaryData(oRecord); }, {&View::moRecord}))
        return;
    const AuxiliaryData oGot = mpoDataset->ReadAuxiliaryData();
    const std::string got = nChannel == 0  ? oGot.GetFileMetadataValue(key)
                            : bDescription ? oGot.GetChannelDescription(nChannel)
                                           : oGot.GetChanMetadataValue(key, nChannel);
    if (got != value)
        Complain("metadata " + key + ": " + got + " instead of " + value);
}

void Edits::ChangeLevels()
{
    const std::unique_ptr<IOverviewManager> poLevels(mpoDataset->GetOverviewManager());
    const unsigned int nLevel = moProgram.Below(10);
    const auto oFound = moModel.moLevels.find(nLevel);
    switch (moProgram.Below(4))
    {
    case 0:
        if (moModel.moLevels.size() < MAX_PAGES)
            Try("level made",
                [&]
                {
                    poLevels->CreateLevel(nLevel);
                    const Samples& oImage = moModel.moImage;
                    const auto oMade = moModel.moLevels.emplace(
                        nLevel, MakeSamples((oImage.mnWidth - 1) / nLevel + 1, (oImage.mnHeight - 1) / nLevel + 1,
                                            oImage.mnChannels, oImage.mnValueBytes));
                    if (!oMade.second)
                        Complain("a level was made twice");
                    moModel.moStates[nLevel].assign(moModel.moImage.mnChannels, '0');
                },
                {});
        return;
    case 1:
        Try("level deleted",
            [&]
            {
                poLevels->DeleteLevel(nLevel);
                moModel.moLevels.erase(nLevel);
                moModel.moStates.erase(nLevel);
            },
            {});
        return;
    case 2:
        Try("level marked",
            [&]
            {
                const bool bValid = moProgram.OneIn(2);
                poLevels->SetValid(1, nLevel, bValid);
                moModel.moStates.at(nLevel)[0] = bValid ? '1' : '0';
            },
            {});
        return;
    default:
        if (oFound != moModel.moLevels.end() && oFound->second.mnWidth != 0)
            Try("level written",
                [&]
                {
                    const std::vector<unsigned int> oChannels = Count(oFound->second.mnChannels);
                    const std::unique_ptr<IRasterIO> poIO(poLevels->GetOverviewIO(nLevel, oChannels));
                    WritePixels(*poIO, oFound->second, oChannels, false);
                },
                {});
    }
}

void Edits::ChangeBitmaps()
{
    const unsigned int nBitmap = 1 + moProgram.Below(7);
    const auto oFound = moModel.moBitmaps.find(nBitmap);
    const std::string text = moProgram.Text(20);
    switch (moProgram.Below(5))
    {
    case 0:
        if (moModel.moBitmaps.size() < MAX_PAGES)
            Try("bitmap made",
                [&]
                {
                    const Samples& oImage = moModel.moImage;
                    const auto oMade = moModel.moBitmaps.emplace(mpoDataset->CreateBitmap(),
                                                                 MakeSamples(oImage.mnWidth, oImage.mnHeight, 1, 1));
                    if (!oMade.second)
                        Complain("a bitmap was made twice");
                },
                {&View::moBitmapTexts});
        return;
    case 1:
        Try("bitmap deleted",
            [&]
            {
                mpoDataset->DeleteBitmap(nBitmap);
                moModel.moBitmaps.erase(nBitmap);
            },
            {&View::moBitmapTexts});
        return;
    case 2:
        if (Try("bitmap described", [&] { mpoDataset->SetBitmapDescription(nBitmap, text); }, {&View::moBitmapTexts}) &&
            mpoDataset->GetBitmapDescription(nBitmap) != text)
            Complain("the description of a bitmap: " + mpoDataset->GetBitmapDescription(nBitmap) + " instead of " +
                     text);
        return;
    case 3:
        if (Try("metadata of a bitmap",
                [&] {
                    mpoDataset->SetBitmapMetadata(nBitmap, {{"Kind", text}});
                },
                {&View::moBitmapTexts}) &&
            Text(mpoDataset->GetBitmapMetadata(nBitmap)) != (text.empty() ? "" : Text({{"Kind", text}})))
            Complain("metadata of a bitmap: " + Text(mpoDataset->GetBitmapMetadata(nBitmap)) + " instead of " + text);
        return;
    default:
        if (oFound != moModel.moBitmaps.end() && oFound->second.mnWidth != 0)
            Try("bitmap written",
                [&]
                {
                    const std::unique_ptr<IRasterIO> poIO(mpoDataset->GetBitmapIO({nBitmap}));
                    WritePixels(*poIO, oFound->second, {1}, true);
                },
                {});
    }
}

void Edits::ChangeTables()
{
    const unsigned int nWay = moProgram.Below(3);
    std::vector<krv::gobs::RGBTuple<std::uint16_t>> oColours(256);
    const unsigned int nStep = moProgram.Below(256);
    for (unsigned int nAt = 0; nAt < 256; ++nAt)
        oColours[nAt] = {static_cast<std::uint16_t>(nAt * 257), static_cast<std::uint16_t>(nAt * nStep), 40000};
    const krv::gobs::PCT oTable = krv::gobs::PCT::FromColours(oColours);
    Try("colour table",
        [&]
        {
            if (nWay == 0)
                mpoDataset->CreatePCT(oTable, 1);
            else if (nWay == 1)
                mpoDataset->UpdatePCT(1, oTable);
            else
                mpoDataset->DeletePCT(1);
        },
        {&View::moTables, &View::moRecord});
}

void Edits::ChangeGeography()
{
    constexpr int SYSTEMS[] = {32632, 4326, 3857, 2263};
    const double nUnit = moProgram.Between(-4, 4) / 2.0;
    const bool bSystem = moProgram.OneIn(4);
    const krv::ogc::cs::GeocodingInfo oInfo(1000.5, nUnit, moProgram.OneIn(2) ? 0.25 : 0, 2000, 0, -1);
    const int nCode = moProgram.Of(SYSTEMS);
    const bool bDone = Try(bSystem ? "reference system" : "geocoding",
                           [&]
                           {
                               if (bSystem)
                                   mpoDataset->UpdateCRS(*krv::ogc::cs::CreateCRSFromEPSG(nCode));
                               else
                                   mpoDataset->SetGeocoding(oInfo);
                           },
                           {&View::moGeography, &View::moRecord});
    if (bDone && !bSystem && !(mpoDataset->GetGeocoding() == oInfo))
        Complain("the geocoding is another one");
}

// The file says what the dataset said; without being stored, what it said when it was stored last.
void Edits::Reopen()
{
    const bool bStore = !moProgram.OneIn(5);
    try
    {
        if (bStore)
            mpoDataset->Close();
    }
    catch (const krv::Exception& oException)
    {
        Complain("Close throws: " + oException.GetMessage());
    }
    mpoDataset.reset();
    mbNamed = mbNamed || bStore;
    if (bStore)
        moStored = moModel;
    moModel = moStored;
    if (!mbNamed)
        return;
    const TifPointer poRead = OpenTif(moFileName, eReadOnly);
    if (!poRead)
        Complain("the file is no longer read");
    Check("reading again", Look(*poRead));
    mpoDataset = OpenTif(moFileName, eUpdate);
    if (!mpoDataset)
        Complain("the file is no longer updated");
    Check("opening again", Look(*mpoDataset));
}

void Edits::Synchronize()
{
    if (!Try("synchronising", [&] { mpoDataset->Synchronize(); }, {}))
        return;
    moStored = moModel;
    mbNamed = true;
}

void Edits::Step()
{
    constexpr void (Edits::*STEPS[])() = {&Edits::WriteWindow,     &Edits::WriteWindow,   &Edits::WriteWindow,
                                          &Edits::ChangeChannels,  &Edits::ChangeRecord,  &Edits::ChangeLevels,
                                          &Edits::ChangeLevels,    &Edits::ChangeBitmaps, &Edits::ChangeTables,
                                          &Edits::ChangeGeography, &Edits::Synchronize,   &Edits::Reopen};
    (this->*moProgram.Of(STEPS))();
}

void Edits::Run(TifPointer poDataset)
{
    mpoDataset = std::move(poDataset);
    mbLossy = IsLossy(*mpoDataset);
    mbNamed = mpoDataset->Exists() && OpenTif(moFileName, eReadOnly) != nullptr;
    moModel = Look(*mpoDataset);
    moStored = moModel;
    if (mbNamed)
        Check("opening for update", Look(*OpenTif(moFileName, eReadOnly)));
    for (unsigned int nStep = 0; mpoDataset && nStep < MAX_STEPS && !moProgram.IsAtEnd(); ++nStep)
        Step();
    if (mpoDataset)
        Reopen();
}

} // namespace krv::fuzz

// Of every fuzzer that edits files.
extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    krv::nspio::Warning::SetSink([](const std::string&, const std::string&, unsigned int) {});
    return 0;
}
