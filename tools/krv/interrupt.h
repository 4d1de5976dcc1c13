#pragma once

#include <exception>

namespace krv::tool
{

// Thrown when the user asked the command to stop.
class Stopped : public std::exception
{
public:
    const char* what() const noexcept override { return "stopped"; }
};

// Notes SIGINT and SIGTERM instead of dying at once. A second one of the same kind ends the process as usual.
void WatchForInterrupt();

// Throws Stopped after a noted signal. To be called between pieces of work.
void CheckInterrupt();

} // namespace krv::tool
