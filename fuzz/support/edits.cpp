#include "fuzz/support/edits.h"

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/irasterio.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/rasterinfo.h"
#include "plugins/tif/tifbuilder.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/ogc/cs/crsfactory.h"
#include "toolkit/xml/xmlutil.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <numeric>

namespace krv::fuzz
{

namespace
{

using krv::datasources::AuxiliaryData;
using krv::datasources::IOverviewManager;
using krv::datasources::IRasterIO;
using krv::plugins::tif::TifDataset;

constexpr std::uint64_t MAX_BYTES = 1U << 14;
constexpr unsigned int MAX_SIDE = 4096;
constexpr unsigned int MAX_CHANNELS = 12;
constexpr std::size_t MAX_PAGES = 6;
constexpr unsigned int MAX_STEPS = 16;

[[noreturn]] void Complain(const std::string& what)
{
    std::fprintf(stderr, "THE MODEL SAYS OTHERWISE: %s\n", what.c_str());
    std::abort();
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

// A part that cannot be read is tried value by value of a row.
Samples ReadSamples(const std::function<IRasterIO*(const std::vector<unsigned int>&)>& oMakeIO, unsigned int nChannels,
                    std::size_t nValueBytes)
{
    Samples oSamples;
    std::unique_ptr<IRasterIO> poIO(oMakeIO(Count(nChannels)));
    oSamples.mnWidth = poIO->GetFileWidth();
    oSamples.mnHeight = poIO->GetFileHeight();
    oSamples.mnChannels = nChannels;
    oSamples.mnValueBytes = nValueBytes;
    const std::size_t nValues = std::size_t{oSamples.mnWidth} * oSamples.mnHeight * nChannels;
    oSamples.moBytes.resize(nValues * nValueBytes);
    oSamples.moKnown.assign(nValues, 1);
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
            oView.moStates += poLevels->IsValid(nChannel, nLevel) ? "1" : "0";
    }
    const AuxiliaryData oRecord = oDataset.ReadAuxiliaryData();
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
    for (const double nValue : {oInfo.GetXOffset(), oInfo.GetXPerColumn(), oInfo.GetXPerRow(), oInfo.GetYOffset(),
                                oInfo.GetYPerColumn(), oInfo.GetYPerRow()})
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

// nSource: the old channel (from 1) of each new one, or 0.
void Rearrange(Samples& oSamples, const std::vector<unsigned int>& oSources)
{
    if (oSamples.mnWidth == 0)
        return; // a page that cannot be read
    Samples oNew = oSamples;
    const std::size_t nPixels = std::size_t{oSamples.mnWidth} * oSamples.mnHeight;
    oNew.mnChannels = static_cast<unsigned int>(oSources.size());
    oNew.moBytes.assign(nPixels * oSources.size() * oSamples.mnValueBytes, 0);
    oNew.moKnown.assign(nPixels * oSources.size(), 1);
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

Edits::Edits(const std::string& fileName, FuzzedDataProvider& oProgram, bool bLossy)
    : moFileName(fileName), moProgram(oProgram), mbLossy(bLossy)
{
}

bool Edits::IsSmall(TifDataset& oDataset)
{
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(oDataset.GetChannelInfo(1));
    const std::unique_ptr<IOverviewManager> poLevels(oDataset.GetOverviewManager());
    return oDataset.GetWidth() <= MAX_SIDE && oDataset.GetHeight() <= MAX_SIDE &&
           oDataset.GetChanCount() <= MAX_CHANNELS && poLevels->GetLevels().size() <= MAX_PAGES &&
           oDataset.GetBitmapList().size() <= MAX_PAGES &&
           std::uint64_t{oDataset.GetWidth()} * oDataset.GetHeight() * oDataset.GetChanCount() *
                   ValueBytes(poInfo->GetDataType()) <=
               MAX_BYTES;
}

void Edits::Check(const char* pWhat, const View& oGot) const
{
    const std::string what = std::string("after ") + pWhat + ": ";
    Compare(what + "the image", moModel.moImage, oGot.moImage);
    Compare(what + "level", moModel.moLevels, oGot.moLevels);
    Compare(what + "bitmap", moModel.moBitmaps, oGot.moBitmaps);
    constexpr std::pair<const char*, Part> PARTS[] = {{"states of levels", &View::moStates},
                                                      {"record", &View::moRecord},
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

void Edits::WritePixels(IRasterIO& oIO, Samples& oSamples, const std::vector<unsigned int>& oChannels, bool bBits)
{
    const unsigned int nX = moProgram.ConsumeIntegralInRange(0U, oSamples.mnWidth - 1);
    const unsigned int nY = moProgram.ConsumeIntegralInRange(0U, oSamples.mnHeight - 1);
    const unsigned int nWidth = moProgram.ConsumeIntegralInRange(1U, oSamples.mnWidth - nX);
    const unsigned int nHeight = moProgram.ConsumeIntegralInRange(1U, oSamples.mnHeight - nY);
    const unsigned int nSeed = moProgram.ConsumeIntegral<unsigned char>();
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(mpoDataset->GetChannelInfo(1));
    const krv::gobs::DataType& oType = poInfo->GetDataType();
    const bool bWhole = poInfo->GetNativeDataType() == oType;
    const std::size_t nBytes = oSamples.mnValueBytes;
    std::vector<unsigned char> oBuffer(std::size_t{nWidth} * nHeight * oChannels.size() * nBytes);
    for (std::size_t nAt = 0; nAt < oBuffer.size(); ++nAt)
        oBuffer[nAt] = static_cast<unsigned char>((nAt * nSeed + nAt / 7 + nSeed) >> (nSeed % 3));
    // Values of fewer bits than they are handed out with: such as every width holds, 0 and 1.
    const std::size_t nPart = bBits ? 1 : oType.GetBits() / 8;
    for (std::size_t nAt = 0; (bBits || !bWhole) && nAt < oBuffer.size(); nAt += nPart)
    {
        const unsigned char nBit = oBuffer[nAt] & (oType.IsSigned() && !oType.IsReal() && !bBits ? 0 : 1);
        const float nReal = nBit;
        std::fill_n(oBuffer.begin() + static_cast<std::ptrdiff_t>(nAt), nPart, static_cast<unsigned char>(0));
        if (oType.IsReal() && !bBits)
            std::memcpy(&oBuffer[nAt], &nReal, std::min<std::size_t>(nPart, sizeof(nReal)));
        else
            oBuffer[nAt] = nBit;
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
        return Forget(oSamples);
    for (unsigned int nRow = 0; nRow < nHeight; ++nRow)
        for (unsigned int nColumn = 0; nColumn < nWidth; ++nColumn)
            for (std::size_t nAt = 0; nAt < oChannels.size(); ++nAt)
            {
                const std::size_t nTo =
                    (std::size_t{nY + nRow} * oSamples.mnWidth + nX + nColumn) * oSamples.mnChannels + oChannels[nAt] -
                    1;
                oSamples.moKnown[nTo] = bKnown;
                std::memcpy(&oSamples.moBytes[nTo * nBytes],
                            &oBuffer[((std::size_t{nRow} * nWidth + nColumn) * oChannels.size() + nAt) * nBytes],
                            nBytes);
            }
}

// The first change of the image marks its levels and drops what was counted of it.
void Edits::WriteWindow()
{
    std::vector<unsigned int> oChannels = Count(moModel.moImage.mnChannels);
    if (moProgram.ConsumeBool())
        oChannels = {moProgram.ConsumeIntegralInRange(1U, moModel.moImage.mnChannels)};
    Try("window",
        [&]
        {
            const std::unique_ptr<IRasterIO> poIO(mpoDataset->GetRasterIO(oChannels));
            WritePixels(*poIO, moModel.moImage, oChannels, false);
        },
        {&View::moStates, &View::moRecord});
}

void Edits::ChangeChannels()
{
    const unsigned int nOld = moModel.moImage.mnChannels;
    std::vector<unsigned int> oSources = Count(nOld);
    View oChanged = moModel;
    const bool bAdd = moProgram.ConsumeBool();
    const unsigned int nChannel = moProgram.ConsumeIntegralInRange(0U, nOld + 1);
    if (bAdd)
        oSources.resize(nOld + 1 + nChannel % 2, 0);
    else if (nChannel >= 1 && nChannel <= nOld)
        oSources.erase(oSources.begin() + (nChannel - 1));
    if (oSources.empty() || oSources.size() > MAX_CHANNELS)
        return;
    const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(mpoDataset->GetChannelInfo(1));
    const View oBefore = moModel;
    const auto Change = [&]
    {
        if (bAdd)
            mpoDataset->AddNewChannel(krv::gobs::RasterInfo(moModel.moImage.mnWidth, moModel.moImage.mnHeight,
                                                            1 + nChannel % 2, poInfo->GetDataType()));
        else
            mpoDataset->DeleteChannel(nChannel);
        for (auto& [nLevel, oLevel] : moModel.moLevels)
            Rearrange(oLevel, oSources);
        Rearrange(moModel.moImage, oSources);
        if (mbLossy)
            Forget(moModel.moImage);
        for (auto& [nLevel, oLevel] : moModel.moLevels)
            if (mbLossy)
                Forget(oLevel);
    };
    Try(bAdd ? "channels added" : "channel deleted", Change, {&View::moStates, &View::moRecord, &View::moTables});
}

void Edits::ChangeRecord()
{
    constexpr const char* KEYS[] = {"Title", "ImageDescription", "Software", "NO_DATA_VALUE",
                                    "a:b",   "XResolution",      "RPC"};
    AuxiliaryData oRecord = mpoDataset->ReadAuxiliaryData();
    const std::string key = moProgram.ConsumeBool() ? std::string(moProgram.PickValueInArray(KEYS))
                                                    : "own " + moProgram.ConsumeRandomLengthString(12);
    const std::string value = moProgram.ConsumeRandomLengthString(40);
    const unsigned int nChannel = moProgram.ConsumeIntegralInRange(0U, oRecord.GetChannelCount());
    const bool bDescription = moProgram.ConsumeIntegralInRange(0, 3) == 0;
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
    const unsigned int nLevel = moProgram.ConsumeIntegralInRange(0U, 9U);
    const auto oFound = moModel.moLevels.find(nLevel);
    switch (moProgram.ConsumeIntegralInRange(0, 3))
    {
    case 0:
        if (moModel.moLevels.size() < MAX_PAGES)
            Try("level made",
                [&]
                {
                    poLevels->CreateLevel(nLevel);
                    Samples oLevel = moModel.moImage;
                    oLevel.mnWidth = (oLevel.mnWidth - 1) / nLevel + 1;
                    oLevel.mnHeight = (oLevel.mnHeight - 1) / nLevel + 1;
                    const std::size_t nValues = std::size_t{oLevel.mnWidth} * oLevel.mnHeight * oLevel.mnChannels;
                    oLevel.moBytes.assign(nValues * oLevel.mnValueBytes, 0);
                    oLevel.moKnown.assign(nValues, 1);
                    if (!moModel.moLevels.emplace(nLevel, std::move(oLevel)).second)
                        Complain("a level was made twice");
                },
                {&View::moStates, &View::moRecord});
        return;
    case 1:
        Try("level deleted",
            [&]
            {
                poLevels->DeleteLevel(nLevel);
                moModel.moLevels.erase(nLevel);
            },
            {&View::moStates, &View::moRecord});
        return;
    case 2:
        Try("level marked", [&] { poLevels->SetValid(1, nLevel, moProgram.ConsumeBool()); },
            {&View::moStates, &View::moRecord});
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
    const unsigned int nBitmap = moProgram.ConsumeIntegralInRange(1U, 7U);
    const auto oFound = moModel.moBitmaps.find(nBitmap);
    const std::string text = moProgram.ConsumeRandomLengthString(20);
    switch (moProgram.ConsumeIntegralInRange(0, 4))
    {
    case 0:
        if (moModel.moBitmaps.size() < MAX_PAGES)
            Try("bitmap made",
                [&]
                {
                    const std::size_t nPixels = std::size_t{moModel.moImage.mnWidth} * moModel.moImage.mnHeight;
                    const unsigned int nNew = mpoDataset->CreateBitmap();
                    if (!moModel.moBitmaps
                             .emplace(nNew, Samples{moModel.moImage.mnWidth, moModel.moImage.mnHeight, 1, 1,
                                                    std::vector<unsigned char>(nPixels, 0),
                                                    std::vector<unsigned char>(nPixels, 1)})
                             .second)
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
    const int nWay = moProgram.ConsumeIntegralInRange(0, 2);
    std::vector<krv::gobs::RGBTuple<std::uint16_t>> oColours(256);
    const unsigned int nStep = moProgram.ConsumeIntegral<unsigned char>();
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
    const double nUnit = moProgram.ConsumeIntegralInRange(-4, 4) / 2.0;
    const bool bSystem = moProgram.ConsumeIntegralInRange(0, 3) == 0;
    const krv::ogc::cs::GeocodingInfo oInfo(1000.5, nUnit, moProgram.ConsumeBool() ? 0.25 : 0, 2000, 0, -1);
    const int nCode = moProgram.PickValueInArray(SYSTEMS);
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
    const bool bStore = moProgram.ConsumeIntegralInRange(0, 4) != 0;
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

void Edits::Step()
{
    switch (moProgram.ConsumeIntegralInRange(0, 11))
    {
    case 0:
    case 1:
    case 2:
        return WriteWindow();
    case 3:
        return ChangeChannels();
    case 4:
        return ChangeRecord();
    case 5:
    case 6:
        return ChangeLevels();
    case 7:
        return ChangeBitmaps();
    case 8:
        return ChangeTables();
    case 9:
        return ChangeGeography();
    case 10:
        if (Try("synchronising", [&] { mpoDataset->Synchronize(); }, {}))
        {
            moStored = moModel;
            mbNamed = true;
        }
        return;
    default:
        return Reopen();
    }
}

void Edits::Run(TifPointer poDataset)
{
    mpoDataset = std::move(poDataset);
    mbNamed = mpoDataset->Exists() && OpenTif(moFileName, eReadOnly) != nullptr;
    moModel = Look(*mpoDataset);
    moStored = moModel;
    if (mbNamed)
        Check("opening for update", Look(*OpenTif(moFileName, eReadOnly)));
    for (unsigned int nStep = 0; mpoDataset && nStep < MAX_STEPS && moProgram.remaining_bytes() != 0; ++nStep)
        Step();
    if (mpoDataset)
        Reopen();
}

} // namespace krv::fuzz

// Of every fuzzer that edits files.
extern "C" int LLVMFuzzerInitialize(int*, char***)
{
    krv::nspio::Warning::SetSink([](const std::string&, const std::string&, unsigned int) {});
    KRV_XMLUtil::Initialize(); // else every reading of tag 42112 starts it anew
    return 0;
}
