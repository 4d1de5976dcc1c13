#include "gobs/mask/detail/vectormark.h"

#if defined(KRV_VECTOR_MASKS)
#if !defined(__AVX2__)
#error "This file is compiled for AVX2 alone; the caller asks the processor first."
#endif
#include "gobs/mask/detail/vectormatch.h"

#include <cstdint>

namespace krv::gobs::detail
{

template <class Sample>
std::size_t MarkByAvx2(const unsigned char* pPixels, std::size_t nPixels, const MarkPattern& oPattern,
                       unsigned char* pBits)
{
    return MarkAnyNaN<Avx2Ops, Sample>(pPixels, nPixels, oPattern, pBits);
}

template std::size_t MarkByAvx2<std::uint8_t>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkByAvx2<std::uint16_t>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkByAvx2<std::uint32_t>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkByAvx2<std::uint64_t>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkByAvx2<float>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkByAvx2<double>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkByAvx2<Complex<float>>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);
template std::size_t MarkByAvx2<Complex<double>>(const unsigned char*, std::size_t, const MarkPattern&, unsigned char*);

} // namespace krv::gobs::detail
#endif
