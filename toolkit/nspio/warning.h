#pragma once

#include "toolkit/api.h"
#include "toolkit/exceptions/place.h"

#include <functional>
#include <string>

namespace krv::nspio
{

// Where warnings go. Nothing sets a sink: they are written to the standard error output, one line each.
// A warning never changes what an operation gives; programs may ignore all of them.
class KRV_TOOLKIT_API Warning
{
public:
    // message, source file, line
    using Sink = std::function<void(const std::string&, const std::string&, unsigned int)>;

    // Any thread. An exception of the sink passes.
    // For whatever was passed over without ending the work: a sidecar that cannot be read, a tag that makes no sense.
    // message: one sentence that names the file. Warnings of one process may come from several threads.
    static void Warn(const std::string& message, const std::string& sourceFile, unsigned int nLine);
    // Names the caller.
    static void Warn(const std::string& message, const Place& oPlace = Place::Current())
    {
        Warn(message, oPlace.GetSourceFile(), oPlace.GetLine());
    }

    // Replaces the sink and returns the former one; an empty sink is the standard one.
    // Any thread. A program with a window sets one at its start, to show warnings in it. The sink may be called by
    // several threads at once.
    static Sink SetSink(Sink oSink);
};

} // namespace krv::nspio
