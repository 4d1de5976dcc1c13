#include "plugins/raw/rawdataset.h"

#include "datasources/metadata/droppedtags.h"
#include "gobs/pct/pct.h"
#include "plugins/raw/envirecord.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/ogc/cs/crsfactory.h"

#include <cstdio>
#include <utility>

namespace krv::plugins::raw
{

using krv::datasources::AuxiliaryData;

namespace
{

// The name of the data, or of the header where there are none to open.
const std::string& GetMainName(const RawFiles& oFiles)
{
    if (oFiles.moData.empty())
        throw FileFormatException(oFiles.moHeader, oFiles.moHeader +
                                                       ": no data file lies beside the header under a usual name; "
                                                       "open the data file by its own");
    return oFiles.moData;
}

// What is wrong with the header is said before what is missing beside it.
RawImage ReadWhole(RawFiles oFiles)
{
    RawImage oImage = ReadImage(std::move(oFiles));
    GetMainName(oImage.moFiles);
    return oImage;
}

} // namespace

void RawOptions::List(support::Options& oOptions)
{
    oOptions.AddChoice("INTERLEAVE", meInterleave,
                       {{"BSQ", Interleave::eBand},
                        {"BIL", Interleave::eLine},
                        {"BIP", Interleave::ePixel},
                        {"BAND", Interleave::eBand},
                        {"LINE", Interleave::eLine},
                        {"PIXEL", Interleave::ePixel}});
    oOptions.AddChoice("BYTEORDER", mbBigEndian, {{"LITTLE", false}, {"BIG", true}});
}

RawDataset::RawDataset(RawFiles oFiles, krv::datasources::IFileFormat* poFormat)
    : Dataset(oFiles.moData.empty() ? oFiles.moHeader : oFiles.moData, poFormat), FacetsBeside(this),
      moImage(ReadWhole(std::move(oFiles)))
{
    ShowImage(std::make_shared<support::File>(moImage.moFiles.moData, support::File::Mode::eRead));
}

RawDataset::RawDataset(krv::datasources::IFileFormat* poFormat, RawFiles oFiles, std::shared_ptr<RawWriter> poWriter)
    : Dataset(poFormat, poWriter), FacetsBeside(this), moImage(ReadWhole(std::move(oFiles))),
      mpoWriter(std::move(poWriter))
{
    ShowImage(mpoWriter->GetFile());
}

RawDataset::RawDataset(krv::datasources::IFileFormat* poFormat, const RawOptions& oOptions,
                       std::shared_ptr<RawWriter> poWriter)
    : Dataset(poFormat, poWriter), FacetsBeside(this), moOptions(oOptions), mpoWriter(std::move(poWriter))
{
}

RawDataset::~RawDataset()
{
    Abandon();
}

void RawDataset::ShowImage(std::shared_ptr<support::File> poFile)
{
    const RawForm& oForm = moImage.moForm;
    const auto oBytes = oForm.CountBytes();
    if (!oBytes || *oBytes > poFile->GetSize())
        throw FileFormatException(poFile->GetName(), poFile->GetName() + " is shorter than its header says: " +
                                                         std::to_string(poFile->GetSize()) + " bytes in place of " +
                                                         (oBytes ? std::to_string(*oBytes) : "more than any file has"));
    const auto BeforeWrite = [this]
    {
        mpoWriter->BeginChange();
        ForgetPixelsBeside();
    };
    mpoSource =
        std::make_shared<support::PlainSource>(std::move(poFile), oForm.PlacePlanes(), oForm.IsSwapped(),
                                               oForm.MakeLayout(), IsWritten() ? BeforeWrite : std::function<void()>());
    SetImage(mpoSource);
}

void RawDataset::Create(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes)
{
    const Place oPlace = Place::Current();
    CheckCreate(nWidth, nHeight, oTypes, oPlace);
    for (const krv::gobs::DataType& oType : oTypes)
        if (oType != oTypes.front())
            Refuse("the header cannot mix the types " + oTypes.front().Describe() + " and " + oType.Describe(), oPlace);
    if (FindTypeCode(oTypes.front()) == 0)
        Refuse("the header has no type " + oTypes.front().Describe(), oPlace);
    if (oTypes.size() > RawForm::MOST_CHANNELS)
        Refuse("more than " + std::to_string(RawForm::MOST_CHANNELS) + " channels cannot be laid out", oPlace);
    RawImage oImage;
    oImage.moForm.mnWidth = nWidth;
    oImage.moForm.mnHeight = nHeight;
    oImage.moForm.mnChannels = static_cast<unsigned int>(oTypes.size());
    oImage.moForm.moType = oTypes.front();
    oImage.moForm.meInterleave = moOptions.meInterleave;
    oImage.moForm.mbBigEndian = moOptions.mbBigEndian;
    const auto oBytes = oImage.moForm.CountBytes();
    if (!oBytes)
        Refuse("the image is too large", oPlace);
    oImage.moFiles = {RawKind::eEnvi, GetFileName(), mpoWriter->GetHeaderName(), {}};
    WriteForm(oImage.moForm, oImage.moHeader);
    oImage.moTags = AuxiliaryData(oImage.moForm.mnChannels);
    mpoWriter->Make(*oBytes);
    moImage = std::move(oImage);
    StoreHeader();
    ShowImage(mpoWriter->GetFile());
}

krv::datasources::IRasterIO* RawDataset::GetRasterIO(const std::vector<unsigned int>& oChannels)
{
    GetImage();
    return new support::PlainIO(mpoSource, oChannels);
}

krv::datasources::FileAccessState RawDataset::Delete()
{
    const bool bNamed = mpoWriter == nullptr || mpoWriter->IsNamed();
    const krv::datasources::FileAccessState eState = Dataset::Delete();
    if (bNamed && eState == krv::datasources::eDone && !moImage.moFiles.moHeader.empty())
        std::remove(moImage.moFiles.moHeader.c_str());
    return eState;
}

void RawDataset::Close()
{
    Dataset::Close();
    mpoSource.reset();
}

HeaderText& RawDataset::GetHeader(const char* pWhat, const Place& oPlace) const
{
    CheckWriting(pWhat, oPlace);
    if (!HasHeader())
        Refuse(std::string(pWhat) + ": a file of this kind has no place for it", oPlace);
    return moImage.moHeader;
}

void RawDataset::StoreHeader() const
{
    mpoWriter->SetHeader(moImage.moHeader.Write());
}

void RawDataset::StoreBeside(support::AuxXml oAuxXml) const
{
    GetSidecars().SetAuxXml(std::move(oAuxXml));
}

AuxiliaryData RawDataset::ReadAuxiliaryData()
{
    GetImage();
    AuxiliaryData oTags = moImage.moTags;
    GetSidecars().AddTags(oTags);
    return oTags;
}

void RawDataset::WriteAuxiliaryData(const AuxiliaryData& oData)
{
    const Place oPlace = Place::Current();
    CheckWriting("metadata cannot be written", oPlace);
    if (oData.GetChannelCount() != GetChanCount())
        Refuse("the metadata are those of " + std::to_string(oData.GetChannelCount()) + " channels, not of " +
                   std::to_string(GetChanCount()),
               oPlace);
    support::AuxXml oAuxXml = GetSidecars().GetAuxXml();
    if (!HasHeader())
    {
        for (const auto& [key, value] : moImage.moTags.GetFileMetadata())
            if (oData.GetFileMetadataValue(key) != value)
                Refuse("\"" + key + "\" is said by the file itself, which has no place for another value", oPlace);
        oAuxXml.SetTags(oData);
        return StoreBeside(std::move(oAuxXml));
    }
    HeaderText oHeader = moImage.moHeader;
    // What lay beside and is removed would be new to the header.
    AuxiliaryData oNew = oData;
    krv::datasources::DropRemoved(oNew, oAuxXml.GetTags());
    oAuxXml.SetTags(WriteTags(std::move(oNew), oHeader));
    moImage.moHeader = std::move(oHeader);
    moImage.moTags = ReadTags(moImage.moHeader, GetChanCount());
    StoreHeader();
    StoreBeside(std::move(oAuxXml));
}

std::unique_ptr<krv::ogc::cs::ICRS> RawDataset::ReadOwnCRS() const
{
    if (moImage.moFiles.meKind == RawKind::eHeight)
        return krv::ogc::cs::CreateCRSFromEPSG(4326);
    std::string trouble;
    auto poCRS = raw::ReadCRS(moImage.moHeader, &trouble);
    if (!trouble.empty())
        krv::nspio::Warning::Warn(moImage.moFiles.moHeader + ": " + trouble);
    return poCRS;
}

krv::ogc::cs::ICRS* RawDataset::ReadCRS() const
{
    GetImage();
    auto poCRS = ReadOwnCRS();
    return (poCRS ? std::move(poCRS) : GetSidecars().ReadCRS()).release();
}

void RawDataset::UpdateCRS(const krv::ogc::cs::ICRS& oCRS) const
{
    StoreCRS(&oCRS, "the reference system cannot be written", Place::Current());
}

// Null removes it.
void RawDataset::StoreCRS(const krv::ogc::cs::ICRS* poCRS, const char* pRefusal, const Place& oPlace) const
{
    CheckWriting(pRefusal, oPlace);
    if (moImage.moFiles.meKind == RawKind::eHeight)
        Refuse("the reference system of elevation tiles is fixed", oPlace);
    support::AuxXml oAuxXml = GetSidecars().GetAuxXml();
    HeaderText oHeader = moImage.moHeader;
    const bool bHeader = poCRS != nullptr && HasHeader() && WriteCRS(*poCRS, oHeader);
    if (!bHeader)
        raw::RemoveCRS(oHeader);
    oAuxXml.SetCRS(bHeader || poCRS == nullptr ? std::string() : poCRS->GetWKT());
    moImage.moHeader = std::move(oHeader);
    if (HasHeader())
        StoreHeader();
    StoreBeside(std::move(oAuxXml));
}

const krv::ogc::cs::GeocodingInfo& RawDataset::GetGeocoding() const
{
    if (!moGeocoding)
        moGeocoding = moImage.moGeocoding ? moImage.moGeocoding : GetSidecars().ReadGeocoding();
    if (!moGeocoding)
        moGeocoding.emplace();
    return *moGeocoding;
}

void RawDataset::SetGeocoding(const krv::ogc::cs::GeocodingInfo& oInfo)
{
    const Place oPlace = Place::Current();
    if (!oInfo.IsInvertible())
        Refuse("a geocoding without an inverse cannot be written", oPlace);
    StoreGeocoding(&oInfo, "the geocoding cannot be written", oPlace);
}

// Null removes it.
void RawDataset::StoreGeocoding(const krv::ogc::cs::GeocodingInfo* poInfo, const char* pRefusal, const Place& oPlace)
{
    CheckWriting(pRefusal, oPlace);
    if (!HasHeader() && moImage.moGeocoding)
        Refuse("the geocoding is said by the file itself, which has no place for another one", oPlace);
    support::AuxXml oAuxXml = GetSidecars().GetAuxXml();
    HeaderText oHeader = moImage.moHeader;
    const bool bHeader = poInfo != nullptr && HasHeader() && WriteGeocoding(*poInfo, ReadOwnCRS().get(), oHeader);
    if (!bHeader)
        raw::RemoveGeocoding(oHeader);
    oAuxXml.SetGeocoding(bHeader || poInfo == nullptr ? std::nullopt : std::optional(*poInfo));
    moImage.moHeader = std::move(oHeader);
    moImage.moGeocoding = bHeader ? std::optional(*poInfo) : std::nullopt;
    moGeocoding = poInfo != nullptr ? *poInfo : krv::ogc::cs::GeocodingInfo();
    if (HasHeader())
        StoreHeader();
    StoreBeside(std::move(oAuxXml));
}

support::Sidecars::Needs RawDataset::GetNeeds() const
{
    return {true, !moImage.moGeocoding, ReadOwnCRS() == nullptr, true};
}

std::vector<unsigned int> RawDataset::GetPCTList() const
{
    return ReadClasses(moImage.moHeader) ? std::vector<unsigned int>{1} : std::vector<unsigned int>();
}

void RawDataset::CheckPCT(unsigned int nPCT, const Place& oPlace) const
{
    if (nPCT != 1 || GetPCTList().empty())
        Refuse("there is no colour table " + std::to_string(nPCT), oPlace);
}

krv::gobs::PCT* RawDataset::GetPCT(unsigned int nPCT) const
{
    CheckPCT(nPCT, Place::Current());
    return new krv::gobs::PCT(*ReadClasses(moImage.moHeader));
}

unsigned int RawDataset::GetPCTChannel(unsigned int nPCT) const
{
    CheckPCT(nPCT, Place::Current());
    return 1;
}

std::string RawDataset::GetPCTDescription(unsigned int nPCT) const
{
    CheckPCT(nPCT, Place::Current());
    return {};
}

void RawDataset::StorePCT(const krv::gobs::PCT& oTable, const Place& oPlace)
{
    HeaderText oHeader = GetHeader("a colour table cannot be written", oPlace);
    if (!WriteClasses(oTable, oHeader))
        Refuse("the header holds opaque colours of 8 bits for the values from 0 on alone", oPlace);
    moImage.moHeader = std::move(oHeader);
    StoreHeader();
}

unsigned int RawDataset::CreatePCT(const krv::gobs::PCT& oTable, unsigned int nChannel)
{
    const Place oPlace = Place::Current();
    if (!GetPCTList().empty() || nChannel > 1)
        Refuse("the header holds one colour table, of channel 1", oPlace);
    StorePCT(oTable, oPlace);
    return 1;
}

void RawDataset::UpdatePCT(unsigned int nPCT, const krv::gobs::PCT& oTable)
{
    CheckPCT(nPCT, Place::Current());
    StorePCT(oTable, Place::Current());
}

void RawDataset::SetPCTDescription(unsigned int nPCT, const std::string&)
{
    CheckPCT(nPCT, Place::Current());
    Refuse("a colour table has no description");
}

void RawDataset::DeletePCT(unsigned int nPCT)
{
    CheckPCT(nPCT, Place::Current());
    RemoveClasses(GetHeader("a colour table cannot be deleted", Place::Current()));
    StoreHeader();
}

} // namespace krv::plugins::raw
