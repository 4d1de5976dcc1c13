#include "plugins/tif/writing/taglist.h"

#include <algorithm>
#include <bit>
#include <utility>

#include <tiff.h>

namespace krv::plugins::tif
{

std::vector<Tag>& TagList::EditTags()
{
    if (mpoTags.use_count() > 1)
        mpoTags = std::make_shared<std::vector<Tag>>(*mpoTags);
    return *mpoTags;
}

std::size_t TagList::Position(std::uint16_t nTag) const
{
    const auto oFound = std::lower_bound(mpoTags->begin(), mpoTags->end(), nTag,
                                         [](const Tag& oTag, std::uint16_t nNumber) { return oTag.mnTag < nNumber; });
    return static_cast<std::size_t>(oFound - mpoTags->begin());
}

const Tag* TagList::Find(std::uint16_t nTag) const
{
    const std::size_t nAt = Position(nTag);
    return nAt < mpoTags->size() && (*mpoTags)[nAt].mnTag == nTag ? &(*mpoTags)[nAt] : nullptr;
}

std::vector<std::uint64_t> TagList::GetNumbers(std::uint16_t nTag) const
{
    std::vector<std::uint64_t> oNumbers;
    const Tag* pTag = Find(nTag);
    const std::size_t nBytes = pTag == nullptr ? 0 : GetTypeBytes(pTag->mnType);
    const bool bWhole = pTag != nullptr && IsWholeType(pTag->mnType);
    for (std::size_t nAt = 0; bWhole && nBytes != 0 && nAt + nBytes <= pTag->moBytes.size(); nAt += nBytes)
        oNumbers.push_back(ReadNumber(pTag->moBytes.data() + nAt, nBytes, mbBigEndian));
    return oNumbers;
}

std::uint64_t TagList::GetNumber(std::uint16_t nTag, std::uint64_t nDefault) const
{
    const std::vector<std::uint64_t> oNumbers = GetNumbers(nTag);
    return oNumbers.empty() ? nDefault : oNumbers.front();
}

std::string TagList::GetText(std::uint16_t nTag) const
{
    const Tag* pTag = Find(nTag);
    if (pTag == nullptr)
        return {};
    const auto oEnd = std::find(pTag->moBytes.begin(), pTag->moBytes.end(), 0);
    return std::string(pTag->moBytes.begin(), oEnd);
}

void TagList::Set(Tag oTag)
{
    mbChanged = true;
    std::vector<Tag>& oTags = EditTags();
    const std::size_t nAt = Position(oTag.mnTag);
    if (Find(oTag.mnTag) == nullptr)
    {
        oTags.insert(oTags.begin() + static_cast<std::ptrdiff_t>(nAt), std::move(oTag));
        return;
    }
    if (oTags[nAt].moStored.mnBytes != 0)
        moReleased.push_back(oTags[nAt].moStored);
    oTags[nAt] = std::move(oTag);
}

void TagList::SetNumbers(std::uint16_t nTag, std::uint16_t nType, const std::vector<std::uint64_t>& oValues)
{
    Tag oTag{nTag, nType, oValues.size(), {}, {}};
    for (const std::uint64_t nValue : oValues)
        AppendNumber(oTag.moBytes, nValue, GetTypeBytes(nType), mbBigEndian);
    Set(std::move(oTag));
}

void TagList::SetNumber(std::uint16_t nTag, std::uint16_t nType, std::uint64_t nValue)
{
    SetNumbers(nTag, nType, {nValue});
}

void TagList::SetDoubles(std::uint16_t nTag, const std::vector<double>& oValues)
{
    Tag oTag{nTag, TIFF_DOUBLE, oValues.size(), {}, {}};
    for (const double nValue : oValues)
        AppendNumber(oTag.moBytes, std::bit_cast<std::uint64_t>(nValue), 8, mbBigEndian);
    Set(std::move(oTag));
}

void TagList::SetText(std::uint16_t nTag, const std::string& text)
{
    if (text.empty())
        return Remove(nTag);
    SetBytes(nTag, TIFF_ASCII, text + '\0');
}

void TagList::SetBytes(std::uint16_t nTag, std::uint16_t nType, const std::string& bytes)
{
    Set({nTag, nType, bytes.size(), std::vector<unsigned char>(bytes.begin(), bytes.end()), {}});
}

void TagList::Remove(std::uint16_t nTag)
{
    if (Find(nTag) == nullptr)
        return;
    std::vector<Tag>& oTags = EditTags();
    const auto oAt = oTags.begin() + static_cast<std::ptrdiff_t>(Position(nTag));
    if (oAt->moStored.mnBytes != 0)
        moReleased.push_back(oAt->moStored);
    oTags.erase(oAt);
    mbChanged = true;
}

std::vector<Extent> TagList::TakeReleased()
{
    return std::exchange(moReleased, {});
}

} // namespace krv::plugins::tif
