#pragma once

#include "toolkit/mathmodel/rpccoefficients.h"

#include <string>

namespace krv::plugins::support
{

// The two texts in which rational polynomial coefficients lie beside an image. Units and keys that are not known are
// passed over, the errors may be missing, numbers may have a sign and an exponent of D or E. fileName is what messages
// name. Both throw FileFormatException for a key that is missing, stands twice with different values or has no number,
// for numbers that are no model, and for coefficients in another order than RPC00B.

// Lines of "LINE_OFF: 5124.0 pixels", a line for each coefficient: "LINE_NUM_COEFF_1: ...".
// text: all of the file, from anybody. Heights are in metres, latitudes and longitudes in degrees, lines and samples in
// pixels.
krv::mathmodel::RpcCoefficients ParseRpcText(const std::string& text, const std::string& fileName);

// The same as a text, each number as short as it reads back the same.
// ParseRpcText reads the same numbers from it.
std::string WriteRpcText(const krv::mathmodel::RpcCoefficients& oModel);

// Statements of "lineOffset = 5124;" and "lineNumCoef = (1.0, ...);", in groups or not.
krv::mathmodel::RpcCoefficients ParseRpb(const std::string& text, const std::string& fileName);

} // namespace krv::plugins::support
