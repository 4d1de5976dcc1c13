#pragma once

#include <filesystem>

namespace krv::datasources::detail
{

// Where libkrvdatasources lies, symbolic links followed.
std::filesystem::path OwnLibraryPath();

} // namespace krv::datasources::detail
