#pragma once

#include "toolkit/mathmodel/rpccoefficients.h"

#include <string>
#include <vector>

namespace krv::plugins::support
{

// The sensor models that lie beside an image, under numbers that do not move: 1 is a text with the ending "_RPC.TXT", 2
// one with ".rpb". A format whose files hold models of their own numbers them from 3 on, so that these count first.
inline constexpr unsigned int FIRST_OWN_MODEL = 3;

// The numbers of those that are there, ascending.
// fileName: of the image. Looks for names; reads nothing.
std::vector<unsigned int> FindModelSidecars(const std::string& fileName);

// The text of a number; empty when there is none.
std::string FindModelSidecar(const std::string& fileName, unsigned int nModel);

// Throws FileFormatException that names the sidecar when it is no model, and DataException when there is none of that
// number.
krv::mathmodel::RpcCoefficients ReadModelSidecar(const std::string& fileName, unsigned int nModel);

// Replaces the text of number 1 as a whole, or makes it.
// Throws what writing throws; an older text then stays as it was.
void WriteModelSidecar(const std::string& fileName, const krv::mathmodel::RpcCoefficients& oModel);

} // namespace krv::plugins::support
