#pragma once

namespace krv::gobs
{

// A colour of red, green and blue.
// T: unsigned char for 8 bits, std::uint16_t for 16 bits of each part. All 0 is black.
template <typename T>
struct RGBTuple
{
    T red{};
    T green{};
    T blue{};

    friend bool operator==(const RGBTuple&, const RGBTuple&) = default;
};

} // namespace krv::gobs
