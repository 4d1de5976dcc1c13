#pragma once

#include "toolkit/api.h"

#include <functional>
#include <string>

namespace krv::nspio
{

// Debug output in levels: 0 is none, higher levels say more. Callers ask GetLevel() before they form a message.
class KRV_TOOLKIT_API Debugger
{
public:
    // level, module, message, source file, line
    using Sink = std::function<void(int, const std::string&, const std::string&, const std::string&, unsigned int)>;

    // 0 at first.
    static int GetLevel();
    static void SetLevel(int nLevel);

    // Passes a message on when its level is at most the set one. Any thread.
    static void Debug(int nLevel, const std::string& module, const std::string& message, const std::string& sourceFile,
                      unsigned int nLine);

    // Replaces the sink and returns the former one; an empty sink is the standard one (standard error output).
    static Sink SetSink(Sink oSink);
};

} // namespace krv::nspio
