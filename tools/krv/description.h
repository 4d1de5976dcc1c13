#pragma once

#include <string>

namespace CLI
{
class App;
}

namespace krv::tool
{

// What is installed beside the command, made from its own description so that it says what the command takes.

// A page for man in roff: of the command, or of one of its verbs when a name is given. Throws UsageError for a name
// that is no verb's.
std::string MakeManPage(const CLI::App& oApp, const std::string& verb, const std::string& version);

// A script that completes verbs, options and the words that options take: for "bash" or "zsh". Throws UsageError for
// other shells.
std::string MakeCompletion(const CLI::App& oApp, const std::string& shell);

} // namespace krv::tool
