#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <vector>

namespace krv::test
{

// The folder of real files with a table of facts about them: named by KRV_TEST_DATA, else beside the source tree.
std::string DataFolder();

std::vector<std::string> Split(const std::string& text, char nSeparator);

// A row of the table by column name; "-" stands for absent.
class Facts
{
public:
    Facts(const std::vector<std::string>& oNames, const std::vector<std::string>& oValues);
    const std::string& operator[](const std::string& name) const { return moValues.at(name); }
    bool Has(const std::string& name) const { return (*this)[name] != "-"; }
    // The parts of a value, none when it is absent.
    std::vector<std::string> List(const std::string& name, char nSeparator = ';') const;
    std::vector<double> Numbers(const std::string& name) const;
    std::string GetPath() const { return DataFolder() + "/" + (*this)["file"]; }
    bool IsLossy() const { return (*this)["lossy"] == "yes"; }
    bool IsHalf() const { return (*this)["type"] == "float16"; }

private:
    std::map<std::string, std::string> moValues;
};

// All rows of a table in the folder; none when it is not there.
const std::vector<Facts>& GetFacts(const std::string& table = "FACTS.tsv");

// IEEE half precision of a value that came from one.
std::uint16_t ToHalf(float nValue);

} // namespace krv::test
