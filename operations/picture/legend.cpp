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

// Letters of numbers, five columns by seven rows: a number for each row, its highest of five bits on the left.
constexpr std::string_view LETTERS = "0123456789-+.e";
constexpr std::array<std::array<std::uint8_t, 7>, LETTERS.size()> SHAPES{{{14, 17, 19, 21, 25, 17, 14},
                                                                          {4, 12, 4, 4, 4, 4, 14},
                                                                          {14, 17, 1, 2, 4, 8, 31},
                                                                          {31, 2, 4, 2, 1, 17, 14},
                                                                          {2, 6, 10, 18, 31, 2, 2},
                                                                          {31, 16, 30, 1, 1, 17, 14},
                                                                          {6, 8, 16, 30, 17, 17, 14},
                                                                          {31, 1, 2, 4, 8, 8, 8},
                                                                          {14, 17, 17, 14, 17, 17, 14},
                                                                          {14, 17, 17, 15, 1, 2, 12},
                                                                          {0, 0, 0, 31, 0, 0, 0},
                                                                          {0, 4, 4, 31, 4, 4, 0},
                                                                          {0, 0, 0, 0, 0, 12, 12},
                                                                          {0, 0, 14, 17, 31, 16, 14}}};
constexpr unsigned int LETTER_WIDTH = 6, LETTER_HEIGHT = 7, GAP = 4;
constexpr unsigned int FIELD = 10;
constexpr unsigned int MOST_FIELDS = 64;
constexpr unsigned int LEAST_WIDTH = 160;

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
        for (unsigned int y = 0; y < LETTER_HEIGHT && nLetter != std::string_view::npos; ++y)
            for (unsigned int x = 0; x < LETTER_WIDTH - 1; ++x)
                if ((SHAPES[nLetter][y] & 16u >> x) != 0)
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

// The entries whose colours the picture has: tables often have many more.
std::vector<TableField> ListShown(const krv::gobs::PCT& oTable, const Picture& oPicture)
{
    std::set<std::array<std::uint8_t, 3>> oSeen;
    for (std::size_t i = 0; i + 3 <= oPicture.pixels.size() && oPicture.samples >= 3; i += oPicture.samples)
        if (!HasAlpha(oPicture) || oPicture.pixels[i + 3] != 0)
            oSeen.insert({oPicture.pixels[i], oPicture.pixels[i + 1], oPicture.pixels[i + 2]});
    std::vector<TableField> oFields;
    for (const auto& oEntry : oTable.GetEntries())
    {
        const auto oColour = oTable.GetValue(oEntry.low);
        if (oFields.size() < MOST_FIELDS && oSeen.contains({oColour.red, oColour.green, oColour.blue}))
            oFields.push_back({oEntry.low, {oColour.red, oColour.green, oColour.blue}});
    }
    return oFields;
}

} // namespace

void AddGreyLegend(double nBlack, double nWhite, bool bInverted, Picture& oPicture)
{
    const std::string left = fmt::format("{:.4g}", nBlack), right = fmt::format("{:.4g}", nWhite);
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

void AddColourLegend(const krv::gobs::PCT& oTable, Picture& oPicture)
{
    const auto oEntries = ListShown(oTable, oPicture);
    const auto nShown = static_cast<unsigned int>(oEntries.size());
    std::vector<std::string> oTexts;
    unsigned int nText = 0;
    for (unsigned int i = 0; i < nShown; ++i)
    {
        oTexts.push_back(fmt::format("{:.6g}", oEntries[i].value));
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
