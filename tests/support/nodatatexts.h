#pragma once

#include <iterator>
#include <sstream>
#include <string>
#include <vector>

namespace krv::test
{

// No-data values as files record them: common ones, the limits of the types with their neighbours, and what few types
// hold.
inline std::vector<std::string> NoDataTexts()
{
    std::istringstream oTexts("0 -0.0 1 -1 0.1 0.5 7.5 255 256 -128 -9999 65535 -32768 16777217 4294967295 1e10 1e30 "
                              "1e39 1e-50 9007199254740993 -9223372036854775808 9223372036854775807 "
                              "18446744073709551615 9.223372036854775808e18 1.8446744073709552e19 3.4028235e38 "
                              "3.4028237e38 3.4028235677973366e38 -3.4028234663852886e+38 -1.7976931348623157e308 "
                              "1.7976931348623157e308 nan inf -inf");
    return {std::istream_iterator<std::string>(oTexts), {}};
}

} // namespace krv::test
