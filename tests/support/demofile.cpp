#include "tests/support/demofile.h"

#include "tests/support/recipe.h"
#include "tools/conformance/tempfolder.h"

namespace krv::test
{

void WriteDemoFile(const std::string& fileName, unsigned int nWidth, unsigned int nHeight,
                   const std::vector<krv::gobs::DataType>& oTypes, const krv::datasources::MetadataMap& oTags)
{
    std::string bytes = "DEMO1\n" + std::to_string(nWidth) + " " + std::to_string(nHeight) + "\n";
    for (const auto& oType : oTypes)
        bytes += oType.Describe() + " ";
    bytes += "\n";
    for (const auto& [key, value] : oTags)
        bytes += key + "=" + value + "\n";
    bytes += "\n";
    for (unsigned int nChannel = 1; nChannel <= oTypes.size(); ++nChannel)
        bytes += RecipeImage(nWidth, nHeight, {nChannel}, oTypes[nChannel - 1]);
    krv::conformance::WriteFile(fileName, bytes);
}

} // namespace krv::test
