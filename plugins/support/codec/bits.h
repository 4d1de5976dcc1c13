#pragma once

#include "plugins/support/codec/blockshape.h"

#include <cstddef>

namespace krv::plugins::codec
{

// Samples that are not whole machine words. Source and destination never overlap unless said otherwise; destinations
// hold samples in the order of this machine.

// Bytes of the smallest word of 1, 2, 4 or 8 bytes that holds a sample of nBits (1 to 64) bits.
// 1 for 1 to 8 bits, 2 for 9 to 16, 4 for 17 to 32, 8 above.
std::size_t GetContainerBytes(unsigned int nBits);

// Widens samples of nBits (1 to 64) bits, packed most significant bit first, each row starting on a byte, into words of
// GetContainerBytes(nBits) bytes. bSigned: the top bit of a sample is its sign and is spread through the word.
// nSourceBytes: what can be read at source; bits that lie outside count as 0.
// A destination row holds nRowSamples words.
// nDestinationPitch: bytes; at least nRowSamples words. Words are in this machine's order.
void UnpackBits(const unsigned char* source, std::size_t nSourceBytes, std::size_t nSourcePitch,
                unsigned char* destination, std::size_t nDestinationPitch, std::size_t nRowSamples, std::size_t nRows,
                unsigned int nBits, bool bSigned);

// Widens nCount integers of three bytes into words of four. bBigEndian: order of the three bytes.
// source: 3 * nCount bytes. bSigned: the top bit is spread through the word.
void Unpack24(const unsigned char* source, unsigned char* destination, std::size_t nCount, bool bBigEndian,
              bool bSigned);

// Widens nCount floating-point numbers of 16 bits (5 of them exponent) to 32, all of them exactly: denormals,
// infinities, and not-a-number with sign and payload kept at the top of the wider fraction, quiet or signalling as it
// was. Source in this machine's order.
// source: 2 * nCount bytes, destination: 4 * nCount. Nothing need be aligned, here and below.
void HalfToFloat(const unsigned char* source, unsigned char* destination, std::size_t nCount);

// The same for 24 bits (7 of them exponent, bias 63; 16 fraction).
// source: 3 * nCount bytes.
void Float24ToFloat(const unsigned char* source, unsigned char* destination, std::size_t nCount);

// The other way: to the nearest number of 16 or 24 bits, of two that are equally near to the even one. What is too
// large becomes infinite; not-a-number stays so. Exact for what came from such numbers.
void FloatToHalf(const unsigned char* source, unsigned char* destination, std::size_t nCount);
void FloatToFloat24(const unsigned char* source, unsigned char* destination, std::size_t nCount);

// Brings nCount integers of nValueBytes (1, 2 or 4) bytes, in this machine's order, into the range of nBits bits: what
// does not fit becomes the nearest value that does.
// In place. Example: 300 and -1 in 8 unsigned bits become 255 and 0.
void FitBits(unsigned char* values, std::size_t nCount, std::size_t nValueBytes, unsigned int nBits, bool bSigned);

// Turns round the bits of every byte. In place is allowed.
// For files whose first pixel of a byte is in its lowest bit (FillOrder 2 of TIFF).
void ReverseBits(const unsigned char* source, unsigned char* destination, std::size_t nBytes);

// Turns round the bytes of nCount samples of 1 to 8 bytes. In place is allowed. A complex sample counts as two.
void SwapBytes(const unsigned char* source, unsigned char* destination, std::size_t nCount, std::size_t nSampleBytes);

} // namespace krv::plugins::codec
