#pragma once

#include <cstddef>
#include <string>
#include <vector>

namespace krv::plugins::support
{

inline constexpr char LEVELS_ENDING[] = ".ovr";
inline constexpr char MASK_ENDING[] = ".msk";
inline constexpr char AUX_XML_ENDING[] = ".aux.xml";

// The file that lies beside another one under its name with an ending, such as "_RPC.TXT", in place of the extension;
// empty when there is none. Looked for by exact names, never by listing the folder: the ending as it is given, in small
// letters and in capitals, then the whole name in small letters and in capitals.
// Some looks at names; nothing is opened.
std::string FindSidecar(const std::string& fileName, const std::string& ending);

// The same with the ending behind the whole name, such as ".msk".
std::string FindAppended(const std::string& fileName, const std::string& ending);

// Those behind the whole name that say of the pixels of this very file, and go with it: levels, masks, ".aux.xml". One
// in other letters that is another file's is not among them.
std::vector<std::string> ListCompanions(const std::string& fileName);

// All of a sidecar but for the byte order mark before its text. Throws FileFormatException when it has more than
// nMaximum bytes, and what opening and reading throw.
std::string ReadSidecar(const std::string& sidecar, std::size_t nMaximum);

} // namespace krv::plugins::support
