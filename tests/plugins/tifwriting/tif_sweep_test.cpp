// Every real TIFF is changed in a few places; libtiff and the reader say that nothing else changed.

#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/metadata/pixelstatistics.h"
#include "plugins/tif/reading/rawdirectory.h"
#include "tests/plugins/tif/tifsupport.h"
#include "tests/support/facts.h"
#include "tests/support/tiffwriter.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <functional>
#include <map>
#include <optional>
#include <set>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace
{

using namespace krv::test;
using krv::datasources::AuxiliaryData;
using krv::plugins::tif::TifDataset;

struct Rect
{
    unsigned int mnX, mnY, mnWidth, mnHeight;

    bool Touches(const Rect& oOther) const
    {
        return mnX < oOther.mnX + oOther.mnWidth && oOther.mnX < mnX + mnWidth && mnY < oOther.mnY + oOther.mnHeight &&
               oOther.mnY < mnY + mnHeight;
    }
};

// A directory as libtiff sees it: its form, the tags that an update of pixels leaves alone, its decoded blocks.
struct Directory
{
    std::uint32_t mnWidth = 0, mnHeight = 0, mnBlockWidth = 0, mnBlockHeight = 0, mnKind = 0;
    std::uint16_t mnCompression = 1;
    std::map<unsigned int, std::string> moTags;
    std::vector<Bytes> moBlocks; // empty: libtiff cannot decode it

    std::uint32_t GetAcross() const { return (mnWidth - 1) / mnBlockWidth + 1; }
    std::uint32_t GetDown() const { return (mnHeight - 1) / mnBlockHeight + 1; }
    Rect GetBlock(std::size_t nBlock) const
    {
        const auto nInPlane = static_cast<std::uint32_t>(nBlock % (GetAcross() * GetDown()));
        const std::uint32_t nX = nInPlane % GetAcross() * mnBlockWidth, nY = nInPlane / GetAcross() * mnBlockHeight;
        return {nX, nY, std::min(mnBlockWidth, mnWidth - nX), std::min(mnBlockHeight, mnHeight - nY)};
    }
    bool IsLossy() const { return mnCompression == COMPRESSION_JPEG; }
    bool IsMask() const { return (mnKind & FILETYPE_MASK) != 0; }
};

// All values of all tags, but for places; the items of tag 42112 are compared as the record's.
std::map<unsigned int, std::string> ReadTags(const std::string& fileName, std::uint64_t nOffset)
{
    const std::set<unsigned int> oChanging = {TIFFTAG_STRIPOFFSETS,   TIFFTAG_STRIPBYTECOUNTS, TIFFTAG_TILEOFFSETS,
                                              TIFFTAG_TILEBYTECOUNTS, TIFFTAG_SUBIFD,          42112};
    using namespace krv::plugins;
    const support::File oFile(fileName, support::File::Mode::eRead);
    tif::PeekReader oReader(oFile);
    unsigned char aHeader[16] = {};
    oFile.ReadUpTo(0, aHeader, sizeof(aHeader));
    const tif::RawDirectory oDirectory(oReader, *tif::FileHeader::Parse(aHeader, sizeof(aHeader)), nOffset);
    std::map<unsigned int, std::string> oTags;
    for (const tif::DirectoryEntry& oEntry : oDirectory.GetEntries())
        if (!oChanging.contains(oEntry.mnTag))
        {
            std::string bytes(oEntry.GetBytes(), ' ');
            oReader.Read(oEntry.mnOffset, bytes.data(), bytes.size());
            oTags[oEntry.mnTag] = std::to_string(oEntry.mnType) + ":" + bytes;
        }
    return oTags;
}

Directory ReadDirectory(TIFF* poTiff, const std::string& fileName)
{
    Directory oDirectory;
    TIFFGetField(poTiff, TIFFTAG_IMAGEWIDTH, &oDirectory.mnWidth);
    TIFFGetField(poTiff, TIFFTAG_IMAGELENGTH, &oDirectory.mnHeight);
    TIFFGetField(poTiff, TIFFTAG_SUBFILETYPE, &oDirectory.mnKind);
    TIFFGetFieldDefaulted(poTiff, TIFFTAG_COMPRESSION, &oDirectory.mnCompression);
    const bool bTiled = TIFFIsTiled(poTiff) != 0;
    oDirectory.mnBlockWidth = oDirectory.mnWidth;
    TIFFGetField(poTiff, TIFFTAG_TILEWIDTH, &oDirectory.mnBlockWidth);
    TIFFGetFieldDefaulted(poTiff, bTiled ? TIFFTAG_TILELENGTH : TIFFTAG_ROWSPERSTRIP, &oDirectory.mnBlockHeight);
    oDirectory.mnBlockHeight =
        bTiled ? oDirectory.mnBlockHeight : std::min(oDirectory.mnBlockHeight, oDirectory.mnHeight);
    oDirectory.moTags = ReadTags(fileName, TIFFCurrentDirOffset(poTiff));
    if (oDirectory.IsLossy())
        TIFFSetField(poTiff, TIFFTAG_JPEGCOLORMODE, JPEGCOLORMODE_RGB);
    for (std::uint32_t nBlock = 0; nBlock < TIFFNumberOfStrips(poTiff); ++nBlock)
    {
        Bytes oBlock(static_cast<std::size_t>(bTiled ? TIFFTileSize(poTiff) : TIFFStripSize(poTiff)));
        const auto nSize = static_cast<tmsize_t>(oBlock.size());
        if (TIFFGetStrileByteCount(poTiff, nBlock) != 0 &&
            (bTiled ? TIFFReadEncodedTile(poTiff, nBlock, oBlock.data(), nSize)
                    : TIFFReadEncodedStrip(poTiff, nBlock, oBlock.data(), nSize)) < 0)
            oBlock.clear();
        oDirectory.moBlocks.push_back(std::move(oBlock));
    }
    return oDirectory;
}

// The chain, then what the first directory lists.
std::vector<Directory> ReadDirectories(const std::string& fileName)
{
    TIFFSetErrorHandler(nullptr);
    TIFFSetWarningHandler(nullptr);
    std::vector<Directory> oDirectories;
    const TiffFile poTiff(TIFFOpen(fileName.c_str(), "rm"));
    if (!poTiff)
        return oDirectories;
    std::uint16_t nBelow = 0;
    const toff_t* pBelow = nullptr;
    std::vector<toff_t> oBelow;
    if (TIFFGetField(poTiff.get(), TIFFTAG_SUBIFD, &nBelow, &pBelow) == 1)
        oBelow.assign(pBelow, pBelow + nBelow);
    do
        oDirectories.push_back(ReadDirectory(poTiff.get(), fileName));
    while (TIFFReadDirectory(poTiff.get()) == 1);
    for (const toff_t nOffset : oBelow)
        if (TIFFSetSubDirectory(poTiff.get(), nOffset) == 1)
            oDirectories.push_back(ReadDirectory(poTiff.get(), fileName));
    return oDirectories;
}

// Pixels by the dataset: the image, its levels, its bitmaps.
struct View
{
    std::string moName;
    std::size_t mnDirectory;
    std::function<IOPointer()> moOpen;
    std::size_t mnPixelBytes;

    bool IsBitmap() const { return moName[0] == 'b'; }
};

std::size_t FindDirectory(const std::vector<Directory>& oDirectories, const krv::datasources::IRasterIO& oIO,
                          bool bMask)
{
    for (std::size_t n = bMask ? 0 : 1; n < oDirectories.size(); ++n)
        if (oDirectories[n].mnWidth == oIO.GetFileWidth() && oDirectories[n].mnHeight == oIO.GetFileHeight() &&
            oDirectories[n].IsMask() == bMask)
            return n;
    return oDirectories.size();
}

std::vector<View> ListViews(TifDataset& oDataset, const std::vector<Directory>& oDirectories)
{
    const auto oChannels = AllChannels(oDataset.GetChanCount());
    const std::size_t nBytes = PixelBytes(oDataset);
    std::vector<View> oViews = {
        {"image", 0, [&oDataset, oChannels] { return IOPointer(oDataset.GetRasterIO(oChannels)); }, nBytes}};
    const auto Add = [&](const std::string& name, std::function<IOPointer()> oOpen, bool bMask, std::size_t nPixelBytes)
    {
        oViews.push_back({name, FindDirectory(oDirectories, *oOpen(), bMask), oOpen, nPixelBytes});
    };
    const std::unique_ptr<krv::datasources::IOverviewManager> poLevels(oDataset.GetOverviewManager());
    for (const unsigned int nLevel : poLevels->GetLevels())
        Add(
            "level " + std::to_string(nLevel),
            [&oDataset, nLevel, oChannels]
            {
                const std::unique_ptr<krv::datasources::IOverviewManager> poManager(oDataset.GetOverviewManager());
                return IOPointer(poManager->GetOverviewIO(nLevel, oChannels));
            },
            false, nBytes);
    for (const unsigned int nBitmap : oDataset.GetBitmapList())
        Add(
            "bitmap " + std::to_string(nBitmap),
            [&oDataset, nBitmap] { return IOPointer(oDataset.GetBitmapIO({nBitmap})); }, true, 1);
    return oViews;
}

// What is not pixels.
struct Record
{
    AuxiliaryData moData{1};
    krv::ogc::cs::GeocodingInfo moGeocoding;
    std::string moCRS;
    bool mbStatistics;

    explicit Record(TifDataset& oDataset) : moData(oDataset.ReadAuxiliaryData()), moGeocoding(oDataset.GetGeocoding())
    {
        const std::unique_ptr<krv::ogc::cs::ICRS> poCRS(oDataset.ReadCRS());
        moCRS = poCRS ? poCRS->GetWKT() : "";
        mbStatistics = krv::datasources::DropStatistics(moData);
        for (unsigned int nChannel = 0; nChannel <= moData.GetChannelCount(); ++nChannel)
        {
            auto oMap = nChannel == 0 ? moData.GetFileMetadata() : moData.GetChanMetadata(nChannel);
            std::erase_if(oMap, [](const auto& oEntry) { return oEntry.first.starts_with("_Overview_"); });
            if (nChannel == 0)
                moData.SetFileMetadata(oMap);
            else
                moData.SetChanMetadata(oMap, nChannel);
        }
    }
    void Compare(const Record& oOther) const
    {
        EXPECT_EQ(moData.GetFileMetadata(), oOther.moData.GetFileMetadata());
        for (unsigned int nChannel = 1; nChannel <= moData.GetChannelCount(); ++nChannel)
        {
            EXPECT_EQ(moData.GetChanMetadata(nChannel), oOther.moData.GetChanMetadata(nChannel));
            EXPECT_EQ(moData.GetChannelDescription(nChannel), oOther.moData.GetChannelDescription(nChannel));
        }
        EXPECT_TRUE(moGeocoding == oOther.moGeocoding);
        EXPECT_EQ(moCRS, oOther.moCRS);
    }
};

// Values that the stored type holds, none what it was.
void ChangeValues(Bytes& oPixels, const krv::gobs::DataType& oType, unsigned int nBits)
{
    const std::size_t nBytes = oType.GetBits() / 8;
    for (std::size_t nAt = 0; nAt < oPixels.size(); nAt += nBytes)
    {
        unsigned char* const pValue = &oPixels[nAt];
        const float nFloat = pValue[nBytes - 1] == 0x40 ? 3.0F : 2.0F;
        const double nDouble = nFloat;
        if (oType.IsReal())
            std::memcpy(pValue, nBytes == 4 ? static_cast<const void*>(&nFloat) : &nDouble, nBytes);
        else
            for (std::size_t nByte = 0; nByte < nBytes; ++nByte)
                if (const unsigned int nLeft = nBits > 8 * nByte ? nBits - static_cast<unsigned int>(8 * nByte) : 0;
                    nLeft > 0 || oType.IsSigned())
                    pValue[nByte] ^=
                        nLeft >= 8 || oType.IsSigned() ? 0xFF : static_cast<unsigned char>((1U << nLeft) - 1);
    }
}

// The places to change: of the image a block, a pixel, a window over a corner of blocks, the end of the last block; of
// a level and of a bitmap a block.
std::vector<Rect> ChooseRects(const Directory& oDirectory, bool bImage)
{
    const std::size_t nBlocks = std::size_t{oDirectory.GetAcross()} * oDirectory.GetDown();
    std::vector<Rect> oRects = {oDirectory.GetBlock(nBlocks / 2)};
    if (!bImage)
        return oRects;
    const Rect oSecond = oDirectory.GetBlock(std::min<std::size_t>(1, nBlocks - 1)),
               oLast = oDirectory.GetBlock(nBlocks - 1);
    oRects.push_back({oSecond.mnX + oSecond.mnWidth / 2, oSecond.mnY + oSecond.mnHeight / 3, 1, 1});
    const unsigned int nX = std::min(oDirectory.mnBlockWidth, oDirectory.mnWidth) - 1,
                       nY = std::min(oDirectory.mnBlockHeight, oDirectory.mnHeight) - 1;
    oRects.push_back({nX, nY, std::min(3U, oDirectory.mnWidth - nX), std::min(3U, oDirectory.mnHeight - nY)});
    oRects.push_back({oLast.mnX + oLast.mnWidth - 1, oLast.mnY, 1, oLast.mnHeight});
    return oRects;
}

void Apply(const View& oView, const Rect& oRect, const krv::gobs::DataType& oType, unsigned int nBits, Bytes& oModel)
{
    const IOPointer poIO = oView.moOpen();
    const std::size_t nPitch = oRect.mnWidth * oView.mnPixelBytes, nWhole = poIO->GetFileWidth() * oView.mnPixelBytes;
    Bytes oWindow(nPitch * oRect.mnHeight);
    for (unsigned int nRow = 0; nRow < oRect.mnHeight; ++nRow)
        std::memcpy(&oWindow[nRow * nPitch], &oModel[(oRect.mnY + nRow) * nWhole + oRect.mnX * oView.mnPixelBytes],
                    nPitch);
    ChangeValues(oWindow, oType, nBits);
    poIO->WriteWindow(oRect.mnX, oRect.mnY, oRect.mnWidth, oRect.mnHeight, oWindow.data());
    for (unsigned int nRow = 0; nRow < oRect.mnHeight; ++nRow)
        std::memcpy(&oModel[(oRect.mnY + nRow) * nWhole + oRect.mnX * oView.mnPixelBytes], &oWindow[nRow * nPitch],
                    nPitch);
}

// A file that is changed, and what libtiff and the reader find before and after.
class Sweep
{
public:
    explicit Sweep(const std::string& fileName) : moFileName(fileName), moBefore(ReadDirectories(fileName))
    {
        for (const unsigned int nTag :
             {TIFFTAG_MINSAMPLEVALUE, TIFFTAG_MAXSAMPLEVALUE, TIFFTAG_SMINSAMPLEVALUE, TIFFTAG_SMAXSAMPLEVALUE})
            moBefore.at(0).moTags.erase(nTag); // no longer true
    }

    // False when the first write was refused, with the reason; nothing is written then.
    bool Change(std::string& reason)
    {
        const TifPointer poDataset = OpenTif(moFileName, eUpdate);
        const std::unique_ptr<krv::datasources::IChannelInfo> poInfo(poDataset->GetChannelInfo(1));
        moRecord.emplace(*poDataset);
        moViews = ListViews(*poDataset, moBefore);
        for (std::size_t nView = 0; nView < moViews.size(); ++nView)
        {
            const View& oView = moViews[nView];
            moModels.push_back(ReadAll(*oView.moOpen(), oView.mnPixelBytes));
            const krv::gobs::DataType oType =
                oView.IsBitmap() ? krv::gobs::DataType(krv::gobs::eDT_8U) : poInfo->GetDataType();
            for (const Rect& oRect : ChooseRects(moBefore.at(oView.mnDirectory), nView == 0))
                try
                {
                    Apply(oView, oRect, oType, oView.IsBitmap() ? 1 : poInfo->GetNativeDataType().GetBits(),
                          moModels.back());
                    moEdits.emplace_back(oView.mnDirectory, oRect);
                }
                catch (const krv::DataException& oException)
                {
                    EXPECT_TRUE(moEdits.empty());
                    reason = oException.GetMessage();
                }
        }
        poDataset->Close();
        return !moEdits.empty();
    }

    void CompareByReader() const
    {
        const TifPointer poDataset = OpenTif(moFileName);
        const Record oRecord(*poDataset);
        moRecord->Compare(oRecord);
        EXPECT_FALSE(oRecord.mbStatistics) << "of the pixels before";
        const std::vector<View> oViews = ListViews(*poDataset, moBefore);
        ASSERT_EQ(oViews.size(), moViews.size());
        for (std::size_t nView = 0; nView < oViews.size(); ++nView)
        {
            const Bytes oPixels = ReadAll(*oViews[nView].moOpen(), oViews[nView].mnPixelBytes);
            const Directory& oDirectory = moBefore[oViews[nView].mnDirectory];
            if (!oDirectory.IsLossy())
            {
                EXPECT_TRUE(oPixels == moModels[nView]) << oViews[nView].moName;
                continue;
            }
            double nSum = 0;
            for (std::size_t nAt = 0; nAt < oPixels.size(); ++nAt)
                nSum += std::abs(int{oPixels[nAt]} - int{moModels[nView][nAt]});
            EXPECT_LT(nSum / static_cast<double>(oPixels.size()), 16.0) << oViews[nView].moName;
        }
    }

    void CompareByLibtiff() const
    {
        const std::vector<Directory> oAfter = ReadDirectories(moFileName);
        ASSERT_EQ(oAfter.size(), moBefore.size());
        for (std::size_t nDirectory = 0; nDirectory < oAfter.size(); ++nDirectory)
        {
            const Directory &oOld = moBefore[nDirectory], &oNew = oAfter[nDirectory];
            EXPECT_EQ(oNew.moTags, oOld.moTags) << "directory " << nDirectory;
            ASSERT_EQ(oNew.moBlocks.size(), oOld.moBlocks.size());
            unsigned int nChanged = 0, nLost = 0;
            for (std::size_t nBlock = 0; nBlock < oOld.moBlocks.size(); ++nBlock)
            {
                const bool bTouched =
                    std::any_of(moEdits.begin(), moEdits.end(),
                                [&](const auto& oEdit)
                                { return oEdit.first == nDirectory && oEdit.second.Touches(oOld.GetBlock(nBlock)); });
                nLost += oNew.moBlocks[nBlock].empty() && !oOld.moBlocks[nBlock].empty();
                nChanged += !bTouched && oNew.moBlocks[nBlock] != oOld.moBlocks[nBlock];
            }
            EXPECT_EQ(nChanged, 0U) << "other blocks of directory " << nDirectory << " are different";
            EXPECT_EQ(nLost, 0U) << "blocks of directory " << nDirectory << " cannot be read";
        }
    }

private:
    std::string moFileName;
    std::vector<Directory> moBefore;
    std::optional<Record> moRecord;
    std::vector<View> moViews;
    std::vector<Bytes> moModels;                       // what every view is to hold
    std::vector<std::pair<std::size_t, Rect>> moEdits; // directory, place
};

bool IsTiff(const std::string& bytes)
{
    const std::string begin = bytes.substr(0, 4);
    return begin == std::string("II*\0", 4) || begin == std::string("II+\0", 4) || begin == std::string("MM\0*", 4) ||
           begin == std::string("MM\0+", 4);
}

TEST(TifSweep, AChangeOfARealFileChangesNothingElse)
{
    if (!std::filesystem::exists(DataFolder()))
        GTEST_SKIP() << "no folder of real files";
    const TempFolder oFolder;
    unsigned int nFiles = 0, nRefused = 0;
    for (const auto& oEntry : std::filesystem::recursive_directory_iterator(DataFolder()))
    {
        const std::string bytes = oEntry.is_regular_file() ? ReadFile(oEntry.path().string()) : std::string();
        if (!IsTiff(bytes))
            continue;
        SCOPED_TRACE(oEntry.path().string());
        const std::string fileName = oFolder.Write("sweep.tif", bytes);
        Sweep oSweep(fileName);
        std::string reason;
        ++nFiles;
        bool bChanged = false;
        EXPECT_NO_THROW(bChanged = oSweep.Change(reason));
        if (bChanged)
        {
            EXPECT_NO_THROW(oSweep.CompareByReader());
            oSweep.CompareByLibtiff();
            continue;
        }
        // Facsimile and WebP are only read.
        ++nRefused;
        EXPECT_THAT(reason, testing::AnyOf(testing::HasSubstr("compression 3"), testing::HasSubstr("compression 4"),
                                           testing::HasSubstr("compression 50001")));
        EXPECT_TRUE(ReadFile(fileName) == bytes);
    }
    EXPECT_LT(10 * nRefused, nFiles);
}

} // namespace
