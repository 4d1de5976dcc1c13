#include "plugins/tif/reading/cloudheader.h"

#include <algorithm>
#include <array>
#include <string_view>

namespace krv::plugins::tif
{

namespace
{

constexpr std::string_view FIRST_LINE = "GDAL_STRUCTURAL_METADATA_SIZE=";
constexpr std::string_view FIRST_LINE_END = " bytes\n";
constexpr std::size_t SIZE_DIGITS = 6;
constexpr std::size_t FIRST_LINE_BYTES = FIRST_LINE.size() + SIZE_DIGITS + FIRST_LINE_END.size();
constexpr std::string_view ROW_MAJOR = "BLOCK_ORDER=ROW_MAJOR\n";
constexpr std::string_view LEADERS = "BLOCK_LEADER=SIZE_AS_UINT4\n";
constexpr std::string_view TRAILERS = "BLOCK_TRAILER=LAST_4_BYTES_REPEATED\n";
constexpr std::string_view MASKED = "MASK_INTERLEAVED_WITH_IMAGERY=YES\n";
// One byte shorter than the other, so that a blank follows it.
constexpr std::string_view UNCHANGED = "KNOWN_INCOMPATIBLE_EDITION=NO\n ";
constexpr std::string_view CHANGED = "KNOWN_INCOMPATIBLE_EDITION=YES\n";
static_assert(UNCHANGED.size() == CHANGED.size());

} // namespace

std::optional<CloudHeader> CloudHeader::Read(const support::File& oFile, const FileHeader& oHeader)
{
    std::array<unsigned char, FIRST_LINE_BYTES> aLine{};
    if (oFile.ReadUpTo(oHeader.GetBytes(), aLine.data(), aLine.size()) != aLine.size())
        return std::nullopt;
    const std::string line(aLine.begin(), aLine.end());
    const std::string digits = line.substr(FIRST_LINE.size(), SIZE_DIGITS);
    if (!line.starts_with(FIRST_LINE) || !line.ends_with(FIRST_LINE_END) ||
        digits.find_first_not_of("0123456789") != std::string::npos)
        return std::nullopt;
    std::string lines(std::stoul(digits), '\0');
    if (oFile.ReadUpTo(oHeader.GetBytes() + line.size(), reinterpret_cast<unsigned char*>(lines.data()),
                       lines.size()) != lines.size())
        return std::nullopt;
    const auto Says = [&lines](std::string_view text)
    {
        return lines.find(text) != std::string::npos;
    };
    return CloudHeader{line + lines, Says(ROW_MAJOR), Says(LEADERS), Says(TRAILERS), Says(CHANGED)};
}

std::string CloudHeader::Make(bool bRowMajor, bool bMasked)
{
    std::string lines = "LAYOUT=IFDS_BEFORE_DATA\n";
    if (bRowMajor)
        lines += ROW_MAJOR;
    lines += LEADERS;
    lines += TRAILERS;
    lines += UNCHANGED;
    if (bMasked)
        lines += MASKED;
    std::string digits = std::to_string(lines.size());
    digits.insert(0, SIZE_DIGITS - digits.size(), '0');
    return std::string(FIRST_LINE) + digits + std::string(FIRST_LINE_END) + lines;
}

std::string CloudHeader::MarkChanged(const std::string& text)
{
    std::string marked = text;
    const std::size_t nAt = marked.find(UNCHANGED);
    if (nAt != std::string::npos)
        marked.replace(nAt, CHANGED.size(), CHANGED);
    return marked;
}

} // namespace krv::plugins::tif
