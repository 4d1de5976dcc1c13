#include "operations/link/linking.h"
#include "tools/krv/jsontext.h"
#include "tools/krv/verbs/verbs.h"

#include <CLI/CLI.hpp>

#include <memory>

namespace krv::tool
{

namespace
{

int RunLink(const std::string& target, const std::string& source)
{
    krv::operations::Link(target, source);
    Print(target + " has its pixels in " + source + "\n");
    return 0;
}

} // namespace

void AddLinkVerb(CLI::App& oApp, Selection& oSelection)
{
    auto* const poVerb =
        oApp.add_subcommand("link", "Makes a native file that refers to the pixels of another file and copies none");
    const auto poTarget = std::make_shared<std::string>();
    poVerb->add_option("TARGET", *poTarget, "The new file; one of that name is replaced")->required();
    poVerb->add_option("SOURCE", oSelection.file, "The file with the pixels; it stays as it is")->required();
    poVerb->footer("The link is a relative path: two files that are moved together still belong to each other.\n"
                   "Channels of single bits are not linked.");
    poVerb->callback(
        [&oSelection, poTarget]
        {
            oSelection.run = [&oSelection, poTarget]
            {
                return RunLink(*poTarget, oSelection.file);
            };
        });
}

} // namespace krv::tool
