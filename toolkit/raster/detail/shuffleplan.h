#pragma once

#include <array>
#include <cstddef>

namespace krv::raster::detail
{

// Picks channels out of pixels by byte shuffles of whole vectors of 16 bytes: worked out once, then run along rows.
// Each output vector is put together from the input vectors that hold bytes of it. Of four channels of 32 bits the
// third and the first:
//     input vectors   a0 b0 c0 d0 | a1 b1 c1 d1
//     shuffled        c0 a0 .  .  | .  .  c1 a1      or    c0 a0 c1 a1
class ShufflePlan
{
public:
    // Pixels of nInputs samples of nSampleBytes bytes become pixels of nOutputs; output channel i is channels[i] of the
    // input.
    ShufflePlan(std::size_t nInputs, const std::size_t* channels, std::size_t nOutputs, std::size_t nSampleBytes);

    // False where single samples are moved as fast: too many channels, samples too large, or a processor without
    // shuffles.
    bool IsUsable() const { return mbUsable; }

    // The pixels of one turn; Run works on whole turns.
    std::size_t GetTurnPixels() const { return 16 / mnSampleBytes; }

    // nTurns turns from source to destination, without gaps.
    void Run(const unsigned char* source, unsigned char* destination, std::size_t nTurns) const;

private:
    static constexpr std::size_t MAX_STEPS = 8;
    static constexpr std::size_t MAX_OUTPUTS = 8;

    struct Step
    {
        std::size_t mnOffset; // of the input vector in the bytes of a turn
        std::array<unsigned char, 16> moTable;
    };

    bool Build(const std::size_t* channels);
    Step* FindStep(std::size_t nOutput, std::size_t nOffset);
    template <std::size_t nSteps>
    void RunSteps(const unsigned char* source, unsigned char* destination, std::size_t nTurns) const;

    std::size_t mnInputs;
    std::size_t mnOutputs;
    std::size_t mnSampleBytes;
    std::size_t mnSteps = 0; // of the output vector that needs most; the others are filled up with idle ones
    std::array<std::size_t, MAX_OUTPUTS> moCounts{};
    std::array<std::array<Step, MAX_STEPS>, MAX_OUTPUTS> moSteps{};
    bool mbUsable; // last: the plan is built as it is initialised
};

} // namespace krv::raster::detail
