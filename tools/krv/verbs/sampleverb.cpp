#include "operations/sample/sampling.h"
#include "operations/source/sourcefile.h"
#include "toolkit/core/numbertext.h"
#include "tools/krv/errors.h"
#include "tools/krv/infotext.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/progress.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>
#include <fmt/format.h>

#include <cmath>
#include <iostream>
#include <memory>
#include <string_view>

namespace krv::tool
{

using namespace krv::operations;

namespace
{

struct Options
{
    std::vector<std::string> coordinates;
    std::string channels;
    std::string noData;
    SampleRequest request;
    std::vector<std::string> names; // what stands behind the coordinates on a line; none when no line has any
    bool unscale = false;
    bool json = false;
};

constexpr std::string_view BETWEEN = " \t,;\r";

// The word that a text begins with, which is taken off it with what separates it from the next.
std::string_view TakeWord(std::string_view& rest)
{
    const std::size_t nEnd = std::min(rest.find_first_of(BETWEEN), rest.size());
    const std::string_view word = rest.substr(0, nEnd);
    rest.remove_prefix(std::min(rest.find_first_not_of(BETWEEN, nEnd), rest.size()));
    return word;
}

std::optional<double> ParseCoordinate(std::string_view word)
{
    word.remove_prefix(word.starts_with('+') ? 1 : 0);
    const auto oNumber = krv::ParseNumber<double>(word);
    return oNumber && std::isfinite(*oNumber) ? oNumber : std::nullopt;
}

// "x y", "x,y" or "x;y" on each line, and whatever behind it as the name of the point. Empty lines, lines that begin
// with # and a first one of words are passed over.
void ReadPoints(std::istream& oStream, Options& oOptions)
{
    std::string line;
    bool bNamed = false;
    for (std::uint64_t nLine = 1; std::getline(oStream, line); ++nLine)
    {
        std::string_view rest = line;
        rest.remove_prefix(rest.starts_with("\xEF\xBB\xBF") ? 3 : 0);
        rest.remove_prefix(std::min(rest.find_first_not_of(BETWEEN), rest.size()));
        if (rest.empty() || rest.front() == '#')
            continue;
        const std::string_view first = TakeWord(rest), second = TakeWord(rest);
        const auto oX = ParseCoordinate(first), oY = ParseCoordinate(second);
        if (!oX && !oY && oOptions.request.points.empty())
            continue;
        if (!oX || !oY)
            throw UsageError(fmt::format("line {} of the points: \"{}\" does not begin with two numbers", nLine, line));
        oOptions.request.points.push_back({*oX, *oY});
        while (!rest.empty() && BETWEEN.find(rest.back()) != std::string_view::npos)
            rest.remove_suffix(1);
        oOptions.names.emplace_back(rest);
        bNamed = bNamed || !rest.empty();
    }
    if (!bNamed)
        oOptions.names.clear();
}

// Each word is one number or two with a comma between them.
void TakePoints(Options& oOptions)
{
    if (oOptions.coordinates.empty() || oOptions.coordinates == std::vector<std::string>{"-"})
        return ReadPoints(std::cin, oOptions);
    std::vector<double> oNumbers;
    for (const std::string& text : oOptions.coordinates)
    {
        const auto oMore = ParseReals(text, "X Y", 1, 2);
        oNumbers.insert(oNumbers.end(), oMore.begin(), oMore.end());
    }
    if (oNumbers.size() % 2 != 0)
        throw UsageError(fmt::format("sample: {} numbers are no points: each has two", oNumbers.size()));
    for (std::size_t i = 0; i < oNumbers.size(); i += 2)
        oOptions.request.points.push_back({oNumbers[i], oNumbers[i + 1]});
}

std::string NumberOf(const krv::gobs::SampleValue& oNumber, const krv::gobs::DataType& oType)
{
    const bool bFloat = oType.IsReal() && oType.GetBits() == 32;
    return bFloat ? fmt::format("{}", static_cast<float>(oNumber.GetReal())) : oNumber.GetText();
}

std::string ValueText(const SampledValue& oValue, const krv::gobs::DataType& oType, bool bScaled)
{
    if (oType.IsComplex())
    {
        const std::string imaginary = NumberOf(oValue.imaginary, oType);
        return NumberOf(oValue.real, oType) + (imaginary.starts_with('-') ? "" : "+") + imaginary + "i";
    }
    return bScaled ? krv::NumberText(oValue.scaled) : NumberOf(oValue.real, oType);
}

// A number as JSON has it; text for those that it has not.
Json NumberToJson(const std::string& text)
{
    const Json oNumber = Json::parse(text, nullptr, false);
    return oNumber.is_number() ? oNumber : Json(text);
}

const char* StateText(SampleState eState)
{
    switch (eState)
    {
    case SampleState::eValid:
        return "valid";
    case SampleState::eOutside:
        return "outside";
    case SampleState::eNoData:
        return "noData";
    default:
        return "masked";
    }
}

const char* CoordinatesText(PointCoordinates eCoordinates)
{
    switch (eCoordinates)
    {
    case PointCoordinates::ePixels:
        return "pixel";
    case PointCoordinates::eGeographic:
        return "lonlat";
    case PointCoordinates::eNamedMap:
        return "crs";
    default:
        return "map";
    }
}

// As CSV wants a text that holds a comma, a quote or a line break.
std::string Quoted(std::string text)
{
    if (text.find_first_of(",\"\n") == std::string::npos)
        return text;
    for (std::size_t nAt = 0; (nAt = text.find('"', nAt)) != std::string::npos; nAt += 2)
        text.insert(nAt, 1, '"');
    return '"' + text + '"';
}

std::string PixelText(double nPosition)
{
    return std::isfinite(nPosition) ? fmt::format("{:.3f}", nPosition) : std::string();
}

std::string ToCsv(const Options& oOptions, const SampleResult& oResult)
{
    std::string text = oOptions.names.empty() ? "x,y,column,row" : "name,x,y,column,row";
    for (const SampledChannel& oChannel : oResult.channels)
        text += fmt::format(",channel{}", oChannel.number);
    text += "\n";
    for (std::size_t i = 0; i < oResult.points.size(); ++i)
    {
        const SampledPoint& oPoint = oResult.points[i];
        if (!oOptions.names.empty())
            text += Quoted(oOptions.names[i]) + ",";
        text += fmt::format("{},{}", oOptions.request.points[i].x, oOptions.request.points[i].y) + "," +
                PixelText(oPoint.column) + "," + PixelText(oPoint.row);
        for (std::size_t c = 0; c < oPoint.values.size(); ++c)
        {
            const bool bValid = oPoint.values[c].state == SampleState::eValid;
            text += "," + (bValid ? ValueText(oPoint.values[c], oResult.channels[c].type, oOptions.unscale) : "");
        }
        text += "\n";
    }
    return text;
}

Json ValueToJson(const SampledValue& oValue, const SampledChannel& oChannel, bool bScaled)
{
    Json oJson{{"channel", oChannel.number}, {"value", nullptr}, {"state", StateText(oValue.state)}};
    if (oValue.state != SampleState::eValid)
        return oJson;
    if (oChannel.type.IsComplex())
        oJson["value"] = {NumberToJson(NumberOf(oValue.real, oChannel.type)),
                          NumberToJson(NumberOf(oValue.imaginary, oChannel.type))};
    else
        oJson["value"] = NumberToJson(ValueText(oValue, oChannel.type, bScaled));
    return oJson;
}

Json ToJson(const std::string& file, const Options& oOptions, const SampleResult& oResult)
{
    Json oPoints = Json::array();
    for (std::size_t i = 0; i < oResult.points.size(); ++i)
    {
        const SampledPoint& oPoint = oResult.points[i];
        Json oValues = Json::array();
        for (std::size_t c = 0; c < oPoint.values.size(); ++c)
            oValues.push_back(ValueToJson(oPoint.values[c], oResult.channels[c], oOptions.unscale));
        Json oJson{{"x", oOptions.request.points[i].x},
                   {"y", oOptions.request.points[i].y},
                   {"column", oPoint.column},
                   {"row", oPoint.row},
                   {"values", oValues}};
        if (!oOptions.names.empty())
            oJson["name"] = oOptions.names[i];
        oPoints.push_back(oJson);
    }
    return {{"file", file},
            {"coordinates", CoordinatesText(oResult.coordinates)},
            {"placedBy", oResult.placedBy ? Json(PlacedByText(*oResult.placedBy)) : Json()},
            {"points", oPoints}};
}

int RunSample(const std::string& file, Options& oOptions)
{
    oOptions.request.channels = ParseNumbers(oOptions.channels, "--channels");
    if (!oOptions.request.crs.empty())
        oOptions.request.coordinates = PointCoordinates::eNamedMap;
    const SourceFile oFile(file, eReadOnly, GivenOrNone(oOptions.noData));
    TakePoints(oOptions);
    const SampleResult oResult = SampleValues(oFile, oOptions.request, ShowProgress());
    Print(oOptions.json ? ToText(ToJson(file, oOptions, oResult)) : ToCsv(oOptions, oResult));
    return 0;
}

} // namespace

void AddSampleVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand("sample", "Reads the values of a file at points");
    const auto poOptions = std::make_shared<Options>();
    const std::vector<std::pair<std::string, PointCoordinates>> oKinds{{"pixel", PointCoordinates::ePixels},
                                                                       {"map", PointCoordinates::eMap},
                                                                       {"lonlat", PointCoordinates::eGeographic}};
    poVerb->add_option("FILE", oSelection.file, "The file")->required();
    poVerb->add_option(
        "X Y", poOptions->coordinates,
        "Points, such as 500020 5199990 or 500020,5199990. Without any, or for -, they are read from the "
        "standard input: a line has x, y and, if there is one, a name");
    auto* const poKind = AddChoice(
        *poVerb, "--coordinates", poOptions->request.coordinates,
        "What the points are in: map (the file's reference system; the default for a file that says where it lies), "
        "pixel ((0, 0) is the outer corner of the first; the default for others) or lonlat (degrees on WGS 84)",
        oKinds);
    poVerb
        ->add_option("--crs", poOptions->request.crs,
                     "The points' reference system, such as EPSG:4258; x is always the easting or longitude")
        ->excludes(poKind);
    poVerb->add_option("--channels", poOptions->channels, "Only these, such as 1,3 or 1-3");
    poVerb->add_option("--no-data", poOptions->noData, "The no-data value, in place of the recorded one");
    poVerb->add_flag("--unscale", poOptions->unscale, "Multiply by the recorded scale and add the offset");
    poVerb->add_option("--height", poOptions->request.height,
                       "Height of the points above the ellipsoid in metres, where a sensor model places them (0)");
    poVerb->add_flag("--json", poOptions->json, "As JSON, with the reason where there is no value; else as CSV");
    poVerb->footer(
        "A point takes the value of the pixel that it lies in. The field is empty where there is none: outside\n"
        "of the image, no-data, masked.\n"
        "Examples:\n"
        "  krv sample scene.tif 500020 5199990\n"
        "  krv sample scene.tif --coordinates lonlat < points.csv");
    poVerb->callback(
        [&oSelection, poOptions]
        {
            oSelection.run = [&oSelection, poOptions]
            {
                return RunSample(oSelection.file, *poOptions);
            };
        });
}

} // namespace krv::tool
