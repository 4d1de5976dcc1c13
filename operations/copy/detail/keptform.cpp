#include "operations/copy/detail/keptform.h"

#include "datasources/interfaces/idataset.h"
#include "toolkit/core/lettercase.h"

#include <fmt/format.h>

#include <algorithm>
#include <cctype>
#include <functional>
#include <sstream>

namespace krv::operations::detail
{

using krv::datasources::EncodedForm;

namespace
{

// Larger blocks are handled in pieces; a copy is better off with the format's own.
constexpr std::uint64_t LARGEST_KEPT_BLOCK = std::uint64_t{64} << 20;
// The bytes of a block that moves as a whole, decoded.
constexpr std::uint64_t LARGEST_MOVED_BLOCK = std::uint64_t{256} << 20;
constexpr const char* FORM_KEYS[] = {"COMPRESS",   "LEVEL",      "PREDICTOR",  "TILED",
                                     "BLOCKXSIZE", "BLOCKYSIZE", "INTERLEAVE", "NBITS"};
// Stored without loss in the place of a codec that a format does not write.
constexpr char LOSSLESS[] = "COMPRESS=DEFLATE";

// Whether blocks of the form are what an option asks for.
bool Agrees(const std::string& key, const std::string& value, const EncodedForm& oForm)
{
    const bool bSeparate = oForm.mbSeparate && oForm.mnChannels > 1;
    if (key == "COMPRESS")
        return value == oForm.moCodec;
    if (key == "PREDICTOR")
        return value == std::to_string(oForm.mnPredictor) || (oForm.mnPredictor == 1 ? value == "NO" : value == "YES");
    if (key == "TILED")
        return value == (oForm.mbWholeBlocks ? "YES" : "NO");
    if (key == "BLOCKXSIZE")
        return oForm.mbWholeBlocks && value == std::to_string(oForm.mnBlockWidth);
    if (key == "BLOCKYSIZE")
        return value == std::to_string(oForm.mnBlockHeight);
    if (key == "INTERLEAVE")
        return oForm.mnChannels == 1 || value == (bSeparate ? "BAND" : "PIXEL");
    if (key == "NBITS")
        return value == std::to_string(oForm.mnSampleBits);
    if (key == "LAYOUT")
        return value != "COG" || oForm.mbWholeBlocks;
    if (key == "PHOTOMETRIC")
        return value == "AUTO";
    return key != "LEVEL" && key != "ALPHA";
}

} // namespace

std::optional<EncodedForm> FindForm(const SourceFile& oSource, unsigned int nLevel)
{
    auto* const poBlocks = dynamic_cast<krv::datasources::IEncodedBlocks*>(&oSource.GetDataset());
    if (poBlocks == nullptr)
        return std::nullopt;
    return poBlocks->GetEncodedForm(nLevel);
}

std::map<std::string, std::string> ParseOptions(const std::string& options)
{
    std::map<std::string, std::string> oOptions;
    std::istringstream oWords(options);
    for (std::string word; oWords >> word;)
    {
        const std::size_t nSign = std::min(word.find('='), word.size());
        oOptions[krv::ToUpper(word.substr(0, nSign))] = krv::ToUpper(word.substr(std::min(nSign + 1, word.size())));
    }
    return oOptions;
}

std::optional<EncodedForm> FindMovedForm(const CopyPlan& oPlan, const std::string& options)
{
    if (!oPlan.IsWholeFile() || oPlan.IsCut() || !oPlan.AreTypesKept())
        return std::nullopt;
    std::optional<EncodedForm> oForm = FindForm(oPlan.GetSource(0));
    if (!oForm || !oForm->mbReadable ||
        std::uint64_t{oForm->mnBlockWidth} * oForm->mnBlockHeight >
            LARGEST_MOVED_BLOCK / (oForm->moType.GetValueBits() / 8 * std::uint64_t{oForm->mnChannels}))
        return std::nullopt;
    const auto oGiven = ParseOptions(options);
    const bool bAgree = std::all_of(oGiven.begin(), oGiven.end(),
                                    [&](const auto& oOption) { return Agrees(oOption.first, oOption.second, *oForm); });
    return bAgree ? oForm : std::nullopt;
}

std::string WithoutForm(const std::string& options)
{
    std::string left;
    std::istringstream oWords(options);
    for (std::string word; oWords >> word;)
    {
        const std::string key = krv::ToUpper(word.substr(0, word.find('=')));
        if (std::find(std::begin(FORM_KEYS), std::end(FORM_KEYS), key) == std::end(FORM_KEYS))
            left += (left.empty() ? "" : " ") + word;
    }
    return left;
}

std::vector<KeptOption> FindKeptOptions(const CopyPlan& oPlan, const std::string& options)
{
    const auto oGiven = ParseOptions(options);
    const auto Has = [&oGiven](const char* pKey, const char* pValue = nullptr)
    {
        const auto oFound = oGiven.find(pKey);
        return oFound != oGiven.end() && (pValue == nullptr || oFound->second == pValue);
    };
    std::vector<KeptOption> oKept;
    const std::optional<EncodedForm> oForm = FindForm(oPlan.GetSource(0));
    if (oForm)
    {
        const bool bCoded = !oForm->moCodec.empty() && oForm->moCodec != "NONE";
        if (!Has("COMPRESS") && oForm->mbLossy)
            oKept.push_back({"", LOSSLESS, ""});
        else if (!Has("COMPRESS") && bCoded)
            oKept.push_back({"compression " + oForm->moCodec, "COMPRESS=" + oForm->moCodec, LOSSLESS});
        if (!Has("INTERLEAVE") && oForm->mbSeparate && oPlan.GetChannels().size() > 1)
            oKept.push_back({"interleaving by band", "INTERLEAVE=BAND", ""});
        const unsigned int nChannels = oForm->mbSeparate ? 1 : static_cast<unsigned int>(oPlan.GetChannels().size());
        const bool bSensible = std::uint64_t{oForm->mnBlockWidth} * oForm->mnBlockHeight <=
                               LARGEST_KEPT_BLOCK / (8 * std::uint64_t{nChannels});
        const bool bTiles = oForm->mbWholeBlocks;
        const bool bOther =
            Has("TILED", bTiles ? "NO" : "YES") || (!bTiles && (Has("BLOCKXSIZE") || Has("LAYOUT", "COG")));
        std::string blocks = bTiles ? "" : "TILED=NO";
        if (bTiles && !Has("BLOCKXSIZE"))
            blocks += fmt::format("BLOCKXSIZE={}", oForm->mnBlockWidth);
        if (!Has("BLOCKYSIZE"))
            blocks += fmt::format("{}BLOCKYSIZE={}", blocks.empty() ? "" : " ", oForm->mnBlockHeight);
        if (bSensible && !bOther && !blocks.empty())
            oKept.push_back({bTiles ? fmt::format("tiles of {} x {}", oForm->mnBlockWidth, oForm->mnBlockHeight)
                                    : fmt::format("strips of {} rows", oForm->mnBlockHeight),
                             blocks, ""});
    }
    // Each channel of several types has the predictor that goes with it.
    const auto& oTypes = oPlan.GetTypes();
    const bool bMixed = std::adjacent_find(oTypes.begin(), oTypes.end(), std::not_equal_to<>()) != oTypes.end();
    // JPEG has no narrow samples, differences of values neither.
    const unsigned int nBits = oPlan.GetNarrowBits();
    if (nBits != 0 && !Has("NBITS") && !Has("COMPRESS", "JPEG") && !Has("PREDICTOR", "2"))
        oKept.push_back({fmt::format("{} bits a sample", nBits), fmt::format("NBITS={}", nBits), ""});
    else if (oForm && !Has("COMPRESS") && !Has("PREDICTOR") && !oForm->mbLossy && oPlan.AreTypesKept() &&
             oForm->moCodec != "NONE" && !bMixed)
        oKept.push_back({oForm->mnPredictor == 1 ? "" : fmt::format("predictor {}", oForm->mnPredictor),
                         oForm->mnPredictor == 1 ? "PREDICTOR=NO" : fmt::format("PREDICTOR={}", oForm->mnPredictor),
                         ""});
    return oKept;
}

} // namespace krv::operations::detail
