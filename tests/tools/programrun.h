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

// Failed, printed nothing, and said why on one line that holds all the words.
void ExpectFailure(const ProgramRun& oRun, int nCode, const std::vector<std::string>& oWords);

// Arguments of the command that it refuses, its exit code and a word of what it says.
struct Refusal
{
    std::vector<std::string> moArguments;
    int mnCode;
    std::string moWord;
};
void ExpectRefusals(const std::string& verb, const std::vector<Refusal>& oRefusals);

} // namespace krv::test
