#pragma once

#include "toolkit/nspio/debugger.h"
#include "toolkit/nspio/warning.h"

#include <string>
#include <vector>

namespace krv::test
{

// Collects warnings and debug output while it lives, the debug output up to a level.
class OutputCapture
{
public:
    struct Line
    {
        std::string moMessage;
        std::string moSourceFile;
        unsigned int mnLine;
        std::string moModule; // debug output only
        int mnLevel = 0;
    };

    explicit OutputCapture(int nDebugLevel = 0);
    OutputCapture(const OutputCapture&) = delete;
    OutputCapture& operator=(const OutputCapture&) = delete;
    ~OutputCapture();

    std::vector<Line> moWarnings;
    std::vector<Line> moDebug;

private:
    int mnFormerLevel;
    krv::nspio::Warning::Sink moFormerWarnings;
    krv::nspio::Debugger::Sink moFormerDebug;
};

} // namespace krv::test
