#pragma once

#include "gobs/api.h"
#include "gobs/pct/rgbtuple.h"

#include <cstdint>
#include <vector>

namespace krv::gobs
{

// A pseudocolour table: half-open ranges of values [low, high), the last one closed, sorted, each with a colour.
// Colours are kept in 16 bits per part, as files hold them; 8-bit colours are 257 times their value.
// A plain value. Example: a class of values from 3 to below 4: oTable.Add({3, 4, {65535, 0, 0}});
class KRV_GOBS_API PCT
{
public:
    struct Entry
    {
        double low;  // the first value of the range
        double high; // the first one behind it
        RGBTuple<std::uint16_t> colour;
        std::uint16_t alpha = 65535; // opaque; 0 is transparent
    };

    // No entries: every value is the background colour.
    PCT() = default;

    // Entry i covers [i, i + 1): the colour map of an index channel.
    // Example: a table of 256 colours for an 8U channel, entry 0 first.
    static PCT FromColours(const std::vector<RGBTuple<std::uint16_t>>& oColours);

    // Keeps the entries sorted. Throws ParameterException for an empty, reversed, NaN or overlapping range.
    // Linear in the number of entries behind the new one.
    void Add(const Entry& oEntry);

    // The colour of a value: that of its range; below the first range the first colour, above the last the last; in a
    // gap the range before it; NaN, and a table without entries, give the background colour.
    // Logarithmic in the number of entries; ColourMapper is quicker for many pixels.
    RGBTuple<unsigned char> GetValue(double nValue) const;
    // The same with alpha; the background's is 0.
    RGBTuple<unsigned char> GetValue(double nValue, unsigned char& nAlpha) const;
    // The same in 16 bits.
    RGBTuple<std::uint16_t> GetValue16(double nValue, std::uint16_t& nAlpha) const;

    // Linear interpolation between the centres of neighbouring ranges; off at first.
    // Files do not record it: it is for showing continuous values.
    void SetInterpolation(bool bInterpolate) { mbInterpolate = bInterpolate; }
    bool GetInterpolation() const { return mbInterpolate; }

    // 8 bits a part. Black until it is set.
    void SetBackground(const RGBTuple<unsigned char>& oColour) { moBackground = oColour; }
    const RGBTuple<unsigned char>& GetBackground() const { return moBackground; }

    // Whether any entry is not opaque.
    bool HasAlpha() const;

    // Ascending. Valid until an entry is added.
    const std::vector<Entry>& GetEntries() const { return moEntries; }

private:
    const Entry* Find(double nValue) const;

    std::vector<Entry> moEntries; // ascending
    RGBTuple<unsigned char> moBackground;
    bool mbInterpolate = false;
};

} // namespace krv::gobs
