#include "plugins/support/sidecar/modelsidecars.h"

#include "plugins/support/file/newfile.h"
#include "plugins/support/sidecar/rpctext.h"
#include "plugins/support/sidecar/sidecarfile.h"
#include "toolkit/exceptions/exceptions.h"

#include <filesystem>

namespace krv::plugins::support
{

namespace
{

constexpr std::size_t MAXIMUM_BYTES = std::size_t{1} << 16; // such texts have three thousand or so

struct Kind
{
    unsigned int mnModel;
    const char* mpEnding;
    krv::mathmodel::RpcCoefficients (*mpParse)(const std::string& text, const std::string& fileName);
};

constexpr Kind KINDS[] = {{1, "_RPC.TXT", &ParseRpcText}, {2, ".rpb", &ParseRpb}};

} // namespace

std::vector<unsigned int> FindModelSidecars(const std::string& fileName)
{
    std::vector<unsigned int> oNumbers;
    for (const Kind& oKind : KINDS)
        if (!FindSidecar(fileName, oKind.mpEnding).empty())
            oNumbers.push_back(oKind.mnModel);
    return oNumbers;
}

std::string FindModelSidecar(const std::string& fileName, unsigned int nModel)
{
    for (const Kind& oKind : KINDS)
        if (oKind.mnModel == nModel)
            return FindSidecar(fileName, oKind.mpEnding);
    return {};
}

krv::mathmodel::RpcCoefficients ReadModelSidecar(const std::string& fileName, unsigned int nModel)
{
    const std::string sidecar = FindModelSidecar(fileName, nModel);
    for (const Kind& oKind : KINDS)
        if (oKind.mnModel == nModel && !sidecar.empty())
            return oKind.mpParse(ReadSidecar(sidecar, MAXIMUM_BYTES), sidecar);
    throw DataException(fileName + ": there is no sensor model " + std::to_string(nModel));
}

void WriteModelSidecar(const std::string& fileName, const krv::mathmodel::RpcCoefficients& oModel)
{
    const Kind& oKind = KINDS[0];
    std::string name = FindSidecar(fileName, oKind.mpEnding);
    if (name.empty())
        name = std::filesystem::path(fileName).replace_extension().string() + oKind.mpEnding;
    const std::string text = WriteRpcText(oModel);
    NewFile oNew(name, true);
    oNew.GetFile()->Write(0, text.data(), text.size());
    oNew.GetFile()->Flush();
    oNew.TakeName(true);
}

} // namespace krv::plugins::support
