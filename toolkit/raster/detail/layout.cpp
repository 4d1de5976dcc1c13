#include "toolkit/raster/detail/layout.h"

#include "toolkit/exceptions/exceptions.h"

#include <limits>
#include <string>
#include <utility>

namespace krv::raster::detail
{

namespace
{

struct PartFacts
{
    int mnDigits; // bits of whole numbers that are exact
    bool mbSigned;
    bool mbReal;
};

template <std::size_t... N>
constexpr std::array<PartFacts, PART_COUNT> MakeFacts(std::index_sequence<N...>)
{
    return {PartFacts{std::numeric_limits<std::tuple_element_t<N, PartTypes>>::digits,
                      std::numeric_limits<std::tuple_element_t<N, PartTypes>>::is_signed,
                      !std::numeric_limits<std::tuple_element_t<N, PartTypes>>::is_integer}...};
}

constexpr auto FACTS = MakeFacts(std::make_index_sequence<PART_COUNT>());

} // namespace

Layout LayoutOf(BufferType eType, const char* sParameter, const Place& oPlace)
{
    constexpr std::size_t COMPLEX_PARTS[] = {2, 3, 5, 6, 9};
    if (eType < eBT_8U || eType > eBT_C64R)
        throw ParameterException("There is no buffer type " + std::to_string(static_cast<int>(eType)),
                                 ParameterException::eInvalidValue, sParameter, oPlace);
    const auto nType = static_cast<std::size_t>(eType);
    return nType < PART_COUNT ? Layout{nType, 1} : Layout{COMPLEX_PARTS[nType - PART_COUNT], 2};
}

bool PartCovers(std::size_t nPart, std::size_t nOther)
{
    const PartFacts& oTo = FACTS[nPart];
    const PartFacts& oFrom = FACTS[nOther];
    return oTo.mnDigits >= oFrom.mnDigits && (oTo.mbReal || (!oFrom.mbReal && (oTo.mbSigned || !oFrom.mbSigned)));
}

bool IsZeroExtended(std::size_t nPart, std::size_t nShorter)
{
    return PART_BYTES[nShorter] < PART_BYTES[nPart] && !FACTS[nPart].mbReal && !FACTS[nShorter].mbReal &&
           !FACTS[nShorter].mbSigned;
}

} // namespace krv::raster::detail
