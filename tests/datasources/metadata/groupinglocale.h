#pragma once

#include <locale>
#include <string>

namespace krv::test
{

// While it lives, the process has a locale that groups digits by dots and has a decimal comma, as an application may
// set it.
class GroupingLocale
{
public:
    GroupingLocale() : moBefore(std::locale::global(std::locale(std::locale::classic(), new Grouping))) {}
    ~GroupingLocale() { std::locale::global(moBefore); }
    GroupingLocale(const GroupingLocale&) = delete;
    GroupingLocale& operator=(const GroupingLocale&) = delete;

private:
    struct Grouping : std::numpunct<char>
    {
        char do_thousands_sep() const override { return '.'; }
        char do_decimal_point() const override { return ','; }
        std::string do_grouping() const override { return "\3"; }
    };

    std::locale moBefore;
};

} // namespace krv::test
