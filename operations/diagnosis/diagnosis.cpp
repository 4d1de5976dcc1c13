#include "operations/diagnosis/diagnosis.h"

#include "datasources/formatregistrar/winformatregistrar.h"
#include "datasources/interfaces/filekind.h"
#include "datasources/interfaces/formatplugin.h"
#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/ilayoutdataset.h"
#include "datasources/interfaces/ilinkeddataset.h"
#include "datasources/interfaces/imathmodeldataset.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/interfaces/irasterio.h"
#include "datasources/interfaces/isidecardataset.h"
#include "datasources/interfaces/iverifieddataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "gobs/pct/pct.h"
#include "gobs/raster/raster.h"
#include "operations/job/exceptions.h"
#include "operations/source/sourcefile.h"
#include "toolkit/core/core.h"
#include "toolkit/mathmodel/imathmodel.h"
#include "toolkit/nspio/warning.h"
#include "toolkit/ogc/cs/icrs.h"

#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>

namespace krv::operations
{

using namespace krv::datasources;

namespace
{

constexpr std::size_t HEADER_BYTES = 4096;

} // namespace

InstallationCheck::InstallationCheck() : moHome(GetFormatHome())
{
    CheckHome();
    CheckRegistry();
    CheckManager();
}

InstallationCheck::~InstallationCheck() = default;

void InstallationCheck::Good(const std::string& subject, const std::string& found)
{
    moFindings.push_back({true, subject, found, {}});
}

void InstallationCheck::Bad(const std::string& subject, const std::string& found, const std::string& remedy)
{
    moFindings.push_back({false, subject, found, remedy});
}

void InstallationCheck::CheckHome()
{
    const std::string variable = IMPGetEnv("KRVHOME");
    const std::string origin = variable.empty() ? "KRVHOME is not set; the home beside the library" : "from KRVHOME";
    if (std::filesystem::is_directory(moHome))
        Good("home " + moHome, origin);
    else
        Bad("home " + moHome, origin + "; there is no such folder",
            variable.empty() ? "reinstall, or set KRVHOME" : "unset KRVHOME, or set it to an installation");
}

void InstallationCheck::CheckRegistry()
{
    const std::string path = moHome + "/etc/" + GetFormatRegistryFilename();
    const std::string subject = "registry " + path;
    const std::string why = WhyUnreadable(path);
    if (!why.empty())
        return Bad(subject, why, "reinstall, or set KRVHOME to an installation");
    std::vector<std::string> oDescriptions;
    try
    {
        oDescriptions = ReadFormatRegistry(path);
    }
    catch (...)
    {
        return Bad(subject, CurrentMessage(), "mend the XML, or reinstall");
    }
    if (oDescriptions.empty())
        return Bad(subject, "lists no format", "reinstall, or add <Format>name.xml</Format> entries to <Formats>");
    Good(subject, fmt::format("lists {} format{}", oDescriptions.size(), oDescriptions.size() == 1 ? "" : "s"));
    for (const std::string& description : oDescriptions)
        CheckDescription(description);
}

void InstallationCheck::CheckDescription(const std::string& description)
{
    if (description.empty())
        return Bad("registry " + moHome + "/etc/" + GetFormatRegistryFilename(), "an entry is empty",
                   "name a description in <Format>, or take the entry out");
    const std::string path = moHome + "/etc/qrfformats/" + description;
    const std::string subject = "description " + description;
    const std::string why = WhyUnreadable(path);
    if (!why.empty())
        return Bad(subject, path + ": " + why, "reinstall the plug-in, or take the entry out of the registry");
    try
    {
        const std::string object = ReadFormatObject(path);
        if (object.empty())
            return Bad(subject, "names no library", "add <Object>name</Object> to <Format>, or reinstall the plug-in");
        Good(subject, "names the library " + GetFormatLibraryFilename(object, "so"));
        CheckPlugin(object);
    }
    catch (...)
    {
        Bad(subject, CurrentMessage(), "mend the XML, or reinstall the plug-in");
    }
}

void InstallationCheck::CheckPlugin(const std::string& object)
{
    const std::string library = GetFormatLibraryFilename(object, "so");
    const std::string subject = "plug-in " + library;
    const std::string path = GetFormatLibraryPath(library);
    void* const pLibrary = IMPOpenLibrary(path);
    if (pLibrary == nullptr)
        return Bad(subject, "does not load: " + IMPLibraryError(),
                   "reinstall the plug-in and the libraries that it needs");
    const auto pVersion = reinterpret_cast<int (*)()>(IMPFindSymbol(pLibrary, "GetQRFFormatVersion"));
    if (pVersion == nullptr || IMPFindSymbol(pLibrary, "RegisterQRFFormat") == nullptr)
        return Bad(subject, path + " is no format plug-in: an entry point is missing", "reinstall the plug-in");
    try
    {
        const int nVersion = pVersion();
        if (nVersion != KRV_QRF_FORMAT_VERSION)
            return Bad(subject, fmt::format("has version {}, wanted is {}", nVersion, KRV_QRF_FORMAT_VERSION),
                       "install the plug-in that belongs to this version");
        CheckBuilder(library, pLibrary);
    }
    catch (...)
    {
        Bad(subject, "fails while it registers: " + CurrentMessage(), "reinstall or report the plug-in");
    }
}

void InstallationCheck::CheckBuilder(const std::string& library, void* pLibrary)
{
    const auto pRegister = reinterpret_cast<IFileIOBuilder* (*)()>(IMPFindSymbol(pLibrary, "RegisterQRFFormat"));
    std::unique_ptr<IFileIOBuilder> poBuilder(pRegister());
    const IFileFormat* const poFormat = poBuilder != nullptr ? poBuilder->GetFileFormat() : nullptr;
    if (poFormat == nullptr)
        return Bad("plug-in " + library, "loads and offers no format", "reinstall or report the plug-in");
    const std::string name = poFormat->GetShortName();
    for (const LoadedPlugin& oOther : moPlugins)
    {
        if (oOther.name == name)
            return Bad("plug-in " + library, "offers the format " + name + ", which an entry before it has already",
                       "take one of the two entries out of the registry");
    }
    Good("plug-in " + library, fmt::format("loads; format {} ({})", name, poFormat->GetDescription()));
    moPlugins.push_back({name, std::move(poBuilder)});
}

// The manager's own warning would say the finding twice.
void InstallationCheck::CheckManager()
{
    const auto oFormerSink = krv::nspio::Warning::SetSink([](const std::string&, const std::string&, unsigned int) {});
    try
    {
        const std::size_t nFormats = DatasetManager::GetInstance()->GetFormatList().size();
        Good("start", fmt::format("{} format{} ready", nFormats, nFormats == 1 ? "" : "s"));
    }
    catch (...)
    {
        Bad("start", CurrentMessage(),
            "mend what failed above: nothing opens while one entry of the registry is broken");
    }
    krv::nspio::Warning::SetSink(oFormerSink);
}

namespace
{

using Header = std::array<unsigned char, HEADER_BYTES>;

std::size_t ReadHeader(const std::string& file, Header& oHeader)
{
    std::ifstream oStream(file, std::ios::binary);
    oStream.read(reinterpret_cast<char*>(oHeader.data()), static_cast<std::streamsize>(oHeader.size()));
    return static_cast<std::size_t>(oStream.gcount());
}

// Pixels are missing from a file that was cut short: the last ones show it first.
void ReadEnds(IDataset& oDataset, unsigned int nChannel)
{
    BasicReader oReader(&oDataset, {nChannel}, false);
    for (const unsigned int nTile : {0U, oReader.GetTileCount() - 1})
        const std::unique_ptr<krv::gobs::Raster> poTile(oReader.GetRaster(nTile));
}

// The blocks of the first and the last pixel.
void ReadEnds(IRasterIO& oIO)
{
    constexpr std::size_t LARGEST_PIXEL = 16;
    std::array<unsigned char, LARGEST_PIXEL> oPixel{};
    oIO.ReadWindow(0U, 0U, 1U, 1U, oPixel.data());
    oIO.ReadWindow(oIO.GetFileWidth() - 1, oIO.GetFileHeight() - 1, 1U, 1U, oPixel.data());
}

std::string DescribeOpened(IDataset& oDataset)
{
    const auto* const poRaster = dynamic_cast<IRasterDataset*>(&oDataset);
    if (poRaster == nullptr)
        return "it opens, and holds no image";
    if (poRaster->GetChanCount() == 0)
        return fmt::format("it opens: {} x {} pixels, no channels", poRaster->GetWidth(), poRaster->GetHeight());
    ReadEnds(oDataset, 1);
    ReadEnds(oDataset, poRaster->GetChanCount());
    return fmt::format("it opens: {} x {} pixels, {} channel{}", poRaster->GetWidth(), poRaster->GetHeight(),
                       poRaster->GetChanCount(), poRaster->GetChanCount() == 1 ? "" : "s");
}

constexpr const char* DAMAGE_REMEDY = "get an undamaged copy, or convert it to a plainer kind";

bool AreAllValid(const IOverviewManager& oLevels, unsigned int nLevel, unsigned int nChannels)
{
    bool bValid = true;
    for (unsigned int nChannel = 1; nChannel <= nChannels; ++nChannel)
        bValid = bValid && oLevels.IsValid(nChannel, nLevel);
    return bValid;
}

// Reads what the other verbs read beside pixels, one thing after the other, so that each that fails is named.
void TryParts(IDataset& oDataset, const std::string& subject, std::vector<Finding>& oFindings)
{
    const auto Try = [&](const std::string& what, const std::function<void()>& oRead)
    {
        try
        {
            oRead();
        }
        catch (...)
        {
            oFindings.push_back(
                {false, subject, fmt::format("{} cannot be read: {}", what, CurrentMessage()), DAMAGE_REMEDY});
        }
    };
    Try("the metadata", [&] { oDataset.ReadAuxiliaryData(); });
    Try("the reference system", [&] { std::unique_ptr<krv::ogc::cs::ICRS>(oDataset.ReadCRS()); });
    if (auto* const poRaster = dynamic_cast<IRasterDataset*>(&oDataset); poRaster != nullptr)
        Try("the levels",
            [&]
            {
                const std::unique_ptr<IOverviewManager> poLevels(poRaster->GetOverviewManager());
                // Levels beside the file: what keeps them from being used is a warning.
                if (poLevels == nullptr || poLevels->GetLevels().empty())
                    std::unique_ptr<IDataset>(
                        DatasetManager::GetInstance()->OpenFormat("GDBALL", oDataset.GetName(), eReadOnly));
                const bool bPixels = poLevels != nullptr && poRaster->GetChanCount() != 0;
                std::vector<unsigned int> oOutdated;
                for (const unsigned int nLevel : bPixels ? poLevels->GetLevels() : std::vector<unsigned int>())
                {
                    ReadEnds(*std::unique_ptr<IRasterIO>(poLevels->GetOverviewIO(nLevel, {1})));
                    if (!AreAllValid(*poLevels, nLevel, poRaster->GetChanCount()))
                        oOutdated.push_back(nLevel);
                }
                if (!oOutdated.empty())
                    oFindings.push_back(
                        {false, subject,
                         fmt::format("outdated levels are passed over, since pixels changed after they were made: {}",
                                     fmt::join(oOutdated, ", ")),
                         "make them anew", RemedyStep::eBuildLevels, oOutdated});
            });
    if (auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(&oDataset); poBitmaps != nullptr)
        Try("the bitmaps",
            [&]
            {
                for (const unsigned int nBitmap : poBitmaps->GetBitmapList())
                    ReadEnds(*std::unique_ptr<IRasterIO>(poBitmaps->GetBitmapIO({nBitmap})));
            });
    if (auto* const poModels = dynamic_cast<IMathModelDataset*>(&oDataset); poModels != nullptr)
        Try("the sensor models",
            [&]
            {
                for (const unsigned int nModel : poModels->GetMathModelList())
                    Try(fmt::format("sensor model {}", nModel),
                        [&] { std::unique_ptr<krv::mathmodel::IMathModel>(poModels->GetMathModel(nModel)); });
            });
    // What is wrong with one that is not used was said already.
    if (auto* const poSidecars = dynamic_cast<ISidecarDataset*>(&oDataset); poSidecars != nullptr)
        Try("the files beside it",
            [&]
            {
                for (const Sidecar& oSidecar : poSidecars->ListSidecars())
                    if (oSidecar.mbUsed || oSidecar.moTrouble.empty())
                        oFindings.push_back({true,
                                             "file " + oSidecar.moFile,
                                             fmt::format("says the {}{}{}", oSidecar.moSays,
                                                         oSidecar.mbUsed ? "" : ", which the file itself says",
                                                         oSidecar.moTrouble.empty() ? "" : "; " + oSidecar.moTrouble),
                                             {}});
            });
    if (const auto* const poTables = dynamic_cast<IPCTDataset*>(&oDataset); poTables != nullptr)
        Try("the colour tables",
            [&]
            {
                for (const unsigned int nTable : poTables->GetPCTList())
                    std::unique_ptr<krv::gobs::PCT>(poTables->GetPCT(nTable));
            });
}

// Where the pixels lie when they are not in the file. False when they cannot be had.
bool CheckLinks(const IDataset& oDataset, const std::string& subject, std::vector<Finding>& oFindings)
{
    const auto* const poLinked = dynamic_cast<const ILinkedDataset*>(&oDataset);
    bool bThere = true;
    for (const std::string& file : poLinked != nullptr ? poLinked->GetLinkedFiles() : std::vector<std::string>())
    {
        const std::string why = WhyUnreadable(file);
        bThere = bThere && why.empty();
        oFindings.push_back({why.empty(), subject,
                             fmt::format("its pixels lie in {}{}{}", file, why.empty() ? "" : ": ", why),
                             why.empty() ? "" : "put that file back to where the link leads, or link anew",
                             why.empty() ? RemedyStep::eNone : RemedyStep::eLinkAnew});
    }
    return bThere;
}

// A file that carries checksums is read to its last byte; each place that is wrong is named, up to a screenful.
void CompareChecksums(IDataset& oDataset, const std::string& subject, std::vector<Finding>& oFindings)
{
    constexpr std::size_t MOST_NAMED = 20;
    auto* const poVerified = dynamic_cast<IVerifiedDataset*>(&oDataset);
    if (poVerified == nullptr)
        return;
    const std::vector<std::string> oWrong = poVerified->Verify({});
    if (oWrong.empty())
        return oFindings.push_back({true, subject, "all checksums of the file are right", {}});
    for (std::size_t nAt = 0; nAt < std::min(oWrong.size(), MOST_NAMED); ++nAt)
        oFindings.push_back({false, subject, oWrong[nAt], DAMAGE_REMEDY});
    if (oWrong.size() > MOST_NAMED)
        oFindings.push_back(
            {false, subject, fmt::format("{} further places are damaged", oWrong.size() - MOST_NAMED), DAMAGE_REMEDY});
}

// What is warned of while the file is read is a finding too.
void CheckOpening(const std::string& file, const LoadedPlugin& oPlugin, std::vector<Finding>& oFindings)
{
    const std::string subject = "format " + oPlugin.name;
    std::vector<std::string> oWarnings;
    const auto oFormerSink = krv::nspio::Warning::SetSink(
        [&oWarnings](const std::string& message, const std::string&, unsigned int)
        {
            if (std::find(oWarnings.begin(), oWarnings.end(), message) == oWarnings.end())
                oWarnings.push_back(message);
        });
    try
    {
        const std::unique_ptr<IDataset> poDataset(oPlugin.builder->Open(file, eReadOnly));
        if (poDataset == nullptr)
            oFindings.push_back({false, subject, "recognises the file and opens nothing", "report the plug-in"});
        else if (CheckLinks(*poDataset, subject, oFindings))
        {
            CompareChecksums(*poDataset, subject, oFindings);
            oFindings.push_back({true, subject, "recognises the file; " + DescribeOpened(*poDataset), {}});
            TryParts(*poDataset, subject, oFindings);
        }
    }
    catch (...)
    {
        oFindings.push_back(
            {false, subject, "recognises the file and cannot read it: " + CurrentMessage(), DAMAGE_REMEDY});
    }
    krv::nspio::Warning::SetSink(oFormerSink);
    for (const std::string& warning : oWarnings)
        oFindings.push_back({false, subject, warning, "what is named is not used; get an undamaged copy, or mend it"});
}

void AskPlugin(const std::string& file, const LoadedPlugin& oPlugin, const Header& oHeader, bool& bRecognised,
               std::vector<Finding>& oFindings)
{
    try
    {
        const int nAnswer = oPlugin.builder->Identify(file, oHeader.data(), HEADER_BYTES, 0);
        if (nAnswer != 0)
            return oFindings.push_back(
                {true, "format " + oPlugin.name, fmt::format("not its own (answer {})", nAnswer), {}});
    }
    catch (...)
    {
        return oFindings.push_back(
            {false, "format " + oPlugin.name, "fails while it looks: " + CurrentMessage(), "report the plug-in"});
    }
    bRecognised = true;
    CheckOpening(file, oPlugin, oFindings);
}

} // namespace

std::string DescribeUnknown(const std::string& file)
{
    constexpr std::string_view ENVI = "ENVI";
    Header oHeader{};
    const auto nRead = ReadHeader(file, oHeader);
    if (nRead == 0)
        return "it is empty";
    const std::string kind = GuessFileKind(oHeader.data(), nRead);
    if (!kind.empty())
        return "it begins like " + kind;
    const std::string stem = std::filesystem::path(file).replace_extension().string();
    for (const std::string& header : {file + ".rsc", file + ".par", stem + ".par", stem + "_dem.par"})
    {
        std::error_code oNone;
        if (std::filesystem::is_regular_file(header, oNone))
            return fmt::format(
                "the header {} beside it is of a kind that is not read: write an ENVI header {}.hdr with "
                "its size and data type",
                header, file);
    }
    for (const std::string& header : {file + ".hdr", stem + ".hdr"})
    {
        std::error_code oNone;
        const std::size_t nBytes = std::filesystem::is_regular_file(header, oNone) ? ReadHeader(header, oHeader) : 0;
        if (nBytes < ENVI.size() || std::memcmp(oHeader.data(), ENVI.data(), ENVI.size()) != 0)
            continue;
        const std::string_view text(reinterpret_cast<const char*>(oHeader.data()), nBytes);
        const std::size_t nNext = text.find_first_not_of(" \t", ENVI.size());
        const bool bAlone = nNext == std::string_view::npos || text[nNext] == '\r' || text[nNext] == '\n';
        return fmt::format("the ENVI header {} beside it {}", header,
                           bAlone ? "tells of a file of another size, or is no text"
                                  : "says more than ENVI in its first line");
    }
    if (std::filesystem::path(file).extension() == ".hgt")
        return "an elevation tile is called by its place, such as N00E010.hgt, and has 1201 or 3601 samples a side";
    return {};
}

std::vector<Finding> CheckFile(const std::string& file, const std::vector<LoadedPlugin>& oPlugins)
{
    const std::string why = WhyUnreadable(file);
    if (!why.empty())
        return {{false, "file " + file, why, {}}};
    Header oHeader{};
    const std::size_t nBytes = ReadHeader(file, oHeader);
    const std::string kind = GuessFileKind(oHeader.data(), nBytes);
    std::vector<Finding> oFindings{{true,
                                    "file " + file,
                                    fmt::format("{} bytes; begins like {}", std::filesystem::file_size(file),
                                                kind.empty() ? "nothing that is known here" : kind),
                                    {}}};
    if (nBytes == 0)
        return {{false, "file " + file, "it is empty", "get the file again"}};
    bool bRecognised = false;
    for (const LoadedPlugin& oPlugin : oPlugins)
        AskPlugin(file, oPlugin, oHeader, bRecognised, oFindings);
    if (const std::string seems = bRecognised ? std::string() : DescribeUnknown(file); !seems.empty())
        oFindings.push_back({false, "file " + file, "no format recognises it: " + seems, {}});
    else if (!bRecognised)
        oFindings.push_back(
            {false, "file " + file, "no format recognises it",
             "install the plug-in of its format, or convert it to one that is installed; where it holds "
             "plain pixels, which no header beside it describes, write an ENVI header " +
                 file + ".hdr with their size, data type and byte order",
             RemedyStep::eConvert});
    return oFindings;
}

std::vector<Finding> CheckCloudLayout(const std::string& file)
{
    constexpr char REMEDY[] = "make a copy that is, with the option LAYOUT=COG";
    const SourceFile oFile(file);
    auto* const poLayout = dynamic_cast<ILayoutDataset*>(&oFile.GetDataset());
    const auto oReasons = poLayout != nullptr ? poLayout->CheckCloudLayout() : std::nullopt;
    const std::string subject = "layout of " + file;
    if (!oReasons)
        return {{false, subject, "files of this format are not laid out for reading over a network", REMEDY,
                 RemedyStep::eCloudCopy}};
    if (oReasons->empty())
        return {{true, subject, "it is laid out for reading over a network (COG)", {}}};
    std::vector<Finding> oFindings;
    for (const std::string& reason : *oReasons)
        oFindings.push_back({false, subject, reason, {}});
    oFindings.back().remedy = REMEDY;
    oFindings.back().step = RemedyStep::eCloudCopy;
    return oFindings;
}

} // namespace krv::operations
