#include "plugins/support/sidecar/rpctext.h"

#include "toolkit/core/lettercase.h"
#include "toolkit/core/numbertext.h"
#include "toolkit/exceptions/exceptions.h"

#include <algorithm>
#include <map>
#include <optional>
#include <sstream>
#include <string_view>
#include <utility>
#include <vector>

namespace krv::plugins::support
{

namespace
{

using krv::mathmodel::RpcCoefficients;

struct NumberKeys
{
    double RpcCoefficients::*mpNumber;
    const char* mpText;
    const char* mpRpb;
};

// The errors, which may be missing, come first.
constexpr NumberKeys NUMBERS[] = {{&RpcCoefficients::biasError, "ERR_BIAS", "ERRBIAS"},
                                  {&RpcCoefficients::randomError, "ERR_RAND", "ERRRAND"},
                                  {&RpcCoefficients::lineOffset, "LINE_OFF", "LINEOFFSET"},
                                  {&RpcCoefficients::sampleOffset, "SAMP_OFF", "SAMPOFFSET"},
                                  {&RpcCoefficients::latitudeOffset, "LAT_OFF", "LATOFFSET"},
                                  {&RpcCoefficients::longitudeOffset, "LONG_OFF", "LONGOFFSET"},
                                  {&RpcCoefficients::heightOffset, "HEIGHT_OFF", "HEIGHTOFFSET"},
                                  {&RpcCoefficients::lineScale, "LINE_SCALE", "LINESCALE"},
                                  {&RpcCoefficients::sampleScale, "SAMP_SCALE", "SAMPSCALE"},
                                  {&RpcCoefficients::latitudeScale, "LAT_SCALE", "LATSCALE"},
                                  {&RpcCoefficients::longitudeScale, "LONG_SCALE", "LONGSCALE"},
                                  {&RpcCoefficients::heightScale, "HEIGHT_SCALE", "HEIGHTSCALE"}};
constexpr std::size_t OPTIONAL_NUMBERS = 2;

struct PolynomialKeys
{
    RpcCoefficients::Polynomial RpcCoefficients::*mpPolynomial;
    const char* mpText; // before the number of the coefficient
    const char* mpRpb;
};

constexpr PolynomialKeys POLYNOMIALS[] = {{&RpcCoefficients::lineNumerator, "LINE_NUM_COEFF_", "LINENUMCOEF"},
                                          {&RpcCoefficients::lineDenominator, "LINE_DEN_COEFF_", "LINEDENCOEF"},
                                          {&RpcCoefficients::sampleNumerator, "SAMP_NUM_COEFF_", "SAMPNUMCOEF"},
                                          {&RpcCoefficients::sampleDenominator, "SAMP_DEN_COEFF_", "SAMPDENCOEF"}};

// What a text says, by keys in capitals; a list has several words, everything else one.
class Words
{
public:
    explicit Words(const std::string& fileName) : moFileName(fileName) {}

    [[noreturn]] void Fail(const std::string& what) const
    {
        throw FileFormatException(moFileName, moFileName + ": " + what);
    }

    void Add(std::string_view key, std::vector<std::string> oWords)
    {
        const auto [pEntry, bNew] = moWords.try_emplace(ToUpper(key), oWords);
        if (!bNew && pEntry->second != oWords)
            Fail("\"" + std::string(key) + "\" stands there twice, with different values");
    }

    const std::vector<std::string>* Find(const std::string& key) const
    {
        const auto pFound = moWords.find(key);
        return pFound == moWords.end() ? nullptr : &pFound->second;
    }

    const std::vector<std::string>& Get(const std::string& key, std::size_t nCount) const
    {
        const std::vector<std::string>* const poWords = Find(key);
        if (poWords == nullptr)
            Fail("\"" + key + "\" is missing");
        if (poWords->size() != nCount)
            Fail("\"" + key + "\" has " + std::to_string(poWords->size()) + " values in place of " +
                 std::to_string(nCount));
        return *poWords;
    }

    double Number(const std::string& key, std::string word) const
    {
        std::replace_if(
            word.begin(), word.end(), [](char c) { return c == 'D' || c == 'd'; }, 'E');
        std::string_view digits = word;
        digits.remove_prefix(digits.starts_with('+') ? 1 : 0);
        const std::optional<double> oNumber = ParseNumber<double>(digits);
        if (!oNumber)
            Fail("the value of \"" + key + "\" is no number: \"" + word + "\"");
        return *oNumber;
    }

private:
    std::string moFileName;
    std::map<std::string, std::vector<std::string>> moWords;
};

RpcCoefficients Checked(const RpcCoefficients& oModel, const Words& oWords)
{
    const std::string fault = oModel.FindFault();
    if (!fault.empty())
        oWords.Fail("the coefficients are no rational polynomial model: " + fault);
    return oModel;
}

RpcCoefficients ReadNumbers(const Words& oWords, const char* NumberKeys::*pKey)
{
    RpcCoefficients oModel;
    for (std::size_t n = 0; n < std::size(NUMBERS); ++n)
    {
        const std::string key = NUMBERS[n].*pKey;
        if (n >= OPTIONAL_NUMBERS || oWords.Find(key) != nullptr)
            oModel.*NUMBERS[n].mpNumber = oWords.Number(key, oWords.Get(key, 1).front());
    }
    return oModel;
}

// The words and signs of a .rpb: names, numbers, quoted texts, and = ( ) , ; each by itself.
std::vector<std::string> SplitStatements(const std::string& text)
{
    constexpr std::string_view SIGNS = "=(),;";
    std::vector<std::string> oTokens;
    std::string token;
    bool bQuoted = false;
    const auto Finish = [&]
    {
        if (!token.empty())
            oTokens.push_back(std::exchange(token, {}));
    };
    for (const char c : text)
    {
        if (c == '"')
            bQuoted = !bQuoted;
        else if (!bQuoted && (c == ' ' || c == '\t' || c == '\r' || c == '\n'))
            Finish();
        else if (!bQuoted && SIGNS.find(c) != SIGNS.npos)
        {
            Finish();
            oTokens.emplace_back(1, c);
        }
        else
            token += c;
    }
    Finish();
    return oTokens;
}

} // namespace

RpcCoefficients ParseRpcText(const std::string& text, const std::string& fileName)
{
    Words oWords(fileName);
    std::istringstream oLines(text);
    for (std::string line; std::getline(oLines, line);)
    {
        const std::size_t nColon = line.find(':');
        if (nColon == line.npos)
            continue;
        std::string key, value;
        std::istringstream(line.substr(0, nColon)) >> key;
        std::istringstream(line.substr(nColon + 1)) >> value;
        oWords.Add(key, {value});
    }
    RpcCoefficients oModel = ReadNumbers(oWords, &NumberKeys::mpText);
    for (const PolynomialKeys& oKeys : POLYNOMIALS)
    {
        RpcCoefficients::Polynomial& oPolynomial = oModel.*oKeys.mpPolynomial;
        for (std::size_t n = 0; n < oPolynomial.size(); ++n)
        {
            const std::string key = oKeys.mpText + std::to_string(n + 1);
            oPolynomial[n] = oWords.Number(key, oWords.Get(key, 1).front());
        }
    }
    return Checked(oModel, oWords);
}

RpcCoefficients ParseRpb(const std::string& text, const std::string& fileName)
{
    Words oWords(fileName);
    const std::vector<std::string> oTokens = SplitStatements(text);
    for (std::size_t n = 0; n + 2 < oTokens.size(); ++n)
    {
        if (oTokens[n + 1] != "=" || oTokens[n] == "BEGIN_GROUP" || oTokens[n] == "END_GROUP")
            continue;
        std::vector<std::string> oValues;
        if (oTokens[n + 2] != "(")
            oValues = {oTokens[n + 2]};
        for (std::size_t m = n + 3; oTokens[n + 2] == "(" && m < oTokens.size() && oTokens[m] != ")"; ++m)
            if (oTokens[m] != ",")
                oValues.push_back(oTokens[m]);
        oWords.Add(oTokens[n], std::move(oValues));
    }
    if (const std::vector<std::string>* const poForm = oWords.Find("SPECID");
        poForm != nullptr && *poForm == std::vector<std::string>{"RPC00A"})
        oWords.Fail("coefficients in the order of RPC00A are not read, those of RPC00B are");
    RpcCoefficients oModel = ReadNumbers(oWords, &NumberKeys::mpRpb);
    for (const PolynomialKeys& oKeys : POLYNOMIALS)
    {
        RpcCoefficients::Polynomial& oPolynomial = oModel.*oKeys.mpPolynomial;
        const std::vector<std::string>& oList = oWords.Get(oKeys.mpRpb, oPolynomial.size());
        std::transform(oList.begin(), oList.end(), oPolynomial.begin(),
                       [&](const std::string& word) { return oWords.Number(oKeys.mpRpb, word); });
    }
    return Checked(oModel, oWords);
}

std::string WriteRpcText(const RpcCoefficients& oModel)
{
    std::string text;
    for (const NumberKeys& oKeys : NUMBERS)
        text += std::string(oKeys.mpText) + ": " + NumberText(oModel.*oKeys.mpNumber) + "\n";
    for (const PolynomialKeys& oKeys : POLYNOMIALS)
        for (std::size_t n = 0; n < std::tuple_size_v<RpcCoefficients::Polynomial>; ++n)
            text += oKeys.mpText + std::to_string(n + 1) + ": " + NumberText((oModel.*oKeys.mpPolynomial)[n]) + "\n";
    return text;
}

} // namespace krv::plugins::support
