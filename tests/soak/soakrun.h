#pragma once

#include <cstdlib>
#include <random>

// How long a run is and where its random numbers begin, by the environment.
namespace krv::test
{

inline unsigned int FromEnvironment(const char* pName, unsigned int nDefault)
{
    const char* const pText = std::getenv(pName);
    return pText != nullptr ? static_cast<unsigned int>(std::strtoul(pText, nullptr, 10)) : nDefault;
}

inline unsigned int Rounds()
{
    return FromEnvironment("KRV_SOAK_ROUNDS", 12);
}

using Random = std::linear_congruential_engine<unsigned int, 48271, 0, 2147483647>;

inline Random MakeRandom(unsigned int nStream)
{
    return Random(FromEnvironment("KRV_SOAK_SEED", 1) * 100 + nStream + 1);
}

} // namespace krv::test
