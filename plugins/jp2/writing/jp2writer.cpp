#include "plugins/jp2/writing/jp2writer.h"

#include "plugins/jp2/geo/geoboxes.h"
#include "plugins/jp2/geo/geotiffbox.h"
#include "plugins/jp2/recordbox.h"
#include "plugins/support/file/copypieces.h"
#include "plugins/support/file/numbers.h"
#include "toolkit/core/lettercase.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>

namespace krv::plugins::jp2
{

namespace
{

using Bytes = std::vector<unsigned char>;
using support::AppendNumber;

constexpr std::uint64_t MOST_TILES = 65535;
constexpr unsigned int MOST_CHANNELS = 16384;
constexpr std::uint64_t LARGEST_TILE_BYTES = std::uint64_t{512} << 20; // of samples as the encoder takes them

void AppendBox(Bytes& oBytes, std::string_view type, const Bytes& oContent)
{
    AppendNumber(oBytes, oContent.size() + 8, 4, true);
    AppendNumber(oBytes, BoxType(type), 4, true);
    oBytes.insert(oBytes.end(), oContent.begin(), oContent.end());
}

Bytes Numbers(std::initializer_list<std::pair<std::uint64_t, std::size_t>> oNumbers)
{
    Bytes oBytes;
    for (const auto& [nValue, nBytes] : oNumbers)
        AppendNumber(oBytes, nValue, nBytes, true);
    return oBytes;
}

Bytes WithUuid(const Uuid& oUuid, const Bytes& oContent)
{
    Bytes oBytes(oUuid.begin(), oUuid.end());
    oBytes.insert(oBytes.end(), oContent.begin(), oContent.end());
    return oBytes;
}

// The table of the tiles' lengths: who reads one tile need not look at those before it.
Bytes MakeLengths(const TileStore& oTiles)
{
    constexpr std::uint64_t TLM = 0xFF55;
    constexpr std::uint64_t KIND = 0x60; // two bytes for the tile, four for its length
    constexpr std::uint64_t MOST_ENTRIES = 10000;
    Bytes oBytes;
    for (std::uint64_t nFirst = 0, nNumber = 0; nFirst < oTiles.CountTiles(); nFirst += MOST_ENTRIES, ++nNumber)
    {
        const std::uint64_t nCount = std::min(MOST_ENTRIES, oTiles.CountTiles() - nFirst);
        const Bytes oHead = Numbers({{TLM, 2}, {4 + 6 * nCount, 2}, {nNumber, 1}, {KIND, 1}});
        oBytes.insert(oBytes.end(), oHead.begin(), oHead.end());
        for (std::uint64_t nTile = nFirst; nTile < nFirst + nCount; ++nTile)
        {
            AppendNumber(oBytes, nTile, 2, true);
            AppendNumber(oBytes, oTiles.GetTileBytes(nTile), 4, true);
        }
    }
    return oBytes;
}

// Red, green and blue of each value, and opacity where the table has it.
Bytes MakePalette(const krv::gobs::PCT& oTable, unsigned int nBits)
{
    constexpr unsigned int MOST_BITS = 10;
    const std::size_t nEntries = std::size_t{1} << std::min(nBits, MOST_BITS);
    const std::size_t nColumns = oTable.HasAlpha() ? 4 : 3;
    Bytes oBytes = Numbers({{nEntries, 2}, {nColumns, 1}});
    oBytes.resize(oBytes.size() + nColumns, 15); // 16 bits each
    for (std::size_t nAt = 0; nAt < nEntries; ++nAt)
    {
        std::uint16_t nAlpha = 0;
        const auto oColour = oTable.GetValue16(static_cast<double>(nAt), nAlpha);
        const std::uint16_t aParts[] = {oColour.red, oColour.green, oColour.blue, nAlpha};
        for (std::size_t nPart = 0; nPart < nColumns; ++nPart)
            AppendNumber(oBytes, aParts[nPart], 2, true);
    }
    return oBytes;
}

} // namespace

Jp2Writer::Jp2Writer(const std::string& fileName, const CreateOptions& oOptions)
    : FileWriter(fileName), moOptions(oOptions)
{
}

Jp2Writer::~Jp2Writer() = default;

void Jp2Writer::Make(unsigned int nWidth, unsigned int nHeight, const std::vector<krv::gobs::DataType>& oTypes,
                     const Place& oPlace)
{
    const auto Refuse = [&](const std::string& what)
    {
        throw krv::DataException(GetFileName() + ": " + what, oPlace);
    };
    const krv::gobs::DataType& oType = oTypes.front();
    if (std::any_of(oTypes.begin(), oTypes.end(), [&oType](const auto& oOne) { return oOne != oType; }))
        Refuse("JPEG 2000 files are written with channels of one type");
    if (oType.IsReal() || oType.IsComplex() || (oType.GetBits() != 8 && oType.GetBits() != 16))
        Refuse("JPEG 2000 holds integers of 8 and 16 bits, not " + oType.Describe());
    if (oTypes.size() > MOST_CHANNELS)
        Refuse("JPEG 2000 holds at most 16384 channels");
    const unsigned int nBits = moOptions.mnSampleBits != 0 ? moOptions.mnSampleBits : oType.GetBits();
    if (nBits > oType.GetBits())
        Refuse("samples of " + std::to_string(nBits) + " bits are more than " + oType.Describe() + " has");
    const TileEncoder oEncoder(GetFileName(), moOptions,
                               {nWidth, nHeight, static_cast<unsigned int>(oTypes.size()), oType, nBits});
    const std::uint64_t nTilePixels = std::uint64_t{oEncoder.GetTileWidth()} * oEncoder.GetTileHeight();
    if (nTilePixels * oTypes.size() * 4 > LARGEST_TILE_BYTES)
        Refuse("tiles of so many channels are too large: BLOCKXSIZE and BLOCKYSIZE make them smaller");
    const std::uint64_t nAcross = (nWidth - 1) / oEncoder.GetTileWidth() + 1;
    const std::uint64_t nDown = (nHeight - 1) / oEncoder.GetTileHeight() + 1;
    if (nAcross * nDown > MOST_TILES)
        Refuse("JPEG 2000 holds at most 65535 tiles, not " + std::to_string(nAcross * nDown) +
               ": BLOCKXSIZE and BLOCKYSIZE make them larger");
    MakeFile();
    moRecord = krv::datasources::AuxiliaryData(static_cast<unsigned int>(oTypes.size()));
    mpoTiles = std::make_shared<TileStore>(GetFile(), oEncoder, [this] { Change(); });
    mbChanged = true;
}

void Jp2Writer::Change()
{
    CheckWritable();
    mbChanged = true;
}

void Jp2Writer::SetRecord(const krv::datasources::AuxiliaryData& oRecord)
{
    Change();
    moRecord = oRecord;
}

void Jp2Writer::SetGeoTags(support::GeoTags oTags)
{
    Change();
    moGeoTags = std::move(oTags);
}

void Jp2Writer::SetPalette(std::optional<krv::gobs::PCT> oPalette, const Place& oPlace)
{
    const ImageForm& oForm = mpoTiles->GetEncoder().GetForm();
    if (oForm.mnChannels != 1 || oForm.moType.IsSigned() || oForm.mnBits > 10)
        throw krv::DataException(
            GetFileName() +
                ": only a single channel of unsigned samples of up to 10 bits can have a pseudocolour table",
            oPlace);
    Change();
    moPalette = std::move(oPalette);
}

bool Jp2Writer::HasBoxes() const
{
    const auto nDot = GetFileName().rfind('.');
    const std::string extension = nDot == std::string::npos ? "" : krv::ToUpper(GetFileName().substr(nDot + 1));
    return moOptions.moBoxes.value_or(extension != "J2K" && extension != "J2C" && extension != "JPC");
}

void Jp2Writer::Store()
{
    mpoTiles->Complete();
    StoreAnew([this](support::File& oFile) { WriteAll(oFile); });
    mbChanged = false;
}

void Jp2Writer::WriteAll(support::File& oFile) const
{
    constexpr std::uint64_t EOC = 0xFFD9;
    Bytes oHead = HasBoxes() ? MakeBoxes() : Bytes();
    const Bytes oMain = MakeMainHeader();
    std::uint64_t nStream = oMain.size() + 2;
    for (std::uint64_t nTile = 0; nTile < mpoTiles->CountTiles(); ++nTile)
        nStream += mpoTiles->GetTileBytes(nTile);
    if (HasBoxes())
    {
        constexpr std::uint64_t LONG_LENGTH = 1;
        const Bytes oBox = Numbers({{LONG_LENGTH, 4}, {BoxType("jp2c"), 4}, {nStream + 16, 8}});
        oHead.insert(oHead.end(), oBox.begin(), oBox.end());
    }
    oHead.insert(oHead.end(), oMain.begin(), oMain.end());
    oFile.Write(0, oHead.data(), oHead.size());
    std::uint64_t nPlace = oHead.size();
    std::vector<support::CopiedPiece> oData;
    for (std::uint64_t nTile = 0; nTile < mpoTiles->CountTiles(); ++nTile)
    {
        oData.push_back({mpoTiles->GetTileOffset(nTile), nPlace, mpoTiles->GetTileBytes(nTile)});
        nPlace += oData.back().mnBytes;
    }
    support::Scratch oScratch;
    support::CopyPieces(*GetFile(), oFile, oData, oScratch, WatchPart(nPlace));
    // Each was encoded as the first one of a codestream of its own.
    for (std::size_t nTile = 1; nTile < oData.size(); ++nTile)
    {
        constexpr std::uint64_t NUMBER = 4;
        const Bytes oNumber = Numbers({{nTile, 2}});
        oFile.Write(oData[nTile].mnTo + NUMBER, oNumber.data(), oNumber.size());
    }
    const Bytes oEnd = Numbers({{EOC, 2}});
    oFile.Write(nPlace, oEnd.data(), oEnd.size());
}

// That of a tile, with the size of the image.
Bytes Jp2Writer::MakeMainHeader() const
{
    constexpr std::ptrdiff_t SIZES = 8;
    const ImageForm& oForm = mpoTiles->GetEncoder().GetForm();
    Bytes oBytes = mpoTiles->ReadMainHeader();
    const Bytes oSizes = Numbers({{oForm.mnWidth, 4},
                                  {oForm.mnHeight, 4},
                                  {0, 4},
                                  {0, 4},
                                  {mpoTiles->GetEncoder().GetTileWidth(), 4},
                                  {mpoTiles->GetEncoder().GetTileHeight(), 4},
                                  {0, 4},
                                  {0, 4}});
    std::copy(oSizes.begin(), oSizes.end(), oBytes.begin() + SIZES);
    const Bytes oLengths = MakeLengths(*mpoTiles);
    oBytes.insert(oBytes.end(), oLengths.begin(), oLengths.end());
    return oBytes;
}

Bytes Jp2Writer::MakeBoxes() const
{
    Bytes oBytes;
    AppendBox(oBytes, "jP  ", {13, 10, 0x87, 10});
    AppendBox(oBytes, "ftyp", Numbers({{BoxType("jp2 "), 4}, {0, 4}, {BoxType("jp2 "), 4}}));
    AppendBox(oBytes, "jp2h", MakeHeaderBox());
    const bool bPlace = !moGeoTags.moKeys.empty() || !moGeoTags.moTiePoints.empty() || !moGeoTags.moMatrix.empty();
    if (bPlace)
        AppendBox(oBytes, "uuid", WithUuid(GEOTIFF_UUID, MakeGeoTiff(moGeoTags)));
    const std::string record = WriteRecordBox(moRecord);
    if (!record.empty())
        AppendBox(oBytes, "uuid", WithUuid(RECORD_UUID, Bytes(record.begin(), record.end())));
    return oBytes;
}

Bytes Jp2Writer::MakeHeaderBox() const
{
    constexpr std::uint64_t WAVELET = 7, ENUMERATED = 1, SRGB = 16, GREY = 17;
    const ImageForm& oForm = mpoTiles->GetEncoder().GetForm();
    const std::uint64_t nBits = (oForm.mnBits - 1) | (oForm.moType.IsSigned() ? 128u : 0u);
    Bytes oBytes;
    AppendBox(
        oBytes, "ihdr",
        Numbers({{oForm.mnHeight, 4}, {oForm.mnWidth, 4}, {oForm.mnChannels, 2}, {nBits, 1}, {WAVELET, 1}, {0, 2}}));
    const std::vector<ChannelUse> oUses = FindUses(moRecord, mpoTiles->GetEncoder().HasColourTransform());
    const auto IsColour = [](const ChannelUse& oUse)
    {
        return oUse.mnColour > 1;
    };
    const bool bColours = moPalette || std::any_of(oUses.begin(), oUses.end(), IsColour);
    AppendBox(oBytes, "colr", Numbers({{ENUMERATED, 1}, {0, 2}, {bColours ? SRGB : GREY, 4}}));
    if (moPalette)
    {
        AppendBox(oBytes, "pclr", MakePalette(*moPalette, oForm.mnBits));
        Bytes oMapping;
        for (std::uint64_t nColumn = 0; nColumn < (moPalette->HasAlpha() ? 4u : 3u); ++nColumn)
        {
            const Bytes oOne = Numbers({{0, 2}, {1, 1}, {nColumn, 1}});
            oMapping.insert(oMapping.end(), oOne.begin(), oOne.end());
        }
        AppendBox(oBytes, "cmap", oMapping);
    }
    const bool bPlain = std::all_of(oUses.begin(), oUses.end(), [](const ChannelUse& oUse) { return oUse.mnUse == 0; });
    if (moPalette || bPlain)
        return oBytes;
    Bytes oChannels = Numbers({{oUses.size(), 2}});
    for (std::size_t nAt = 0; nAt < oUses.size(); ++nAt)
    {
        const Bytes oOne = Numbers({{nAt, 2}, {oUses[nAt].mnUse, 2}, {oUses[nAt].mnColour, 2}});
        oChannels.insert(oChannels.end(), oOne.begin(), oOne.end());
    }
    AppendBox(oBytes, "cdef", oChannels);
    return oBytes;
}

} // namespace krv::plugins::jp2
