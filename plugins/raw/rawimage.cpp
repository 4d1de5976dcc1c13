#include "plugins/raw/rawimage.h"

#include "plugins/raw/envirecord.h"
#include "plugins/support/sidecar/sidecarfile.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"

#include <sys/stat.h>

#include <algorithm>
#include <climits>
#include <initializer_list>
#include <map>
#include <sstream>
#include <vector>

namespace krv::plugins::raw
{

using krv::ogc::cs::GeocodingInfo;

namespace
{

constexpr std::size_t MOST_HEADER_BYTES = std::size_t{8} << 20;
constexpr std::uint64_t MOST_SURPLUS = 4096;
// Data files of a header are tried by these endings when the header is named.
constexpr const char* DATA_ENDINGS[] = {"",    "img", "dat", "bin", "raw", "bsq", "bil", "bip", "envi", "cub",
                                        "flt", "slc", "rdr", "dem", "grd", "int", "cor", "unw", "lin"};
constexpr const char* ESRI_ENDINGS[] = {"BIL", "BIP", "BSQ", "FLT", "DEM"};

std::optional<std::uint64_t> FindSize(const std::string& fileName)
{
    struct stat oStatus = {};
    if (::stat(fileName.c_str(), &oStatus) != 0 || !S_ISREG(oStatus.st_mode))
        return std::nullopt;
    return static_cast<std::uint64_t>(oStatus.st_size);
}

// Where the ending begins, behind its dot; the length of the name when it has none.
std::size_t FindEnding(const std::string& fileName)
{
    const std::size_t nSlash = fileName.rfind('/');
    const std::size_t nName = nSlash == std::string::npos ? 0 : nSlash + 1;
    const std::size_t nDot = fileName.rfind('.');
    return nDot == std::string::npos || nDot <= nName ? fileName.size() + 1 : nDot + 1;
}

std::string GetEnding(const std::string& fileName)
{
    const std::size_t nEnding = FindEnding(fileName);
    return nEnding > fileName.size() ? std::string() : krv::ToUpper(fileName.substr(nEnding));
}

std::string GetStem(const std::string& fileName)
{
    return fileName.substr(0, FindEnding(fileName) - 1);
}

// A text of a sensible size; no value for any other file, and for one that is none.
std::optional<std::string> ReadText(const std::string& fileName)
{
    if (!FindSize(fileName))
        return std::nullopt;
    try
    {
        std::string text = support::ReadSidecar(fileName, MOST_HEADER_BYTES);
        return text.find('\0') == std::string::npos ? std::optional(std::move(text)) : std::nullopt;
    }
    catch (const FileException&)
    {
        return std::nullopt;
    }
}

std::optional<RawFiles> TakeHeader(const std::string& header, const std::string& data)
{
    auto oText = ReadText(header);
    if (!oText)
        return std::nullopt;
    if (HeaderText::IsHeader(*oText))
        return RawFiles{RawKind::eEnvi, data, header, std::move(*oText)};
    const std::string ending = GetEnding(data);
    const bool bEnding = std::any_of(std::begin(ESRI_ENDINGS), std::end(ESRI_ENDINGS),
                                     [&ending](const char* pOne) { return ending == pOne; });
    if (bEnding && IsEsriHeader(*oText))
        return RawFiles{RawKind::eEsri, data, header, std::move(*oText)};
    return std::nullopt;
}

// Whether the header is of a file of so many bytes, or says what is wrong with it when it is opened.
bool MayFit(const RawFiles& oFiles, std::uint64_t nBytes)
{
    try
    {
        return IsSizeOf(ReadForm(oFiles), nBytes);
    }
    catch (const FileFormatException&)
    {
        return true;
    }
}

// By the name of the header. Where no data file of a fitting size lies beside it, opening says so.
std::optional<RawFiles> FindData(const std::string& header)
{
    auto oText = ReadText(header);
    const bool bEnvi = oText && HeaderText::IsHeader(*oText);
    if (!bEnvi && !(oText && IsEsriHeader(*oText)))
        return std::nullopt;
    const std::string stem = GetStem(header);
    std::optional<RawFiles> oFirst;
    for (const char* const pEnding : DATA_ENDINGS)
        for (const std::string& ending : {std::string(pEnding), krv::ToUpper(pEnding)})
        {
            const std::string data = ending.empty() ? stem : stem + "." + ending;
            const auto oSize = FindSize(data);
            auto oFiles = oSize ? TakeHeader(header, data) : std::nullopt;
            if (!oFiles)
                continue;
            if (!oFirst)
                oFirst = oFiles;
            if (MayFit(*oFiles, *oSize))
                return oFiles;
        }
    if (oFirst || !bEnvi)
        return oFirst;
    return RawFiles{RawKind::eEnvi, {}, header, std::move(*oText)};
}

bool IsNumber(const std::string& text)
{
    return ParseReal(text).has_value();
}

// N00E010: the south-western sample of a tile of one degree. No value for any other name.
std::optional<std::pair<int, int>> ParseTileName(const std::string& fileName)
{
    const std::size_t nSlash = fileName.rfind('/');
    const std::string name = krv::ToUpper(fileName.substr(nSlash == std::string::npos ? 0 : nSlash + 1));
    if (name.size() != 11 || !name.ends_with(".HGT") || (name[0] != 'N' && name[0] != 'S') ||
        (name[3] != 'E' && name[3] != 'W'))
        return std::nullopt;
    const auto oLatitude = krv::ParseNumber<unsigned int>(name.substr(1, 2));
    const auto oLongitude = krv::ParseNumber<unsigned int>(name.substr(4, 3));
    if (!oLatitude || !oLongitude || *oLatitude > 90 || *oLongitude > 180)
        return std::nullopt;
    const int nLatitude = static_cast<int>(*oLatitude), nLongitude = static_cast<int>(*oLongitude);
    return std::pair(name[0] == 'N' ? nLatitude : -nLatitude, name[3] == 'E' ? nLongitude : -nLongitude);
}

// Samples along a side of a tile of so many bytes; 0 for other files.
unsigned int FindTileSide(std::uint64_t nBytes)
{
    for (const unsigned int nSide : {1201u, 3601u})
        if (nBytes == std::uint64_t{2} * nSide * nSide)
            return nSide;
    return 0;
}

RawForm ReadTileForm(const RawFiles& oFiles)
{
    const unsigned int nSide = FindTileSide(FindSize(oFiles.moData).value_or(0));
    if (!ParseTileName(oFiles.moData) || nSide == 0)
        throw FileFormatException(oFiles.moData, oFiles.moData + ": no elevation tile has this size");
    RawForm oForm;
    oForm.mnWidth = oForm.mnHeight = nSide;
    oForm.moType = krv::gobs::eDT_16S;
    oForm.mbBigEndian = true;
    return oForm;
}

RawImage ReadTile(RawFiles oFiles)
{
    RawImage oImage;
    oImage.moForm = ReadTileForm(oFiles);
    const auto oPlace = ParseTileName(oFiles.moData);
    oImage.moTags = krv::datasources::AuxiliaryData(1);
    oImage.moTags.SetFileMetadataValue("NO_DATA_VALUE", "-32768");
    oImage.moTags.SetChanMetadataValue("UnitType", "m", 1);
    // Samples lie on whole degrees, so pixels reach half a step beyond.
    const double nStep = 1.0 / (oImage.moForm.mnWidth - 1);
    oImage.moGeocoding = GeocodingInfo(oPlace->second - nStep / 2, nStep, 0, oPlace->first + 1 + nStep / 2, 0, -nStep);
    oImage.moFiles = std::move(oFiles);
    return oImage;
}

// Keywords in capitals, with what stands behind them; two values of the same are joined by a blank, which no value of
// its own has.
std::map<std::string, std::string> ParseKeywords(std::string_view text)
{
    std::map<std::string, std::string> oKeywords;
    std::string lines(text);
    std::replace(lines.begin(), lines.end(), '\r', '\n');
    std::istringstream oLines(lines);
    for (std::string line; std::getline(oLines, line);)
    {
        std::istringstream oWords(line);
        std::string key, value;
        if (oWords >> key >> value)
            if (std::string& known = oKeywords[krv::ToUpper(key)]; known != value)
                known += (known.empty() ? "" : " ") + value;
    }
    return oKeywords;
}

// What the keywords of a header say, with the checks of every one.
class EsriHeader
{
public:
    explicit EsriHeader(const RawFiles& oFiles)
        : moName(oFiles.moHeader), moEnding(GetEnding(oFiles.moData)), moKeywords(ParseKeywords(oFiles.moHeaderText))
    {
    }

    RawForm ReadForm() const;
    std::optional<GeocodingInfo> ReadGeocoding(const RawForm& oForm) const;
    krv::datasources::AuxiliaryData ReadTags(unsigned int nChannels) const;

private:
    std::string Get(const std::string& key, const std::string& usual) const
    {
        const auto oFound = moKeywords.find(key);
        return oFound == moKeywords.end() ? usual : krv::ToUpper(oFound->second);
    }
    std::uint64_t GetNumber(const std::string& key, std::uint64_t nUsual, std::uint64_t nFrom, std::uint64_t nTo) const
    {
        const std::string text = Get(key, std::to_string(nUsual));
        const auto oNumber = krv::ParseNumber<std::uint64_t>(text);
        if (!oNumber || *oNumber < nFrom || *oNumber > nTo)
            Refuse(key, text, "a number from " + std::to_string(nFrom) + " to " + std::to_string(nTo));
        return *oNumber;
    }
    std::optional<double> GetReal(const std::string& key) const
    {
        return moKeywords.contains(key) ? ParseReal(moKeywords.at(key)) : std::nullopt;
    }
    [[noreturn]] void Refuse(const std::string& key, const std::string& value, const std::string& takes) const
    {
        throw FileFormatException(moName, moName + ": \"" + key + " " + value + "\" is not " + takes);
    }
    krv::gobs::DataType ReadType() const;
    bool ReadByteOrder() const;
    void ReadGaps(RawForm& oForm) const;

    std::string moName;
    std::string moEnding;
    std::map<std::string, std::string> moKeywords;
};

krv::gobs::DataType EsriHeader::ReadType() const
{
    const bool bFloat = moEnding == "FLT";
    const std::uint64_t nBits = GetNumber("NBITS", bFloat ? 32 : 8, 1, 64);
    // A value below 0 that stands for nothing is one of the type.
    const bool bSigned = GetReal("NODATA").value_or(0) < 0;
    const std::string type = Get("PIXELTYPE", bFloat ? "FLOAT" : bSigned ? "SIGNEDINT" : "UNSIGNEDINT");
    using namespace krv::gobs;
    static constexpr struct
    {
        std::uint64_t mnBits;
        const char* mpType;
        NativeDataTypeCode meCode;
    } TYPES[] = {{8, "UNSIGNEDINT", eDT_8U},   {8, "SIGNEDINT", eDT_8S},     {16, "UNSIGNEDINT", eDT_16U},
                 {16, "SIGNEDINT", eDT_16S},   {32, "UNSIGNEDINT", eDT_32U}, {32, "SIGNEDINT", eDT_32S},
                 {64, "UNSIGNEDINT", eDT_64U}, {64, "SIGNEDINT", eDT_64S},   {32, "FLOAT", eDT_32R},
                 {64, "FLOAT", eDT_64R}};
    for (const auto& oType : TYPES)
        if (oType.mnBits == nBits && type == oType.mpType)
            return oType.meCode;
    Refuse("NBITS", std::to_string(nBits) + ", PIXELTYPE " + type,
           "8, 16, 32 or 64 bits of UNSIGNEDINT or SIGNEDINT, or 32 or 64 of FLOAT");
}

bool EsriHeader::ReadByteOrder() const
{
    const std::string order = Get("BYTEORDER", "I");
    if (order == "M" || order == "MSBFIRST" || order == "MOTOROLA")
        return true;
    if (order != "I" && order != "LSBFIRST" && order != "INTEL" && order != "VMS_FLOAT")
        Refuse("BYTEORDER", order, "I, LSBFIRST, M or MSBFIRST");
    if (order == "VMS_FLOAT")
        Refuse("BYTEORDER", order, "an order of IEEE numbers");
    return false;
}

void EsriHeader::ReadGaps(RawForm& oForm) const
{
    const std::uint64_t nValues = oForm.moType.GetValueBits() / 8 * oForm.mnWidth;
    const bool bPixel = oForm.meInterleave == Interleave::ePixel;
    const std::uint64_t nLeast = bPixel ? nValues * oForm.mnChannels : nValues;
    oForm.mnChannelRowBytes = GetNumber("BANDROWBYTES", nValues, nValues, INT64_MAX >> 20);
    if (oForm.meInterleave == Interleave::eBand)
    {
        oForm.mnBandGap = GetNumber("BANDGAPBYTES", 0, 0, INT64_MAX >> 20);
        oForm.mnRowBytes = oForm.mnChannelRowBytes;
        return;
    }
    const std::uint64_t nUsual = bPixel ? nLeast : oForm.mnChannelRowBytes * oForm.mnChannels;
    oForm.mnRowBytes = GetNumber("TOTALROWBYTES", nUsual, nUsual, INT64_MAX >> 20);
}

RawForm EsriHeader::ReadForm() const
{
    for (const char* const pKey : {"NROWS", "NCOLS"})
        if (!moKeywords.contains(pKey))
            throw FileFormatException(moName, moName + ": the header has no \"" + pKey + "\"");
    RawForm oForm;
    oForm.mnWidth = static_cast<unsigned int>(GetNumber("NCOLS", 0, 1, INT_MAX));
    oForm.mnHeight = static_cast<unsigned int>(GetNumber("NROWS", 0, 1, INT_MAX));
    oForm.mnChannels = static_cast<unsigned int>(GetNumber("NBANDS", 1, 1, RawForm::MOST_CHANNELS));
    oForm.mnOffset = GetNumber("SKIPBYTES", 0, 0, INT64_MAX);
    oForm.moType = ReadType();
    oForm.mbBigEndian = ReadByteOrder();
    const std::string layout = Get("LAYOUT", moEnding == "FLT" ? "BSQ" : moEnding);
    if (layout != "BIL" && layout != "BIP" && layout != "BSQ")
        Refuse("LAYOUT", layout, "BIL, BIP or BSQ");
    oForm.meInterleave = layout == "BIL" ? Interleave::eLine : layout == "BIP" ? Interleave::ePixel : Interleave::eBand;
    ReadGaps(oForm);
    return oForm;
}

// The centre of the first pixel, or a corner or centre at the lower left.
std::optional<GeocodingInfo> EsriHeader::ReadGeocoding(const RawForm& oForm) const
{
    const auto FindFirst = [this](std::initializer_list<const char*> oKeys)
    {
        std::optional<double> oValue;
        for (const char* const pKey : oKeys)
            oValue = oValue ? oValue : GetReal(pKey);
        return oValue;
    };
    const auto oStepX = FindFirst({"XDIM", "DX", "CELLSIZE"}), oStepY = FindFirst({"YDIM", "DY", "CELLSIZE"});
    const double nStepX = oStepX.value_or(1), nStepY = oStepY.value_or(1);
    std::optional<GeocodingInfo> oInfo;
    if (const auto oX = GetReal("ULXMAP"), oY = GetReal("ULYMAP"); oX && oY)
        oInfo = GeocodingInfo(*oX - nStepX / 2, nStepX, 0, *oY + nStepY / 2, 0, -nStepY);
    const double nShiftX = GetReal("XLLCENTER") ? 0.5 : 0, nShiftY = GetReal("YLLCENTER") ? 0.5 : 0;
    if (const auto oX = FindFirst({"XLLCENTER", "XLLCORNER"}), oY = FindFirst({"YLLCENTER", "YLLCORNER"});
        oX && oY && oStepX && oStepY)
        oInfo = GeocodingInfo(*oX - nShiftX * nStepX, nStepX, 0, *oY + (oForm.mnHeight - nShiftY) * nStepY, 0, -nStepY);
    return oInfo && oInfo->IsInvertible() ? oInfo : std::nullopt;
}

krv::datasources::AuxiliaryData EsriHeader::ReadTags(unsigned int nChannels) const
{
    krv::datasources::AuxiliaryData oTags(nChannels);
    for (const char* const pKey : {"NODATA", "NODATA_VALUE"})
        if (const auto oFound = moKeywords.find(pKey); oFound != moKeywords.end() && IsNumber(oFound->second))
            oTags.SetFileMetadataValue("NO_DATA_VALUE", oFound->second);
    return oTags;
}

RawImage ReadEsri(RawFiles oFiles)
{
    const EsriHeader oHeader(oFiles);
    RawImage oImage;
    oImage.moForm = oHeader.ReadForm();
    oImage.moTags = oHeader.ReadTags(oImage.moForm.mnChannels);
    oImage.moGeocoding = oHeader.ReadGeocoding(oImage.moForm);
    oImage.moFiles = std::move(oFiles);
    return oImage;
}

RawImage ReadEnvi(RawFiles oFiles)
{
    RawImage oImage;
    oImage.moHeader = HeaderText(oFiles.moHeaderText);
    oImage.moForm = ReadForm(oImage.moHeader, oFiles.moHeader);
    oImage.moTags = ReadTags(oImage.moHeader, oImage.moForm.mnChannels);
    oImage.moGeocoding = ReadGeocoding(oImage.moHeader);
    oImage.moFiles = std::move(oFiles);
    return oImage;
}

} // namespace

// Every line of it is a keyword with values; those of the size are among them.
bool IsEsriHeader(std::string_view text)
{
    const auto oKeywords = ParseKeywords(text);
    const auto IsThere = [&oKeywords](const char* pKey)
    {
        const auto oFound = oKeywords.find(pKey);
        return oFound != oKeywords.end() && IsNumber(oFound->second.substr(0, oFound->second.find(' ')));
    };
    return IsThere("NROWS") && IsThere("NCOLS");
}

std::optional<RawFiles> FindFiles(const std::string& fileName)
{
    if (GetEnding(fileName) == "HDR")
        return FindData(fileName);
    const auto oSize = FindSize(fileName);
    if (!oSize)
        return std::nullopt;
    const std::string stem = GetStem(fileName);
    std::optional<RawFiles> oFirst;
    for (const std::string& base : {fileName, stem})
        for (const char* const pEnding : {".hdr", ".HDR"})
        {
            auto oFiles = TakeHeader(base + pEnding, fileName);
            if (oFiles && MayFit(*oFiles, *oSize))
                return oFiles;
            if (!oFirst)
                oFirst = std::move(oFiles);
        }
    if (oFirst)
        return oFirst;
    if (FindTileSide(*oSize) != 0 && ParseTileName(fileName))
        return RawFiles{RawKind::eHeight, fileName, {}, {}};
    return std::nullopt;
}

std::string ChooseHeaderName(const std::string& dataFile)
{
    const std::string longName = dataFile + ".hdr", shortName = GetStem(dataFile) + ".hdr";
    if (const auto oFiles = FindFiles(dataFile); oFiles && !oFiles->moHeader.empty())
        return oFiles->moHeader;
    return GetEnding(dataFile).empty() || FindSize(shortName) || FindSize(GetStem(dataFile) + ".HDR") ? longName
                                                                                                      : shortName;
}

bool IsSizeOf(const RawForm& oForm, std::uint64_t nBytes)
{
    const auto oNeeded = oForm.CountBytes();
    if (!oNeeded)
        return false;
    const std::uint64_t nRow = (*oNeeded - oForm.mnOffset) / oForm.mnHeight;
    return nBytes >= *oNeeded / 2 && nBytes <= *oNeeded + std::max(MOST_SURPLUS, nRow);
}

RawForm ReadForm(const RawFiles& oFiles)
{
    switch (oFiles.meKind)
    {
    case RawKind::eEsri:
        return EsriHeader(oFiles).ReadForm();
    case RawKind::eHeight:
        return ReadTileForm(oFiles);
    case RawKind::eEnvi:
        break;
    }
    return ReadForm(HeaderText(oFiles.moHeaderText), oFiles.moHeader);
}

RawImage ReadImage(RawFiles oFiles)
{
    switch (oFiles.meKind)
    {
    case RawKind::eEsri:
        return ReadEsri(std::move(oFiles));
    case RawKind::eHeight:
        return ReadTile(std::move(oFiles));
    case RawKind::eEnvi:
        break;
    }
    return ReadEnvi(std::move(oFiles));
}

} // namespace krv::plugins::raw
