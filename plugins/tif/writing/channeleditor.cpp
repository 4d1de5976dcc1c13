#include "plugins/tif/writing/channeleditor.h"

#include "plugins/support/image/blockimage.h"
#include "plugins/tif/writing/pagewriter.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/raster/interleave.h"

#include <algorithm>
#include <numeric>

#include <tiff.h>

namespace krv::plugins::tif
{

namespace
{

bool IsSeparate(const TagList& oTags)
{
    return oTags.GetNumber(TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG) == PLANARCONFIG_SEPARATE;
}

std::unique_ptr<support::BlockImage> MakeImage(std::shared_ptr<PageWriter> poWriter)
{
    return std::make_unique<support::BlockImage>(std::move(poWriter), std::make_shared<support::BlockCache>());
}

std::vector<unsigned int> Count(std::size_t nCount)
{
    std::vector<unsigned int> oNumbers(nCount);
    std::iota(oNumbers.begin(), oNumbers.end(), 1u);
    return oNumbers;
}

class ChannelEditor
{
public:
    ChannelEditor(FileEditor& oEditor, const std::vector<unsigned int>& oSources)
        : moEditor(oEditor), moSources(oSources)
    {
    }

    void Rebuild(const std::shared_ptr<PageModel>& poOld, const Place& oPlace) const
    {
        CheckCodec(*poOld, oPlace);
        moEditor.LoadTags(*poOld);
        const std::shared_ptr<PageModel> poNew = MakePage(*poOld);
        if (IsSeparate(poOld->moTags))
            MovePlanes(*poOld, *poNew);
        else
            CopyPixels(poOld, poNew);
        moEditor.ReplacePage(poNew);
    }

private:
    void CheckCodec(const PageModel& oPage, const Place& oPlace) const
    {
        if (oPage.moTags.GetNumber(TIFFTAG_COMPRESSION, COMPRESSION_NONE) == COMPRESSION_JPEG &&
            !IsSeparate(oPage.moTags))
            throw DataException(moEditor.GetFileName() + ": the channels of pixel-interleaved JPEG cannot be changed",
                                oPlace);
    }

    std::shared_ptr<PageModel> MakePage(PageModel& oOld) const
    {
        const std::uint64_t nOldChannels = oOld.moTags.GetNumber(TIFFTAG_SAMPLESPERPIXEL, 1);
        auto poNew = std::make_shared<PageModel>(oOld.moTags.IsBigEndian());
        poNew->mnNumber = oOld.mnNumber;
        TagList& oTags = poNew->moTags;
        for (const Tag& oTag : oOld.moTags.GetTags())
            oTags.Set({oTag.mnTag, oTag.mnType, oTag.mnCount, oTag.moBytes, {}});
        poNew->DropRanges();
        for (const std::uint16_t nTag : {TIFFTAG_BITSPERSAMPLE, TIFFTAG_SAMPLEFORMAT})
            if (oTags.Find(nTag) != nullptr)
                oTags.SetNumbers(nTag, TIFF_SHORT,
                                 std::vector<std::uint64_t>(moSources.size(), oTags.GetNumber(nTag, 1)));
        oTags.SetNumber(TIFFTAG_SAMPLESPERPIXEL, TIFF_SHORT, moSources.size());
        SetColours(oTags, nOldChannels);
        moEditor.LayOut(*poNew);
        return poNew;
    }

    // The colours stay colours when all of them are still there and in front.
    void SetColours(TagList& oTags, std::uint64_t nOldChannels) const
    {
        const std::vector<std::uint64_t> oOldExtra = oTags.GetNumbers(TIFFTAG_EXTRASAMPLES);
        const std::size_t nOldColours = nOldChannels - std::min<std::uint64_t>(oOldExtra.size(), nOldChannels - 1);
        const std::vector<unsigned int> oStraight = Count(nOldColours);
        const bool bColours =
            moSources.size() >= nOldColours && std::equal(oStraight.begin(), oStraight.end(), moSources.begin());
        const std::size_t nColours = bColours ? nOldColours : 1;
        if (!bColours)
        {
            oTags.SetNumber(TIFFTAG_PHOTOMETRIC, TIFF_SHORT, PHOTOMETRIC_MINISBLACK);
            for (const std::uint16_t nTag : {TIFFTAG_COLORMAP, TIFFTAG_YCBCRSUBSAMPLING, TIFFTAG_REFERENCEBLACKWHITE})
                oTags.Remove(nTag);
        }
        std::vector<std::uint64_t> oExtra;
        for (std::size_t nAt = nColours; nAt < moSources.size(); ++nAt)
        {
            const bool bExtra = moSources[nAt] > nOldColours && moSources[nAt] - nOldColours <= oOldExtra.size();
            oExtra.push_back(bExtra ? oOldExtra[moSources[nAt] - nOldColours - 1] : EXTRASAMPLE_UNSPECIFIED);
        }
        oTags.Remove(TIFFTAG_EXTRASAMPLES);
        if (!oExtra.empty())
            oTags.SetNumbers(TIFFTAG_EXTRASAMPLES, TIFF_SHORT, oExtra);
    }

    // Strips and tiles of a channel of its own stay where they are.
    void MovePlanes(const PageModel& oOld, PageModel& oNew) const
    {
        const std::size_t nPlane = oNew.GetStriles() / moSources.size();
        for (std::size_t nChannel = 0; nChannel < moSources.size(); ++nChannel)
            for (std::size_t nAt = 0; moSources[nChannel] != 0 && nAt < nPlane; ++nAt)
            {
                const std::size_t nFrom = (moSources[nChannel] - 1) * nPlane + nAt;
                const std::size_t nTo = nChannel * nPlane + nAt;
                oNew.moOffsets[nTo] = oOld.moOffsets[nFrom];
                oNew.moByteCounts[nTo] = oOld.moByteCounts[nFrom];
                oNew.moRoom[nTo] = oOld.moRoom[nFrom];
                oNew.moGenerations[nTo] = oOld.moGenerations[nFrom];
            }
    }

    void CopyPixels(const std::shared_ptr<PageModel>& poOld, const std::shared_ptr<PageModel>& poNew) const
    {
        const auto MakeWriter = [this](const std::shared_ptr<PageModel>& poPage)
        {
            return std::make_shared<PageWriter>(moEditor.shared_from_this(), poPage, moEditor.OpenPage(poPage),
                                                PixelUse::eImage);
        };
        const std::shared_ptr<PageWriter> poWriter = MakeWriter(poNew);
        const std::unique_ptr<support::BlockImage> poSource = MakeImage(MakeWriter(poOld));
        const std::unique_ptr<support::BlockImage> poTarget = MakeImage(poWriter);
        const support::ImageLayout& oLayout = poTarget->GetLayout();
        const support::ChannelSelection oAll(oLayout, Count(moSources.size()));
        const bool bTiled = poOld->IsTiled();
        const std::uint64_t nRows =
            bTiled ? oLayout.GetBlockHeight()
                   : std::min<std::uint64_t>(poOld->moTags.GetNumber(TIFFTAG_ROWSPERSTRIP, UINT32_MAX),
                                             oLayout.GetHeight());
        const unsigned int nWidth = oLayout.GetBlockWidth();
        const unsigned int nHeight = static_cast<unsigned int>(nRows);
        std::vector<unsigned char> oPixels;
        std::size_t nStrile = 0;
        for (unsigned int nY = 0; nY < oLayout.GetHeight(); nY += std::min(nHeight, oLayout.GetHeight() - nY))
            for (unsigned int nX = 0; nX < oLayout.GetWidth();
                 nX += std::min(nWidth, oLayout.GetWidth() - nX), ++nStrile)
            {
                if (!poOld->Get(nStrile).IsStored())
                    continue;
                const support::PixelRect oRect{nX, nY, std::min(nWidth, oLayout.GetWidth() - nX),
                                               std::min(nHeight, oLayout.GetHeight() - nY)};
                FillBlock(*poSource, oRect, oAll.GetValueBytes(), oPixels);
                poTarget->Write(oAll, oRect, oPixels.data(), oRect.mnWidth * oAll.GetPixelBytes());
            }
        poWriter->Flush();
    }

    void FillBlock(support::BlockImage& oOld, const support::PixelRect& oRect, std::size_t nValueBytes,
                   std::vector<unsigned char>& oPixels) const
    {
        std::vector<unsigned int> oKept = moSources;
        std::erase(oKept, 0u);
        const support::ChannelSelection oSelection(oOld.GetLayout(), oKept);
        const std::size_t nPitch = oRect.mnWidth * moSources.size() * nValueBytes;
        oPixels.assign(nPitch * oRect.mnHeight, 0);
        if (oKept.size() == moSources.size())
            return oOld.Read(oSelection, oRect, oPixels.data(), nPitch);
        const std::size_t nKeptPitch = oRect.mnWidth * oSelection.GetPixelBytes();
        const std::size_t nPlanePitch = oRect.mnWidth * nValueBytes;
        std::vector<unsigned char> oOldPixels(nKeptPitch * oRect.mnHeight);
        std::vector<unsigned char> oPlane(nPlanePitch * oRect.mnHeight);
        oOld.Read(oSelection, oRect, oOldPixels.data(), nKeptPitch);
        const raster::PixelArea oArea{oRect.mnWidth, oRect.mnHeight, nValueBytes};
        std::size_t nTaken = 0;
        for (std::size_t nChannel = 0; nChannel < moSources.size(); ++nChannel)
        {
            if (moSources[nChannel] == 0)
                continue;
            raster::ExtractChannel(oOldPixels.data(), nKeptPitch, nTaken++, oKept.size(), oPlane.data(), nPlanePitch,
                                   oArea);
            raster::PlaceChannel(oPlane.data(), nPlanePitch, oPixels.data(), nPitch, nChannel, moSources.size(), oArea);
        }
    }

    FileEditor& moEditor;
    const std::vector<unsigned int>& moSources;
};

} // namespace

void RebuildChannels(FileEditor& oEditor, const std::vector<unsigned int>& oSources,
                     const std::shared_ptr<PageModel>& poOld, const Place& oPlace)
{
    ChannelEditor(oEditor, oSources).Rebuild(poOld, oPlace);
}

} // namespace krv::plugins::tif
