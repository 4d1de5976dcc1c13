#pragma once

#include "operations/api.h"

#include <memory>
#include <string>
#include <vector>

namespace krv::datasources
{
class IFileIOBuilder;
}

namespace krv::operations
{

// What a program could do by itself to mend what a finding tells.
enum class RemedyStep
{
    eNone,
    eBuildLevels, // BuildOverviews
    eLinkAnew,    // Link
    eConvert,     // Convert, into a format that is there
    eCloudCopy    // Convert, with the option LAYOUT=COG
};

// One thing that was looked at. A failed one says what to do.
// Texts are for people; programs go by `good`.
struct Finding
{
    bool good = true;    // nothing to do about it
    std::string subject; // the file, or the piece of the installation
    std::string found;   // one sentence
    std::string remedy;  // one sentence; empty for what is good
    RemedyStep step = RemedyStep::eNone;
    std::vector<unsigned int> levels = {}; // that are to be built
};

// A plug-in that loaded, with a builder of its own, apart from the manager's.
// The builder goes before the program's end; its library stays loaded.
struct LoadedPlugin
{
    std::string name; // short name of its format
    std::unique_ptr<krv::datasources::IFileIOBuilder> builder;
};

// Looks at an installation piece by piece, so that one broken piece does not hide the others: home, registry, every
// description, every plug-in, and last the start of the manager as a whole.
// All of the looking is done by the constructor: what is wrong is a finding, not an exception.
class KRV_OPERATIONS_API InstallationCheck
{
public:
    InstallationCheck();
    ~InstallationCheck();

    // In the order of looking, good ones included. Lives as long as the check.
    const std::vector<Finding>& GetFindings() const { return moFindings; }

    // Those that CheckFile asks. Empty when no plug-in loads.
    const std::vector<LoadedPlugin>& GetPlugins() const { return moPlugins; }

private:
    void CheckHome();
    void CheckRegistry();
    void CheckDescription(const std::string& description);
    void CheckPlugin(const std::string& object);
    void CheckBuilder(const std::string& library, void* pLibrary);
    void CheckManager();
    void Good(const std::string& subject, const std::string& found);
    void Bad(const std::string& subject, const std::string& found, const std::string& remedy);

    std::string moHome; // the folder that is looked at
    std::vector<Finding> moFindings;
    std::vector<LoadedPlugin> moPlugins;
};

// What a file seems to be that no format recognises, and what to do about it; empty when nothing says so.
KRV_OPERATIONS_API std::string DescribeUnknown(const std::string& file);

// Why a file opens or does not: the file itself, which plug-ins were asked, what each said, and what its opening gave.
// Never throws for what is wrong with the file; oPlugins: of an InstallationCheck, which outlives the call.
KRV_OPERATIONS_API std::vector<Finding> CheckFile(const std::string& file, const std::vector<LoadedPlugin>& oPlugins);

// Whether a file is laid out so that programs read it in few requests over a network, and if not, why: a finding for
// each reason. Passes what opening the file throws.
KRV_OPERATIONS_API std::vector<Finding> CheckCloudLayout(const std::string& file);

} // namespace krv::operations
