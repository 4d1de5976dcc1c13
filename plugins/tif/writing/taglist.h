#pragma once

#include "plugins/support/file/file.h"
#include "plugins/support/file/numbers.h"
#include "plugins/support/file/space.h"
#include "plugins/tif/reading/rawdirectory.h"

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace krv::plugins::tif
{

using support::AppendNumber;

using support::Extent;

// A tag with its values as bytes in the order of the file. Large values of a file that was opened stay there.
struct Tag
{
    std::uint16_t mnTag = 0;
    std::uint16_t mnType = 0;
    std::uint64_t mnCount = 0;
    std::vector<unsigned char> moBytes; // empty when the values stand in the file alone
    Extent moStored;                    // of no bytes: not in the file yet, or inside the entry

    std::uint64_t GetBytes() const { return mnCount * GetTypeBytes(mnType); }
};

// The tags of a directory, ascending, all but those that say where strips and tiles lie. Tags that nobody asks about
// are kept byte for byte. Copies share their tags until one of them changes.
class TagList
{
public:
    explicit TagList(bool bBigEndian) : mbBigEndian(bBigEndian) {}

    const std::vector<Tag>& GetTags() const { return *mpoTags; }
    std::vector<Tag>& EditTags();
    bool IsBigEndian() const { return mbBigEndian; }
    const Tag* Find(std::uint16_t nTag) const;

    // The first value, or all, of a tag of whole numbers that is in memory.
    std::uint64_t GetNumber(std::uint16_t nTag, std::uint64_t nDefault) const;
    std::vector<std::uint64_t> GetNumbers(std::uint16_t nTag) const;
    // A text up to its first NUL, when it is in memory.
    std::string GetText(std::uint16_t nTag) const;

    // Put a tag in the place of the one of its number.
    void Set(Tag oTag);
    void SetNumbers(std::uint16_t nTag, std::uint16_t nType, const std::vector<std::uint64_t>& oValues);
    void SetNumber(std::uint16_t nTag, std::uint16_t nType, std::uint64_t nValue);
    void SetDoubles(std::uint16_t nTag, const std::vector<double>& oValues);
    // With a NUL at its end. An empty text removes the tag.
    void SetText(std::uint16_t nTag, const std::string& text);
    void SetBytes(std::uint16_t nTag, std::uint16_t nType, const std::string& bytes);
    void Remove(std::uint16_t nTag);

    // The places in the file of tags that were replaced since the last call.
    std::vector<Extent> TakeReleased();
    // Whether anything was set or removed since the last call of Settle.
    bool IsChanged() const { return mbChanged; }
    void Settle() { mbChanged = false; }
    void Touch() { mbChanged = true; }

private:
    std::size_t Position(std::uint16_t nTag) const;

    bool mbBigEndian;
    bool mbChanged = false;
    std::shared_ptr<std::vector<Tag>> mpoTags = std::make_shared<std::vector<Tag>>();
    std::vector<Extent> moReleased;
};

} // namespace krv::plugins::tif
