#pragma once

namespace krv::gobs
{

// A complex value as it lies in a buffer.
template <class Part>
struct Complex
{
    Part mnReal;
    Part mnImaginary;

    friend bool operator==(const Complex&, const Complex&) = default;
};

} // namespace krv::gobs
