#pragma once

#include "datasources/interfaces/iencodedblocks.h"
#include "operations/copy/detail/copyplan.h"

#include <map>
#include <optional>
#include <string>
#include <vector>

namespace krv::operations::detail
{

// How a file stores the blocks of its image or of a level; no value when its format does not say.
std::optional<krv::datasources::EncodedForm> FindForm(const SourceFile& oSource, unsigned int nLevel = 1);

// The words KEY=VALUE of options, in capitals.
std::map<std::string, std::string> ParseOptions(const std::string& options);

// The form that the copy's blocks can take over as bytes: the first file's, when the copy is of all of its image in its
// type and no option asks for another codec or layout.
std::optional<krv::datasources::EncodedForm> FindMovedForm(const CopyPlan& oPlan, const std::string& options);

// Those of the options that are no matter of codec and layout of blocks.
std::string WithoutForm(const std::string& options);

// A property of the first file that a copy can keep, and the options of new files that do it.
struct KeptOption
{
    std::string what;    // for the line that says that it is not kept; empty for what needs no line
    std::string options; // such as "BLOCKXSIZE=256 BLOCKYSIZE=256"
    std::string instead; // to be tried when the format has no such thing
};

// Of what the user's options leave open: compression (a lossy one becomes one without loss), interleaving, blocks,
// narrow samples and predictor, in this order, since each may rest on those before it.
std::vector<KeptOption> FindKeptOptions(const CopyPlan& oPlan, const std::string& options);

} // namespace krv::operations::detail
