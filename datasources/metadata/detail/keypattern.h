#pragma once

#include <array>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace krv::qrfutils::detail
{

// A text to look for in time linear in the length of what is searched.
class KeySegment
{
public:
    // Where an occurrence may lie: at a line's start, before a line's end.
    struct Anchors
    {
        bool mbLineStart = false;
        bool mbLineEnd = false;
    };

    KeySegment(std::string text, bool bCaseInsensitive);

    // The end of the first occurrence that begins at nFrom or later, npos when there is none.
    std::size_t Find(std::string_view key, std::size_t nFrom, const Anchors& oAnchors) const;

    bool LiesAt(std::string_view key, std::size_t nAt) const;
    std::size_t GetLength() const { return moText.size(); }

private:
    unsigned char Fold(char cByte) const { return (*mpoFolding)[static_cast<unsigned char>(cByte)]; }
    // For a key of one line, where anchors leave one place.
    std::size_t FindInLine(std::string_view key, std::size_t nFrom, const Anchors& oAnchors) const;
    std::size_t FindAnywhere(std::string_view key, std::size_t nFrom, const Anchors& oAnchors) const;

    std::string moText;
    // For each length of a matched beginning the length of its longest proper part that is one as well.
    std::vector<std::size_t> moBorders;
    const std::array<unsigned char, 256>* mpoFolding;
};

// The regular expressions that are plain text between anchors and ".*", or the whole of "^text[0-9]+$": the same
// answers as Boost.Regex gives for them in its default Perl syntax, but without backtracking. Most filters are of this
// kind.
class KeyPattern
{
public:
    // Nothing for any other expression, those that do not compile among them.
    static std::optional<KeyPattern> Parse(const std::string& pattern, bool bCaseInsensitive);

    bool Search(std::string_view key) const;

private:
    bool SearchNumber(std::string_view key) const;

    std::vector<KeySegment> moSegments;
    bool mbLineStart = false;
    bool mbLineEnd = false;
    bool mbNumber = false; // between the only segment and the line's end
};

} // namespace krv::qrfutils::detail
