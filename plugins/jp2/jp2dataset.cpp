#include "plugins/jp2/jp2dataset.h"

#include "datasources/interfaces/channelinfo.h"
#include "plugins/jp2/reading/jp2source.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/nspio/warning.h"

#include <algorithm>
#include <bit>

namespace krv::plugins::jp2
{

namespace
{

constexpr unsigned int MOST_REDUCED = 24;
// Levels down to where the larger side is below it.
constexpr std::uint32_t SMALLEST_LEVEL = 1;

} // namespace

Jp2Dataset::Jp2Dataset(const std::string& fileName, krv::datasources::IFileFormat* poFormat)
    : Dataset(fileName, poFormat)
{
    FindCodestream(std::make_shared<support::File>(fileName, support::File::Mode::eRead));
    moBook = krv::datasources::AuxiliaryData(static_cast<unsigned int>(mpoStream->GetComponents().size()));
    SetImage(std::make_shared<Jp2Source>(mpoStream, 0));
}

Jp2Dataset::~Jp2Dataset() = default;

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
    krv::nspio::Warning::Warn(GetFileName() + ": " + trouble);
}

void Jp2Dataset::Close()
{
    Dataset::Close();
    moLevels.clear();
}

krv::datasources::IChannelInfo* Jp2Dataset::GetChannelInfo(unsigned int nChannel) const
{
    const support::Plane& oPlane = GetLayout().GetChannelPlane(nChannel);
    const Component& oComponent = mpoStream->GetComponents()[nChannel - 1];
    return new krv::datasources::ChannelInfo(
        krv::gobs::DataType(oComponent.mnBits, oComponent.mbSigned, false, 0, 0, false), oPlane.moType);
}

krv::datasources::AuxiliaryData Jp2Dataset::ReadAuxiliaryData()
{
    using Use = ImageHeader::Use;
    CheckOpen();
    const std::vector<Component>& oComponents = mpoStream->GetComponents();
    krv::datasources::AuxiliaryData oData(static_cast<unsigned int>(oComponents.size()));
    const auto SetText = [&oData](const char* pKey, const std::string& text)
    {
        if (!text.empty())
            oData.SetFileMetadataValue(pKey, text);
    };
    SetText("ColorSpace", moHeader.GetColourSpace());
    SetText("ICCProfile", moHeader.moProfile);
    SetText("Comment", mpoStream->GetComment());
    if (moHeader.moResolution)
    {
        constexpr double CENTIMETRES = 100.0;
        SetText("XResolution", NumberText(moHeader.moResolution->first / CENTIMETRES));
        SetText("YResolution", NumberText(moHeader.moResolution->second / CENTIMETRES));
        SetText("ResolutionUnit", "centimetre");
    }

    static constexpr const char* COLOURS[] = {"Red", "Green", "Blue"};
    constexpr unsigned int SRGB = 16;
    const bool bRed = moHeader.mnColours == SRGB && oComponents.size() >= 3;
    for (unsigned int nAt = 0; nAt < oComponents.size(); ++nAt)
    {
        const auto oTold = moHeader.moChannels.find(nAt);
        std::string interpretation;
        if (moHeader.moPalette)
            interpretation = nAt == moHeader.mnPaletteComponent ? "Palette" : "";
        else if (oTold == moHeader.moChannels.end())
            interpretation = bRed && nAt < 3 && moHeader.moChannels.empty() ? COLOURS[nAt]
                             : nAt == 0 && oComponents.size() <= 2 && !bRed ? "Gray"
                                                                            : "";
        else if (oTold->second.meUse == Use::eAlpha || oTold->second.meUse == Use::ePremultiplied)
        {
            interpretation = "Alpha";
            oData.SetChanMetadataValue("AlphaKind", oTold->second.meUse == Use::eAlpha ? "Straight" : "Premultiplied",
                                       nAt + 1);
        }
        else if (oTold->second.meUse == Use::eColour && oTold->second.mnColour >= 1 && oTold->second.mnColour <= 3)
            interpretation = bRed ? COLOURS[oTold->second.mnColour - 1] : oComponents.size() <= 2 ? "Gray" : "";
        if (!interpretation.empty())
            oData.SetChanMetadataValue("ColorInterp", interpretation, nAt + 1);
    }
    return oData;
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
    CheckOpen();
    return new support::OverviewManager(*this, *this);
}

std::vector<unsigned int> Jp2Dataset::GetPCTList() const
{
    CheckOpen();
    return moHeader.moPalette ? std::vector<unsigned int>{1} : std::vector<unsigned int>{};
}

void Jp2Dataset::CheckPCT(unsigned int nPCT, const Place& oPlace) const
{
    if (nPCT != 1 || GetPCTList().empty())
        Refuse("pseudocolour table " + std::to_string(nPCT) + " does not exist", oPlace);
}

krv::gobs::PCT* Jp2Dataset::GetPCT(unsigned int nPCT) const
{
    CheckPCT(nPCT, Place::Current());
    return new krv::gobs::PCT(*moHeader.moPalette);
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

void Jp2Dataset::RefusePCT(const Place& oPlace) const
{
    Refuse("pseudocolour tables cannot be written", oPlace);
}

unsigned int Jp2Dataset::CreatePCT(const krv::gobs::PCT&, unsigned int)
{
    RefusePCT(Place::Current());
}

void Jp2Dataset::UpdatePCT(unsigned int, const krv::gobs::PCT&)
{
    RefusePCT(Place::Current());
}

void Jp2Dataset::SetPCTDescription(unsigned int, const std::string&)
{
    RefusePCT(Place::Current());
}

void Jp2Dataset::DeletePCT(unsigned int)
{
    RefusePCT(Place::Current());
}

} // namespace krv::plugins::jp2
