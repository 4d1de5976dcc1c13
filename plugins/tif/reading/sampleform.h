#pragma once

#include "gobs/raster/datatype.h"

#include <cstddef>
#include <cstdint>
#include <string>

namespace krv::plugins::tif
{

// How samples turn from what a directory says into what is handed out.
enum class Widening
{
    eNone,       // stored as they are handed out
    eBits,       // packed bits, or words of 5 to 7 bytes, to the next whole type
    eThreeBytes, // integers of three bytes to four
    eHalf,       // reals of 16 bits to 32
    eFloat24     // reals of 24 bits to 32
};

// The form of one sample. A complex sample has two parts.
struct SampleForm
{
    krv::gobs::DataType moType;       // handed out
    krv::gobs::DataType moNativeType; // stored
    Widening meWidening = Widening::eNone;
    unsigned int mnPartBits = 8; // stored bits of one part
    unsigned int mnParts = 1;

    unsigned int GetBits() const { return mnPartBits * mnParts; }
    std::size_t GetPartBytes() const { return moType.GetBits() / 8; } // as handed out
    std::size_t GetValueBytes() const { return GetPartBytes() * mnParts; }
    bool IsSigned() const { return moNativeType.IsSigned(); }
    // Whether a stored sample is a whole number of bytes.
    bool IsWhole() const { return GetBits() % 8 == 0; }
};

// nBits, nFormat: BitsPerSample and SampleFormat. False with a reason for what no type can hold.
bool FindSampleForm(unsigned int nBits, unsigned int nFormat, SampleForm& oForm, std::string& reason);

// Turns stored samples into those handed out. Whole words of two and three bytes are in this machine's order, eBits are
// packed most significant bit first and begin with the first byte. A row has nCount samples; pitches are in bytes.
// Source and target do not overlap. Does nothing for eNone.
void WidenRows(const SampleForm& oForm, const unsigned char* pSource, std::size_t nSourcePitch, unsigned char* pTarget,
               std::size_t nTargetPitch, std::size_t nCount, std::size_t nRows);

} // namespace krv::plugins::tif
