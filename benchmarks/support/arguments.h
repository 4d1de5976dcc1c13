#pragma once

#include <map>
#include <string>
#include <vector>

namespace krv::benchmarks
{

// The command line of a benchmark. Its usage is the grammar: "FOLDER [FILE...] [--size N] [--only rings|stars]" wants
// one word, takes more, and knows two options, the first a positive number, the second with a choice of values.
// --help prints the usage, so does whatever does not fit; both end the process.
class Arguments
{
public:
    Arguments(int nArguments, char** pArguments, const std::string& usage);

    const std::vector<std::string>& GetWords() const { return moWords; }

    // The value of "--name", or the other one.
    std::string GetOption(const std::string& name, const std::string& otherwise = {}) const;
    unsigned int GetNumber(const std::string& name, unsigned int nOtherwise) const;

    // Whether a part of the benchmark is to run: "--only" names it, or none.
    bool Wants(const std::string& part) const;

private:
    void ReadUsage(const std::string& usage);
    std::string FindFault(int nArguments, char** pArguments);
    bool Fits(const std::string& option, const std::string& value) const;

    std::size_t mnLeastWords = 0;
    std::size_t mnMostWords = 0;
    std::map<std::string, std::string> moKnown; // option: what the usage says of its value
    std::map<std::string, std::string> moOptions;
    std::vector<std::string> moWords;
};

} // namespace krv::benchmarks
