#pragma once

#include <nlohmann/json.hpp>

#include <string>
#include <vector>

namespace krv::test
{

// What a run of a program left.
struct ProgramRun
{
    int code = -1; // exit code; 128 + number for a signal
    std::string output;
    std::string errors;

    // The output parsed; throws when it is no JSON.
    nlohmann::json Json() const { return nlohmann::json::parse(output); }
};

// Runs a program without a shell and without a terminal, and waits for it. oEnvironment: "NAME=value" on top of this
// process's. nInterruptAfterMs: sends SIGINT so many milliseconds after the start; 0: never.
ProgramRun RunProgram(const std::string& program, const std::vector<std::string>& oArguments,
                      const std::vector<std::string>& oEnvironment = {}, unsigned int nInterruptAfterMs = 0);

// The command of this build.
ProgramRun RunKrv(const std::vector<std::string>& oArguments, const std::vector<std::string>& oEnvironment = {});

} // namespace krv::test
