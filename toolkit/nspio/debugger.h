#pragma once

#include "toolkit/api.h"

#include <functional>
#include <string>

namespace krv::nspio
{

// Debug output in levels: 0 is none, higher levels say more. Callers ask GetLevel() before they form a message.
// Example: if (Debugger::GetLevel() >= 2) Debugger::Debug(2, "TIF", "directory at " + std::to_string(nAt), __FILE__,
// __LINE__);
class KRV_TOOLKIT_API Debugger
{
public:
    // level, module, message, source file, line
    using Sink = std::function<void(int, const std::string&, const std::string&, const std::string&, unsigned int)>;

    // 0 at first.
    // Any thread, without a lock: a single look.
    static int GetLevel();

    // Any thread; counts from the next message on.
    static void SetLevel(int nLevel);

    // Passes a message on when its level is at most the set one. Any thread.
    static void Debug(int nLevel, const std::string& module, const std::string& message, const std::string& sourceFile,
                      unsigned int nLine);

    // Replaces the sink and returns the former one; an empty sink is the standard one (standard error output).
    // Any thread. A call that is on its way still goes to the old one.
    static Sink SetSink(Sink oSink);
};

} // namespace krv::nspio
