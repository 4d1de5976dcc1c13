#include "tools/krv/jsontext.h"

#include "toolkit/exceptions/exceptions.h"

#include <cerrno>
#include <cstdio>
#include <cstring>

namespace krv::tool
{

std::string ToText(const Json& oJson)
{
    return oJson.dump(2, ' ', false, Json::error_handler_t::replace) + "\n";
}

Json TextOrNull(const std::string& text)
{
    return text.empty() ? Json(nullptr) : Json(text);
}

void Print(const std::string& text)
{
    if (std::fwrite(text.data(), 1, text.size(), stdout) != text.size() || std::fflush(stdout) != 0)
        throw krv::OSException(errno, std::string("the output could not be written: ") + std::strerror(errno));
}

} // namespace krv::tool
