#pragma once

#include "plugins/support/codec/blockshape.h"

#include <cstddef>
#include <vector>

namespace krv::plugins::codec
{

// The predictors of TIFF. Every row stands for itself. mnChannels of the shape is the number of samples that lie side
// by side in a pixel of the block: 1 where the channels are stored in separate planes.
//
// Source and destination of the Undo and Apply functions are either the same bytes with the same pitch, or do not
// overlap. A shape narrower than the stored row is allowed for the horizontal predictor and gives the left part of the
// rows; the floating-point predictor needs the row as it was stored.

// Predictors work on numbers, so that the order of bytes has to be known to undo them.
enum class SampleOrder
{
    eNative, // the order of this machine
    eSwapped // the other one
};

// Turns horizontal differences into samples of 1, 2, 4 or 8 bytes, modulo their size. Source samples are in oOrder, the
// destination's in the order of this machine.
// Complex values are two samples each. Runs along the rows in vectors where the processor has them.
void UndoHorizontal(const unsigned char* source, std::size_t nSourcePitch, unsigned char* destination,
                    std::size_t nDestinationPitch, const BlockShape& oShape, SampleOrder oOrder = SampleOrder::eNative);

// The reverse: samples of this machine's order become differences in oOrder.
// What UndoHorizontal gives of the result is the source again, bit for bit.
void ApplyHorizontal(const unsigned char* source, std::size_t nSourcePitch, unsigned char* destination,
                     std::size_t nDestinationPitch, const BlockShape& oShape,
                     SampleOrder oOrder = SampleOrder::eNative);

// Turns rows of byte planes (most significant byte of every sample first), stored as differences of bytes, into samples
// of 2, 3, 4 or 8 bytes in the order of this machine. The stored form is the same in files of either byte order.
// oScratch: working memory, grown to the bytes of a row and kept for the next call.
// Works for reals of any width and loses nothing, NaN and its payload included.
void UndoFloatingPoint(const unsigned char* source, std::size_t nSourcePitch, unsigned char* destination,
                       std::size_t nDestinationPitch, const BlockShape& oShape, std::vector<unsigned char>& oScratch);

// The reverse: samples of this machine's order become differences of byte planes.
void ApplyFloatingPoint(const unsigned char* source, std::size_t nSourcePitch, unsigned char* destination,
                        std::size_t nDestinationPitch, const BlockShape& oShape, std::vector<unsigned char>& oScratch);

} // namespace krv::plugins::codec
