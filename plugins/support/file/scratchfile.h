#pragma once

#include "plugins/support/file/file.h"

#include <memory>
#include <string>

namespace krv::plugins::support
{

// An empty file without a name for what does not fit memory, in the folder that TMPDIR names, else in /var/tmp. It goes
// with the object, or with the program, however that ends. fileName: the file that it serves, which messages name.
// Throws IOException when the folder cannot be written.
std::shared_ptr<File> MakeScratchFile(const std::string& fileName, const Place& oPlace = Place::Current());

} // namespace krv::plugins::support
