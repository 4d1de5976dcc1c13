// Any contents in the tags that say something of a sound image: metadata, no-data, geographic keys, sensor model. The
// same texts go to the functions that read tags of the metadata.
#include "datasources/metadata/typednodata.h"
#include "fuzz/support/exercise.h"
#include "fuzz/support/inputfile.h"

#include <fuzzer/FuzzedDataProvider.h>

#include <map>

namespace
{

struct Tag
{
    std::uint16_t mnNumber;
    std::uint16_t mnType;
};

constexpr std::uint16_t TEXT = 2, SHORT = 3, LONG = 4, DOUBLE = 12;
constexpr Tag TAGS[] = {{270, TEXT},     {42112, TEXT},  {42113, TEXT},   {33550, DOUBLE}, {33922, DOUBLE},
                        {34264, DOUBLE}, {34735, SHORT}, {34736, DOUBLE}, {34737, TEXT},   {50844, DOUBLE}};

void Append(std::string& bytes, std::uint64_t nValue, unsigned int nCount)
{
    for (unsigned int n = 0; n < nCount; ++n)
        bytes += static_cast<char>(nValue >> (8 * n));
}

// A TIFF file of one 8-bit channel, 4 x 4 pixels. The tags, by number, have any contents, but whole values.
std::string MakeFile(std::map<std::uint16_t, std::pair<std::uint16_t, std::string>> oTags)
{
    for (const auto& [nTag, nValue] :
         {std::pair(256, 4), {257, 4}, {258, 8}, {259, 1}, {262, 1}, {273, 8}, {277, 1}, {278, 4}, {279, 16}})
        oTags[static_cast<std::uint16_t>(nTag)] = {LONG,
                                                   std::string(1, static_cast<char>(nValue)) + std::string(3, '\0')};
    std::string file("II*\0\x18\0\0\0", 8), values;
    file.append(16, '\x55');
    Append(file, oTags.size(), 2);
    const std::size_t nFree = file.size() + oTags.size() * 12 + 4;
    for (const auto& [nTag, oTag] : oTags)
    {
        const std::size_t nBytes = oTag.first == TEXT ? 1 : oTag.first == SHORT ? 2 : oTag.first == LONG ? 4 : 8;
        Append(file, nTag, 2);
        Append(file, oTag.first, 2);
        Append(file, oTag.second.size() / nBytes, 4);
        std::string value = oTag.second.substr(0, oTag.second.size() / nBytes * nBytes);
        if (value.size() > 4)
        {
            Append(file, nFree + values.size(), 4);
            values += value;
            continue;
        }
        value.resize(4);
        file += value;
    }
    Append(file, 0, 4);
    return file + values;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* poBytes, std::size_t nBytes)
{
    FuzzedDataProvider oData(poBytes, nBytes);
    std::map<std::uint16_t, std::pair<std::uint16_t, std::string>> oTags;
    const auto nWanted = oData.ConsumeIntegral<std::uint16_t>();
    for (std::size_t n = 0; n < std::size(TAGS); ++n)
    {
        if ((nWanted >> n & 1U) == 0)
            continue;
        const std::string bytes = oData.ConsumeRandomLengthString();
        oTags[TAGS[n].mnNumber] = {TAGS[n].mnType, bytes};
        krv::datasources::ParseNoData(bytes);
    }
    const std::string file = MakeFile(oTags);
    const krv::fuzz::InputFile oFile(reinterpret_cast<const std::uint8_t*>(file.data()), file.size());
    krv::fuzz::ExerciseFile(oFile.GetName());
    return 0;
}
