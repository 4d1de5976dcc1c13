// Channels that come and go: the image of a TIFF file and its levels are made anew without decoding what stays.
#include "datasources/metadata/levelbook.h"
#include "gobs/raster/rasterinfo.h"
#include "plugins/tif/tifdataset.h"
#include "plugins/tif/writing/channeleditor.h"
#include "plugins/tif/writing/metadatawriter.h"

#include <numeric>

namespace krv::plugins::tif
{

void TifDataset::AddNewChannel(const krv::gobs::RasterInfo& oInfo)
{
    const Place oPlace = Place::Current();
    GetEditor("channels cannot be added", oPlace);
    if (oInfo.GetWidth() != GetWidth() || oInfo.GetHeight() != GetHeight())
        Refuse("a channel of another size cannot be added", oPlace);
    const krv::gobs::DataType oType = GetLayout().GetPlane(0).moType;
    if (oInfo.GetDataType() != oType || mpoPage->GetForm().moSample.meWidening != Widening::eNone)
        Refuse("TIFF cannot mix the types " + oType.Describe() + " and " + oInfo.GetDataType().Describe() +
                   " in one image",
               oPlace);
    if (std::uint64_t{GetChanCount()} + oInfo.GetChansCount() > UINT16_MAX)
        Refuse("TIFF holds at most 65535 channels", oPlace);
    std::vector<unsigned int> oSources(GetChanCount());
    std::iota(oSources.begin(), oSources.end(), 1u);
    oSources.resize(oSources.size() + oInfo.GetChansCount(), 0);
    ChangeChannels(oSources, oPlace);
}

void TifDataset::DeleteChannel(unsigned int nChannel)
{
    const Place oPlace = Place::Current();
    GetEditor("channels cannot be deleted", oPlace);
    if (nChannel == 0 || nChannel > GetChanCount())
        Refuse("channel " + std::to_string(nChannel) + " does not exist", oPlace);
    if (GetChanCount() == 1)
        Refuse("the only channel cannot be deleted", oPlace);
    if (mpoPage->GetForm().moSample.meWidening != Widening::eNone)
        Refuse("channels of this kind cannot be deleted", oPlace);
    std::vector<unsigned int> oSources(GetChanCount());
    std::iota(oSources.begin(), oSources.end(), 1u);
    oSources.erase(oSources.begin() + (nChannel - 1));
    ChangeChannels(oSources, oPlace);
}

// The record is taken off the old channels and put on the new ones.
void TifDataset::ChangeChannels(const std::vector<unsigned int>& oSources, const Place& oPlace)
{
    FileEditor& oEditor = *mpoEditor;
    oEditor.StoreHeld();
    const krv::datasources::AuxiliaryData oOld = ReadAuxiliaryData();
    krv::datasources::AuxiliaryData oBare(oOld.GetChannelCount());
    oBare.SetFileMetadata(oOld.GetFileMetadata());
    std::vector<unsigned int> oLevels;
    std::vector<std::uint64_t> oNumbers = {oEditor.GetPages().front()->mnNumber};
    for (const PageLevel& oLevel : GetLevels(PixelUse::eImage))
    {
        oLevels.push_back(oLevel.mnLevel);
        oNumbers.push_back(oLevel.moPage.mnOffset);
    }
    const krv::datasources::AuxiliaryData oNew = krv::datasources::TakeChannels(oOld, oSources, oLevels);
    std::shared_ptr<support::IBlockSource> poSource;
    Edit(
        [&]
        {
            WriteMetadata(oEditor, oEditor.GetPages().front(), oBare, oPlace);
            for (const std::uint64_t nNumber : oNumbers)
                RebuildChannels(oEditor, oSources, oEditor.GetPage(nNumber), oPlace);
            WriteMetadata(oEditor, oEditor.GetPages().front(), oNew, oPlace);
            poSource = MakeSource(oEditor.GetPages().front(), PixelUse::eImage);
        });
    moImages.clear();
    ShowImage(std::move(poSource));
}

} // namespace krv::plugins::tif
