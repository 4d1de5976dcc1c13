#include "toolkit/ogc/cs/detail/projcontext.h"

#include "toolkit/exceptions/exceptions.h"

#include <new>
#include <string_view>

namespace krv::ogc::cs::detail
{
namespace
{

// PROJ begins its messages with the name of its own function.
std::string_view WithoutFunction(std::string_view message)
{
    const auto nColon = message.find(": ");
    const bool bFunction = nColon != std::string_view::npos && message.substr(0, nColon).starts_with("proj_");
    return bFunction ? message.substr(nColon + 2) : message;
}

} // namespace

ProjContext::ProjContext() : mpoContext(Proj().proj_context_create())
{
    if (mpoContext == nullptr)
        throw std::bad_alloc();
    Proj().proj_log_func(mpoContext, this, &ProjContext::Log);
    Proj().proj_log_level(mpoContext, PJ_LOG_ERROR);
    Proj().proj_context_set_enable_network(mpoContext, 0);
}

ProjContext::~ProjContext()
{
    Proj().proj_context_destroy(mpoContext);
}

void ProjContext::Log(void* poSelf, int, const char* poMessage)
{
    std::string& message = static_cast<ProjContext*>(poSelf)->moMessage;
    constexpr std::size_t MAX_MESSAGE = 2000;
    if (poMessage == nullptr || message.size() > MAX_MESSAGE)
        return;
    message += (message.empty() ? "" : "; ");
    message += WithoutFunction(poMessage);
}

void ProjContext::Fail(const std::string& what, const Place& oPlace) const
{
    std::string message = std::move(moMessage);
    moMessage.clear();
    if (Proj().proj_context_get_database_path(mpoContext) == nullptr)
        message = "the reference system database proj.db cannot be found; install it (Debian package proj-data) or let "
                  "PROJ_LIB name its folder";
    throw DataException(what + ": " + (message.empty() ? "no further cause is known" : message), oPlace);
}

} // namespace krv::ogc::cs::detail
