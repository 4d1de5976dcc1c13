#include "datasources/datasets/constrasterdataset.h"

#include "datasources/datasets/detail/channellist.h"
#include "datasources/datasets/detail/pixelfill.h"
#include "datasources/datasets/detail/recordparts.h"
#include "datasources/interfaces/channelinfo.h"
#include "datasources/interfaces/windowedio.h"
#include "gobs/mask/samplematch.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <utility>

namespace krv::datasources
{

namespace
{

constexpr unsigned int BLOCK_SIZE = 512;
using Bytes = std::vector<unsigned char>;

class ConstIO : public WindowedIO<IRasterIO>
{
public:
    ConstIO(std::string name, unsigned int nWidth, unsigned int nHeight, Bytes oPixel)
        : moName(std::move(name)), mnWidth(nWidth), mnHeight(nHeight), moPixel(std::move(oPixel))
    {
    }

    unsigned int GetFileWidth() const override { return mnWidth; }
    unsigned int GetFileHeight() const override { return mnHeight; }
    unsigned int GetTileWidth() const override { return std::min(mnWidth, BLOCK_SIZE); }
    unsigned int GetTileHeight() const override { return std::min(mnHeight, BLOCK_SIZE); }

private:
    std::size_t GetPixelBytes() const override { return moPixel.size(); }
    void ReadPixels(const PixelRect& oRect, unsigned char* pTarget, std::size_t nPitch) override
    {
        detail::FillPixels(pTarget, nPitch, oRect.mnWidth, oRect.mnHeight, moPixel.data(), moPixel.size());
    }
    void WritePixels(const PixelRect&, const unsigned char*, std::size_t) override
    {
        throw krv::DataException(moName + ": the pixels of a constant image cannot be written");
    }

    std::string moName;
    unsigned int mnWidth;
    unsigned int mnHeight;
    Bytes moPixel;
};

std::string MakeName(unsigned int nWidth, unsigned int nHeight, const std::vector<ConstChannel>& oChannels)
{
    return "<constant " + std::to_string(nWidth) + " x " + std::to_string(nHeight) + ", " +
           std::to_string(oChannels.size()) + (oChannels.size() == 1 ? " channel>" : " channels>");
}

} // namespace

struct ConstRasterDataset::State
{
    unsigned int mnWidth;
    unsigned int mnHeight;
    std::vector<krv::gobs::DataType> moTypes;
    std::vector<Bytes> moValues; // of each channel
    detail::RecordParts moRecord;
};

ConstRasterDataset::ConstRasterDataset(unsigned int nWidth, unsigned int nHeight,
                                       const std::vector<ConstChannel>& oChannels)
    : FilelessDataset(MakeName(nWidth, nHeight, oChannels)), mpoState(new State{nWidth, nHeight, {}, {}, {}})
{
    const Place oPlace = Place::Current();
    const std::string name = ConstRasterDataset::GetName();
    detail::CheckImageSize(nWidth, nHeight, oChannels.size(), name, oPlace);
    for (const ConstChannel& oChannel : oChannels)
    {
        const krv::gobs::DataType& oType = oChannel.moType;
        const auto nNumber = static_cast<unsigned int>(mpoState->moTypes.size()) + 1;
        const std::size_t nBytes = detail::CheckChannelType(oType, nNumber, name, oPlace);
        const std::size_t nPartBytes = nBytes / oType.GetParts();
        const krv::gobs::DataType oPart(oType.GetBits(), oType.IsSigned(), oType.IsReal(), 0, 0, false);
        Bytes oValue(2 * nPartBytes);
        const bool bStored = krv::gobs::StoreSample(oChannel.moValue, oPart, oValue.data()) &&
                             krv::gobs::StoreSample(oChannel.moImaginary, oPart, oValue.data() + nPartBytes);
        const bool bImaginary = !oType.IsComplex() && oChannel.moImaginary.GetReal() != 0;
        if (!bStored || bImaginary)
            Refuse("no value of channel " + std::to_string(nNumber) + ", of the type " + oType.Describe() +
                       ", equals " + oChannel.moValue.GetText() +
                       (oChannel.moImaginary.GetReal() == 0 ? "" : " with " + oChannel.moImaginary.GetText() + " i"),
                   oPlace);
        oValue.resize(nBytes);
        mpoState->moTypes.push_back(oType);
        mpoState->moValues.push_back(std::move(oValue));
    }
    mpoState->moRecord.moTags = AuxiliaryData(static_cast<unsigned int>(oChannels.size()));
}

ConstRasterDataset::~ConstRasterDataset() = default;

AuxiliaryData ConstRasterDataset::ReadAuxiliaryData()
{
    CheckOpen();
    return mpoState->moRecord.moTags;
}

void ConstRasterDataset::WriteAuxiliaryData(const AuxiliaryData& oData)
{
    CheckOpen();
    CheckRecord(oData);
    mpoState->moRecord.moTags = oData;
}

krv::ogc::cs::ICRS* ConstRasterDataset::ReadCRS() const
{
    return mpoState->moRecord.CloneCRS();
}

void ConstRasterDataset::UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const
{
    CheckOpen();
    mpoState->moRecord.mpoCRS.reset(oCRS.Clone());
}

IRasterIO* ConstRasterDataset::GetRasterIO(const std::vector<unsigned int>& oChannels)
{
    const Place oPlace = Place::Current();
    CheckOpen(oPlace);
    static_cast<void>(detail::CheckChannelList(oChannels, mpoState->moTypes, GetName(), oPlace));
    Bytes oPixel;
    for (const unsigned int nChannel : oChannels)
        oPixel.insert(oPixel.end(), mpoState->moValues[nChannel - 1].begin(), mpoState->moValues[nChannel - 1].end());
    return new ConstIO(GetName(), mpoState->mnWidth, mpoState->mnHeight, std::move(oPixel));
}

unsigned int ConstRasterDataset::GetWidth() const
{
    return mpoState->mnWidth;
}

unsigned int ConstRasterDataset::GetHeight() const
{
    return mpoState->mnHeight;
}

unsigned int ConstRasterDataset::GetChanCount() const
{
    return static_cast<unsigned int>(mpoState->moTypes.size());
}

IChannelInfo* ConstRasterDataset::GetChannelInfo(unsigned int nChannel) const
{
    const Place oPlace = Place::Current();
    CheckOpen(oPlace);
    if (nChannel == 0 || nChannel > GetChanCount())
        Refuse("channel " + std::to_string(nChannel) + " does not exist; there are " + std::to_string(GetChanCount()),
               oPlace);
    return new ChannelInfo(mpoState->moTypes[nChannel - 1]);
}

const krv::ogc::cs::GeocodingInfo& ConstRasterDataset::GetGeocoding() const
{
    return mpoState->moRecord.moGeocoding;
}

void ConstRasterDataset::SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    const Place oPlace = Place::Current();
    CheckOpen(oPlace);
    if (!oInfo.IsInvertible())
        Refuse("a geocoding without an inverse cannot be written", oPlace);
    mpoState->moRecord.moGeocoding = oInfo;
}

} // namespace krv::datasources
