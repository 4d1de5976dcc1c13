#pragma once

#include <string>

namespace krv::conformance
{

// A folder of its own below the system's temporary one, removed with all that is in it.
class TempFolder
{
public:
    TempFolder();
    TempFolder(const TempFolder&) = delete;
    TempFolder& operator=(const TempFolder&) = delete;
    ~TempFolder();

    const std::string& GetPath() const { return moPath; }
    // The path of a name inside; folders on the way are made.
    std::string File(const std::string& name) const;
    // Writes a file inside, replacing an older one, and returns its path.
    std::string Write(const std::string& name, const std::string& bytes) const;

private:
    std::string moPath;
};

// All bytes of a file; std::runtime_error when it cannot be read.
std::string ReadFile(const std::string& fileName);
void WriteFile(const std::string& fileName, const std::string& bytes);

} // namespace krv::conformance
