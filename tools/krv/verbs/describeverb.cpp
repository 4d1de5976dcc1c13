#include "toolkit/exceptions/exceptions.h"
#include "tools/krv/description.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>

#include <filesystem>
#include <fstream>
#include <memory>

namespace krv::tool
{

namespace
{

void Write(const std::filesystem::path& oFile, const std::string& text)
{
    std::filesystem::create_directories(oFile.parent_path());
    std::ofstream oStream(oFile, std::ios::binary);
    if (!(oStream << text) || !oStream.flush())
        throw krv::IOException(oFile.string(), "it cannot be written");
}

// All of it, as it lies below a prefix.
void WriteAll(const CLI::App& oApp, const std::filesystem::path& oShare)
{
    Write(oShare / "man/man1/krv.1", MakeManPage(oApp, "", KRV_VERSION));
    for (const CLI::App* const poVerb : oApp.get_subcommands({}))
        if (!poVerb->get_group().empty())
            Write(oShare / ("man/man1/krv-" + poVerb->get_name() + ".1"),
                  MakeManPage(oApp, poVerb->get_name(), KRV_VERSION));
    Write(oShare / "bash-completion/completions/krv", MakeCompletion(oApp, "bash"));
    Write(oShare / "zsh/site-functions/_krv", MakeCompletion(oApp, "zsh"));
}

} // namespace

// For the build, which installs what this writes; users are not told of it.
void AddDescribeVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb = oApp.add_subcommand("describe", "Writes manual pages and completion below a folder");
    const auto poFolder = std::make_shared<std::string>();
    poVerb->group("");
    poVerb->add_option("FOLDER", *poFolder, "Where share/ of an installation is")->required();
    poVerb->callback(
        [&oApp, &oSelection, poFolder]
        {
            oSelection.run = [&oApp, poFolder]
            {
                WriteAll(oApp, *poFolder);
                return 0;
            };
        });
}

} // namespace krv::tool
