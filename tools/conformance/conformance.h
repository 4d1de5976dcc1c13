#pragma once

#include "datasources/interfaces/ifileiobuilder.h"

#include <memory>
#include <string>
#include <vector>

// What the framework and its users may rely on in every format plug-in, as checks that need nothing but the plug-in's
// library and files of its format.
namespace krv::conformance
{

// A plug-in library, loaded as the framework does it, with a builder of its own.
class Plugin
{
public:
    // Throws std::runtime_error when it cannot be loaded or gives no builder.
    explicit Plugin(const std::string& libraryFile);

    const std::string& GetLibraryFile() const { return moLibraryFile; }
    krv::datasources::IFileIOBuilder& GetBuilder() const { return *mpoBuilder; }

private:
    std::string moLibraryFile;
    std::unique_ptr<krv::datasources::IFileIOBuilder> mpoBuilder;
};

using Findings = std::vector<std::string>;

struct Check
{
    const char* mpName;
    const char* mpMeaning;
    void (*mpRun)(const Plugin& oPlugin, const std::string& sampleFile, Findings& oFindings);
};

const std::vector<Check>& GetChecks();

// Runs one check over one file of the format, which holds a raster of at most 256 MiB. Empty when all is as it should
// be; an exception that gets out is a finding. Random choices are the same in every run.
Findings Run(const Check& oCheck, const Plugin& oPlugin, const std::string& sampleFile);

} // namespace krv::conformance
