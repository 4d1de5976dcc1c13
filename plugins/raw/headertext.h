#pragma once

#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace krv::plugins::raw
{

// A header as text: a first line that says ENVI, then "key = value" in any order. A value in braces may reach over
// several lines. Keys differ neither in letter case nor in the number of their blanks. Lines that begin with a
// semicolon are comments. What is not changed keeps its bytes. A plain value.
class HeaderText
{
public:
    // A header without keys.
    HeaderText() = default;
    // Whatever makes no sense is kept and means nothing.
    explicit HeaderText(std::string_view text);

    // Whether a file that begins so is such a header.
    static bool IsHeader(std::string_view bytes);

    // The value without white space around it, in its braces where it has them; none for a key that is not there. Of a
    // key that is there twice the last counts.
    std::optional<std::string> Find(std::string_view key) const;
    // The same without braces; empty for a key that is not there.
    std::string GetText(std::string_view key) const;
    // The parts of it between commas, without white space around them; none for a key that is not there.
    std::vector<std::string> GetList(std::string_view key) const;
    // All keys in their order, as they are written.
    std::vector<std::string> GetKeys() const;
    // Whether a key is there more than once, with different values.
    bool IsContradicted(std::string_view key) const;

    // In the place of what the key had, or at the end. The value with its braces.
    void Set(const std::string& key, const std::string& value);
    void SetList(const std::string& key, const std::vector<std::string>& oParts);
    void Remove(std::string_view key);
    // Whether the key and value would be read as they are.
    static bool CanHold(const std::string& key, const std::string& value);
    // Whether texts can be the parts of a list.
    static bool CanHoldList(const std::vector<std::string>& oParts);

    std::string Write() const;

    // How keys are compared: small letters, single blanks, none around.
    static std::string Normalise(std::string_view key);

private:
    struct Entry
    {
        std::string moKey; // empty for a comment or a line without sense
        std::string moValue;
        std::string moLines; // all of it, with the end of the last line; empty for one that was removed
    };

    void Add(Entry oEntry);

    std::vector<Entry> moEntries;
    std::map<std::string, std::vector<std::size_t>> moPlaces; // of each key as they are compared, ascending
};

} // namespace krv::plugins::raw
