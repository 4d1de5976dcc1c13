#include "operations/picture/legend.h"

#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <set>
#include <string>
#include <string_view>
#include <vector>

namespace krv::operations
{

namespace
{

// Letters, five columns by seven rows: a number for each row, its highest of five bits on the left. What is not among
// them is shown as a box.
constexpr std::string_view LETTERS =
    "!\"#%&'()*+,-./0123456789:;<=>?ABCDEFGHIJKLMNOPQRSTUVWXYZ[]_abcdefghijklmnopqrstuvwxyz";
constexpr std::array<std::array<std::uint8_t, 7>, LETTERS.size()> SHAPES{
    {{4, 4, 4, 4, 0, 0, 4},        {10, 10, 10, 0, 0, 0, 0},     {10, 10, 31, 10, 31, 10, 10},
     {24, 25, 2, 4, 8, 19, 3},     {12, 18, 20, 8, 21, 18, 13},  {12, 4, 8, 0, 0, 0, 0},
     {2, 4, 8, 8, 8, 4, 2},        {8, 4, 2, 2, 2, 4, 8},        {0, 4, 21, 14, 21, 4, 0},
     {0, 4, 4, 31, 4, 4, 0},       {0, 0, 0, 0, 12, 4, 8},       {0, 0, 0, 31, 0, 0, 0},
     {0, 0, 0, 0, 0, 12, 12},      {0, 1, 2, 4, 8, 16, 0},       {14, 17, 19, 21, 25, 17, 14},
     {4, 12, 4, 4, 4, 4, 14},      {14, 17, 1, 2, 4, 8, 31},     {31, 2, 4, 2, 1, 17, 14},
     {2, 6, 10, 18, 31, 2, 2},     {31, 16, 30, 1, 1, 17, 14},   {6, 8, 16, 30, 17, 17, 14},
     {31, 1, 2, 4, 8, 8, 8},       {14, 17, 17, 14, 17, 17, 14}, {14, 17, 17, 15, 1, 2, 12},
     {0, 12, 12, 0, 12, 12, 0},    {0, 12, 12, 0, 12, 4, 8},     {2, 4, 8, 16, 8, 4, 2},
     {0, 0, 31, 0, 31, 0, 0},      {8, 4, 2, 1, 2, 4, 8},        {14, 17, 1, 2, 4, 0, 4},
     {14, 17, 17, 31, 17, 17, 17}, {30, 17, 17, 30, 17, 17, 30}, {14, 17, 16, 16, 16, 17, 14},
     {28, 18, 17, 17, 17, 18, 28}, {31, 16, 16, 30, 16, 16, 31}, {31, 16, 16, 30, 16, 16, 16},
     {14, 17, 16, 23, 17, 17, 15}, {17, 17, 17, 31, 17, 17, 17}, {14, 4, 4, 4, 4, 4, 14},
     {7, 2, 2, 2, 2, 18, 12},      {17, 18, 20, 24, 20, 18, 17}, {16, 16, 16, 16, 16, 16, 31},
     {17, 27, 21, 21, 17, 17, 17}, {17, 17, 25, 21, 19, 17, 17}, {14, 17, 17, 17, 17, 17, 14},
     {30, 17, 17, 30, 16, 16, 16}, {14, 17, 17, 17, 21, 18, 13}, {30, 17, 17, 30, 20, 18, 17},
     {15, 16, 16, 14, 1, 1, 30},   {31, 4, 4, 4, 4, 4, 4},       {17, 17, 17, 17, 17, 17, 14},
     {17, 17, 17, 17, 17, 10, 4},  {17, 17, 17, 21, 21, 21, 10}, {17, 17, 10, 4, 10, 17, 17},
     {17, 17, 17, 10, 4, 4, 4},    {31, 1, 2, 4, 8, 16, 31},     {14, 8, 8, 8, 8, 8, 14},
     {14, 2, 2, 2, 2, 2, 14},      {0, 0, 0, 0, 0, 0, 31},       {0, 0, 14, 1, 15, 17, 15},
     {16, 16, 22, 25, 17, 17, 30}, {0, 0, 14, 16, 16, 17, 14},   {1, 1, 13, 19, 17, 17, 15},
     {0, 0, 14, 17, 31, 16, 14},   {6, 9, 8, 28, 8, 8, 8},       {0, 15, 17, 17, 15, 1, 14},
     {16, 16, 22, 25, 17, 17, 17}, {4, 0, 12, 4, 4, 4, 14},      {2, 0, 6, 2, 2, 18, 12},
     {16, 16, 18, 20, 24, 20, 18}, {12, 4, 4, 4, 4, 4, 14},      {0, 0, 26, 21, 21, 17, 17},
     {0, 0, 22, 25, 17, 17, 17},   {0, 0, 14, 17, 17, 17, 14},   {0, 0, 30, 17, 30, 16, 16},
     {0, 0, 13, 19, 15, 1, 1},     {0, 0, 22, 25, 16, 16, 16},   {0, 0, 14, 16, 14, 1, 30},
     {8, 8, 28, 8, 8, 9, 6},       {0, 0, 17, 17, 17, 19, 13},   {0, 0, 17, 17, 17, 10, 4},
     {0, 0, 17, 17, 21, 21, 10},   {0, 0, 17, 10, 4, 10, 17},    {0, 0, 17, 17, 15, 1, 14},
     {0, 0, 31, 2, 4, 8, 31}}};
constexpr std::array<std::uint8_t, 7> BOX{31, 17, 17, 17, 17, 17, 31};
constexpr unsigned int LETTER_WIDTH = 6, LETTER_HEIGHT = 7, GAP = 4;
constexpr unsigned int FIELD = 10;
constexpr unsigned int MOST_FIELDS = 64;
constexpr unsigned int LEAST_WIDTH = 160;
constexpr std::size_t LONGEST_TEXT = 32;

struct Colour
{
    std::uint8_t red;
    std::uint8_t green;
    std::uint8_t blue;
};

constexpr Colour INK{0, 0, 0};

bool HasAlpha(const Picture& oPicture)
{
    return oPicture.samples % 2 == 0;
}

void Paint(Picture& oPicture, unsigned int nX, unsigned int nY, const Colour& oColour)
{
    if (nX >= oPicture.width || nY >= oPicture.height)
        return;
    std::uint8_t* const pPixel = oPicture.pixels.data() + (std::size_t{nY} * oPicture.width + nX) * oPicture.samples;
    const std::uint8_t aColour[] = {oColour.red, oColour.green, oColour.blue};
    std::copy_n(aColour, oPicture.samples < 3 ? 1 : 3, pPixel);
    if (HasAlpha(oPicture))
        pPixel[oPicture.samples - 1] = 255;
}

void PaintField(Picture& oPicture, unsigned int nX, unsigned int nY, unsigned int nWidth, unsigned int nHeight,
                const Colour& oColour)
{
    for (unsigned int y = 0; y < nHeight; ++y)
        for (unsigned int x = 0; x < nWidth; ++x)
            Paint(oPicture, nX + x, nY + y, oColour);
}

unsigned int WidthOf(const std::string& text)
{
    return static_cast<unsigned int>(text.size()) * LETTER_WIDTH;
}

void Write(Picture& oPicture, unsigned int nX, unsigned int nY, const std::string& text)
{
    for (const char c : text)
    {
        const std::size_t nLetter = LETTERS.find(c);
        const auto& aShape = nLetter == std::string_view::npos ? BOX : SHAPES[nLetter];
        for (unsigned int y = 0; y < LETTER_HEIGHT && c != ' '; ++y)
            for (unsigned int x = 0; x < LETTER_WIDTH - 1; ++x)
                if ((aShape[y] & 16u >> x) != 0)
                    Paint(oPicture, nX + x, nY + y, INK);
        nX += LETTER_WIDTH;
    }
}

// A white strip below, and beside where the picture is narrower than it; returns the strip's first row.
unsigned int MakeRoom(Picture& oPicture, unsigned int nWidth, unsigned int nHeight)
{
    Picture oLarger{std::max(oPicture.width, nWidth), oPicture.height + nHeight, oPicture.samples, {}};
    oLarger.pixels.assign(std::size_t{oLarger.width} * oLarger.height * oLarger.samples, 255);
    for (unsigned int y = 0; y < oPicture.height; ++y)
        std::copy_n(
            oPicture.pixels.begin() + static_cast<std::ptrdiff_t>(std::size_t{y} * oPicture.width * oPicture.samples),
            std::size_t{oPicture.width} * oPicture.samples,
            oLarger.pixels.begin() + static_cast<std::ptrdiff_t>(std::size_t{y} * oLarger.width * oLarger.samples));
    const unsigned int nStrip = oPicture.height;
    oPicture = std::move(oLarger);
    return nStrip;
}

struct TableField
{
    double value;
    Colour colour;
};

// The entries whose values occur: tables often have many more.
std::vector<TableField> ListShown(const krv::gobs::PCT& oTable, const std::set<double>& oValues)
{
    std::vector<TableField> oFields;
    for (const auto& oEntry : oTable.GetEntries())
    {
        const auto oValue = oValues.lower_bound(oEntry.low);
        const bool bShown = oValue != oValues.end() && (*oValue < oEntry.high || *oValue == oEntry.low);
        const auto oColour = oTable.GetValue(oEntry.low);
        if (bShown && oFields.size() < MOST_FIELDS)
            oFields.push_back({oEntry.low, {oColour.red, oColour.green, oColour.blue}});
    }
    return oFields;
}

// The value, and the name of its class as far as there is room. A character of several bytes takes the place of one.
std::string FieldText(double nValue, const ClassNames& oNames)
{
    std::string text = fmt::format("{:.6g}", nValue);
    const auto oName =
        nValue >= 0 && nValue <= UINT32_MAX ? oNames.find(static_cast<unsigned int>(nValue)) : oNames.end();
    if (oName == oNames.end())
        return text;
    text += ' ';
    for (const char c : oName->second)
        if ((static_cast<unsigned char>(c) & 0xC0U) != 0x80U && text.size() < LONGEST_TEXT)
            text += c;
    return text;
}

} // namespace

void AddGreyLegend(double nBlack, double nWhite, const std::string& unit, bool bInverted, Picture& oPicture)
{
    const std::string left = fmt::format("{:.4g}", nBlack);
    const std::string right = fmt::format("{:.4g}{}{}", nWhite, unit.empty() ? "" : " ", unit.substr(0, LONGEST_TEXT));
    const unsigned int nTexts = WidthOf(left) + WidthOf(right) + 3 * GAP;
    const unsigned int nTop = MakeRoom(oPicture, std::max(nTexts, LEAST_WIDTH), FIELD + LETTER_HEIGHT + 3 * GAP);
    const unsigned int nLength = oPicture.width - 2 * GAP;
    for (unsigned int x = 0; x < nLength; ++x)
    {
        const auto nLevel = static_cast<std::uint8_t>(255u * x / std::max(nLength - 1, 1u));
        const auto nShown = bInverted ? static_cast<std::uint8_t>(255 - nLevel) : nLevel;
        PaintField(oPicture, GAP + x, nTop + GAP, 1, FIELD, {nShown, nShown, nShown});
    }
    PaintField(oPicture, GAP, nTop + GAP, nLength, 1, INK);
    PaintField(oPicture, GAP, nTop + GAP + FIELD - 1, nLength, 1, INK);
    Write(oPicture, GAP, nTop + 2 * GAP + FIELD, left);
    Write(oPicture, oPicture.width - GAP - WidthOf(right), nTop + 2 * GAP + FIELD, right);
}

void AddColourLegend(const krv::gobs::PCT& oTable, const std::set<double>& oValues, const ClassNames& oNames,
                     Picture& oPicture)
{
    const auto oEntries = ListShown(oTable, oValues);
    const auto nShown = static_cast<unsigned int>(oEntries.size());
    std::vector<std::string> oTexts;
    unsigned int nText = 0;
    for (unsigned int i = 0; i < nShown; ++i)
    {
        oTexts.push_back(FieldText(oEntries[i].value, oNames));
        nText = std::max(nText, WidthOf(oTexts.back()));
    }
    const unsigned int nStep = FIELD + nText + 2 * GAP;
    const unsigned int nAcross = std::max((std::max(oPicture.width, LEAST_WIDTH) - GAP) / nStep, 1u);
    const unsigned int nRows = (nShown + nAcross - 1) / nAcross;
    const unsigned int nTop = MakeRoom(oPicture, std::max(LEAST_WIDTH, nStep + GAP), nRows * (FIELD + GAP) + GAP);
    for (unsigned int i = 0; i < nShown; ++i)
    {
        const unsigned int nX = GAP + i % nAcross * nStep, nY = nTop + GAP + i / nAcross * (FIELD + GAP);
        PaintField(oPicture, nX, nY, FIELD, FIELD, INK);
        PaintField(oPicture, nX + 1, nY + 1, FIELD - 2, FIELD - 2, oEntries[i].colour);
        Write(oPicture, nX + FIELD + 2, nY + 2, oTexts[i]);
    }
}

} // namespace krv::operations
