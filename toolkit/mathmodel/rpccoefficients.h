#pragma once

#include "toolkit/api.h"

#include <array>
#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace krv::mathmodel
{

// The numbers of a rational polynomial model in the form called RPC00B. With P, L and H as the latitude, longitude and
// height less their offset over their scale,
//     line = lineOffset + lineScale * lineNumerator(P, L, H) / lineDenominator(P, L, H),
// and the sample likewise; (line, sample) = (0, 0) is the centre of the first pixel. A polynomial has its 20
// coefficients in the order 1, L, P, H, LP, LH, PH, LL, PP, HH, PLH, LLL, LPP, LHH, LLP, PPP, PHH, LLH, PPH, HHH.
// Source: NIMA, The Compendium of Controlled Extensions for the National Imagery Transmission Format, RPC00B.
// A plain value. What was read from a file is checked by FindFault before a model is made of it.
struct KRV_TOOLKIT_API RpcCoefficients
{
    using Polynomial = std::array<double, 20>;

    // Two errors, five offsets, five scales and four polynomials.
    static constexpr std::size_t COUNT = 92;
    using Values = std::array<double, COUNT>;

    double biasError = -1;      // root mean square, metres on each horizontal axis; negative: unknown
    double randomError = -1;    // the same, of each point
    double lineOffset = 0;      // pixels
    double sampleOffset = 0;    // pixels
    double latitudeOffset = 0;  // degrees
    double longitudeOffset = 0; // degrees
    double heightOffset = 0;    // metres above the ellipsoid
    double lineScale = 1;       // pixels
    double sampleScale = 1;     // pixels
    double latitudeScale = 1;   // degrees
    double longitudeScale = 1;  // degrees
    double heightScale = 1;     // metres
    Polynomial lineNumerator{};
    Polynomial lineDenominator{1};
    Polynomial sampleNumerator{};
    Polynomial sampleDenominator{1};

    // All numbers in the order of the members, which is that of the TIFF tag 50844 and stays for good.
    // The first two are the errors, then the offsets, the scales, and the four polynomials of 20.
    Values GetValues() const;

    // Nothing is checked: FindFault does that, and RpcModel asks it.
    static RpcCoefficients FromValues(const Values& oValues);

    // The values as a text, separated by blanks, each as short as it reads back the same; no value for any text but 92
    // numbers.
    std::string GetText() const;
    static std::optional<RpcCoefficients> FromText(std::string_view text);

    // The coefficients of an image whose outer corner lies at that place of this one.
    // For a part cut out of an image: nColumn and nRow are where its first pixel lies in the whole.
    RpcCoefficients Shifted(double nColumn, double nRow) const;
    // Those of a reduced image of the same scene; the ratios are full size over reduced size.
    // 2 and 2 for a level of half size. Offsets and scales of line and sample change, nothing else.
    RpcCoefficients Scaled(double nColumnRatio, double nRowRatio) const;

    // Why these numbers are no model; empty when they are one.
    // Such as a scale of 0 or a coefficient that is not finite. Files hold them, so ask before use.
    std::string FindFault() const;

    bool operator==(const RpcCoefficients&) const = default;
};

} // namespace krv::mathmodel
