#pragma once

namespace krv::gobs
{

// A colour of red, green and blue.
template <typename T>
struct RGBTuple
{
    T red{};
    T green{};
    T blue{};

    friend bool operator==(const RGBTuple&, const RGBTuple&) = default;
};

} // namespace krv::gobs
