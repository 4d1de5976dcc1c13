#pragma once

#include "toolkit/exceptions/place.h"
#include "toolkit/ogc/cs/detail/projlibrary.h"

#include <memory>
#include <string>

namespace krv::ogc::cs::detail
{

struct ProjDelete
{
    void operator()(PJ* poObject) const { Proj().proj_destroy(poObject); }
};

using ProjObject = std::unique_ptr<PJ, ProjDelete>;

// A PROJ context that keeps what PROJ has to say instead of printing it, and never uses the network. Objects made in it
// must go before it. Its address is fixed, since PROJ knows it.
class ProjContext
{
public:
    ProjContext();
    ProjContext(const ProjContext&) = delete;
    ProjContext& operator=(const ProjContext&) = delete;
    ~ProjContext();

    PJ_CONTEXT* Get() const { return mpoContext; }

    // Throws krv::DataException: what was tried, then PROJ's own message since the last call, or what to do when its
    // database is not there.
    [[noreturn]] void Fail(const std::string& what, const Place& oPlace) const;

private:
    static void Log(void* poSelf, int nLevel, const char* poMessage);

    PJ_CONTEXT* mpoContext;
    mutable std::string moMessage;
};

} // namespace krv::ogc::cs::detail
