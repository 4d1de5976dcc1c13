#include "tests/support/outputcapture.h"

#include <utility>

namespace krv::test
{

OutputCapture::OutputCapture(int nDebugLevel) : mnFormerLevel(krv::nspio::Debugger::GetLevel())
{
    moFormerWarnings = krv::nspio::Warning::SetSink(
        [this](const std::string& message, const std::string& sourceFile, unsigned int nLine) {
            moWarnings.push_back({message, sourceFile, nLine, ""});
        });
    moFormerDebug = krv::nspio::Debugger::SetSink(
        [this](int nLevel, const std::string& module, const std::string& message, const std::string& sourceFile,
               unsigned int nLine) {
            moDebug.push_back({message, sourceFile, nLine, module, nLevel});
        });
    krv::nspio::Debugger::SetLevel(nDebugLevel);
}

OutputCapture::~OutputCapture()
{
    krv::nspio::Debugger::SetLevel(mnFormerLevel);
    krv::nspio::Debugger::SetSink(std::move(moFormerDebug));
    krv::nspio::Warning::SetSink(std::move(moFormerWarnings));
}

} // namespace krv::test
