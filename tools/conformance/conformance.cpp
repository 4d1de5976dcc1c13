#include "tools/conformance/conformance.h"

#include "datasources/interfaces/formatplugin.h"
#include "datasources/interfaces/ibitmapdataset.h"
#include "datasources/interfaces/ichannelinfo.h"
#include "datasources/interfaces/idataset.h"
#include "datasources/interfaces/ifileformat.h"
#include "datasources/interfaces/igeocodeddataset.h"
#include "datasources/interfaces/inewfiledataset.h"
#include "datasources/interfaces/ioverviewio.h"
#include "datasources/interfaces/ioverviewmanager.h"
#include "datasources/interfaces/ipctdataset.h"
#include "datasources/interfaces/irasterdataset.h"
#include "datasources/iomanager/datasetmanager.h"
#include "datasources/metadata/auxiliarydata.h"
#include "datasources/reader/basicreader.h"
#include "datasources/reader/rasterrange.h"
#include "gobs/pct/pct.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"
#include "toolkit/ogc/cs/geocodinginfo.h"
#include "toolkit/ogc/cs/icrs.h"
#include "tools/conformance/formathome.h"
#include "tools/conformance/referenceimage.h"
#include "tools/conformance/tempfolder.h"

#include <dlfcn.h>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <future>
#include <limits>
#include <random>
#include <sstream>
#include <stdexcept>

using namespace krv::datasources;

namespace krv::conformance
{

namespace
{

using Channels = std::vector<unsigned int>;
using DatasetPtr = std::unique_ptr<IDataset>;
using IOPtr = std::unique_ptr<IRasterIO>;
using InfoPtr = std::unique_ptr<IChannelInfo>;
using ManagerPtr = std::unique_ptr<IOverviewManager>;

constexpr std::size_t HEADER_LENGTH = 4096;
constexpr std::uint64_t MAX_SAMPLE_BYTES = 256ull << 20;
constexpr double MAX_SECONDS = 10; // for a damaged copy; a file takes milliseconds
constexpr std::uint64_t MAX_MEMORY = 512ull << 20;
constexpr char GUARD = '\x5a';
constexpr std::size_t GUARD_BYTES = 64;

template <class... Parts>
std::string Text(const Parts&... oParts)
{
    std::ostringstream oStream;
    (oStream << ... << oParts);
    return oStream.str();
}

template <class... Parts>
void Expect(Findings& oFindings, bool bHolds, const Parts&... oParts)
{
    if (!bHolds)
        oFindings.push_back(Text(oParts...));
}

// Whether an operation throws krv::Exception or a kind of it; anything else passes.
template <class Kind = krv::Exception, class Operation>
bool Throws(const Operation& oOperation)
{
    try
    {
        oOperation();
    }
    catch (const Kind&)
    {
        return true;
    }
    return false;
}

std::string DescribeException()
{
    try
    {
        throw;
    }
    catch (const krv::Exception& oException)
    {
        return Text("a krv::Exception (", oException.what(), ", from ", oException.GetFunction(), ")");
    }
    catch (const std::exception& oException)
    {
        return Text("an exception that is no krv::Exception (", oException.what(), ")");
    }
    catch (...)
    {
        return "an exception of an unknown type";
    }
}

DatasetPtr Open(const Plugin& oPlugin, const std::string& file)
{
    DatasetPtr oDataset(oPlugin.GetBuilder().Open(file, eReadOnly));
    if (oDataset == nullptr)
        throw std::runtime_error("Open returned null: a failed open throws a krv::Exception");
    return oDataset;
}

IRasterDataset& Raster(IDataset& oDataset)
{
    auto* const poRaster = dynamic_cast<IRasterDataset*>(&oDataset);
    if (poRaster == nullptr)
        throw std::runtime_error("the dataset has no raster facet");
    return *poRaster;
}

// The channels of the file grouped by type, each group in ascending order.
std::vector<Channels> ChannelGroups(const IRasterDataset& oRaster)
{
    std::map<krv::gobs::DataType, Channels> oGroups;
    for (unsigned int nChannel = 1; nChannel <= oRaster.GetChanCount(); ++nChannel)
        oGroups[InfoPtr(oRaster.GetChannelInfo(nChannel))->GetDataType()].push_back(nChannel);
    std::vector<Channels> oResult;
    for (const auto& oGroup : oGroups)
        oResult.push_back(oGroup.second);
    return oResult;
}

std::size_t PixelBytes(const IRasterDataset& oRaster, const Channels& oChannels)
{
    return InfoPtr(oRaster.GetChannelInfo(oChannels.at(0)))->GetDataType().GetValueBits() / 8 * oChannels.size();
}

// A buffer between guard bytes.
class Buffer
{
public:
    explicit Buffer(std::size_t nBytes) : moBytes(nBytes + 2 * GUARD_BYTES, GUARD) {}

    unsigned char* Get() { return reinterpret_cast<unsigned char*>(moBytes.data()) + GUARD_BYTES; }
    std::string GetContent() const { return moBytes.substr(GUARD_BYTES, moBytes.size() - 2 * GUARD_BYTES); }
    bool IsGuardIntact() const
    {
        const std::string guard(GUARD_BYTES, GUARD);
        return moBytes.starts_with(guard) && moBytes.ends_with(guard);
    }

private:
    std::string moBytes;
};

// The whole image of an I/O object in one reading.
ReferenceImage ReadWhole(IRasterIO& oIO, std::size_t nPixelBytes)
{
    const std::uint64_t nPixels = std::uint64_t{oIO.GetFileWidth()} * oIO.GetFileHeight();
    if (nPixels > MAX_SAMPLE_BYTES / nPixelBytes)
        throw std::runtime_error("the image is larger than 256 MiB: give a smaller sample");
    Buffer oBuffer(nPixels * nPixelBytes);
    oIO.ReadWindow(0u, 0u, oIO.GetFileWidth(), oIO.GetFileHeight(), oBuffer.Get());
    if (!oBuffer.IsGuardIntact())
        throw std::runtime_error("reading the whole image writes beyond the buffer");
    return {oIO.GetFileWidth(), oIO.GetFileHeight(), nPixelBytes, oBuffer.GetContent()};
}

struct Window
{
    int mnX;
    int mnY;
    unsigned int mnWidth;
    unsigned int mnHeight;

    friend std::ostream& operator<<(std::ostream& oStream, const Window& oWindow)
    {
        return oStream << oWindow.mnWidth << " x " << oWindow.mnHeight << " at " << oWindow.mnX << ", " << oWindow.mnY;
    }
};

class Random
{
public:
    // 0 to nLimit.
    unsigned int Up(std::uint64_t nLimit) { return static_cast<unsigned int>(moEngine() % (nLimit + 1)); }

    Window Inside(const ReferenceImage& oImage)
    {
        const unsigned int nX = Up(oImage.mnWidth - 1);
        const unsigned int nY = Up(oImage.mnHeight - 1);
        return {static_cast<int>(nX), static_cast<int>(nY), 1 + Up(std::min(oImage.mnWidth - nX - 1, 400u)),
                1 + Up(std::min(oImage.mnHeight - nY - 1, 400u))};
    }

private:
    std::mt19937 moEngine{20};
};

// --- identification -------------------------------------------------------------------------------------------------

void CheckDescription(const Plugin& oPlugin, const std::string&, Findings& oFindings)
{
    IFileFormat* const poFormat = oPlugin.GetBuilder().GetFileFormat();
    if (poFormat == nullptr)
        throw std::runtime_error("the builder has no format description");
    const std::string name = poFormat->GetShortName();
    Expect(oFindings, !name.empty(), "the short name is empty");
    Expect(oFindings,
           std::none_of(name.begin(), name.end(), [](unsigned char n) { return n <= ' ' || (n >= 'a' && n <= 'z'); }),
           "the short name ", name, " has lower-case letters or blanks: it would not be found by name");
    Expect(oFindings, !poFormat->GetDescription().empty(), "the description is empty");
    for (const std::string& extension : poFormat->GetExtensions())
        Expect(oFindings, !extension.empty() && extension.find('.') == std::string::npos, "the extension \"", extension,
               "\" is empty or has a dot");
    Expect(oFindings, poFormat == oPlugin.GetBuilder().GetFileFormat(), "the builder gives another format each time");
    const Plugin oSecond(oPlugin.GetLibraryFile());
    Expect(oFindings, &oSecond.GetBuilder() != &oPlugin.GetBuilder(), "two registrations give one builder");
}

// The first bytes of files of other formats, by family.
const std::vector<std::pair<std::string, std::vector<std::string>>>& ForeignHeaders()
{
    using namespace std::string_literals;
    static const std::vector<std::pair<std::string, std::vector<std::string>>> HEADERS = {
        {"TIFF", {"II*\0\10\0\0\0"s, "MM\0*\0\0\0\10"s, "II+\0\10\0\0\0"s, "MM\0+\0\10\0\0"s}},
        {"PNG", {"\x89PNG\r\n\x1a\n\0\0\0\rIHDR"s}},
        {"JPEG", {"\xff\xd8\xff\xe0\0\x10JFIF\0"s}},
        {"JPEG 2000", {"\0\0\0\x0cjP  \r\n\x87\n"s, "\xff\x4f\xff\x51\0"s}},
        {"GIF", {"GIF89a"s}},
        {"BMP", {"BM\x36\0\x0c\0\0\0\0\0"s}},
        {"HDF", {"\x89HDF\r\n\x1a\n"s, "\x0e\x03\x13\x01"s}},
        {"netCDF", {"CDF\1\0\0\0\0"s}},
        {"NITF", {"NITF02.10"s}},
        {"WebP", {"RIFF\x24\0\0\0WEBPVP8 "s}},
        {"PDF", {"%PDF-1.7\n"s}},
        {"ZIP", {"PK\3\4\x14\0\0\0"s}},
        {"gzip", {"\x1f\x8b\x08\0"s}},
        {"ELF",
         {"\x7f"
          "ELF\2\1\1\0"s}},
        {"XML", {"<?xml version=\"1.0\"?>\n<Formats/>"s}},
        {"DEMO", {"DEMO1\n1 1\n8U\n\nx"s}},
        {"text", {"ENVI\nsamples = 10\n"s, "hello\n"s, "640 480\n8U\n"s}},
        {"nothing", {""s, "\xff\xff\xff\xff"s}},
    };
    return HEADERS;
}

// A copy of the sample under another name without its ending, with the files that belong to it: those beside it that
// begin with its name, or with its name up to the ending, and go on with a dot.
std::string CopySample(const std::string& sample, const TempFolder& oFolder, const std::string& name)
{
    namespace fs = std::filesystem;
    const fs::path oSample(sample);
    const std::string full = oSample.filename().string(), stem = oSample.stem().string();
    const std::string copy = name + oSample.extension().string();
    const fs::path oBeside = oSample.has_parent_path() ? oSample.parent_path() : fs::path(".");
    for (const auto& oEntry : fs::directory_iterator(oBeside))
    {
        const std::string other = oEntry.path().filename().string();
        if (!oEntry.is_regular_file() || other == full)
            continue;
        if (other.starts_with(full + "."))
            oFolder.Write(copy + other.substr(full.size()), ReadFile(oEntry.path().string()));
        else if (other.starts_with(stem + "."))
            oFolder.Write(name + other.substr(stem.size()), ReadFile(oEntry.path().string()));
    }
    return oFolder.Write(copy, ReadFile(sample));
}

std::string Padded(std::string header)
{
    header.resize(HEADER_LENGTH, '\0');
    return header;
}

int Identify(const Plugin& oPlugin, const std::string& file, const std::string& header)
{
    return oPlugin.GetBuilder().Identify(file, reinterpret_cast<const unsigned char*>(header.data()),
                                         static_cast<unsigned int>(header.size()), 0);
}

void CheckIdentify(const Plugin& oPlugin, const std::string& sample, Findings& oFindings)
{
    const std::string own = Padded(ReadFile(sample).substr(0, HEADER_LENGTH));
    const std::vector<std::string> oExtensions = oPlugin.GetBuilder().GetFileFormat()->GetExtensions();
    const std::string otherName = "another." + (oExtensions.empty() ? "bin" : oExtensions[0]);
    for (int nTime = 0; nTime < 2; ++nTime)
        Expect(oFindings, Identify(oPlugin, sample, own) == 0, "the sample is not recognised, time ", nTime + 1);
    const TempFolder oFolder;
    Expect(oFindings, Identify(oPlugin, CopySample(sample, oFolder, "renamed.xyz"), own) == 0,
           "the sample is not recognised under another name");

    for (const auto& [family, headers] : ForeignHeaders())
    {
        if (std::any_of(headers.begin(), headers.end(),
                        [&](const std::string& header)
                        { return header.size() > 3 && own.starts_with(header.substr(0, 4)); }))
            continue; // the plug-in's own
        const auto IsFamily = [&family = family](const std::string& extension)
        {
            return krv::ToUpper(extension) == krv::ToUpper(family);
        };
        if (std::any_of(oExtensions.begin(), oExtensions.end(), IsFamily))
            continue; // one of several kinds that are
        for (const std::string& header : headers)
        {
            Expect(oFindings, Identify(oPlugin, otherName, Padded(header)) != 0, "claims a file of the kind ", family);
            Expect(oFindings, Identify(oPlugin, otherName, header) != 0, "claims a short file of the kind ", family);
        }
    }
    std::mt19937 oRandom(1);
    std::string noise(HEADER_LENGTH, '\0');
    for (int nRound = 0; nRound < 200; ++nRound)
    {
        std::generate(noise.begin(), noise.end(), [&] { return static_cast<char>(oRandom()); });
        Expect(oFindings, Identify(oPlugin, otherName, noise) != 0, "claims random bytes, round ", nRound);
    }
    for (std::size_t nBytes = 0; nBytes < HEADER_LENGTH; nBytes += 1 + nBytes / 16) // must bear them, may claim them
    {
        Identify(oPlugin, sample, own.substr(0, nBytes));
        Identify(oPlugin, sample, Padded(own.substr(0, nBytes)));
    }
}

// --- damaged files --------------------------------------------------------------------------------------------------

std::size_t CountDescriptors()
{
    std::size_t nCount = 0;
    for ([[maybe_unused]] const auto& oEntry : std::filesystem::directory_iterator("/proc/self/fd"))
        ++nCount;
    return nCount;
}

// The most memory that the process has held, in bytes.
std::uint64_t PeakMemory()
{
    std::istringstream oStatus(ReadFile("/proc/self/status"));
    for (std::string word; oStatus >> word;)
    {
        std::uint64_t nKilobytes = 0;
        if (word == "VmHWM:" && oStatus >> nKilobytes)
            return nKilobytes << 10;
    }
    return 0;
}

// Opens a file and reads from every channel; a krv::Exception is as good an outcome as pixels.
void ReadWhatThereIs(const Plugin& oPlugin, const std::string& file)
{
    try
    {
        const DatasetPtr oDataset = Open(oPlugin, file);
        oDataset->ReadAuxiliaryData();
        const std::unique_ptr<krv::ogc::cs::ICRS> oSystem(oDataset->ReadCRS());
        IRasterDataset& oRaster = Raster(*oDataset);
        for (unsigned int nChannel = 1; nChannel <= std::min(oRaster.GetChanCount(), 16u); ++nChannel)
        {
            const IOPtr oIO(oRaster.GetRasterIO({nChannel}));
            const std::size_t nPixelBytes = PixelBytes(oRaster, {nChannel});
            const unsigned int nWidth = std::min(oIO->GetFileWidth(), 512u);
            const unsigned int nHeight = std::min(oIO->GetFileHeight(), 512u);
            Buffer oBuffer(1ull * nWidth * nHeight * nPixelBytes);
            for (const bool bEnd : {false, true})
                oIO->ReadWindow(bEnd ? oIO->GetFileWidth() - nWidth : 0, bEnd ? oIO->GetFileHeight() - nHeight : 0,
                                nWidth, nHeight, oBuffer.Get());
        }
        const ManagerPtr oManager(oRaster.GetOverviewManager());
    }
    catch (const krv::Exception&)
    {
    }
}

void TryDamaged(const Plugin& oPlugin, const std::string& file, const std::string& what, Findings& oFindings)
{
    const std::uint64_t nMemory = PeakMemory();
    const std::clock_t nStart = std::clock();
    try
    {
        ReadWhatThereIs(oPlugin, file);
    }
    catch (...)
    {
        oFindings.push_back(what + ": " + DescribeException());
    }
    // Time is that of the processor: a busy machine is no fault of the plug-in.
    const double dSeconds = static_cast<double>(std::clock() - nStart) / CLOCKS_PER_SEC;
    Expect(oFindings, dSeconds < MAX_SECONDS, what, ": takes ", dSeconds, " s");
    // Not the difference: the kernel counts pages by processor, and the peak that it tells may even sink a little.
    const std::uint64_t nPeak = PeakMemory();
    Expect(oFindings, nPeak < nMemory + MAX_MEMORY, what, ": takes ", (nPeak - nMemory) >> 20, " MiB");
}

void CheckTruncated(const Plugin& oPlugin, const std::string& sample, Findings& oFindings)
{
    const TempFolder oFolder;
    const std::string file = CopySample(sample, oFolder, "cut");
    const std::size_t nDescriptors = CountDescriptors();
    for (std::uint64_t nBytes = std::filesystem::file_size(file); nBytes > 0;)
    {
        nBytes -= 1 + (nBytes - 1) / 64;
        std::filesystem::resize_file(file, nBytes);
        TryDamaged(oPlugin, file, Text("cut to ", nBytes, " bytes"), oFindings);
    }
    Expect(oFindings, CountDescriptors() == nDescriptors, "failed openings leave files open");
}

void CheckDamaged(const Plugin& oPlugin, const std::string& sample, Findings& oFindings)
{
    const TempFolder oFolder;
    const std::string bytes = ReadFile(sample);
    const std::string file = CopySample(sample, oFolder, "damaged");
    const std::size_t nDescriptors = CountDescriptors();
    for (unsigned int nSeed = 0; nSeed < 400; ++nSeed)
    {
        std::mt19937 oRandom(nSeed);
        const std::size_t nReach = nSeed % 2 == 0 ? std::min<std::size_t>(512, bytes.size()) : bytes.size();
        std::vector<std::size_t> oPlaces(1 + nSeed % 8);
        std::fstream oStream(file, std::ios::binary | std::ios::in | std::ios::out);
        for (std::size_t& nPlace : oPlaces)
        {
            nPlace = oRandom() % nReach;
            oStream.seekp(static_cast<std::streamoff>(nPlace))
                .put(static_cast<char>(nSeed % 3 == 0 ? 0xff : oRandom()));
        }
        oStream.flush();
        TryDamaged(oPlugin, file, Text("damaged with seed ", nSeed), oFindings);
        for (const std::size_t nPlace : oPlaces)
            oStream.seekp(static_cast<std::streamoff>(nPlace)).put(bytes[nPlace]);
    }
    Expect(oFindings, CountDescriptors() == nDescriptors, "failed openings leave files open");
}

// --- datasets -------------------------------------------------------------------------------------------------------

void CheckDataset(const Plugin& oPlugin, const std::string& sample, Findings& oFindings)
{
    const DatasetPtr oDataset = Open(oPlugin, sample);
    IRasterDataset& oRaster = Raster(*oDataset);
    const unsigned int nCount = oRaster.GetChanCount();
    Expect(oFindings, oDataset->GetFileFormat() == oPlugin.GetBuilder().GetFileFormat(), "another format description");
    Expect(oFindings, oDataset->GetName() == sample, "GetName() gives ", oDataset->GetName());
    Expect(oFindings, oDataset->IsOpen() && oDataset->Exists(), "an open dataset is not open or does not exist");
    Expect(oFindings, nCount > 0 && oRaster.GetWidth() > 0 && oRaster.GetHeight() > 0, "no channels or no pixels");
    Expect(oFindings, oRaster.GetRasterCapabilities().IsReadable(), "the raster facet is not readable");
    for (unsigned int nChannel = 1; nChannel <= nCount; ++nChannel)
    {
        const InfoPtr oFirst(oRaster.GetChannelInfo(nChannel));
        const InfoPtr oSecond(oRaster.GetChannelInfo(nChannel));
        Expect(oFindings, oFirst != nullptr && oFirst != oSecond, "channel ", nChannel,
               ": no new description each time");
        krv::gobs::NativeDataTypeCode eCode;
        Expect(oFindings, oFirst->GetDataType().FindNativeCode(eCode) && eCode != krv::gobs::eDT_BIT, "channel ",
               nChannel, ": the type is not in the table");
        const IOPtr oIO(oRaster.GetRasterIO({nChannel}));
        Expect(oFindings, oIO->GetFileWidth() == oRaster.GetWidth() && oIO->GetFileHeight() == oRaster.GetHeight(),
               "channel ", nChannel, ": dataset and I/O differ in size");
        Expect(oFindings, oIO->GetTileWidth() > 0 && oIO->GetTileHeight() > 0, "the preferred block is empty");
        Expect(oFindings, dynamic_cast<IOverviewIO*>(oIO.get()) == nullptr,
               "the full image's I/O is an IOverviewIO: readers would take it for a level");
    }
    for (const unsigned int nChannel : {0u, nCount + 1, std::numeric_limits<unsigned int>::max()})
    {
        Expect(oFindings, Throws<krv::DataException>([&] { InfoPtr(oRaster.GetChannelInfo(nChannel)); }),
               "GetChannelInfo(", nChannel, ") throws no DataException");
        Expect(oFindings,
               Throws<krv::DataException>(
                   [&] {
                       IOPtr(oRaster.GetRasterIO({1, nChannel}));
                   }),
               "GetRasterIO over channel ", nChannel, " throws no DataException");
    }
    Expect(oFindings, Throws<krv::DataException>([&] { IOPtr(oRaster.GetRasterIO({})); }),
           "GetRasterIO over no channels throws no DataException");
    const std::vector<Channels> oGroups = ChannelGroups(oRaster);
    Expect(oFindings,
           oGroups.size() < 2 || Throws<krv::DataException>(
                                     [&] {
                                         IOPtr(oRaster.GetRasterIO({oGroups[0][0], oGroups[1][0]}));
                                     }),
           "GetRasterIO over channels of several types throws no DataException");
    oDataset->Close();
    Expect(oFindings, !oDataset->IsOpen(), "a closed dataset is open");
}

void CheckMetadata(const Plugin& oPlugin, const std::string& sample, Findings& oFindings)
{
    using krv::ogc::cs::ICRS;
    const DatasetPtr oDataset = Open(oPlugin, sample);
    IRasterDataset& oRaster = Raster(*oDataset);
    const AuxiliaryData oData = oDataset->ReadAuxiliaryData();
    const AuxiliaryData oAgain = Open(oPlugin, sample)->ReadAuxiliaryData();
    Expect(oFindings, oData.GetChannelCount() == oRaster.GetChanCount(), "the metadata has ", oData.GetChannelCount(),
           " channels");
    Expect(oFindings, oData.GetFileMetadata() == oAgain.GetFileMetadata(), "the file's metadata changes by itself");
    for (unsigned int nChannel = 1; nChannel <= std::min(oData.GetChannelCount(), oAgain.GetChannelCount()); ++nChannel)
        Expect(oFindings, oData.GetChanMetadata(nChannel) == oAgain.GetChanMetadata(nChannel),
               "the metadata of channel ", nChannel, " changes by itself");
    const std::unique_ptr<ICRS> oCRS(oDataset->ReadCRS());
    const std::unique_ptr<ICRS> oSecondCRS(oDataset->ReadCRS());
    Expect(oFindings, oCRS == nullptr || (oCRS != oSecondCRS && oCRS->IsEquivalent(*oSecondCRS)),
           "ReadCRS gives no new, equal object each time");
    if (const auto* const poGeocoded = dynamic_cast<IGeocodedDataset*>(oDataset.get()))
        for (const double nTerm : poGeocoded->GetGeocoding().GetTerms())
            Expect(oFindings, std::isfinite(nTerm), "a term of the geocoding is not finite");
    if (const auto* const poTables = dynamic_cast<IPCTDataset*>(oDataset.get()))
    {
        for (const unsigned int nTable : poTables->GetPCTList())
            Expect(oFindings, std::unique_ptr<krv::gobs::PCT>(poTables->GetPCT(nTable)) != nullptr, "table ", nTable,
                   " is null");
        Expect(oFindings, Throws([&] { std::unique_ptr<krv::gobs::PCT>(poTables->GetPCT(0)); }), "table 0 exists");
    }
}

// --- pixels ---------------------------------------------------------------------------------------------------------

void CheckShortForm(IRasterIO& oIO, const ReferenceImage& oImage, const Window& oWindow, Findings& oFindings)
{
    Buffer oBuffer(oImage.mnPixelBytes * oWindow.mnWidth * oWindow.mnHeight);
    oIO.ReadWindow(static_cast<unsigned int>(oWindow.mnX), static_cast<unsigned int>(oWindow.mnY), oWindow.mnWidth,
                   oWindow.mnHeight, oBuffer.Get());
    Expect(oFindings,
           oBuffer.GetContent() == oImage.Window(oWindow.mnX, oWindow.mnY, oWindow.mnWidth, oWindow.mnHeight),
           "window ", oWindow, ": differs from the whole image");
    Expect(oFindings, oBuffer.IsGuardIntact(), "window ", oWindow, ": writes beyond the buffer");
}

void CheckLongForm(IRasterIO& oIO, const ReferenceImage& oImage, const Window& oWindow, const Window& oPart,
                   Findings& oFindings)
{
    Buffer oBuffer(oImage.mnPixelBytes * oWindow.mnWidth * oWindow.mnHeight);
    const std::string expected = oImage.Part(oBuffer.GetContent(), oWindow.mnX, oWindow.mnY, oWindow.mnWidth,
                                             oWindow.mnHeight, oPart.mnX, oPart.mnY, oPart.mnWidth, oPart.mnHeight);
    oIO.ReadWindow(oWindow.mnX, oWindow.mnY, oWindow.mnWidth, oWindow.mnHeight, oPart.mnX, oPart.mnY, oPart.mnWidth,
                   oPart.mnHeight, oBuffer.Get());
    Expect(oFindings, oBuffer.GetContent() == expected, "part ", oPart, " of window ", oWindow,
           ": is not exactly the part inside the image, with all other bytes untouched");
    Expect(oFindings, oBuffer.IsGuardIntact(), "part ", oPart, " of window ", oWindow, ": writes beyond the buffer");
}

void CheckTransfers(IRasterIO& oIO, const ReferenceImage& oImage, Findings& oFindings)
{
    Random oRandom;
    const int nWidth = static_cast<int>(oImage.mnWidth);
    const int nHeight = static_cast<int>(oImage.mnHeight);
    for (const Window& oWindow : {Window{0, 0, 1, 1}, Window{nWidth - 1, nHeight - 1, 1, 1},
                                  Window{0, nHeight / 2, oImage.mnWidth, 1}, Window{nWidth / 2, 0, 1, oImage.mnHeight}})
        CheckShortForm(oIO, oImage, oWindow, oFindings);
    for (int nRound = 0; nRound < 60; ++nRound)
        CheckShortForm(oIO, oImage, oRandom.Inside(oImage), oFindings);
    for (unsigned int nY = 0; nY < oImage.mnHeight; nY += oIO.GetTileHeight()) // as readers do
        for (unsigned int nX = 0; nX < oImage.mnWidth; nX += oIO.GetTileWidth())
            CheckShortForm(oIO, oImage,
                           {static_cast<int>(nX), static_cast<int>(nY),
                            std::min(oIO.GetTileWidth(), oImage.mnWidth - nX),
                            std::min(oIO.GetTileHeight(), oImage.mnHeight - nY)},
                           oFindings);

    for (int nRound = 0; nRound < 150; ++nRound)
    {
        const unsigned int nReach = nRound % 2 == 0 ? 20 : 300;
        const Window oWindow{static_cast<int>(oRandom.Up(oImage.mnWidth + 2 * nReach)) - 2 * static_cast<int>(nReach),
                             static_cast<int>(oRandom.Up(oImage.mnHeight + 2 * nReach)) - 2 * static_cast<int>(nReach),
                             1 + oRandom.Up(2 * nReach), 1 + oRandom.Up(2 * nReach)};
        const unsigned int nPartX = oRandom.Up(oWindow.mnWidth);
        const unsigned int nPartY = oRandom.Up(oWindow.mnHeight);
        CheckLongForm(oIO, oImage, oWindow, {0, 0, oWindow.mnWidth, oWindow.mnHeight}, oFindings);
        CheckLongForm(oIO, oImage, oWindow,
                      {static_cast<int>(nPartX), static_cast<int>(nPartY), oRandom.Up(oWindow.mnWidth - nPartX),
                       oRandom.Up(oWindow.mnHeight - nPartY)},
                      oFindings);
    }
    constexpr int FAR = std::numeric_limits<int>::max();
    for (const auto& [nX, nY] : {std::pair{FAR, 0}, {0, FAR}, {-FAR - 1, 0}, {0, -FAR - 1}, {FAR, FAR}})
        CheckLongForm(oIO, oImage, {nX, nY, 3, 3}, {0, 0, 3, 3}, oFindings);

    constexpr unsigned int MOST = std::numeric_limits<unsigned int>::max();
    Buffer oBuffer(oImage.mnPixelBytes * 16);
    for (const auto& [nX, nY] : {std::pair{oImage.mnWidth, 0u},
                                 {0u, oImage.mnHeight},
                                 {oImage.mnWidth - 1, 0u},
                                 {0u, oImage.mnHeight - 1},
                                 {MOST, 0u},
                                 {0u, MOST}})
        Expect(oFindings,
               Throws<krv::DataException>([&, x = nX, y = nY] { oIO.ReadWindow(x, y, 2u, 2u, oBuffer.Get()); }),
               "a window of 2 x 2 at ", nX, ", ", nY, " throws no DataException");
    Expect(oFindings, oBuffer.IsGuardIntact(), "a refused window writes beyond the buffer");
}

void CheckWindows(const Plugin& oPlugin, const std::string& sample, Findings& oFindings)
{
    const DatasetPtr oDataset = Open(oPlugin, sample);
    IRasterDataset& oRaster = Raster(*oDataset);
    for (const Channels& oGroup : ChannelGroups(oRaster))
    {
        const Channels oSome(oGroup.begin(), oGroup.begin() + std::min<std::size_t>(oGroup.size(), 4));
        const IOPtr oWholeIO(oRaster.GetRasterIO(oSome));
        const ReferenceImage oImage = ReadWhole(*oWholeIO, PixelBytes(oRaster, oSome));
        const DatasetPtr oFresh = Open(oPlugin, sample); // windows first, nothing read before
        CheckTransfers(*IOPtr(Raster(*oFresh).GetRasterIO(oSome)), oImage, oFindings);
        CheckTransfers(*oWholeIO, oImage, oFindings);
    }
}

void CheckChannelOrder(const Plugin& oPlugin, const std::string& sample, Findings& oFindings)
{
    const DatasetPtr oDataset = Open(oPlugin, sample);
    IRasterDataset& oRaster = Raster(*oDataset);
    Random oRandom;
    for (const Channels& oGroup : ChannelGroups(oRaster))
    {
        const std::size_t nValueBytes = PixelBytes(oRaster, {oGroup[0]});
        std::map<unsigned int, ReferenceImage> oSingles;
        for (const unsigned int nChannel : oGroup)
            if (oSingles.size() < 8)
                oSingles.emplace(nChannel, ReadWhole(*IOPtr(oRaster.GetRasterIO({nChannel})), nValueBytes));
        for (int nRound = 0; nRound < 12; ++nRound)
        {
            Channels oList(1 + oRandom.Up(4));
            for (unsigned int& nChannel : oList)
                nChannel = std::next(oSingles.begin(), oRandom.Up(oSingles.size() - 1))->first;
            const ReferenceImage oImage = ReadWhole(*IOPtr(oRaster.GetRasterIO(oList)), nValueBytes * oList.size());
            std::size_t nPosition = 0;
            bool bEqual = true;
            for (std::size_t nPixel = 0; nPixel < std::size_t{oImage.mnWidth} * oImage.mnHeight; ++nPixel)
                for (const unsigned int nChannel : oList)
                    bEqual = bEqual && oImage.moBytes.compare(nValueBytes * nPosition++, nValueBytes,
                                                              oSingles.at(nChannel).moBytes, nValueBytes * nPixel,
                                                              nValueBytes) == 0;
            std::string list;
            for (const unsigned int nChannel : oList)
                list += " " + std::to_string(nChannel);
            Expect(oFindings, bEqual, "the channels", list, " read together differ from those read one by one");
        }
    }
}

void CheckOverviews(const Plugin& oPlugin, const std::string& sample, Findings& oFindings)
{
    const DatasetPtr oDataset = Open(oPlugin, sample);
    IRasterDataset& oRaster = Raster(*oDataset);
    const ManagerPtr oManager(oRaster.GetOverviewManager());
    if (oManager == nullptr)
        return;
    const Channels oLevels = oManager->GetLevels();
    Expect(oFindings, std::is_sorted(oLevels.begin(), oLevels.end(), std::less_equal<>()),
           "the levels are not ascending");
    Expect(oFindings, oLevels.empty() || oLevels[0] >= 2, "level ", oLevels.empty() ? 0 : oLevels[0],
           " is no reduction");
    const unsigned int nAbsent = oLevels.empty() ? 2 : oLevels.back() + 1;
    Expect(oFindings, Throws<krv::DataException>([&] { IOPtr(oManager->GetOverviewIO(nAbsent, {1})); }),
           "GetOverviewIO of the absent level ", nAbsent, " throws no DataException");
    Expect(oFindings, Throws<krv::DataException>([&] { oManager->GetLevelWidth(nAbsent); }),
           "GetLevelWidth of the absent level ", nAbsent, " throws no DataException");
    const bool bAnswers = !Throws<krv::Exception>([&] { static_cast<void>(oManager->IsValid(1, nAbsent)); });
    Expect(oFindings, bAnswers && !oManager->IsValid(1, nAbsent), "IsValid of the absent level ", nAbsent,
           " does not answer false");
    for (const unsigned int nLevel : oLevels)
    {
        const IOPtr oIO(oManager->GetOverviewIO(nLevel, {1}));
        const auto* const poLevelIO = dynamic_cast<IOverviewIO*>(oIO.get());
        Expect(oFindings, poLevelIO != nullptr && poLevelIO->GetLevel() == nLevel, "level ", nLevel,
               ": its I/O is no IOverviewIO of that level");
        Expect(oFindings,
               oIO->GetFileWidth() == oManager->GetLevelWidth(nLevel) &&
                   oIO->GetFileHeight() == oManager->GetLevelHeight(nLevel) &&
                   oIO->GetFileWidth() <= oRaster.GetWidth(),
               "level ", nLevel, ": sizes differ");
        Expect(oFindings, oManager->GetAuxiliaryData(nLevel).GetChannelCount() == oRaster.GetChanCount(), "level ",
               nLevel, ": its metadata has not the file's channels");
        CheckTransfers(*oIO, ReadWhole(*oIO, PixelBytes(oRaster, {1})), oFindings);
    }
}

void CheckBitmaps(const Plugin& oPlugin, const std::string& sample, Findings& oFindings)
{
    const DatasetPtr oDataset = Open(oPlugin, sample);
    auto* const poBitmaps = dynamic_cast<IBitmapDataset*>(oDataset.get());
    if (poBitmaps == nullptr)
        return;
    const Channels oList = poBitmaps->GetBitmapList();
    Expect(oFindings, std::is_sorted(oList.begin(), oList.end(), std::less_equal<>()), "the bitmaps are not ascending");
    const unsigned int nAbsent = oList.empty() ? 1 : oList.back() + 1;
    for (const unsigned int nBitmap : {0u, nAbsent})
        Expect(oFindings, Throws([&] { IOPtr(poBitmaps->GetBitmapIO({nBitmap})); }), "bitmap ", nBitmap,
               " can be read");
    for (const unsigned int nBitmap : oList)
    {
        const IOPtr oIO(poBitmaps->GetBitmapIO({nBitmap}));
        const ReferenceImage oImage = ReadWhole(*oIO, 1);
        Expect(oFindings,
               std::all_of(oImage.moBytes.begin(), oImage.moBytes.end(), [](char n) { return n == 0 || n == 1; }),
               "bitmap ", nBitmap, ": values other than 0 and 1");
        CheckTransfers(*oIO, oImage, oFindings);
        poBitmaps->GetBitmapDescription(nBitmap);
        poBitmaps->GetBitmapMetadata(nBitmap);
    }
}

// --- life -----------------------------------------------------------------------------------------------------------

std::string ReadFirstChannel(IDataset& oDataset)
{
    const IOPtr oIO(Raster(oDataset).GetRasterIO({1}));
    return ReadWhole(*oIO, PixelBytes(Raster(oDataset), {1})).moBytes;
}

void CheckLife(const Plugin& oPlugin, const std::string& sample, Findings& oFindings)
{
    const std::string bytes = ReadFile(sample);
    const std::string pixels = ReadFirstChannel(*Open(oPlugin, sample));
    const std::size_t nDescriptors = CountDescriptors();
    {
        DatasetPtr oFirst = Open(oPlugin, sample);
        const DatasetPtr oSecond = Open(oPlugin, sample);
        const IOPtr oIO(Raster(*oSecond).GetRasterIO({1}));
        const IOPtr oTwin(Raster(*oSecond).GetRasterIO({1}));
        const InfoPtr oInfo(Raster(*oFirst).GetChannelInfo(1)); // both outlive their dataset
        const ManagerPtr oManager(Raster(*oFirst).GetOverviewManager());
        oFirst.reset();
        for (IRasterIO* poIO : {oIO.get(), oTwin.get(), oIO.get()})
            Expect(oFindings, ReadWhole(*poIO, PixelBytes(Raster(*oSecond), {1})).moBytes == pixels,
                   "two open datasets disturb each other");
        Expect(oFindings, oInfo->GetDataType().GetBits() != 0, "a channel description dies with its dataset");
        // What is not open for writing is not written.
        Buffer oBuffer(PixelBytes(Raster(*oSecond), {1}));
        Throws([&] { oIO->WriteWindow(0u, 0u, 1u, 1u, oBuffer.Get()); });
    }
    for (int nRound = 0; nRound < 50; ++nRound)
        Open(oPlugin, sample);
    Expect(oFindings, CountDescriptors() == nDescriptors, "closed datasets leave files open");

    std::vector<DatasetPtr> oDatasets(4); // one for each thread; opening itself is the manager's, one at a time
    for (DatasetPtr& oDataset : oDatasets)
        oDataset = Open(oPlugin, sample);
    std::vector<std::future<std::string>> oThreads;
    for (const DatasetPtr& oDataset : oDatasets)
        oThreads.push_back(std::async(std::launch::async, [&oDataset] { return ReadFirstChannel(*oDataset); }));
    for (auto& oThread : oThreads)
        Expect(oFindings, oThread.get() == pixels, "datasets in several threads disturb each other");
    Expect(oFindings, ReadFile(sample) == bytes, "reading changed the file");
    const std::string missing = sample + ".missing";
    Expect(oFindings, Throws([&] { Open(oPlugin, missing); }), "a missing file is opened");
}

// A part that does not lie inside the image is refused, and nothing of it stored.
void CheckWrittenParts(IRasterDataset& oRaster, Findings& oFindings)
{
    const IOPtr oIO(oRaster.GetRasterIO({1}));
    const std::size_t nPixelBytes = PixelBytes(oRaster, {1});
    const auto nRight = static_cast<int>(oIO->GetFileWidth());
    const auto nBottom = static_cast<int>(oIO->GetFileHeight());
    const std::string before = ReadWhole(*oIO, nPixelBytes).moBytes;
    Buffer oBuffer(nPixelBytes * 5 * 4);
    std::memset(oBuffer.Get(), 90, nPixelBytes * 5 * 4);
    for (const auto& [nX, nY] : {std::pair(-2, -1), {-2, 0}, {0, -2}, {nRight - 3, 0}, {0, nBottom - 2}, {nRight, 0}})
        Expect(oFindings,
               Throws<krv::DataException>([&, nX = nX, nY = nY]
                                          { oIO->WriteWindow(nX, nY, 5, 4, 1, 1, 3, 2, oBuffer.Get()); }),
               "a part that is not inside the image is written: 3 x 2 of a window at ", nX, ", ", nY);
    Expect(oFindings,
           Throws<krv::DataException>(
               [&] { oIO->WriteWindow(static_cast<unsigned int>(nRight), 0u, 1u, 1u, oBuffer.Get()); }),
           "a window that is not inside the image is written");
    Expect(oFindings, ReadWhole(*oIO, nPixelBytes).moBytes == before, "what is refused is stored in part");
}

// The sample, where the format updates, and a new file, where it creates: whoever cannot do it says so.
void CheckWriting(const Plugin& oPlugin, const std::string& sample, Findings& oFindings)
{
    const TempFolder oFolder;
    const std::string copy = CopySample(sample, oFolder, std::filesystem::path(sample).stem().string());
    DatasetPtr oDataset;
    if (!Throws([&] { oDataset.reset(oPlugin.GetBuilder().Open(copy, eUpdate)); }) && oDataset != nullptr)
        CheckWrittenParts(Raster(*oDataset), oFindings);
    oDataset.reset();
    const std::string file = oFolder.File("new" + std::filesystem::path(sample).extension().string());
    if (Throws([&] { oDataset.reset(oPlugin.GetBuilder().Create(file, "")); }) || oDataset == nullptr)
        return;
    Raster(*oDataset).Create(7, 6, {krv::gobs::eDT_8U});
    CheckWrittenParts(Raster(*oDataset), oFindings);
    oDataset->Close();
    oDataset.reset(oPlugin.GetBuilder().Create(file, ""));
    if (auto* const poNewFile = dynamic_cast<INewFileDataset*>(oDataset.get()))
    {
        const std::string bytes = ReadFile(file);
        poNewFile->KeepExisting();
        Expect(oFindings,
               Throws<krv::IOException>(
                   [&]
                   {
                       Raster(*oDataset).Create(7, 6, {krv::gobs::eDT_8U});
                       oDataset->Synchronize();
                   }) &&
                   ReadFile(file) == bytes,
               "a new file replaces one that it is to keep");
    }
}

void CheckReader(const Plugin& oPlugin, const std::string& sample, Findings& oFindings)
{
    FormatHome oHome;
    oHome.Add(oPlugin.GetLibraryFile());
    const DatasetPtr oDataset(DatasetManager::GetInstance()->Open(sample, eReadOnly));
    Expect(oFindings, oDataset != nullptr, "the manager opens null");
    Random oRandom;
    for (const Channels& oGroup : ChannelGroups(Raster(*oDataset)))
    {
        BasicReader oReader(sample, oGroup);
        const IOPtr oIO(Raster(*oDataset).GetRasterIO(oGroup));
        const ReferenceImage oImage = ReadWhole(*oIO, PixelBytes(Raster(*oDataset), oGroup));
        const eMarginBehaviour BEHAVIOURS[] = {eReplicate, eMirror, eMirror101, eConstant, eWrap};
        for (int nRound = 0; nRound < 6; ++nRound)
        {
            const unsigned int nXMargin = nRound == 0 ? 0 : oRandom.Up(std::min(oImage.mnWidth / 2, 20u));
            const unsigned int nYMargin = nRound == 0 ? 0 : oRandom.Up(std::min(oImage.mnHeight / 2, 20u));
            const eMarginBehaviour eBehaviour = BEHAVIOURS[nRound % 5];
            oReader.SetMargins(nXMargin, nYMargin, eBehaviour);
            if (nRound > 2)
                oReader.SetTileSize(1 + oRandom.Up(oImage.mnWidth), 1 + oRandom.Up(oImage.mnHeight));
            if (oReader.GetTileCount() > 500) // tiny blocks: what the test wants is not their number
                oReader.SetTileSize(1 + oImage.mnWidth / 20, 1 + oImage.mnHeight / 20);
            for (const auto& oTile : RasterRange(oReader))
            {
                const std::string expected = oImage.WithMargins(oTile->GetX(), oTile->GetY(), oTile->GetWidth(),
                                                                oTile->GetHeight(), nXMargin, nYMargin, eBehaviour);
                Expect(oFindings,
                       expected.size() == oTile->GetBufferSize() &&
                           std::memcmp(expected.data(), oTile->GetBuffer(), expected.size()) == 0,
                       "tile ", oTile->GetWidth(), " x ", oTile->GetHeight(), " at ", oTile->GetX(), ", ",
                       oTile->GetY(), " with margins ", nXMargin, ", ", nYMargin, " differs from the image");
            }
        }
    }
}

} // namespace

Plugin::Plugin(const std::string& libraryFile) : moLibraryFile(std::filesystem::absolute(libraryFile).string())
{
    void* const pLibrary = dlopen(moLibraryFile.c_str(), RTLD_NOW | RTLD_LOCAL);
    if (pLibrary == nullptr)
        throw std::runtime_error(Text("cannot be loaded: ", dlerror()));
    const auto pVersion = reinterpret_cast<int (*)()>(dlsym(pLibrary, "GetQRFFormatVersion"));
    const auto pRegister = reinterpret_cast<IFileIOBuilder* (*)()>(dlsym(pLibrary, "RegisterQRFFormat"));
    if (pVersion == nullptr || pRegister == nullptr)
        throw std::runtime_error("lacks an entry point: GetQRFFormatVersion or RegisterQRFFormat");
    if (pVersion() != KRV_QRF_FORMAT_VERSION)
        throw std::runtime_error("was compiled against another version of the interfaces");
    mpoBuilder.reset(pRegister());
    if (mpoBuilder == nullptr)
        throw std::runtime_error("RegisterQRFFormat returns null");
}

const std::vector<Check>& GetChecks()
{
    static const std::vector<Check> CHECKS = {
        {"description", "short name, extensions and description can be used", CheckDescription},
        {"identify", "recognises its own file, declines all others and bears any bytes", CheckIdentify},
        {"dataset", "size, channels, types, and exceptions for what does not exist", CheckDataset},
        {"metadata", "metadata, reference system, geocoding, colour tables", CheckMetadata},
        {"windows", "windows inside, on and across the edges, in both forms", CheckWindows},
        {"channels", "order and repeats of channels", CheckChannelOrder},
        {"overviews", "levels, their sizes and pixels", CheckOverviews},
        {"bitmaps", "bitmaps, their numbers and pixels", CheckBitmaps},
        {"life", "ownership, destruction order, threads, nothing left open, nothing written", CheckLife},
        {"writing", "parts outside the image, names that are taken", CheckWriting},
        {"reader", "tiles with margins through the manager", CheckReader},
        {"truncated", "files cut at any length: an exception, no crash", CheckTruncated},
        {"damaged", "files with wrong bytes: an exception or pixels, no crash", CheckDamaged},
    };
    return CHECKS;
}

Findings Run(const Check& oCheck, const Plugin& oPlugin, const std::string& sampleFile)
{
    constexpr std::size_t MOST = 6;
    Findings oFindings;
    try
    {
        oCheck.mpRun(oPlugin, sampleFile, oFindings);
    }
    catch (...)
    {
        oFindings.push_back("ended early by " + DescribeException());
    }
    if (oFindings.size() > MOST)
    {
        const std::size_t nMore = oFindings.size() - MOST;
        oFindings.resize(MOST);
        oFindings.push_back(Text("and ", nMore, " more"));
    }
    return oFindings;
}

} // namespace krv::conformance
