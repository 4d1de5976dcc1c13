#include "operations/job/exceptions.h"

namespace krv::operations
{

RequestException::RequestException(const std::string& message, const krv::Place& oPlace)
    : krv::Exception(message, oPlace)
{
}

RequestException::RequestException(const std::string& message, const std::string& field, const krv::Place& oPlace)
    : krv::Exception(message, oPlace), moField(field)
{
}

RequestException::~RequestException() = default;

StoppedException::StoppedException(const krv::Place& oPlace) : krv::Exception("stopped", oPlace) {}

StoppedException::~StoppedException() = default;

std::string CurrentMessage()
{
    try
    {
        throw;
    }
    catch (const std::exception& oError)
    {
        return oError.what();
    }
    catch (...)
    {
        return "unknown error";
    }
}

} // namespace krv::operations
