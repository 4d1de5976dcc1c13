#include "plugins/jp2/reading/imageheader.h"

#include "plugins/support/file/iccprofile.h"
#include "plugins/support/file/numbers.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <cmath>

namespace krv::plugins::jp2
{

namespace
{

using support::ReadNumber;

constexpr std::uint64_t LARGEST_BOX = std::uint64_t{16} << 20;
constexpr std::size_t MOST_COLOURS = 1024;
constexpr unsigned int MOST_COLOUR_BITS = 16;
constexpr unsigned int COLOUR_MAXIMUM = 65535;

// Bytes that are taken one number after the other; 0 behind the end, which shows in IsShort.
class Cursor
{
public:
    explicit Cursor(const std::vector<unsigned char>& oBytes) : moBytes(oBytes) {}

    std::uint32_t Take(std::size_t nBytes)
    {
        mbShort = mbShort || moBytes.size() - mnAt < nBytes;
        if (mbShort)
            return 0;
        mnAt += nBytes;
        return static_cast<std::uint32_t>(ReadNumber(moBytes.data() + mnAt - nBytes, nBytes, true));
    }

    bool IsShort() const { return mbShort; }
    std::size_t GetPlace() const { return mnAt; }

private:
    const std::vector<unsigned char>& moBytes;
    std::size_t mnAt = 0;
    bool mbShort = false;
};

// Colours by entry, of as many columns as there are, in 16 bits.
struct Palette
{
    std::size_t mnEntries = 0;
    std::size_t mnColumns = 0;
    std::vector<std::uint16_t> moValues;
};

std::optional<Palette> ReadPalette(const std::vector<unsigned char>& oBytes)
{
    Cursor oCursor(oBytes);
    Palette oPalette;
    oPalette.mnEntries = oCursor.Take(2);
    oPalette.mnColumns = oCursor.Take(1);
    if (oPalette.mnEntries == 0 || oPalette.mnEntries > MOST_COLOURS || oPalette.mnColumns == 0)
        return std::nullopt;
    std::vector<unsigned int> oBits;
    for (std::size_t nAt = 0; nAt < oPalette.mnColumns; ++nAt)
        oBits.push_back((oCursor.Take(1) & 127) + 1);
    if (*std::max_element(oBits.begin(), oBits.end()) > MOST_COLOUR_BITS)
        return std::nullopt;
    for (std::size_t nAt = 0; nAt < oPalette.mnEntries * oPalette.mnColumns; ++nAt)
    {
        const unsigned int nBits = oBits[nAt % oPalette.mnColumns];
        const unsigned int nMaximum = (1u << nBits) - 1;
        const unsigned int nValue = std::min(oCursor.Take((nBits + 7) / 8), nMaximum);
        oPalette.moValues.push_back(
            static_cast<std::uint16_t>((std::uint64_t{nValue} * COLOUR_MAXIMUM + nMaximum / 2) / nMaximum));
    }
    return oCursor.IsShort() ? std::nullopt : std::optional(std::move(oPalette));
}

void ReadColours(const std::vector<unsigned char>& oBytes, ImageHeader& oHeader)
{
    constexpr std::uint32_t ENUMERATED = 1;
    Cursor oCursor(oBytes);
    const std::uint32_t nMethod = oCursor.Take(1);
    oCursor.Take(2);
    if (oCursor.IsShort() || oHeader.mnColours != 0 || !oHeader.moProfile.empty())
        return;
    if (nMethod == ENUMERATED)
        oHeader.mnColours = oCursor.Take(4);
    else
    {
        const std::size_t nAt = std::min(oCursor.GetPlace(), oBytes.size());
        oHeader.moProfile = support::ReadProfileName(oBytes.data() + nAt, oBytes.size() - nAt);
    }
}

// Pixels per metre: a fraction and a power of ten.
void ReadResolution(const std::vector<unsigned char>& oBytes, ImageHeader& oHeader)
{
    Cursor oCursor(oBytes);
    double aValues[4];
    for (double& nValue : aValues)
        nValue = oCursor.Take(2);
    const auto nDownPower = static_cast<signed char>(oCursor.Take(1));
    const auto nAcrossPower = static_cast<signed char>(oCursor.Take(1));
    const double nDown = aValues[0] / aValues[1] * std::pow(10.0, nDownPower);
    const double nAcross = aValues[2] / aValues[3] * std::pow(10.0, nAcrossPower);
    if (!oCursor.IsShort() && std::isfinite(nDown) && std::isfinite(nAcross) && nDown > 0 && nAcross > 0)
        oHeader.moResolution = {nAcross, nDown};
}

using Mapping = std::vector<std::pair<unsigned int, int>>; // component and column of the palette, or -1

Mapping ReadMapping(const std::vector<unsigned char>& oBytes)
{
    Mapping oMapping;
    for (std::size_t nAt = 0; nAt + 4 <= oBytes.size(); nAt += 4)
        oMapping.emplace_back(static_cast<unsigned int>(ReadNumber(oBytes.data() + nAt, 2, true)),
                              oBytes[nAt + 2] == 1 ? oBytes[nAt + 3] : -1);
    return oMapping;
}

void ReadChannels(const std::vector<unsigned char>& oBytes, unsigned int nComponents, ImageHeader& oHeader)
{
    using Use = ImageHeader::Use;
    constexpr std::uint32_t NO_COLOUR = 65535;
    Cursor oCursor(oBytes);
    const std::uint32_t nCount = oCursor.Take(2);
    for (std::uint32_t nAt = 0; nAt < nCount; ++nAt)
    {
        const std::uint32_t nChannel = oCursor.Take(2), nUse = oCursor.Take(2), nColour = oCursor.Take(2);
        if (oCursor.IsShort())
            return;
        const Use eUse = nUse == 0   ? Use::eColour
                         : nUse == 1 ? Use::eAlpha
                         : nUse == 2 ? Use::ePremultiplied
                                     : Use::eOther;
        if (nChannel < nComponents)
            oHeader.moChannels.insert({nChannel, {eUse, nColour == NO_COLOUR ? 0 : nColour}});
    }
}

krv::gobs::PCT MakeTable(const Palette& oPalette, const Mapping& oMapping, unsigned int nComponent)
{
    // Red, green, blue and opacity; the columns as they stand where nothing says otherwise.
    std::vector<std::size_t> oColumns;
    for (const auto& [nOf, nColumn] : oMapping)
        if (nOf == nComponent && nColumn >= 0 && static_cast<std::size_t>(nColumn) < oPalette.mnColumns)
            oColumns.push_back(static_cast<std::size_t>(nColumn));
    for (std::size_t nAt = 0; oMapping.empty() && nAt < oPalette.mnColumns; ++nAt)
        oColumns.push_back(nAt);
    krv::gobs::PCT oTable;
    for (std::size_t nAt = 0; !oColumns.empty() && nAt < oPalette.mnEntries; ++nAt)
    {
        const auto Value = [&](std::size_t nPart)
        {
            const std::size_t nColumn = oColumns[oColumns.size() < 3 ? 0 : nPart];
            return oPalette.moValues[nAt * oPalette.mnColumns + nColumn];
        };
        const auto nValue = static_cast<double>(nAt);
        oTable.Add({nValue,
                    nValue + 1,
                    {Value(0), Value(1), Value(2)},
                    oColumns.size() > 3 ? Value(3) : std::uint16_t{COLOUR_MAXIMUM}});
    }
    return oTable;
}

} // namespace

std::string ImageHeader::GetColourSpace() const
{
    constexpr std::pair<unsigned int, const char*> NAMES[] = {
        {12, "CMYK"}, {14, "CIELab"}, {16, "sRGB"}, {17, "Grey"}, {18, "sYCC"}, {20, "e-sRGB"}, {21, "ROMM-RGB"}};
    for (const auto& [nNumber, pName] : NAMES)
        if (nNumber == mnColours)
            return pName;
    return {};
}

ImageHeader ReadImageHeader(const support::File& oFile, const Box& oHeader, unsigned int nComponents,
                            std::string* pTrouble)
{
    ImageHeader oFound;
    std::optional<Palette> oPalette;
    Mapping oMapping;
    const auto ReadOne = [&](const Box& oBox, const auto& Read)
    {
        try
        {
            Read(ReadBox(oFile, oBox, LARGEST_BOX));
        }
        catch (const krv::FileFormatException& oException)
        {
            if (pTrouble != nullptr)
                *pTrouble = oException.GetMessage();
        }
    };
    for (const Box& oBox : ListBoxes(oFile, oHeader.mnOffset, oHeader.mnOffset + oHeader.mnBytes, pTrouble))
        switch (oBox.mnType)
        {
        case BoxType("pclr"):
            ReadOne(oBox, [&](const auto& oBytes) { oPalette = ReadPalette(oBytes); });
            break;
        case BoxType("cmap"):
            ReadOne(oBox, [&](const auto& oBytes) { oMapping = ReadMapping(oBytes); });
            break;
        case BoxType("cdef"):
            ReadOne(oBox, [&](const auto& oBytes) { ReadChannels(oBytes, nComponents, oFound); });
            break;
        case BoxType("colr"):
            ReadOne(oBox, [&](const auto& oBytes) { ReadColours(oBytes, oFound); });
            break;
        case BoxType("res "):
            for (const Box& oInner : ListBoxes(oFile, oBox.mnOffset, oBox.mnOffset + oBox.mnBytes))
                ReadOne(oInner, [&](const auto& oBytes) { ReadResolution(oBytes, oFound); });
            break;
        default:
            break;
        }
    if (!oPalette)
        return oFound;
    // Its channels are those of the palette, not of the codestream.
    oFound.moChannels.clear();
    const auto IsMapped = [](const auto& oOne)
    {
        return oOne.second >= 0;
    };
    const auto oFirst = std::find_if(oMapping.begin(), oMapping.end(), IsMapped);
    oFound.mnPaletteComponent = oFirst == oMapping.end() ? 0 : oFirst->first;
    if (oFound.mnPaletteComponent < nComponents)
        oFound.moPalette = MakeTable(*oPalette, oMapping, oFound.mnPaletteComponent);
    return oFound;
}

} // namespace krv::plugins::jp2
