#pragma once

namespace krv::gobs
{

// A complex value as it lies in a buffer.
// A plain value of two parts without padding, for parts that std::complex does not take: integers.
template <class Part>
struct Complex
{
    Part mnReal; // first in memory
    Part mnImaginary;

    // By both parts; NaN equals nothing, as for reals.
    friend bool operator==(const Complex&, const Complex&) = default;
};

} // namespace krv::gobs
