#include "toolkit/nspio/warning.h"

#include "toolkit/nspio/detail/sinkholder.h"

#include <cstdio>
#include <utility>

namespace krv::nspio
{

void Warning::Warn(const std::string& message, const std::string& sourceFile, unsigned int nLine)
{
    const Sink oSink = detail::SinkHolder<Warning>::Get();
    if (oSink)
        oSink(message, sourceFile, nLine);
    else
        std::fprintf(stderr, "warning: %s (%s:%u)\n", message.c_str(), sourceFile.c_str(), nLine);
}

Warning::Sink Warning::SetSink(Sink oSink)
{
    return detail::SinkHolder<Warning>::Set(std::move(oSink));
}

} // namespace krv::nspio
