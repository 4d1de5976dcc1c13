#include "plugins/jp2/jp2dataset.h"

#include "datasources/interfaces/channelinfo.h"
#include "plugins/jp2/reading/jp2source.h"
#include "plugins/jp2/recordbox.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <algorithm>
#include <bit>

namespace krv::plugins::jp2
{

namespace
{

constexpr unsigned int MOST_REDUCED = 24; // level numbers are powers of two
// Levels down to where the larger side is below it.
constexpr std::uint32_t SMALLEST_LEVEL = 1;

} // namespace

Jp2Dataset::Jp2Dataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat)
    : Dataset(fileName, poFormat), FacetsBeside(this)
{
    FindCodestream(std::make_shared<support::File>(fileName, support::File::Mode::eRead));
    moBook = krv::datasources::AuxiliaryData(static_cast<unsigned int>(mpoStream->GetComponents().size()));
    SetImage(std::make_shared<Jp2Source>(mpoStream, 0));
}

Jp2Dataset::Jp2Dataset(krv::datasources::IFileFormat* poFormat, std::shared_ptr<Jp2Writer> poWriter)
    : Dataset(poFormat, poWriter), FacetsBeside(this), mpoWriter(std::move(poWriter))
{
}

Jp2Dataset::~Jp2Dataset()
{
    Abandon();
}

void Jp2Dataset::Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes)
{
    const Place oPlace = Place::Current();
    CheckCreate(nWidth, nHeight, oTypes, oPlace);
    mpoWriter->Make(nWidth, nHeight, oTypes, oPlace);
    moBook = krv::datasources::AuxiliaryData(static_cast<unsigned int>(oTypes.size()));
    SetImage(mpoWriter->GetTiles());
}

void Jp2Dataset::FindCodestream(const std::shared_ptr<support::File>& poFile)
{
    unsigned char aBytes[8] = {};
    const std::size_t nRead = poFile->ReadUpTo(0, aBytes, sizeof(aBytes));
    if (IsCodestream(aBytes, nRead))
    {
        mpoStream = std::make_shared<Codestream>(poFile, 0, poFile->GetSize());
        return;
    }
    std::string trouble;
    moBoxes = ListBoxes(*poFile, 0, poFile->GetSize(), &trouble);
    const auto Find = [this](std::uint32_t nType)
    {
        return std::find_if(moBoxes.begin(), moBoxes.end(), [nType](const Box& oBox) { return oBox.mnType == nType; });
    };
    const auto oStream = Find(BoxType("jp2c"));
    if (oStream == moBoxes.end())
        throw krv::FileFormatException(poFile->GetName(), poFile->GetName() + ": there is no codestream in the file" +
                                                              (trouble.empty() ? "" : ": " + trouble));
    Complain(trouble);
    mpoStream = std::make_shared<Codestream>(poFile, oStream->mnOffset, oStream->mnOffset + oStream->mnBytes);
    const auto oHeader = Find(BoxType("jp2h"));
    if (oHeader == moBoxes.end())
        return;
    std::string damage;
    moHeader =
        ReadImageHeader(*poFile, *oHeader, static_cast<unsigned int>(mpoStream->GetComponents().size()), &damage);
    Complain(damage);
}

void Jp2Dataset::Complain(const std::string& trouble) const
{
    if (trouble.empty() || !moComplaints.insert(trouble).second)
        return;
    const bool bNamed = trouble.starts_with(GetFileName());
    krv::nspio::Warning::Warn(bNamed ? trouble : GetFileName() + ": " + trouble);
}

void Jp2Dataset::Close()
{
    Dataset::Close();
    moLevels.clear();
}

krv::datasources::IChannelInfo* Jp2Dataset::GetChannelInfo(unsigned int nChannel) const
{
    if (mpoWriter)
        return Dataset::GetChannelInfo(nChannel);
    const support::Plane& oPlane = GetLayout().GetChannelPlane(nChannel);
    const Component& oComponent = mpoStream->GetComponents()[nChannel - 1];
    return new krv::datasources::ChannelInfo(
        krv::gobs::DataType(oComponent.mnBits, oComponent.mbSigned, false, 0, 0, false), oPlane.moType);
}

krv::datasources::AuxiliaryData Jp2Dataset::ReadAuxiliaryData()
{
    GetImage();
    if (mpoWriter)
        return mpoWriter->GetRecord();
    krv::datasources::AuxiliaryData oRecord = ReadRecord();
    GetSidecars().AddTags(oRecord);
    return oRecord;
}

support::Sidecars::Needs Jp2Dataset::GetNeeds() const
{
    return {true, GetPlace().moGeocoding.IsIdentity(), GetPlace().mpoCRS == nullptr, true};
}

void Jp2Dataset::KeepBeside(const std::function<void(support::AuxXml&)>& oAdd) const
{
    if (mpoWriter->HasBoxes())
        return;
    support::AuxXml oAuxXml = GetSidecars().GetAuxXml();
    oAdd(oAuxXml);
    GetSidecars().SetAuxXml(std::move(oAuxXml));
}

bool Jp2Dataset::KeepsPixels() const
{
    GetImage();
    return mpoWriter ? mpoWriter->IsLossless() : mpoStream->GetCoding(0).mbReversible;
}

void Jp2Dataset::WriteAuxiliaryData(const krv::datasources::AuxiliaryData& oData)
{
    CheckWriting("metadata cannot be written", Place::Current());
    if (oData.GetChannelCount() != GetChanCount())
        Refuse("the metadata are those of " + std::to_string(oData.GetChannelCount()) + " channels, not of " +
               std::to_string(GetChanCount()));
    mpoWriter->SetRecord(oData);
    KeepBeside([&oData](support::AuxXml& oAuxXml) { oAuxXml.SetTags(oData); });
}

krv::datasources::AuxiliaryData Jp2Dataset::ReadRecord() const
{
    krv::datasources::AuxiliaryData oData(static_cast<unsigned int>(mpoStream->GetComponents().size()));
    const auto SetText = [&oData](const char* pKey, const std::string& text)
    {
        if (!text.empty())
            oData.SetFileMetadataValue(pKey, text);
    };
    SetText("ColorSpace", moHeader.GetColourSpace());
    SetText("ICCProfile", moHeader.moProfile);
    SetText("Comment", mpoStream->GetComment());
    if (const auto oBytes = FindUuid(*mpoStream->GetFile(), moBoxes, XMP_UUID))
        SetText("XMP", std::string(oBytes->begin(), std::find(oBytes->begin(), oBytes->end(), 0)));
    if (moHeader.moResolution)
    {
        constexpr double CENTIMETRES = 100.0;
        SetText("XResolution", NumberText(moHeader.moResolution->first / CENTIMETRES));
        SetText("YResolution", NumberText(moHeader.moResolution->second / CENTIMETRES));
        SetText("ResolutionUnit", "centimetre");
    }
    DescribeChannels(oData);
    if (const auto oBytes = FindUuid(*mpoStream->GetFile(), moBoxes, RECORD_UUID))
        ReadRecordBox(std::string(oBytes->begin(), oBytes->end()), oData);
    return oData;
}

void Jp2Dataset::DescribeChannels(krv::datasources::AuxiliaryData& oData) const
{
    using Use = ImageHeader::Use;
    static constexpr const char* COLOURS[] = {"Red", "Green", "Blue"};
    constexpr unsigned int SRGB = 16;
    const unsigned int nChannels = oData.GetChannelCount();
    const bool bColours = moHeader.mnColours == SRGB && nChannels >= 3;
    const bool bGrey = !bColours && nChannels <= 2;
    for (unsigned int nAt = 0; nAt < nChannels; ++nAt)
    {
        const auto oTold = moHeader.moChannels.find(nAt);
        const ImageHeader::Channel oChannel = oTold != moHeader.moChannels.end() ? oTold->second
                                              : moHeader.moChannels.empty()
                                                  ? ImageHeader::Channel{Use::eColour, nAt + 1}
                                                  : ImageHeader::Channel{Use::eOther, 0};
        std::string interpretation;
        if (moHeader.moPalette)
            interpretation = nAt == moHeader.mnPaletteComponent ? "Palette" : "";
        else if (oChannel.meUse == Use::eAlpha || oChannel.meUse == Use::ePremultiplied)
        {
            interpretation = "Alpha";
            oData.SetChanMetadataValue("AlphaKind", oChannel.meUse == Use::eAlpha ? "Straight" : "Premultiplied",
                                       nAt + 1);
        }
        else if (oChannel.meUse == Use::eColour && oChannel.mnColour >= 1 && oChannel.mnColour <= 3)
            interpretation = bColours ? COLOURS[oChannel.mnColour - 1] : bGrey && oChannel.mnColour == 1 ? "Gray" : "";
        if (!interpretation.empty())
            oData.SetChanMetadataValue("ColorInterp", interpretation, nAt + 1);
    }
}

const GeoPlace& Jp2Dataset::GetPlace() const
{
    CheckOpen();
    if (!mpoPlace && mpoWriter)
    {
        mpoPlace = std::make_unique<GeoPlace>();
        support::ReadGeocoding(mpoWriter->GetGeoTags(), mpoPlace->moGeocoding);
        mpoPlace->mpoCRS = support::ReadCRS(mpoWriter->GetGeoTags(), GetFileName());
    }
    if (!mpoPlace)
    {
        std::vector<std::string> oTroubles;
        mpoPlace = std::make_unique<GeoPlace>(ReadGeoPlace(*mpoStream->GetFile(), moBoxes, oTroubles));
        for (const std::string& trouble : oTroubles)
            Complain(trouble);
    }
    return *mpoPlace;
}

krv::ogc::cs::ICRS* Jp2Dataset::ReadCRS() const
{
    const GeoPlace& oPlace = GetPlace();
    return oPlace.mpoCRS ? oPlace.mpoCRS->Clone() : mpoWriter ? nullptr : GetSidecars().ReadCRS().release();
}

const krv::ogc::cs::GeocodingInfo& Jp2Dataset::GetGeocoding() const
{
    if (!moGeocoding)
    {
        moGeocoding = GetPlace().moGeocoding;
        if (moGeocoding->IsIdentity() && !mpoWriter)
            moGeocoding = GetSidecars().ReadGeocoding().value_or(*moGeocoding);
    }
    return *moGeocoding;
}

void Jp2Dataset::SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    const Place oPlace = Place::Current();
    CheckWriting("the geocoding cannot be written", oPlace);
    if (!oInfo.IsInvertible())
        Refuse("a geocoding without an inverse cannot be written", oPlace);
    support::GeoTags oTags = mpoWriter->GetGeoTags();
    support::SetGeocoding(oTags, oInfo);
    mpoWriter->SetGeoTags(std::move(oTags));
    KeepBeside([&oInfo](support::AuxXml& oAuxXml) { oAuxXml.SetGeocoding(oInfo); });
    mpoPlace.reset();
    moGeocoding.reset();
}

void Jp2Dataset::UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const
{
    const Place oPlace = Place::Current();
    CheckWriting("the reference system cannot be written", oPlace);
    support::GeoTags oTags = mpoWriter->GetGeoTags();
    support::SetCRS(oTags, oCRS, GetFileName(), oPlace);
    mpoWriter->SetGeoTags(std::move(oTags));
    KeepBeside([&oCRS](support::AuxXml& oAuxXml) { oAuxXml.SetCRS(oCRS.GetWKT()); });
    mpoPlace.reset();
}

std::vector<support::LevelStore::Level> Jp2Dataset::GetLevels() const
{
    std::vector<Level> oLevels;
    const unsigned int nLevels = std::min(mpoStream->CountLevels(), MOST_REDUCED);
    for (unsigned int nReduce = 1; nReduce <= nLevels; ++nReduce)
    {
        const Resolution oResolution(*mpoStream, nReduce, 1);
        if (oResolution.GetWidth() < SMALLEST_LEVEL || oResolution.GetHeight() < SMALLEST_LEVEL)
            break;
        oLevels.push_back({1u << nReduce, oResolution.GetWidth(), oResolution.GetHeight()});
    }
    return oLevels;
}

std::shared_ptr<support::BlockImage> Jp2Dataset::OpenLevel(unsigned int nLevel)
{
    CheckOpen();
    std::shared_ptr<support::BlockImage>& poImage = moLevels[nLevel];
    if (!poImage)
    {
        const auto nReduce = static_cast<unsigned int>(std::bit_width(nLevel)) - 1;
        poImage = std::make_shared<support::BlockImage>(std::make_shared<Jp2Source>(mpoStream, nReduce), GetCache());
    }
    return poImage;
}

const krv::datasources::AuxiliaryData& Jp2Dataset::GetBook() const
{
    return moBook;
}

void Jp2Dataset::MakeLevel(const Level&, const krv::datasources::AuxiliaryData&, const Place& oPlace)
{
    Refuse("levels cannot be added: they are resolutions of the image", oPlace);
}

void Jp2Dataset::DropLevel(unsigned int, const krv::datasources::AuxiliaryData&, const Place& oPlace)
{
    Refuse("levels cannot be deleted: they are resolutions of the image", oPlace);
}

void Jp2Dataset::WriteBook(const krv::datasources::AuxiliaryData&, bool, const Place& oPlace)
{
    Refuse("levels are valid always: they are resolutions of the image", oPlace);
}

krv::datasources::IOverviewManager* Jp2Dataset::GetOverviewManager()
{
    GetImage();
    return mpoWriter ? nullptr : new support::OverviewManager(*this, *this);
}

const std::optional<krv::gobs::PCT>& Jp2Dataset::GetPalette() const
{
    return mpoWriter ? mpoWriter->GetPalette() : moHeader.moPalette;
}

std::vector<unsigned int> Jp2Dataset::GetPCTList() const
{
    CheckOpen();
    return GetPalette() ? std::vector<unsigned int>{1} : std::vector<unsigned int>{};
}

void Jp2Dataset::CheckPCT(unsigned int nPCT, const Place& oPlace) const
{
    if (nPCT != 1 || GetPCTList().empty())
        Refuse("pseudocolour table " + std::to_string(nPCT) + " does not exist", oPlace);
}

krv::gobs::PCT* Jp2Dataset::GetPCT(unsigned int nPCT) const
{
    CheckPCT(nPCT, Place::Current());
    return new krv::gobs::PCT(*GetPalette());
}

unsigned int Jp2Dataset::GetPCTChannel(unsigned int nPCT) const
{
    CheckPCT(nPCT, Place::Current());
    return moHeader.mnPaletteComponent + 1;
}

std::string Jp2Dataset::GetPCTDescription(unsigned int nPCT) const
{
    CheckPCT(nPCT, Place::Current());
    return {};
}

unsigned int Jp2Dataset::CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel)
{
    const Place oPlace = Place::Current();
    CheckWriting("pseudocolour tables cannot be written", oPlace);
    if (nChannel > 1 || !GetPCTList().empty())
        Refuse("JPEG 2000 holds one pseudocolour table, for channel 1", oPlace);
    mpoWriter->SetPalette(oTable, oPlace);
    return 1;
}

void Jp2Dataset::UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable)
{
    const Place oPlace = Place::Current();
    CheckWriting("pseudocolour tables cannot be written", oPlace);
    CheckPCT(nPCT, oPlace);
    mpoWriter->SetPalette(oTable, oPlace);
}

void Jp2Dataset::SetPCTDescription(unsigned int, const std::string&)
{
    Refuse("JPEG 2000 has no place for the description of a pseudocolour table");
}

void Jp2Dataset::DeletePCT(unsigned int nPCT)
{
    const Place oPlace = Place::Current();
    CheckWriting("pseudocolour tables cannot be deleted", oPlace);
    CheckPCT(nPCT, oPlace);
    mpoWriter->SetPalette(std::nullopt, oPlace);
}

std::string Jp2Dataset::GetVariant()
{
    if (!mpoStream)
        return {};
    const std::string kind = moBoxes.empty() ? "codestream" : "JP2";
    return kind + (mpoStream->GetCoding(0).mbReversible ? ", reversible" : ", not reversible");
}

} // namespace krv::plugins::jp2
